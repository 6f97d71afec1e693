"""The service when its disk takes no more, or another holds its database: a fault, a line in the log, and it goes on."""
import os
import resource
import sqlite3
import tempfile
import unittest

import zuv
from by_hand import call, exchange, target

ATTACH = "<attachment/><dataPortPreference><c:transport>HTTP</c:transport></dataPortPreference>"


class disk(unittest.TestCase):
    def setUp(self):
        folder = self.enterContext(tempfile.TemporaryDirectory())
        self.database = os.path.join(folder, "documents.db")
        self.log, written = os.pipe()  # no file, which would be limited too
        self.addCleanup(os.close, self.log)
        self.stderr = self.enterContext(os.fdopen(written, "w"))

    def expect_failure(self, answer, logged):
        self.assertEqual(answer.status, 500, answer)
        self.assertIn(logged, os.read(self.log, 1 << 16).decode())

    def limit_files(self, address, size):
        resource.prlimit(address.process.pid, resource.RLIMIT_FSIZE, (size, resource.RLIM_INFINITY))

    def test_a_full_one_refuses_what_has_to_be_written(self):
        with zuv.service("--database", self.database, stderr=self.stderr) as address:
            report = call(address, "StatusReport", "create").first("thisURI")
            url = call(address, "StatusReport", "attach", ATTACH, target(report)).first("dataURI")
            data = "POST %s HTTP/1.1\r\nContent-Length: 6\r\n\r\nsignal" % url.removeprefix(address)
            profile = call(address, "Profile", "create").first("thisURI")

            self.limit_files(address, 0)
            refused = call(address, "Profile", "create")
            self.assertIn("Server.Processing", refused)
            self.expect_failure(refused, "database: ")
            self.expect_failure(exchange(address, data), "arriving-")
            self.assertEqual(call(address, "Profile", "get", header=target(profile)).status, 200)

            self.limit_files(address, resource.RLIM_INFINITY)
            self.assertEqual(call(address, "Profile", "create").status, 200)
            self.assertEqual(exchange(address, data).status, 200)

    def test_a_locked_database_can_be_read(self):
        with zuv.service("--database", self.database, stderr=self.stderr) as address:
            profile = call(address, "Profile", "create").first("thisURI")
            other = sqlite3.connect(self.database, isolation_level=None)
            self.addCleanup(other.close)
            other.execute("BEGIN IMMEDIATE")
            self.assertEqual(call(address, "Profile", "get", header=target(profile)).status, 200)
            self.expect_failure(call(address, "Profile", "create"), "database is locked")
            other.execute("ROLLBACK")
            self.assertEqual(call(address, "Profile", "create").status, 200)

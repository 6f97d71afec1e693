"""What the service outlives: garbage, cut requests, work out of all proportion, its own violent end, many clients at once."""
import concurrent.futures
import gzip
import os
import random
import re
import signal
import tempfile
import threading
import time
import unittest

import zuv
from by_hand import Connection, call, envelope, exchange, post, request, target

# A sanitizer keeps freed blocks, and qemu something of each ended thread.
MEMORY_IS_MEASURED = not (os.environ.get("ZUV_SANITIZED") or os.environ.get("ZUV_EMULATED"))
MB = 1 << 20


def create(name):
    return post("Profile", envelope("Profile", request("create", "<c:identity><c:name>%s</c:name></c:identity>" % name)))


def memory_of(address, name):
    """A number of /proc/PID/status, in bytes: VmRSS is in use now, VmHWM was at most."""
    with open("/proc/%d/status" % address.process.pid, encoding="ascii") as status:
        return int(re.search(name + r":\s*(\d+) kB", status.read())[1]) * 1024


def doubled(tag, depth, content=""):
    """Objects that hold the next one twice: 2^depth elements if they were written as a tree."""
    rows = ['<%s id="n0">%s</%s>' % (tag, content, tag)]
    for number in range(1, depth):
        inner = 2 * ('<%s href="#n%d"/>' % (tag, number - 1))
        rows.append('<%s id="n%d">%s%s</%s>' % (tag, number, inner, content, tag))
    return "".join(rows)


class endurance(unittest.TestCase):
    def started(self, *options, **how):
        return self.enterContext(zuv.service(*options, **how))  # whose end fails if it ended before or otherwise than with 0

    def expect_useful(self, address):
        self.assertEqual(exchange(address, create("x")).status, 200)

    def sent_and_ended(self, address, data):
        with Connection(address) as peer:
            return peer.send(data).end_sending().receive()

    def test_garbage_ends_nothing(self):
        address, dice, good = self.started(), random.Random(20240501), create("Ada")  # the same garbage each time
        for number in range(300):
            if number % 3 == 0:  # nothing but noise
                data = dice.randbytes(dice.randrange(2000))
            else:  # a request with some bytes changed, in the head too or only in the message
                data = bytearray(good)
                for _ in range(5):
                    data[dice.randrange(0 if number % 3 == 1 else good.index(b"\r\n\r\n") + 4, len(good))] = dice.randrange(256)
            self.sent_and_ended(address, bytes(data))
        self.expect_useful(address)

    def test_cut_requests_end_nothing_and_change_nothing(self):
        address, good = self.started(), create("Ada")
        head = good.index(b"\r\n\r\n") + 4
        for length in [*range(head), *range(head, len(good), 7)]:
            status = self.sent_and_ended(address, good[:length]).status
            self.assertTrue(status == 400 if length >= head else status != 200, (length, status))
        self.expect_useful(address)

    def test_hostile_messages_end_nothing(self):
        address = self.started()
        for body, header in ((100000 * "<profile>", ""), (request("create", doubled("profile", 40)), ""),
                             (request("create", '<profile id="a"><profile href="#a"/></profile>'), ""),
                             ('<createRequest id="a"><profile href="#a"/></createRequest>', ""),
                             ('<createRequest xsi:type="c:Identity"/>', ""), ('<createRequest xsi:nil="true"/>', ""),
                             (request("add", '<c:credentials xsi:nil="true"/>'), '<c:credentials xsi:nil="true"/>' + target("u"))):
            answer = exchange(address, post("Profile", envelope("Profile", body, header)))
            self.assertNotEqual(answer.status, 0, body[:1500])
        entity = '<!DOCTYPE a [<!ENTITY b "%s">]>' % (1000 * "b") + envelope("Profile", "&b;&b;")
        self.assertNotEqual(exchange(address, post("Profile", entity)).status, 0)
        self.expect_useful(address)

    def test_small_requests_make_no_large_work(self):
        """What references, filters and lists stand for is bounded by what arrived, not by what they could come to."""
        def queries(count, type_, content):
            return "<c:QueryRequests>%s</c:QueryRequests>" % (
                count * ('<c:queryRequest xsi:type="%s">%s</c:queryRequest>' % (type_, content)))

        def report(text):
            return request("submit", "<problemDescription>%s</problemDescription>" % text)
        nothing = ('<r:inclusionFilter><rf:expression xsi:type="rf:ReportTextComparison" compareOp="containsPhrase">'
                   "<rf:text>nothing</rf:text></rf:expression></r:inclusionFilter>")
        one_filter = ('<inclusionFilter id="f">%s<f:expression compareOp="equal" xsi:type="f:CategoryComparison">'
                      "<f:category>x</f:category></f:expression></inclusionFilter>" % (10000 * "<f:scope>requisite</f:scope>"))
        user = '<credentials id="c"><c:username>%s</c:username></credentials>' % (100000 * "u")
        address = self.started()
        for rule, port, body, noted in (
                ("an attachment within itself", "StatusReport",
                 request("create", '<c:attachment id="a"><c:attachment href="#a"/></c:attachment>'), "Client.InvalidInformation"),
                ("attachments doubled", "StatusReport", request("create", doubled("c:attachment", 40)), "Server.DataTooLarge"),
                ("profiles doubled", "Profile", request("create", doubled("profile", 15)), "Server.DataTooLarge"),
                ("authentications doubled", "UpdateOrder", request("authenticate", user + doubled(
                    "authenticateRequest", 8, '<credentials href="#c"/>')), "Client.InvalidRequest"),
                ("updates that nobody knows", "UpdateOrder", request("submit", 10001 * "<updateId>x</updateId>"),
                 "Client.InvalidRequest"),
                ("deliveries that nobody makes", "UpdateOrder",
                 request("submit", "<updateId>FW-100</updateId>" + 101 * "<deliveryPreference/>"), "Client.InvalidRequest"),
                ("one filter again and again", "UpdateOrder",
                 request("submit", one_filter + 10000 * '<inclusionFilter href="#f"/>'), "FilterExpressionTooComplex"),
                ("product collections that nobody knows", "Query",
                 queries(1, "u:QueryRecognizedProductCollectionsRequest", 1001 * "<u:productCollectionHierarchyRoot/>"),
                 "Client.InvalidRequest"),
                ("a report of many words", "ProblemReport", report(2000000 * "a b "), "submitResponse"),
                ("queries that look through it again and again", "Query", queries(20, "r:QueryReportsRequest", nothing),
                 "FilterExpressionTooComplex"),
                ("queries for a report that is too large", "Query", queries(3, "r:QueryReportsRequest", ""),
                 "too large for one answer"),
                ("a small report", "ProblemReport", report("nothing to report"), "submitResponse"),
                ("a query that is wanted", "Query", queries(1, "r:QueryReportsRequest", nothing), "nothing to report")):
            with self.subTest(rule):
                self.assertIn(noted, exchange(address, post(port, envelope(port, body))))
        if MEMORY_IS_MEASURED: # one takes up to 55 MB, and may not have given them back when the next one comes
            self.assertLess(memory_of(address, "VmHWM"), 150 * MB)

    def test_the_memory_of_a_request_is_bounded_and_comes_back(self):
        address = self.started()
        self.expect_useful(address)
        before = memory_of(address, "VmRSS")
        text = '<thisURI id="u">%s</thisURI>' % (MB * "u")
        for rule, content, noted in (
                ("60 MB of empty elements", 2300000 * "<profile/>", "max_memory: more than %d bytes" % (256 * MB)),
                ("a text copied 3000 times", text + 3000 * '<thisURI href="#u"/>', "copies by references and QNames: more than")):
            packed = gzip.compress(envelope("Profile", request("create", content)).encode(), 1)
            answer = exchange(address, post("Profile", packed, "Content-Encoding: gzip"))
            self.assertEqual((answer.status, noted in answer, "Connection: close" in answer), (413, True, True), (rule, answer))
        most, until = memory_of(address, "VmHWM"), time.monotonic() + 20
        while memory_of(address, "VmRSS") >= before + 32 * MB and time.monotonic() < until:
            self.expect_useful(address)
        print("%d MB before, %d at most, %d afterwards" % (before / MB, most / MB, memory_of(address, "VmRSS") / MB))
        if MEMORY_IS_MEASURED:
            self.assertLess(most, before + 400 * MB)
            self.assertLess(memory_of(address, "VmRSS"), before + 32 * MB)

    def test_acknowledged_documents_outlive_a_killed_service(self):
        with tempfile.TemporaryDirectory() as folder:
            database, uris, busy = os.path.join(folder, "documents.db"), [], threading.Event()

            def write(address):  # one client keeps writing until the service dies
                with Connection(address) as peer:
                    while uri := peer.send(create("Ada %d" % len(uris))).receive().first("thisURI"):
                        uris.append(uri)
                        if len(uris) == 20:
                            busy.set()
            with zuv.service("--database", database, end_status=-signal.SIGKILL) as address:
                writer = threading.Thread(target=write, args=[address])
                writer.start()
                self.assertTrue(busy.wait(zuv.LIMIT_S))
                address.process.kill()
                writer.join(zuv.LIMIT_S)
            with zuv.service("--database", database) as address:
                for number, uri in enumerate(uris):
                    self.assertEqual(call(address, "Profile", "get", header=target(uri)).first("name"), "Ada %d" % number)

    def test_many_clients_work_at_the_same_time(self):
        clients, calls = 8, 25
        address = self.started("--connections", "6")  # fewer than there are clients: some wait
        header = target(exchange(address, create("x")).first("thisURI"))
        more = post("Profile", envelope("Profile", request("add", "<c:contact/>"), header))

        def work(_):  # all of them change one document
            with Connection(address) as peer:
                return [peer.send(more).receive().status for _ in range(calls)]
        with concurrent.futures.ThreadPoolExecutor(clients) as pool:
            self.assertEqual(list(pool.map(work, range(clients))), clients * [calls * [200]])
        held = call(address, "Profile", "get", header=header).all("contact")
        self.assertEqual(len(held), clients * calls, "no change was lost")

"""A file of any size goes to the service and comes back through a host's callbacks, in all forms of messages: whole, and in
flat memory on both sides. For comparison curl carries the same file to and from a data port of the same service.

Usage: transfer.py BYTES FILE_HOST ZUV_SERVICE ZUV"""
import contextlib
import hashlib
import json
import os
import re
import subprocess
import sys
import tempfile
import time

MEMORY_LIMIT_KB = 8 * 1024  # above the idle process, at any size of file
BLOCK = 1 << 20
ATTACH = ('<s:attachRequest xmlns:s="http://www.zuv.example/xmlns/b2b/zuv/v1.0/StatusReport"><s:attachment/></s:attachRequest>')


def make_file(path, size):
    """Bytes that do not compress."""
    with open(path, "wb") as file:
        while size > 0:
            size -= file.write(os.urandom(min(size, BLOCK)))


def checksum(path):
    digest = hashlib.sha256()
    with open(path, "rb") as file:
        while block := file.read(BLOCK):
            digest.update(block)
    return digest.hexdigest()


def memory_kb(process, what):
    with open("/proc/%d/status" % process.pid, encoding="ascii") as status:
        return int(re.search(what + r":\s*(\d+) kB", status.read())[1])


@contextlib.contextmanager
def service(program, folder, size):
    process = subprocess.Popen([program, "--port", "0", "--database", os.path.join(folder, "documents.db"),
                                "--max-attachments", str(size)],
                               stdout=subprocess.PIPE, text=True)
    try:
        yield process, process.stdout.readline().rpartition(" ")[2].strip()
    finally:
        process.terminate()
        process.wait()
        process.stdout.close()


class Transfers:
    def __init__(self, folder, size, source):
        self.size, self.source, self.copy = size, source, os.path.join(folder, "copy")
        self.checksum = checksum(source)
        self.paces = {}

    def arrived(self):
        same = os.path.getsize(self.copy) == self.size and checksum(self.copy) == self.checksum
        os.unlink(self.copy)
        return same

    def show(self, what, up, down, notes=""):
        self.paces[what] = up, down
        print("%-18s %8.0f %8.0f   %s" % (what, up, down, notes), flush=True)

    def by_host(self, program, url, *options):
        run = subprocess.run([program, *options, url, self.source, self.copy], capture_output=True, text=True)
        assert run.returncode == 0, (options, run.stdout, run.stderr)
        up, down = (self.size / 1e6 / float(seconds) for seconds in re.findall(r"bytes in ([\d.]+) s", run.stdout))
        idle, more = map(int, re.search(r"memory +(\d+) kB idle, at most (\d+) kB more", run.stdout).groups())
        self.show(" ".join(options), up, down, "%d kB above %d kB idle" % (more, idle))
        assert more < MEMORY_LIMIT_KB, run.stdout
        assert self.arrived(), options

    def by_curl(self, address):
        def timed(*arguments):
            began = time.monotonic()
            subprocess.run(["curl", "-sSf", *arguments], check=True, stdout=subprocess.DEVNULL)
            return self.size / 1e6 / (time.monotonic() - began)
        # By --data-binary it would take the whole file into memory first.
        up = timed("-X", "POST", "-H", "Content-Type: application/octet-stream", "-H", "Expect:", "-T", self.source, address)
        self.show("curl", up, timed("-o", self.copy, address))
        assert self.arrived()


def data_port(zuv, url):
    """The address of a data port that the service has opened."""
    endpoint = url + "/zuv/v1.0/services/StatusReport"

    def call(*arguments, given=None):
        run = subprocess.run([zuv, "statusreport", *arguments, "--json", "-e", endpoint], input=given, text=True,
                             capture_output=True, check=True)
        return json.loads(run.stdout)
    report = call("create")["thisURI"][0]
    return call("attach", "-", "-t", report, given=ATTACH)["attachment"][0]["dataPort"][0]["dataURI"]


def main(size, file_host, service_program, zuv):
    with tempfile.TemporaryDirectory() as folder, service(service_program, folder, size) as (process, url):
        source = os.path.join(folder, "source")
        make_file(source, int(size))
        transfers = Transfers(folder, int(size), source)
        port = data_port(zuv, url)
        idle = memory_kb(process, "VmRSS")
        print("%-18s %8s %8s   of %d bytes" % ("", "up MB/s", "down", transfers.size))
        transfers.by_curl(port)
        for form in ("--mtom", "--mime", "--dime"):
            transfers.by_host(file_host, url, form)
            transfers.by_host(file_host, url, form, "--chunked")
        more = memory_kb(process, "VmHWM") - idle
        print("service: %d kB above %d kB idle" % (more, idle))
        assert more < MEMORY_LIMIT_KB
        for what, (up, down) in transfers.paces.items():
            print("%-18s %.2f of curl's pace up, %.2f down" % (
                what, up / transfers.paces["curl"][0], down / transfers.paces["curl"][1]))


if __name__ == "__main__":
    main(*sys.argv[1:])

#!/usr/bin/python3
"""What the pages show is so: their C++ is in programs that compile and run, their commands are run by some test, and their
links lead somewhere.

Usage: pages_test.py SOURCE_DIR ZUV_SERVICE GUIDE README_HOST. The programs call a zuv-service started here.
"""
import http.server
import os
import pathlib
import re
import subprocess
import sys
import tempfile
import threading
import zlib

sys.path.insert(0, os.path.join(os.path.dirname(os.path.abspath(__file__)), "..", "interop"))
import listening
import messages
import zuv_service

COMMAND = re.compile(r"^(?:script/|cmake |ctest |g\+\+ |zuv(?!::)|\.ci/)")
# The README's commands: the file that runs each, a script or a test that takes it from the text, and how it is written there.
RUN_BY = {
    "script/demo": (".ci/run", "script/demo\n"),
    "script/test": (".ci/run", "script/test\n"),
    "script/package": (".ci/run", "script/package "),
    "cmake --install build/release": ("tests/package/readme_test.py", "cmake --install"),
    "g++ host.cpp $(pkg-config --cflags --libs zuv_client_pro)": ("tests/package/readme_test.py", r"g\+\+"),
    "cmake --build build/release --target docs": ("cmake/docs_tests.cmake", "--build . --target docs"),
}


def blocks(page, language):
    return re.findall(r"^```%s\n(.*?)^```" % language, page, re.S | re.M)


def words(code):
    return " ".join(code.split())


def anchors(page):
    titles = re.findall(r"^#+ (.*)$", page, re.M)
    return {re.sub(r"[^\w\- ]", "", title.lower()).replace(" ", "-") for title in titles}


def check_links(path):
    page = pathlib.Path(path).read_text("utf-8")
    for target in re.findall(r"\]\(([^)\s]+)\)", page):
        if re.match(r"https?:", target):
            continue
        name, _, anchor = target.partition("#")
        place = os.path.join(os.path.dirname(path), name) if name else path
        assert os.path.exists(place), "%s: no file for the link %s" % (path, target)
        if anchor:
            assert anchor in anchors(pathlib.Path(place).read_text("utf-8")), "%s: no heading for the link %s" % (path, target)


def check_guide(source):
    pieces = blocks(pathlib.Path(source, "docs", "host-guide.md").read_text("utf-8"), "cpp")
    compiled = words(pathlib.Path(source, "examples", "guide.cpp").read_text("utf-8"))
    assert len(pieces) > 10, "the guide's code was not found"
    for piece in pieces:
        assert words(piece) in compiled, "not in examples/guide.cpp:\n" + piece


def commands(page):
    """Those of the page's shell blocks, and what is in back quotes and looks like one."""
    lines = "".join(blocks(page, "sh") + re.findall(r"^    .*\n", page, re.M)).splitlines()
    inline = re.findall(r"``(.+?)``|`([^`\n]+)`", re.sub(r"^```.*?^```", "", page, flags=re.S | re.M))
    found = [line.partition("#")[0].strip() for line in lines] + [one or other for one, other in inline]
    return [command for command in found if COMMAND.match(command)]


def check_commands(source, service):
    """Each command of the README is run somewhere; scripts that any page names are there; the service's own page starts it."""
    text = {}
    for page in ("README.md", "CONTRIBUTING.md", "docs/host-guide.md", "docs/command-line.md", "service/README.md"):
        text[page] = pathlib.Path(source, page).read_text("utf-8")
        for script in re.findall(r"(?<![\w/])(?:script/[\w-]+(?:\.\w+)?|\.ci/run)", text[page]):
            assert os.path.exists(os.path.join(source, script)), "%s: there is no %s" % (page, script)
    assert {one for one in commands(text["README.md"]) if " " in one or "/" in one} == set(RUN_BY), commands(text["README.md"])
    for command, (place, words) in RUN_BY.items():
        assert words in pathlib.Path(source, place).read_text("utf-8"), "%s doesn't run %s" % (place, command)
    starts = [one.split()[1:] for one in commands(text["service/README.md"]) if one.startswith("zuv-service ")]
    assert starts
    for arguments in starts:
        arguments += ["--port", "0"]  # the last one counts
        with tempfile.TemporaryDirectory() as folder:
            with listening.started([service, *arguments], cwd=folder) as address:
                assert re.fullmatch(r"https?://[\w.]+:\d+", address), address
            made = [one for one in arguments if re.search("[a-z]", one) and not one.startswith("-")]
            assert all(os.path.exists(os.path.join(folder, one)) for one in made), arguments


def check_run(program, arguments, expected, **environment):
    with tempfile.TemporaryDirectory() as folder:
        run = subprocess.run([program, *arguments], cwd=folder, text=True, capture_output=True, timeout=60,
                             env={**os.environ, **environment})
    assert run.returncode == 0, run.stdout + run.stderr
    for pattern in expected:
        assert re.search(pattern, run.stdout, re.M), "not printed: %s\n%s" % (pattern, run.stdout)


class PlainPeer(http.server.BaseHTTPRequestHandler):
    """Answers each request by a response, or a fault, in which everything optional is missing."""
    protocol_version, content = "HTTP/1.1", ""

    def do_POST(self):
        if "Content-Length" in self.headers:
            body = self.rfile.read(int(self.headers["Content-Length"]))
        else:
            body = b""
            while size := int(self.rfile.readline(), 16):
                body += self.rfile.read(size)
                self.rfile.readline()
            self.rfile.readline()
        text = (zlib.decompress(body, 47) if "Content-Encoding" in self.headers else body).decode()
        operation = re.search(r"<[\w-]+:(\w+)Request[ />]", text)[1]
        nil = ' xmlns:i="http://www.w3.org/2001/XMLSchema-instance" i:nil="true"' if self.content == "nil" else ""
        held = "<p:%sResponse%s/>" % (operation, nil)
        if "urn:not:there" in text:
            held = "<E:Fault><faultcode>E:Client</faultcode><detail><c:Client.ObjectNotFound/></detail></E:Fault>"
        answer = ('<E:Envelope xmlns:E="%s" xmlns:p="%s" xmlns:c="%s"><E:Body>%s</E:Body></E:Envelope>' % (
            re.search(r'"(http://[^"]*envelope/?)"', text)[1], messages.namespace("Profile"), messages.COMMON, held)).encode()
        self.send_response(500 if "Fault" in held else 200)
        self.send_header("Content-Type", "text/xml; charset=utf-8")
        self.send_header("Content-Length", str(len(answer)))
        self.end_headers()
        self.wfile.write(answer)

    def log_message(self, *_):
        pass


def check_plain_answers(guide, readme_host):
    """No sample takes for granted what an answer may lack."""
    for content in "empty", "nil":
        with http.server.ThreadingHTTPServer(("127.0.0.1", 0), type("Peer", (PlainPeer,), {"content": content})) as peer:
            threading.Thread(target=peer.serve_forever).start()
            endpoint = "http://127.0.0.1:%d/" % peer.server_address[1]
            try:
                check_run(guide, [endpoint], [r"^not found: $", r"^\d+ bytes$"])
                check_run(readme_host, [], [r"^kept as \(no URI\)$"] if content == "empty" else [], ZUV_README_ENDPOINT=endpoint)
            finally:
                peer.shutdown()


def main():
    source, service, guide, readme_host = sys.argv[1:]
    pages = subprocess.run(["git", "ls-files", "*.md"], cwd=source, text=True, capture_output=True).stdout.split()
    pages = pages or ["README.md", "docs/host-guide.md", "docs/architecture.md", "docs/command-line.md"]  # not a checkout
    for page in pages:
        check_links(os.path.join(source, page))
    check_guide(source)
    check_commands(source, service)
    with zuv_service.running(service) as address:
        endpoint = address + messages.service_path("Profile")
        check_run(guide, [endpoint], [r"^Ada's workshop$", r"^still here: Ada's workshop$", r"^not found: urn:not:there$",
                                      r"^\d+ bytes$"])
        check_run(readme_host, [], [r"^kept as urn:zuv:profile:"], ZUV_README_ENDPOINT=endpoint)
    check_plain_answers(guide, readme_host)
    print("%d pages, the guide's code, the README's host and commands" % len(pages))


if __name__ == "__main__":
    main()

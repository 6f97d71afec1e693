#!/usr/bin/python3
"""nginx between a host of the library and the Profile services; and curl, with Expect: 100-continue, before zuv-service.

Usage: nginx_profile.py ZUV ZUV_SERVICE NPM_FOLDER SCHEMA_DIR. Needs no privileges: nginx runs from a directory of
its own, on a free port.
"""
import contextlib
import os
import re
import shutil
import socket
import subprocess
import sys
import tempfile

import messages
import profile_calls
import zuv_service

LARGE = 5_000_000  # bytes
LIMIT_S = 120


@contextlib.contextmanager
def nginx(folder, zuv, npm):
    """Gives the address. The socket is bound here and handed over, so connections wait in its queue from the start."""
    with socket.create_server(("127.0.0.1", 0)) as listener:
        address = "127.0.0.1:%d" % listener.getsockname()[1]
        with open(os.path.join(os.path.dirname(os.path.abspath(__file__)), "nginx.conf"), encoding="utf-8") as file:
            text = file.read()
        user = "user root;" if os.geteuid() == 0 else ""
        for word, value in {"user": user, "folder": folder, "listen": address, "zuv": zuv, "npm": npm}.items():
            text = text.replace("@%s@" % word, value.removeprefix("http://"))
        config = os.path.join(folder, "nginx.conf")
        with open(config, "w", encoding="utf-8") as file:
            file.write(text)
        command = shutil.which("nginx", path=os.environ["PATH"] + ":/usr/sbin") or "nginx"
        program = subprocess.Popen([command, "-e", "stderr", "-p", folder, "-c", config], pass_fds=[listener.fileno()],
                                   env={**os.environ, "NGINX": "%d;" % listener.fileno()},
                                   stderr=subprocess.PIPE, text=True)
    try:
        yield "http://" + address
    finally:
        program.terminate()
        _, said = program.communicate(timeout=LIMIT_S)
        problems = [line for line in said.splitlines() if "using inherited sockets" not in line]
    assert program.returncode == 0 and not problems, problems


def call_all(program, endpoint, many, *options):
    """A small profile many times over one connection, then a large one, and one that isn't there."""
    profiles = profile_calls.Profiles(program, endpoint, *options)
    profiles.call("create", given=profile_calls.SAMPLE % "")
    profiles.call("get", "--keep-alive", "--repeat", str(many))
    large = "a" * LARGE
    given = profile_calls.SAMPLE % ("<p:profileAuthority>%s</p:profileAuthority>" % large)
    profiles.call("set", "--keep-alive", "--repeat", "2", given=given, profileAuthority=large)
    profiles.uri = "urn:nobody"
    profiles.expect_not_found()


def post(address, name, request, *options):
    """Sends a request with curl; gives the heads of what came back, and the body."""
    run = subprocess.run(["curl", "--silent", "--show-error", "--include", "--max-time", str(LIMIT_S), *options,
                          "-H", "Content-Type: text/xml; charset=utf-8", "-H", 'SOAPAction: ""',
                          "--data-binary", "@-", address + name], input=request, capture_output=True, timeout=LIMIT_S)
    assert run.returncode == 0, run.stderr
    heads, _, body = run.stdout.partition(b"<?xml")
    return re.findall(r"^HTTP/1\.1 (\d+)", heads.decode(), re.MULTILINE), body


def create_request(size):
    return (b'<E:Envelope xmlns:E="http://schemas.xmlsoap.org/soap/envelope/"><E:Body><p:createRequest'
            b' xmlns:p="http://www.zuv.example/xmlns/b2b/zuv/v1.0/Profile"><p:profileAuthority>' + b"a" * size +
            b"</p:profileAuthority></p:createRequest></E:Body></E:Envelope>")


def expect_continue(zuv):
    """curl sends nothing of a body of this size before it is told to go on, or a second has passed."""
    for size in (10, LARGE):
        for framing in ([], ["-H", "Transfer-Encoding: chunked"]):
            statuses, body = post(zuv, messages.service_path("Profile"), create_request(size), "-H", "Expect: 100-continue",
                                  "--expect100-timeout", str(LIMIT_S), *framing)
            assert statuses == ["100", "200"] and len(body) > size, (size, framing, statuses)
    print("Expect: 100-continue is answered before the body arrives")


class Log:
    """The exchanges that nginx logged, one mapping each."""

    def __init__(self, folder):
        pattern = re.compile(r"(?P<connection>\d+) (?P<status>\d+) request=(?P<request>\S+) answer=(?P<answer>\S+)$")
        with open(os.path.join(folder, "access.log"), encoding="utf-8") as file:
            self.exchanges = [pattern.match(line).groupdict() for line in file]
        self.next = 0

    def take(self, count):
        """The next exchanges, which belong to one service; the last one is answered by the fault."""
        run = self.exchanges[self.next:self.next + count]
        self.next += count
        assert len(run) == count and [e["status"] for e in run[:-1]] == ["200"] * (count - 1), run
        assert run[-1]["status"] in ("400", "500"), run[-1]
        return run


def through_nginx(program, zuv, npm, chunked_answers):
    """Runs of the host in turn, then a look at nginx's log: connections, and the framing both ways."""
    runs = [(place, many, chunked, ["--soap12"] if soap12 else [])
            for place in ("zuv", "stored/zuv") for soap12 in (False, True)
            for many, chunked in ((500, False), (20, True))] + [("npm/zuv", 200, False, []), ("npm/zuv", 20, True, [])]
    with tempfile.TemporaryDirectory() as folder:
        with nginx(folder, zuv, npm) as address:
            for place, many, chunked, version in runs:
                call_all(program, "%s/%s/v1.0/services/Profile" % (address, place), many,
                         *(["--chunked"] if chunked else []), *version)
        log = Log(folder)
        for place, many, chunked, _ in runs:
            exchanges = log.take(many + 4)
            connections = [e["connection"] for e in exchanges]
            assert len(set(connections)) == 4, "one each for create, all of get, both of set, and what isn't there"
            assert connections == sorted(connections, key=connections.index), "none is come back to"
            assert {e["request"] for e in exchanges} == {"chunked" if chunked else "-"}, exchanges[0]
            assert {e["answer"] for e in exchanges} == {"chunked" if chunked_answers or place.startswith("npm") else "-"}
        assert log.next == len(log.exchanges)
        print("%d calls through nginx, answers %s" % (log.next, "in chunks" if chunked_answers else "with a length"))


def main():
    program, service, npm_folder, schemas = (os.path.abspath(argument) for argument in sys.argv[1:])
    with zuv_service.running_npm(npm_folder, schemas) as npm:
        for chunked in (False, True):
            with zuv_service.running(service, *(["--chunked"] if chunked else [])) as zuv:
                expect_continue(zuv)
                through_nginx(program, zuv, npm, chunked)


if __name__ == "__main__":
    main()

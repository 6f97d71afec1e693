"""What the tests of servers and networks share: programs on free ports, certificates, and calls by call_client."""
import contextlib
import os
import pathlib
import re
import shutil
import socket
import subprocess
import time

LIMIT_S = 60
EOF_ERROR, NO_DATA, TCP_ERROR, TLS_ERROR = -1, 14, 28, 30  # codes of calls; others are HTTP's

STUNNEL = """
foreground = yes
pid =
[zuv]
accept = 127.0.0.1:@port0@
connect = @zuv@
cert = @folder@/server.pem
"""


def command(name):
    """Path of a program that Debian may have put outside the PATH of users."""
    return shutil.which(name, path=os.environ["PATH"] + ":/usr/sbin:/sbin") or name


def free_port():
    with socket.create_server(("127.0.0.1", 0)) as listener:
        return listener.getsockname()[1]


def _answers(port):
    with contextlib.suppress(OSError), socket.create_connection(("127.0.0.1", port), timeout=1):
        return True
    return False


def _started(arguments, ports, log, options):
    """The program once all its ports take connections; None if it has ended before."""
    process = subprocess.Popen(arguments, stdin=subprocess.DEVNULL, stdout=log, stderr=log, **options)
    began = time.monotonic()
    for port in ports:
        while not _answers(port):
            if process.poll() is not None or time.monotonic() - began > LIMIT_S:
                process.kill()
                process.wait()
                return None
            time.sleep(0.02)
    return process


@contextlib.contextmanager
def server(folder, name, arguments, configuration, count=1, **options):
    """Runs a server that has to be given its ports; gives them. The words @folder@, @port0@, ... of the configuration,
    and of the arguments @file@, are filled in. A port that another program was quicker to take costs another try."""
    file, log_file = os.path.join(folder, name + ".conf"), os.path.join(folder, name + ".log")
    for _ in range(5):
        ports = [free_port() for _ in range(count)]
        text = filled(configuration, {"folder": folder, **{"port%d" % number: str(port) for number, port in enumerate(ports)}})
        pathlib.Path(file).write_text(text, "utf-8")
        with open(log_file, "w", encoding="utf-8") as log:
            process = _started([argument.replace("@file@", file) for argument in arguments], ports, log, options)
        if process:
            break
    else:
        raise RuntimeError("%s did not start: %s" % (name, pathlib.Path(log_file).read_text("utf-8")))
    try:
        yield ports
    finally:
        process.terminate()
        try:
            process.wait(LIMIT_S)
        except subprocess.TimeoutExpired:
            process.kill()
            process.wait()


def filled(text, words):
    """The text with its words in @ filled in."""
    for word, value in words.items():
        text = text.replace("@%s@" % word, value)
    return text


def stunnel(folder, address):
    """stunnel before a service without TLS, with the certificate in the folder; gives its port as a list."""
    return server(folder, "stunnel", [command("stunnel4"), "@file@"], filled(STUNNEL, {"zuv": address.removeprefix("http://")}))


def password_file(path):
    """Makes a file of passwords as web servers read it: that of Aladdin is "sesame"."""
    made = subprocess.run(["openssl", "passwd", "-apr1", "-salt", "x", "sesame"], check=True, capture_output=True,
                          text=True)
    pathlib.Path(path).write_text("Aladdin:" + made.stdout, "utf-8")


def _openssl(*arguments):
    subprocess.run(["openssl", *arguments], check=True, capture_output=True)


def certificates(folder):
    """Files in the folder: ca.pem; for localhost and 127.0.0.1 server.crt, server.key and both as server.pem; the same
    for a client."""
    key = ["-newkey", "ec", "-pkeyopt", "ec_paramgen_curve:P-256", "-nodes", "-days", "2"]
    path = lambda name: os.path.join(folder, name)
    _openssl("req", "-x509", *key, "-subj", "/CN=authority", "-keyout", path("ca.key"), "-out", path("ca.pem"))
    for name, subject, names in (("server", "localhost", "DNS:localhost,IP:127.0.0.1"), ("client", "client", "DNS:client")):
        _openssl("req", "-x509", *key, "-subj", "/CN=" + subject, "-addext", "subjectAltName=" + names,
                 "-addext", "basicConstraints=critical,CA:FALSE", "-CA", path("ca.pem"), "-CAkey", path("ca.key"),
                 "-keyout", path(name + ".key"), "-out", path(name + ".crt"))
        both = (pathlib.Path(path(name + part)).read_text("utf-8") for part in (".crt", ".key"))
        pathlib.Path(path(name + ".pem")).write_text("".join(both), "utf-8")
    return folder


def words(options):
    """Options of call_client, several of which may be one text."""
    return " ".join(map(str, options)).split()


class Call:
    """What came of a call."""

    def __init__(self, line):
        found = re.match(r"code=(-?\d+) ms=(\d+) connection=(\d+) fault=(.*)$", line)
        if not found:
            raise AssertionError("not the outcome of a call: %r" % line)
        self.code, self.ms, self.connection = (int(found[number]) for number in (1, 2, 3))
        self.fault = found[4]


class Caller:
    """Runs call_client and holds its calls against what is expected; prints a line for each run."""

    def __init__(self, program):
        self.program = program

    def run(self, rule, endpoint, *options, codes, connections=None, least_ms=0, most_ms=20000, before=()):
        """`codes`: one for all calls, a list, or a set of which each call has one. Gives the calls."""
        run = subprocess.run([*before, self.program, endpoint, *words(options)], capture_output=True, text=True, timeout=LIMIT_S)
        what = (rule, run.stdout, run.stderr)
        assert run.returncode == 0 and "descriptors left: 0\n" in run.stdout, what
        calls = [Call(line) for line in run.stdout.splitlines() if line.startswith("code=")]
        longest = max(call.ms for call in calls)
        print("%-44s %3d calls  codes %-12s %d connections %6d ms" % (
            rule, len(calls), " ".join(str(code) for code in dict.fromkeys(call.code for call in calls)),
            calls[-1].connection, longest), flush=True)
        found = [call.code for call in calls]
        if isinstance(codes, set):
            assert set(found) <= codes, what
        else:
            assert found == (codes if isinstance(codes, list) else [codes] * len(found)), what
        assert connections is None or calls[-1].connection == connections, what
        assert least_ms <= longest <= most_ms, what
        return calls

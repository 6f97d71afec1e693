"""Runs zuv for the tests, and peers that play a script. Programs and places come from the environment (cmake/cli.cmake)."""
import contextlib
import os
import re
import socket
import ssl
import subprocess
import threading

import zuv_service  # the reference service, as the interoperability tests start it

SOURCE = os.environ["ZUV_SOURCE_DIR"]
PROGRAM, SERVICE = os.environ["ZUV_PROGRAM"], os.environ["ZUV_SERVICE_PROGRAM"]
COMMON = "http://www.zuv.example/xmlns/b2b/zuv/v1.0"
PROFILE = COMMON + "/Profile"
LIMIT_S = 120


def run(*arguments, given=None, env=None, text=True, cwd=None):
    """The finished zuv: returncode, stdout, stderr."""
    clean = {name: value for name, value in os.environ.items() if not name.startswith("ZUV_")}
    return subprocess.run([PROGRAM, *arguments], input=given, capture_output=True, text=text, timeout=LIMIT_S, cwd=cwd,
                          env={**clean, "XDG_CONFIG_HOME": os.devnull, **(env or {})})


def envelope(body, version=1):
    uri = {1: "http://schemas.xmlsoap.org/soap/envelope/", 2: "http://www.w3.org/2003/05/soap-envelope", 3: "urn:later"}[version]
    return ('<?xml version="1.0" encoding="UTF-8"?><E:Envelope xmlns:E="%s" xmlns:c="%s" xmlns:p="%s"><E:Body>%s</E:Body>'
            '</E:Envelope>' % (uri, COMMON, PROFILE, body))


def answer(body, status="200 OK", headers=()):
    """The bytes of an HTTP response that ends the connection."""
    body = body if isinstance(body, bytes) else body.encode()
    lines = ["HTTP/1.1 " + status, "Connection: close", "Content-Length: %d" % len(body), *headers]
    if not any(line.startswith("Content-Type") for line in headers):
        lines.append("Content-Type: text/xml; charset=utf-8")
    return "\r\n".join(lines).encode() + b"\r\n\r\n" + body


def _read_request(connection):
    request, chunked, length = b"", False, None
    while not (request.endswith(b"\r\n0\r\n\r\n") if chunked else len(request) == length):
        part = connection.recv(65536)
        if not part:
            break
        request += part
        head, end, _ = request.partition(b"\r\n\r\n")
        chunked = b"\r\nTransfer-Encoding: chunked" in head
        size = re.search(rb"\r\nContent-Length: (\d+)", head)
        length = len(head + end) + (int(size[1]) if size else 0) if end else None
    return request


@contextlib.contextmanager
def peer(*answers, certificate=None):
    """A server that gives these answers, a connection each: gives its address and the list that takes the requests."""
    listener = socket.create_server(("127.0.0.1", 0))
    listener.settimeout(LIMIT_S)
    requests = []
    context = None
    if certificate:
        context = ssl.SSLContext(ssl.PROTOCOL_TLS_SERVER)
        context.load_cert_chain(certificate)

    def play():
        for one in answers:
            try:
                connection, _ = listener.accept()
            except OSError:
                return
            with contextlib.suppress(OSError):
                connection.settimeout(LIMIT_S)
                if context:
                    connection = context.wrap_socket(connection, server_side=True)
                requests.append(_read_request(connection))
                connection.sendall(one)
            connection.close()

    thread = threading.Thread(target=play)
    thread.start()
    try:
        yield "%s://127.0.0.1:%d" % ("https" if certificate else "http", listener.getsockname()[1]), requests
    finally:
        listener.shutdown(socket.SHUT_RDWR)
        listener.close()
        thread.join(LIMIT_S)


def service(*options, **how):
    return zuv_service.running(SERVICE, *options, **how)

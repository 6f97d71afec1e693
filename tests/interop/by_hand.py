"""Messages to zuv-service written by hand, and connections that carry them byte by byte."""
import re
import socket

import messages

LIMIT_S = 60  # longest silence that a test waits through
SOAP_URI = {1: "http://schemas.xmlsoap.org/soap/envelope/", 2: "http://www.w3.org/2003/05/soap-envelope"}
# Prefixes in messages: E the envelope's, c of the common namespace, f of the port's filters, the default namespace is the
# port's own. Those of other ports, where one is called through another: r, rf, u, uf.
PREFIXES = {"xsi": "http://www.w3.org/2001/XMLSchema-instance", "c": messages.COMMON,
            "r": messages.namespace("ProblemReport"), "rf": messages.namespace("ProblemReport/Filter"),
            "u": messages.namespace("UpdateOrder"), "uf": messages.namespace("UpdateOrder/Filter")}


def envelope(port, body, header="", version=1):
    uris = {**PREFIXES, "E": SOAP_URI[version], "f": messages.namespace(port + "/Filter")}
    declared = "".join(' xmlns:%s="%s"' % row for row in uris.items())
    block = "<E:Header><c:header>%s</c:header></E:Header>" % header if header else ""
    return '<E:Envelope%s xmlns="%s">%s<E:Body>%s</E:Body></E:Envelope>' % (declared, messages.namespace(port), block, body)


def request(operation, content=""):
    return "<%sRequest>%s</%sRequest>" % (operation, content, operation)


def target(uri):
    """What a header names a document by."""
    return "<c:targetURI>%s</c:targetURI>" % uri


def post(port, body, *headers, version="1.1", kind="text/xml"):
    """The bytes of a POST to a port."""
    body = body if isinstance(body, bytes) else body.encode()
    lines = ["POST %s HTTP/%s" % (messages.service_path(port), version), "Host: localhost", "Content-Type: " + kind,
             "Content-Length: %d" % len(body), *headers]
    return "\r\n".join(lines).encode() + b"\r\n\r\n" + body


class Answer:
    """An answer to a request; its status is 0 if the connection ended without one."""

    def __init__(self, head, body):
        self.head, self.body = head, body
        start = re.match(rb"HTTP/1\.\d (\d{3})", head)
        self.status = int(start[1]) if start else 0

    def __contains__(self, text):
        return (text if isinstance(text, bytes) else text.encode()) in self.head + self.body

    def __repr__(self):
        return (self.head + self.body[:3000]).decode(errors="replace")

    def all(self, name):
        """The texts of the elements of a local name, in order."""
        return [text.decode() for text in re.findall(rb"<(?:[\w.-]+:)?%s(?: [^>]*)?(?:/>|>([^<]*))" % name.encode(), self.body)]

    def first(self, name):
        """The text of the first of them; None if there is none."""
        return next(iter(self.all(name)), None)


class Connection:
    """One connection to a service, http://HOST:PORT."""

    def __init__(self, address):
        host, _, port = address.removeprefix("http://").rpartition(":")
        self.socket = socket.create_connection((host, int(port)), timeout=LIMIT_S)
        self.received = b""

    def __enter__(self):
        return self

    def __exit__(self, *_):
        self.socket.close()

    def send(self, data):
        """Gives up where the peer closes before it has taken all of it."""
        try:
            self.socket.sendall(data if isinstance(data, bytes) else data.encode())
        except ConnectionError:
            pass
        return self

    def end_sending(self):
        try:
            self.socket.shutdown(socket.SHUT_WR)
        except OSError:
            pass  # the peer has closed before
        return self

    def _fill(self):
        try:
            data = self.socket.recv(1 << 16)
        except ConnectionError:
            return False
        self.received += data
        return bool(data)

    def _take(self, length):
        while len(self.received) < length and self._fill():
            pass
        taken, self.received = self.received[:length], self.received[length:]
        return taken

    def _take_to(self, end):
        while end not in self.received and self._fill():
            pass
        at = self.received.find(end)
        return self._take(len(self.received) if at < 0 else at + len(end))

    def receive(self):
        """The next answer on the connection; interim ones (100) are answers too."""
        head = self._take_to(b"\r\n\r\n")
        if b"\r\nTransfer-Encoding: chunked" not in head:
            length = re.search(rb"\r\nContent-Length: (\d+)", head)
            return Answer(head, self._take(int(length[1])) if length else b"")
        body = b""
        while True:
            size = int(self._take_to(b"\r\n") or b"0", 16)
            body += self._take(size)
            self._take(2)
            if size == 0:
                return Answer(head, body)

    def ended(self):
        """Whether the peer closes without sending anything more."""
        return not self.received and not self._fill()


def exchange(address, data):
    """The answer to these bytes, sent over a connection of their own."""
    with Connection(address) as connection:
        return connection.send(data).receive()


def call(address, port, operation, content="", header="", version=1):
    """The answer to an operation of a port."""
    return exchange(address, post(port, envelope(port, request(operation, content), header, version)))

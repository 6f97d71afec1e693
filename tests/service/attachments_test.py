"""Data that travels in the same message as a document that refers to it: kept as files, given back, forgotten."""
import base64
import json
import os
import pathlib
import random
import shutil
import signal
import tempfile
import textwrap
import unittest

import zuv
from by_hand import Connection, envelope, exchange, post, request, target

BYTES = random.Random(4).choices([b"\r", b"\n", b"-", b"=", b"x", b"\0", b"\xff", b"y"], k=100001)


def some_bytes(size):
    return b"".join(BYTES * (size // len(BYTES) + 1))[:size]


def part(name, data, encoding=""):
    """A part of a MIME message, after its delimiter."""
    how = "Content-Transfer-Encoding: %s\r\n" % encoding if encoding else ""
    return b"\r\n--edge\r\nContent-ID: <%s>\r\n%s\r\n%s" % (name.encode(), how.encode(), data)


def mime_post(message, parts=(), before=()):
    """A message to ProblemReport with MIME parts as other toolkits write them; `before` are put before the message itself."""
    root = b"\r\n--edge\r\nContent-Type: text/xml\r\nContent-ID: <root>\r\n\r\n" + message.encode()
    return post("ProblemReport", b"".join([*before, root, *parts, b"\r\n--edge--\r\n"]),
                kind='multipart/related; boundary=edge; type="text/xml"; start="<root>"')


def report(*references):
    """A problem report with an attachment for each reference."""
    return envelope("ProblemReport", request("submit", "".join(
        "<c:attachment><c:dataHandler>%s</c:dataHandler></c:attachment>" % reference for reference in references)))


def about(uri, operation, content=""):
    return envelope("ProblemReport", request(operation, content), target(uri))


def addition(uri, reference):
    return about(uri, "attach", "<attachment><c:dataHandler>%s</c:dataHandler></attachment>" % reference)


class attachments(unittest.TestCase):
    def setUp(self):
        self.folder = self.enterContext(tempfile.TemporaryDirectory())
        self.database = os.path.join(self.folder, "documents.db")

    def kept(self):
        """Names of the files of data; what arrives and is not wanted is gone only after the answer."""
        return [name for name in os.listdir(self.database + "-data") if not name.startswith("arriving-")]

    def content(self, name):
        return pathlib.Path(self.folder, name).read_bytes()

    def test_they_come_back_as_they_were_in_every_form(self):
        data = {"large": some_bytes(300001), "small": b"in memory"}
        for name, content in data.items():
            pathlib.Path(self.folder, name).write_bytes(content)
        inner = "<c:attachment><c:dataHandler>cid:small</c:dataHandler></c:attachment>"  # attachments may hold attachments
        document = ('<s:createRequest xmlns:s="%s/StatusReport" xmlns:c="%s"><c:attachment>%s<c:dataHandler>cid:la%%72ge'
                    "</c:dataHandler></c:attachment></s:createRequest>" % (zuv.COMMON, zuv.COMMON, inner))
        with zuv.service("--database", self.database) as address:
            def call(operation, *arguments, given=None):
                run = zuv.run("statusreport", operation, *arguments, "-e", address, given=given, cwd=self.folder)
                self.assertEqual(run.returncode, 0, run.stderr)
                return run
            for form in (form + more for form in (["--dime"], ["--mime"], ["--mtom"]) for more in ([], ["--chunked"])):
                with self.subTest(form=form):
                    run = call("create", "-", "--attach", "large,id=large", "--attach", "small,id=small", "--json", *form,
                               given=document)
                    self.assertNotIn("came along", run.stderr, "the client has it")
                    created = json.loads(run.stdout)
                    held = created["attachment"][0]
                    self.assertEqual((held["size"], held["state"]), ("300001", "complete"))
                    uri, place = created["thisURI"][0], held["dataPort"][0]["dataURI"]
                    self.assertEqual(len(self.kept()), 2)
                    self.assertEqual(self.content("documents.db-data/" + place.rpartition("/")[2]), data["large"])

                    # Whole messages one after the other on one connection, so nothing of an attachment is left over.
                    shutil.rmtree(os.path.join(self.folder, "back"), ignore_errors=True)
                    call("get", "-t", uri, "--keep-alive", "--repeat", "2", "--save-attachments", "back", *form)
                    back = sorted(os.listdir(os.path.join(self.folder, "back")))
                    self.assertEqual({self.content("back/" + name) for name in back}, set(data.values()))
                    got = exchange(address, "GET %s HTTP/1.1\r\n\r\n" % place.removeprefix(address))
                    self.assertEqual(got.body, data["large"], "those who don't ask in such a form have the data port")

                    # What a new version of the report no longer refers to is forgotten, what it refers to stays.
                    small = held["attachment"][0]["dataPort"][0]["dataURI"]
                    shorter = ('<s:submitRequest xmlns:s="%s/StatusReport" xmlns:c="%s"><c:attachment><c:dataPort><c:dataURI>%s'
                               "</c:dataURI></c:dataPort></c:attachment></s:submitRequest>" % (zuv.COMMON, zuv.COMMON, small))
                    call("submit", "-", "-t", uri, given=shorter)
                    self.assertEqual(self.kept(), [small.rpartition("/")[2]])
                    call("remove", "-t", uri)
                    self.assertEqual(self.kept(), [])

    def test_problem_reports_have_them_too(self):
        data = b"first line\r\n-- edge\r\n--edg"
        with zuv.service() as address:
            answer = exchange(address, mime_post(report("cid:dump@machine"),
                                                 [part("unwanted", b"nobody refers to it"), part("dump@machine", data)]))
            self.assertEqual(answer.status, 200, answer)
            uri = answer.first("thisURI")

            def got():
                return exchange(address, mime_post(about(uri, "get")))
            answer = got()
            self.assertIn("multipart/related", answer)
            name = answer.first("dataHandler").removeprefix("cid:").encode()
            self.assertIn(b"Content-ID: <%s>\r\n\r\n%s\r\n--" % (name, data), answer)
            self.assertNotIn("nobody refers to it", answer)

            answer = exchange(address, mime_post(addition(uri, "cid:log"), [part("log", b"more")]))
            self.assertEqual(answer.status, 200, answer)
            added = [one for one in answer.all("thisURI") if one.startswith("urn:zuv:attachment:")][-1]
            answer = exchange(address, mime_post(about(
                uri, "attachStatus", "<c:attachmentURI>%s</c:attachmentURI><c:intention>retry</c:intention>" % added)))
            self.assertIn("\r\n\r\nmore\r\n--", answer, "sent once more")
            self.assertNotIn("first line", answer, "the other one isn't")
            exchange(address, mime_post(addition(uri, "cid:none"), [part("none", b"")]))
            self.assertIn(">\r\n\r\n\r\n--", got(), "an empty one")
            answer = exchange(address, post("ProblemReport", about(uri, "get")))
            self.assertTrue("text/xml" in answer and "multipart" not in answer, answer)
            self.assertEqual(answer.all("dataHandler"), [], "a reference to nothing")

    def test_nothing_is_left_when_the_request_is_refused(self):
        message, one = report("cid:data"), part("data", some_bytes(50000))
        title = envelope("ProblemReport", request("submit", "<title>%s</title>" % (100000 * "x")))
        whole = mime_post(message, [one])
        with zuv.service("--database", self.database, "--max-attachments", "100000", "--max-body", "20000") as address:
            for rule, sent, status in (
                    ("nothing has the id", mime_post(message, [part("other", some_bytes(50000))]), 500),
                    ("too long", mime_post(message, [part("data", some_bytes(100001))]), 413),
                    ("too long together", mime_post(message, [one, part("x", some_bytes(60000))]), 413),
                    ("too many", mime_post(message, [part(str(number), b"x") for number in range(1001)]), 413),
                    ("two of one id", mime_post(message, [part("data", b"1"), part("data", b"2")]), 400),
                    ("nothing has the second id", mime_post(report("cid:data", "cid:other"), [one]), 500),
                    ("a document that is too long", mime_post(title, [part("data", b"1")]), 413),
                    ("cut at the end", whole[:-4], 400), ("cut in the middle", whole[:len(whole) // 2], 400)):
                with self.subTest(rule), Connection(address) as peer:
                    self.assertEqual(peer.send(sent).end_sending().receive().status, status)
                    self.assertTrue(peer.ended())
                    self.assertEqual(os.listdir(self.database + "-data"), [])
            self.assertEqual(exchange(address, whole).status, 200, "the limits are those of refused ones")
            self.assertEqual(len(self.kept()), 1)

    def test_they_come_out_of_their_transfer_encoding(self):
        """Wherever the library leaves them: in files, in memory before the message, and as values of the message."""
        data = some_bytes(70000)
        escaped = b"=\r\n".join(b"".join(b"=%02X" % byte for byte in data[at:at + 24]) for at in range(0, len(data), 24))
        wrapped = "\r\n".join(textwrap.wrap(base64.b64encode(data).decode(), 76)).encode()
        value = envelope("ProblemReport", request(
            "submit", '<c:attachment><c:dataPort><c:hash href="cid:data"/></c:dataPort></c:attachment>'))
        with zuv.service("--database", self.database, "--max-body", "200000") as address:
            for encoding, sent, held in (
                    ("", b"as it is=20", b"as it is=20"), ("binary", b"as it is=20", b"as it is=20"),
                    ("uuencode", b"as it is=20", b"as it is=20"), ("base64", b"cGl4ZWxz", b"pixels"),
                    ("BASE64", b"\r\ncGl4\r\n ZWw=\t\r\n\r\n", b"pixel"), ("Base64", b"", b""), ("base64", wrapped, data),
                    ("quoted-printable", b"caf=C3=a9 =\r\nau lait \t\r\n=20end= ", b"caf\xc3\xa9 au lait\r\n end"),
                    ("Quoted-Printable", b"a\rb =0D\n c \r", b"a\rb \r\n c\r"), ("quoted-printable", escaped, data),
                    ("base64", b"cGl4ZWxz!", None), ("base64", b"cGl4ZWx", None), ("base64", b"cGl4ZWw=cGl4", None),
                    ("base64", b"cGl4-ZWxz", None), ("base64", 4096 * b" " + b"cGw=" + 5000 * b"\n" + b"cGl4", None),
                    ("quoted-printable", b"100 = 1", None), ("quoted-printable", b"=4", None), ("quoted-printable", b"=4x", None),
                    ("quoted-printable", b"=\rx", None), ("quoted-printable", 999 * b" ", None)):
                one = part("data", sent, encoding)
                for way, message in (("file", mime_post(report("cid:data"), [one])), ("value", mime_post(value, [one])),
                                     ("before", mime_post(report("cid:data"), before=[one]))):
                    with self.subTest(way=way, encoding=encoding, sent=sent[:60]):
                        answer = exchange(address, message)
                        self.assertEqual(answer.status, 400 if held is None else 200, answer)
                        if held is None:
                            self.assertIn(encoding, answer.first("faultstring"))
                            self.assertIn("Client.MalformedRequest", answer)
                        elif way == "value":
                            self.assertEqual(base64.b64decode(answer.first("hash")), held)
                        else:
                            self.assertEqual(answer.first("size"), str(len(held)))
                            self.assertEqual(self.content("documents.db-data/" + answer.first("dataURI").rpartition("/")[2]), held)
            # Bytes that stay in memory are bounded as the message is, however they are encoded.
            long = part("data", base64.b64encode(some_bytes(250000)), "base64")
            self.assertEqual(exchange(address, mime_post(report("cid:data"), before=[long])).status, 413)

    def test_they_are_kept_and_sent_once(self):
        """Many references to one thing are not many things, and many things are not many open files."""
        parts = [part("part-%d" % number, b"x") for number in range(120)]
        with zuv.service("--database", self.database) as address:
            for rule, references, status, kept, sent in (
                    ("one part, again and again", 120 * ["cid:part-7"], 200, 1, 1),
                    ("more parts than an answer may hold", ["cid:part-%d" % n for n in range(120)], 200, 120, 100),
                    ("too many references", 1001 * ["cid:part-7"], 500, 0, 0)):
                with self.subTest(rule):
                    before = len(self.kept())
                    answer = exchange(address, mime_post(report(*references), parts))
                    self.assertEqual((answer.status, len(self.kept()) - before), (status, kept), answer)
                    answer = exchange(address, mime_post(about(answer.first("thisURI"), "get")))
                    self.assertEqual(answer.body.count(b"\r\n\r\nx\r\n--"), sent)

    def test_they_outlive_the_process_that_kept_them(self):
        with zuv.service("--database", self.database, end_status=-signal.SIGKILL) as address:
            uri = exchange(address, mime_post(report("cid:data"), [part("data", b"kept")])).first("thisURI")
            address.process.kill()
        for name in "arriving-ABCDEF", "00000000-0000-4000-8000-000000000000":
            pathlib.Path(self.database + "-data", name).write_text("nobody's", "ascii")
        with zuv.service("--database", self.database) as address:
            self.assertEqual(len(os.listdir(self.database + "-data")), 1, "what an earlier end left over is removed")
            self.assertIn("\r\n\r\nkept\r\n--", exchange(address, mime_post(about(uri, "get"))))

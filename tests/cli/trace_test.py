"""zuv trace: what the library logs is made out again, hides secrets, and is harmless whatever it holds."""
import gzip
import os
import pathlib
import random
import re
import subprocess
import tempfile
import unittest
import zlib

from lxml import etree, html

import browser
import zuv

SECRETS = ("pass-1", "dG9rLTI=", "tok-3", "pass-4", "cookie-5", "query-6", "pass-7", "inner-8", "pem-9", "url-10", "sign-11", "head-12", "url-13", "shared-14")
CREDENTIALS = ('<c:Credentials xmlns:c="%s"><c:password>pass-1</c:password><c:key>dG9rLTI=</c:key><c:token>tok-3</c:token>'
               '</c:Credentials>' % zuv.COMMON)
HOSTILE = b"""</pre></details><script>document.title='owned'</script><img src=x onerror="document.title='owned'">\x1b[2J\xff"""


def compact(text):
    return re.sub(r"\s", "", text)


def got(size, version=1):
    body = random.Random(size).randbytes(size).hex()
    return zuv.envelope("<p:getResponse><p:thisURI>%s</p:thisURI></p:getResponse>" % body, version)


def chunks(body, size):
    return b"".join(b"%x\r\n%s\r\n" % (len(body[i:i + size]), body[i:i + size]) for i in range(0, len(body), size)) + b"0\r\n\r\n"


def chunked(body, *headers):
    head = ["HTTP/1.1 200 OK", "Transfer-Encoding: chunked", "Content-Type: text/xml", *headers]
    return "\r\n".join(head).encode() + b"\r\n\r\n" + chunks(body, 9000)


def bare_deflate(body):
    packer = zlib.compressobj(wbits=-15)
    return packer.compress(body) + packer.flush()


class trace(unittest.TestCase):
    def setUp(self):
        self.folder = self.enterContext(tempfile.TemporaryDirectory())
        self.log, self.page = (os.path.join(self.folder, name) for name in ("t.log", "t.html"))

    def made_page(self, *options):
        run = zuv.run("trace", self.log, "--html", self.page, *options)
        self.assertEqual((run.returncode, run.stderr), (0, ""))
        return html.parse(self.page, html.HTMLParser(encoding="utf-8")).getroot()

    def write(self, *parts):
        pathlib.Path(self.log).write_bytes(b"".join(parts))

    def test_every_form_of_framing_and_compression_is_undone(self):
        gzipped = "Content-Encoding: gzip"
        rows = []
        for size in (5, 70000, 400000):
            for make, *options in ((zuv.answer,), (lambda b: zuv.answer(gzip.compress(b), headers=[gzipped]), "--gzip"),
                                   (lambda b: chunked(zlib.compress(b), "Content-Encoding: deflate"), "--chunked", "--soap12"),
                                   (lambda b: chunked(gzip.compress(b), gzipped), "--gzip", "--chunked"),
                                   (chunked, "--keep-alive")):
                body = got(size, 2 if "--soap12" in options else 1)
                rows.append((body, make(body.encode()), options))
        for _, answer, options in rows:
            with zuv.peer(answer) as (address, _):
                zuv.run("profile", "get", "-e", address, "-t", "urn:one", "--trace", self.log, *options)
        with zuv.peer(zuv.answer(got(5))[:-50]) as (address, _):
            zuv.run("profile", "get", "-e", address, "--trace", self.log)
        table = zuv.run("trace", self.log).stdout.splitlines()
        self.assertEqual(len(table), len(rows) + 2)
        for line, (_, _, options) in zip(table[1:], rows):
            self.assertRegex(line, r"^ *\d+  get +200 +%s .* /zuv/v1.0/services/Profile$" % ("1.2" if "--soap12" in options else "1.1"))
        self.assertTrue(table[-1].endswith("incomplete"), table[-1])
        exchanges = self.made_page().xpath(".//details[starts-with(@class, 'exchange')]")
        self.assertEqual(len(exchanges), len(rows) + 1)
        for exchange, (body, _, options) in zip(exchanges, rows):
            request, answer = (pre.text_content() for pre in exchange.iterfind(".//pre"))
            self.assertIn("<protocol:targetURI>urn:one</protocol:targetURI>", request)
            shown = compact(re.sub(r"\d+ namespaces", "", answer))
            notes, sent = [p.text for p in exchange.iterfind(".//p[@class='note']")], compact(body)
            self.assertEqual([bool(re.match(r"and [\d.]+ kB more", note)) for note in notes], [True] * (len(body) > 400000))
            self.assertEqual(shown, sent[:len(shown)] if notes else sent)

    def test_secrets_are_not_shown_unless_asked_for(self):
        credentials = os.path.join(self.folder, "c.xml")
        pathlib.Path(credentials).write_text(CREDENTIALS)
        body = zuv.envelope('<p:getResponse><p:x><c:Password a="1">inner-8<c:b/></c:x>inner-8</c:Password></p:x>'
                            '<p:y userToken="pass-7" at="http://u:url-10@h/">-----BEGIN X-----pem-9-----END X-----</p:y>'
                            '<p:z>see https://h/d?a=1&amp;X-Amz-Signature=sign-11&amp;b=2 </p:z><p:token e:ref="#s"/></p:getResponse><p:shared e:id=\'s\'>shared-14</p:shared>')
        with zuv.peer(zuv.answer(body, headers=["Set-Cookie: cookie-5", "X-Auth-Token: head-12", "Via: ftp://u:url-13@h"])) as (address, _):
            zuv.run("profile", "get", "-e", address + "/at?token=query-6", "--credentials", credentials, "--user", "ada",
                    "--trace", self.log, env={"ZUV_PASSWORD": "pass-4"})
        logged = pathlib.Path(self.log).read_text()
        self.made_page()
        shown = pathlib.Path(self.page).read_text() + "".join(zuv.run("trace", self.log, *how).stdout for how in ([], ["--show", "1"]))
        self.made_page("--show-secrets")
        everything = pathlib.Path(self.page).read_text()
        for secret in SECRETS:
            secret = "YWRhOnBhc3MtNA==" if secret == "pass-4" else secret
            self.assertIn(secret, logged)
            self.assertNotIn(secret, shown)
            self.assertIn(secret, everything)
        for left in "Basic [not shown]", "a=1&amp;X-Amz-Signature=[not shown]&amp;b=2", "http://[not shown]@h/", ">[not shown]<":
            self.assertIn(left, shown)

    def test_attachments_are_named_by_type_and_size(self):
        data = os.path.join(self.folder, "d.bin")
        pathlib.Path(data).write_bytes(b"\r\nHTTP/1.1 200 OK\r\n\r\n" * 50)  # what looks like a message is none
        with zuv.peer(zuv.answer(got(5))) as (address, _):
            zuv.run("profile", "get", "-e", address, "--attach", data + ",type=image/png,id=pic", "--trace", self.log)
        exchange, = self.made_page().xpath(".//details[starts-with(@class, 'exchange')]")
        self.assertEqual([p.text for p in exchange.iterfind(".//p[@class='part']")][1], "attachment d.bin: image/png, <pic>, 1.1 kB")
        self.assertEqual([p.text for p in exchange.iterfind(".//p[@class='note']")], ["Not shown"])
        with zuv.peer(zuv.answer(got(5))) as (address, _):
            zuv.run("profile", "get", "-e", address, "--attach", data + ",type=image/png,id=pic", "--dime", "--trace", self.log)
        self.assertIn("\nattachment: image/png, pic, 1.1 kB, not shown\n", zuv.run("trace", self.log, "--show", "2").stdout)

    def test_answers_go_to_the_requests_that_wait_for_them(self):
        def request(operation):
            body = zuv.envelope("<p:%sRequest/>" % operation).encode()
            return b"POST /%s HTTP/1.1\r\nContent-Length: %d\r\n\r\n%s" % (operation.encode(), len(body), body)

        def answer(operation):
            return zuv.answer(zuv.envelope("<p:%sResponse/>" % operation))
        busy = zuv.answer("", "503 Busy")
        rows = (  # what the file holds; operation, status and doubt of each exchange
            ((request("get"), request("set"), answer("get"), answer("set")), ("get 200", "set 200")),
            ((request("get"), request("get"), answer("get"), answer("get")), ("get 200 several requests waited",) * 2),
            ((request("get"), request("set"), busy, answer("get")), ("get 200", "set 503 several requests waited")),
            ((answer("get"), request("get"), answer("get")), ("unknown 200 request isn't known", "get 200")),
            ((request("get"), *(request("set"), answer("set")) * 9, answer("get")),
             ("get none", *["set 200"] * 9, "unknown 200 request isn't known")),
        )
        for parts, expected in rows:
            with self.subTest(expected=expected):
                self.write(*parts)
                lines = zuv.run("trace", self.log).stdout.splitlines()[1:]
                self.assertEqual(len(lines), len(expected))
                for line, words in zip(lines, expected):
                    operation, status, *doubt = words.split(" ", 2)
                    self.assertRegex(line, r"^ *\d+  %s +%s .*%s" % (operation, status, doubt[0] if doubt else r"/\w+$"))
        self.write(request("get"), answer("get"), request("set"), busy)
        self.assertRegex(zuv.run("trace", self.log, "--failed").stdout, r"^#.*\n2  set +503 [^\n]*\n$")
        self.assertRegex(zuv.run("trace", self.log, "--show", "1").stdout, r"^exchange 1: get, 200(?s:.)*\n  <E:Body>\n    <p:getResponse/>\n")
        self.assertEqual(zuv.run("trace", self.log, "--show", "3").returncode, 2)

    def hostile_trace(self):
        post = b"POST /%s?x=%s HTTP/1.1\r\n%s: %s\r\nContent-Type: multipart/related; boundary=B\r\n\r\n" % ((HOSTILE.replace(b" ", b"_"),) * 2 + (HOSTILE,) * 2)
        parts = b"--B\r\nContent-ID: <%s>\r\nContent-Type: text/xml\r\n\r\n<a b=\"%s\" c='%s'>%s<![CDATA[%s]]><!--%s-->\r\n--B--" % ((HOSTILE,) * 6)
        fault = b"HTTP/1.1 500 %s\r\n\r\n<E><Body><Fault><faultstring>a ]]>&lt;<![CDATA[%s]]></faultstring>" % (HOSTILE, HOSTILE)
        return post + parts + fault

    def test_times_are_those_of_the_file_beside_the_trace(self):
        with zuv.peer(zuv.answer(got(10).encode())) as (address, _):
            zuv.run("profile", "get", "-e", address, "-t", "urn:one", "--trace", self.log, "--trace-times")
        number, shown = r"\d+\.\d ms", zuv.run("trace", self.log, "--show", "1").stdout
        self.assertRegex(shown, r"began 20\d\d-\d\d-\d\dT[\d:]{8}\.\d{3}Z, last byte after %s\nanswer after %s\n" % (number, number))
        self.assertRegex(zuv.run("trace", self.log).stdout, r"began +took +target\n1 .*Z +%s  /" % number)
        self.assertRegex(etree.tostring(self.made_page()).decode(), r"<time>20[^<]*Z</time> %s " % number)
        with open(self.log + ".times", "wb") as file: # lines that say nothing, or of an impossible time, and an answer before its request
            file.write(b"0 1700000000000000 r\n\xff 1 s\n0 9999999999999999999 s\n0 -5 s\n7 s\n1700000000 0 s\n0 1700000000250000 s\n0 17")
        self.assertIn("began 2023-11-14T22:13:20.250Z, last byte after 0.0 ms\nanswer after -250.0 ms\n", zuv.run("trace", self.log, "--show", "1").stdout)

    def test_hostile_content_stays_text(self):
        self.write(self.hostile_trace())
        page = self.made_page()
        self.assertEqual([e.tag for e in page.iter("script", "img", "iframe", "object", "link")], ["script"])  # the page's own
        self.assertIn("<script>document.title='owned'</script>", page.text_content())
        table = zuv.run("trace", self.log, text=False)
        self.assertEqual(table.returncode, 0)
        for byte in b"\x1b", b"\xff":
            self.assertNotIn(byte, table.stdout)
            self.assertNotIn(byte, pathlib.Path(self.page).read_bytes())
        browser.need(self)
        dom = browser.dom(self.page)
        self.assertNotIn("owned</title>", dom)
        self.assertEqual(dom.count('<details class="exchange failed"'), 1)

    def test_a_page_opens_in_a_browser(self):
        browser.need(self)
        with zuv.peer(zuv.answer(got(5)), zuv.answer("", "503 Busy")) as (address, _):
            for _ in range(2):
                zuv.run("profile", "get", "-e", address, "--trace", self.log)
        self.made_page()
        dom = html.document_fromstring(browser.dom(self.page))
        self.assertEqual([e.text for e in dom.iterfind(".//span[@class='operation']")], ["get", "get"])
        self.assertEqual([e.text for e in dom.xpath("//span[starts-with(@class,'badge')]")], ["200", "503"])
        for dark in (True, False):
            for width, needed, ink, paper in browser.measured(self.page, dark):
                with self.subTest(dark=dark, width=width):
                    self.assertLessEqual(needed, width)
                    self.assertLess(*((paper, 0.05) if dark else (0.8, paper)))
                    self.assertGreater((max(ink, paper) + 0.05) / (min(ink, paper) + 0.05), 7, "contrast")

    def test_any_bytes_are_a_trace(self):
        dice = random.Random(4)
        seeds = [self.hostile_trace(), b"POST / HTTP/1.1\r\nContent-Length: 4\r\n\r\n<a/>" + zuv.answer(got(200)),
                 chunked(gzip.compress(got(300).encode()), "Content-Encoding: gzip"), chunked(bare_deflate(b"<a/>" * 99), "Content-Encoding: deflate")]
        for _ in range(80):
            bytes_ = bytearray(b"".join(dice.choices(seeds, k=3)))
            for _ in range(dice.randrange(1, 20)):
                at = dice.randrange(len(bytes_))
                bytes_[at:at + dice.randrange(3)] = dice.choice((b"<", b">", b'"', b"\r\n", b"\0", b"HTTP/1.1 200", b"POST ", b"9", b"0"))
            run = zuv.run("trace", "-", "--html", "-", given=bytes(bytes_), text=False)
            self.assertEqual((run.returncode, run.stderr), (0, b""), bytes_)
            self.assertEqual(run.stdout.count(b"<script"), 1)
        for bytes_ in (b"", b"\0" * 100, b"HTTP/1.1", b" HTTP/1.1" * 300000, b"<a " * 1000000, b"POST / HTTP/1.1\r\n" * 100000,
                       chunked(gzip.compress(b"\0" * (300 << 20)), "Content-Encoding: gzip")):
            self.assertEqual(zuv.run("trace", "-", given=bytes_, text=False).returncode, 0)
        self.assertEqual(zuv.run("trace", os.path.join(self.folder, "none")).returncode, 11)
        self.write(seeds[1] * 20000)
        with subprocess.Popen([zuv.PROGRAM, "trace", self.log, "--html", "-"], stdout=subprocess.PIPE, stderr=subprocess.PIPE) as running:
            running.stdout.readline()  # it waits for a reader of the rest
            os.truncate(self.log, 0)
            self.assertIn(b"became shorter", running.communicate()[1])
        self.assertEqual(running.returncode, 11)

"""Calls from the command line: every operation, the options, what comes back, and how failures are reported."""
import base64
import email
import email.policy
import glob
import gzip
import json
import os
import pathlib
import random
import re
import signal
import socket
import subprocess
import tempfile
import unittest

from lxml import etree

import zuv

PROFILE_XML = """<p:ProfileContent xmlns:p="%s" xmlns:c="%s">
  <c:identity><c:type>organization</c:type><c:name>Zo\u00eb &amp; \u4e16</c:name></c:identity>
  <c:contact><c:name>one</c:name></c:contact>
</p:ProfileContent>""" % (zuv.PROFILE, zuv.COMMON)
GOT = zuv.envelope("<p:getResponse><p:thisURI>urn:1</p:thisURI></p:getResponse>")
PATH = "/zuv/v1.0/services/Profile"


class calls(unittest.TestCase):
    def setUp(self):
        self.folder = self.enterContext(tempfile.TemporaryDirectory())

    def file(self, name, content):
        path = os.path.join(self.folder, name)
        pathlib.Path(path).write_bytes(content if isinstance(content, bytes) else content.encode())
        return path

    def expect(self, run, code, *parts):
        self.assertEqual(run.returncode, code, (run.stdout, run.stderr))
        for part in parts:
            self.assertIn(part, run.stdout + run.stderr)
        return run

    def test_every_operation_of_the_contract_is_a_command(self):
        wsdl = "{http://schemas.xmlsoap.org/wsdl/}"
        operations = 0
        for path in glob.glob(os.path.join(zuv.SOURCE, "schema", "*", "*.wsdl")):
            port = os.path.basename(path)[:-5].lower()
            listed = zuv.run(port, "--help").stdout
            for operation in etree.parse(path).iterfind(wsdl + "portType/" + wsdl + "operation"):
                name = operation.get("name")
                summary = " ".join(operation.findtext(wsdl + "documentation").split()).split(". ")[0].rstrip(".")
                self.assertRegex(listed, r"(?m)^  %s +%s" % (name, re.escape(summary[:40])))
                self.assertEqual(zuv.run(port, name, "--help").returncode, 0)
                operations += 1
        self.assertEqual(operations, 30)

    def test_an_answer_is_the_same_however_it_was_asked_for(self):
        request = self.file("p.xml", PROFILE_XML)
        with zuv.service() as address:
            env = {"ZUV_ENDPOINT": address}
            created = self.expect(zuv.run("profile", "create", "-", given=PROFILE_XML, env=env), 0)
            uri = re.search("urn:[^<]*", created.stdout)[0]
            first = json.loads(zuv.run("profile", "get", "-t", uri, "--json", env=env).stdout)
            self.assertEqual(first["identity"], {"type": "organization", "name": "Zo\u00eb & \u4e16"})
            self.assertEqual((first["thisURI"], first["contact"]), ([uri], [{"name": "one"}]))
            for options in ("", "--soap12", "--gzip", "--chunked", "--chunked --gzip --soap12", "--keep-alive --repeat 5"):
                with self.subTest(options=options):
                    run = zuv.run("profile", "set", request, "-t", uri, "--json", *options.split(), env=env)
                    self.expect(run, 0)
                    self.assertEqual(json.loads(run.stdout)["identity"], first["identity"])
                    self.assertEqual("5 calls in" in run.stderr, "repeat" in options)
            held = self.file("held.xml", zuv.run("profile", "get", "-t", uri, env=env).stdout)
            self.expect(zuv.run("profile", "set", held, "-t", uri, env=env), 0)  # an answer serves as a request
            changed = json.dumps({**first, "identity": {"name": "Ada <&>"}})
            run = self.expect(zuv.run("profile", "set", "-", "-t", uri, "--json", given=changed, env=env), 0)
            self.assertEqual(json.loads(run.stdout)["identity"], {"name": "Ada <&>"})
            self.expect(zuv.run("profile", "get", "-t", uri, "-e", "http://127.0.0.1:1", "-e", address), 0)

    def test_ports_without_a_proxy_class_are_called_the_same_way(self):
        self.expect(zuv.run("problemreport", "get"), 2, "no usual address")
        with zuv.service() as address:
            for options in ([], ["--soap12", "--chunked"]):
                run = zuv.run("problemreport", "submit", "--json", "-e", address, *options)
                report = json.loads(self.expect(run, 0).stdout)
                self.assertEqual(report["answer"][0]["@type"],
                                 "protocolProblemReport:Answer.Server.Administration.Acknowledgment")
                self.expect(zuv.run("problemreport", "get", "-t", report["thisURI"][0], "-e", address), 0)
                self.expect(zuv.run("problemreport", "get", "-t", "urn:no", "-e", address, *options), 8, "Client.ObjectNotFound",
                            "uri: urn:no", "try       check the URI")

    def test_what_the_options_ask_for_is_on_the_wire(self):
        credentials = self.file("c.xml", '<c:Credentials xmlns:c="%s"><c:token>t0k</c:token></c:Credentials>' % zuv.COMMON)
        header = self.file("h.xml", '<c:Header xmlns:c="%s"><c:note>first</c:note></c:Header>' % zuv.COMMON)
        with zuv.peer(zuv.answer(zuv.envelope("<p:getResponse/>", 2))) as (address, requests):
            run = zuv.run("profile", "get", "-e", address, "-t", "urn:1", "--transaction", "T", "--sequence", "2", "--correlation",
                          "C", "--priority", "7", "--note", "second", "-", "--credentials", credentials, "--header", header, "--user",
                          "ada", "--soap12", "--action", "urn:go",
                          given='<p:getRequest xmlns:p="%s"/>' % zuv.PROFILE, env={"ZUV_PASSWORD": "s3cret"})
            self.expect(run, 0)
        head, _, body = requests[0].decode().partition("\r\n\r\n")
        for line in ("POST %s HTTP/1.1" % PATH, "Authorization: Basic YWRhOnMzY3JldA==", 'SOAPAction: "urn:go"',
                     "Content-Type: application/soap+xml"):
            self.assertIn(line, head)
        block = etree.fromstring(body.encode()).find("{*}Header/{%s}header" % zuv.COMMON)
        self.assertEqual([(etree.QName(e).localname, "".join(e.itertext())) for e in block],
                         [("targetURI", "urn:1"), ("credentials", "t0k"), ("transactionId", "T"), ("sequenceId", "2"),
                          ("correlationId", "C"), ("priority", "7"), ("note", "first"), ("note", "second")])
        with zuv.peer(zuv.answer(GOT)) as (address, requests):
            proxy = address[len("http://"):]
            self.expect(zuv.run("profile", "get", "-e", "http://there:9", "--proxy", proxy, "--proxy-user", "x", "--gzip"), 0)
        self.assertTrue(requests[0].startswith(b"POST http://there:9" + PATH.encode()), requests)
        self.assertIn(b"Proxy-Authorization: Basic ", requests[0])
        self.assertIn(b":Envelope", gzip.decompress(requests[0].partition(b"\r\n\r\n")[2]))

    def test_failures_are_told_by_code_and_words(self):
        fault = "<E:Fault><faultcode>%s</faultcode><faultstring>%s</faultstring>%s</E:Fault>"
        busy = "<detail><c:Server.ServiceUnavailable><c:description>down</c:description></c:Server.ServiceUnavailable></detail>"
        rows = (
            (8, zuv.answer(zuv.envelope(fault % ("E:Client", "no\x1b[31m \u202ered", "")), "500 Oops"), "what      no?[31m ?red"),
            (9, zuv.answer(zuv.envelope(fault % ("E:Server", "busy", busy)), "500 Oops"), "try again later"),
            (9, zuv.answer(zuv.envelope("<E:Fault><E:Code><E:Value>E:Receiver</E:Value></E:Code><E:Reason><E:Text>r</E:Text>"
                                        "</E:Reason></E:Fault>", 2), "500 Oops"), "SOAP-ENV:Receiver"),
            (10, zuv.answer(zuv.envelope(fault % ("E:MustUnderstand", "m", "")), "500 Oops"), "--soap12"),
            (10, zuv.answer(zuv.envelope(fault % ("c:Odd", "o", "")), "500 Oops"), "what      o"),
            (6, zuv.answer("", "401 Unauthorized"), "--user"),
            (6, zuv.answer("<html>gone</html>", "302 Found", ["Location: http://else/"]), "moved to  http://else/"),
            (6, zuv.answer("", "503 Service Unavailable"), "try again later"),
            (6, zuv.answer(zuv.envelope(fault % ("E:Client", "never heard", "")), "404 No"), "detail    never heard (E:Client)\n"),
            (6, zuv.answer("<html><title>Please log in</title><p>x</p></html>", "403 No"), "detail    Please log in\n"),
            (7, zuv.answer("<html>", headers=["Content-Type: text/html"]), "not a SOAP message: it is of type text/html"),
            (4, zuv.answer(GOT[:-40]), "before the end of its answer"),
            (7, zuv.answer(zuv.envelope("<p:getResponse/>", 3)), "--soap12"),
            (7, zuv.answer(zuv.envelope("<p:setResponse/>")), "tag name or namespace mismatch"),
            (7, zuv.answer(GOT).replace(b"Connection", b"Content-Encoding: gzip\r\nConnection"), "zuv trace"),
            (4, b"", "The peer closed the connection without an answer"),
        )
        for code, bytes_, words in rows:
            with self.subTest(answer=bytes_), zuv.peer(bytes_) as (address, _):
                run = self.expect(zuv.run("profile", "get", "-e", address), code, words, "zuv: profile get failed")
                self.assertEqual(run.stdout, "")
        deep = zuv.answer(zuv.envelope("<p:getResponse>%s</p:getResponse>" % ("<p:profile>" * 4000 + "</p:profile>" * 4000)))
        for options, code in ([], 0), (["--json"], 7):
            with zuv.peer(deep) as (address, _):
                self.expect(zuv.run("profile", "get", "-e", address, *options), code)
        with socket.create_server(("127.0.0.1", 0)) as silent:
            address = "http://127.0.0.1:%d" % silent.getsockname()[1]
            self.expect(zuv.run("profile", "get", "-v", "-e", address, "--silence-limit", "0.1"), 4, "(100000us receive delay)",
                        "* ended by --silence-limit\n")
        wrong = self.file("w.xml", PROFILE_XML.replace("organization", "nobody"))
        for code, words, arguments in (
                (4, "Connection refused", ["profile", "get", "-e", "http://127.0.0.1:1"]),
                (3, "w.xml:2:15: <c:type> should be one of system", ["profile", "set", wrong]),
                (3, "holds a protocolProfile:ProfileContent, not", ["updateorder", "submit", self.file("p.xml", PROFILE_XML)]),
                (11, "can't be opened", ["profile", "set", os.path.join(self.folder, "none.xml")]),
                (11, "can't be attached", ["profile", "set", "--attach", self.folder]),
                (5, "can't be set up", ["profile", "get", "--ca-file", wrong]),
                (4, "The HTTP proxy 127.0.0.1:1 can't be reached: Connection refused", ["profile", "get", "--proxy", "127.0.0.1:1", "-e", "http://x"]),
                (11, "--ca-file: /none: No such file", ["profile", "get", "--ca-file", "/none"]),
                (11, "--key-file: /none: No such file", ["data", "get", "--key-file", "/none", "http://x/"]),
                (2, "--endpoint", ["profile", "get", "-e", "ftp://x"]),
                (2, "--user", ["profile", "get", "-e", "http://u:p@x"]),
                (2, "excludes", ["statusreport", "get", "--mime", "--dime"]),
                (4, 'No call can go to "http://:9/', ["profile", "get", "-e", "http://:9"]),
                (4, 'No call can go to "https://x:65536/', ["problemreport", "get", "-e", "http://x", "-e", "https://x:65536"]),
                (4, 'No call can go to "http://x:0/"', ["data", "get", "http://x:0/"]),
                (2, '"profle"; did you mean "profile"?', ["profle", "get"]),
                (2, '"nothing"; there are create, ', ["profile", "nothing"]),
                (2, '"--endpont"; did you mean "--endpoint"?', ["profile", "get", "--endpont=x"]),
                (2, "--repeat", ["profile", "get", "--repeat", "0"]), (2, "a command is missing: inventoryreport, ", [])):
            with self.subTest(arguments=arguments):
                self.expect(zuv.run(*arguments), code, words)

    def certificate(self, name, subject):
        path = os.path.join(self.folder, name)
        subprocess.run(["openssl", "req", "-x509", "-newkey", "rsa:2048", "-nodes", "-days", "2", "-keyout", path + ".key",
                        "-out", path, "-subj", "/CN=x", "-addext", "subjectAltName=" + subject], check=True, capture_output=True)
        with open(path + ".key") as key, open(path, "a") as both:
            both.write(key.read())
        return path

    def test_ping_tells_what_is_there(self):
        with zuv.service() as address:
            self.expect(zuv.run("ping", env={"ZUV_ENDPOINT": address}), 0, "  connected to ", "\n  Profile          answers in ")
            noted, = json.loads(zuv.run("ping", "--json", "-e", address).stdout)
            self.assertEqual((noted["ok"], [port["answers"] for port in noted["ports"].values()]), (True, [True] * 5))
            self.expect(zuv.run("ping", "-e", address + "/elsewhere"), 6, "Profile          doesn't answer", "404")
        self.expect(zuv.run("ping", "-e", "http://127.0.0.1:1"), 4, "no connection to", "Connection refused")
        here = self.certificate("here.pem", "IP:127.0.0.1")
        for code, options, answers in (7, ["--ca-file", here], [False, False, True, False, False]), (5, [], [False]):
            with self.subTest(options=options), zuv.peer(*[zuv.answer(GOT)] * len(answers), certificate=here) as (address, _):
                noted, = json.loads(self.expect(zuv.run("ping", "--json", "-e", address, *options), code).stdout)
                shown = noted["certificate"]
                self.assertEqual((shown["subject"], shown["issuer"], "refused" in shown), ("CN=x", "CN=x", not options))
                self.assertEqual([port["answers"] for port in noted["ports"].values()], answers)

    def test_defaults_come_from_the_environment_and_a_file(self):
        def configure(text, mode=0o600):
            os.makedirs(os.path.join(self.folder, "zuv"), exist_ok=True)
            os.chmod(self.file("zuv/config", text), mode)
        env = {"XDG_CONFIG_HOME": self.folder}
        rows = (([], {}, "urn:file", b"ada:s3cret"), ([], {"ZUV_TARGET": "urn:env", "ZUV_PASSWORD": "other"}, "urn:env", b"ada:other"),
                (["-t", "urn:option", "--user", "eve"], {"ZUV_TARGET": "urn:env"}, "urn:option", b"eve:s3cret"))
        with zuv.peer(*[zuv.answer(GOT)] * len(rows)) as (address, requests):
            for (options, more, target, user), mode in zip(rows, (0o644, 0o600, 0o600)):
                configure('endpoint = %s\nuser = ada\npassword = "s3cret"\ntarget = urn:all\nsoap12 = true\n[profile.get]\nsoap12=false\n'
                          'target = urn:file\nnote = ["a", "b"]\n[data]\nuser = none\n' % address, mode)
                run = self.expect(zuv.run("profile", "get", *options, env={**env, **more}), 0)
                self.assertEqual(("others may read it" in run.stderr, "s3cret" in run.stderr), (mode == 0o644, False))
                self.assertIn(b"Authorization: Basic " + base64.b64encode(user) + b"\r\n", requests[-1])
                self.assertRegex(requests[-1].decode(), "text/xml(?s:.)*targetURI>%s<.*note>a<.*note>b<" % target)
        for text, words in (("endpiont = x", 'no option "endpiont"; did you mean "endpoint"?'), ("connect-limit = soon", "connect-limit"),
                            ("[profle]\nuser = x", "the section [profle]"), ('proxy = "u:s3cret@h:1"', "--proxy-user"),
                            ('endpoint = "http://u:s3cret@h"', "--user")):
            with self.subTest(text=text):
                configure(text)
                self.assertNotIn("s3cret", self.expect(zuv.run("profile", "get", env=env), 2, words).stderr)
        self.expect(zuv.run("profile", "get", env={"ZUV_SILENCE_LIMIT": "long"}), 2, "ZUV_SILENCE_LIMIT: ")

    def test_tls_names_must_match_unless_told_otherwise(self):
        here, other = self.certificate("here.pem", "IP:127.0.0.1"), self.certificate("other.pem", "DNS:elsewhere.example")
        trusted, refused = "TLSv certificate TLS sent first received HTTP", "certificate certificate sent received"
        for code, certificate, options, steps in (
                (0, here, ["--ca-file", here], trusted), (5, here, [], refused), (5, other, ["--ca-file", other], "TLSv " + refused),
                (0, other, ["--ca-file", other, "--no-host-check"], trusted), (5, other, ["--ca-file", here], refused)):
            with self.subTest(options=options), zuv.peer(zuv.answer(GOT), certificate=certificate) as (address, _):
                run = self.expect(zuv.run("profile", "get", "-v", "-e", address, *options), code, *(["--ca-file"] if code else []))
                noted = re.findall(r"^\* ([a-zA-Z]+)", run.stderr, re.M)
                self.assertEqual(noted, ["looked", "connected", *steps.split(), "over"], run.stderr)

    def test_attachments_come_from_files_and_go_to_files(self):
        data = random.Random(1).randbytes(70000) + b"\r\n--\r\n"
        one, two = self.file("one.bin", data), self.file("two.txt", "")
        referring = GOT.replace("</p:getResponse>", '<c:credentials><c:key href="cid:../../x%1b"/></c:credentials></p:getResponse>')
        parts = b"".join(b"--B\r\nContent-ID: <%s>\r\nContent-Type: %s\r\n\r\n%s\r\n" % row for row in (
            (b"root", b"text/xml", referring.encode()), (b"../../x\x1b", b"a/\x1bb", data), (b"", b"text/plain", b"")))
        multipart = zuv.answer(parts + b"--B--", headers=['Content-Type: multipart/related; boundary="B"; type="text/xml"; start="<root>"'])
        with zuv.peer(multipart) as (address, _):
            self.expect(zuv.run("profile", "get", "-e", address), 0, "2 attachments came along")
        kept = os.path.join(self.folder, "kept")
        for options in ([], ["--chunked"]):
            with zuv.peer(multipart) as (address, requests):
                run = self.expect(zuv.run("profile", "get", "-e", address, "--json", "--attach", one + ",type=image/png,id=pic", "--attach",
                                          two, "--save-attachments", kept, *options), 0, "70.0 kB, a/?b", "urn:1")
            self.assertTrue(json.loads(run.stdout)["credentials"][0]["key"]["@href"].startswith("cid:.."))
            self.assertEqual(run.stderr.count("saved "), 2, run.stderr)
            self.assertEqual(sorted(os.listdir(kept)), ["1-.._.._x_", "2"])
            self.assertEqual(pathlib.Path(kept, "1-.._.._x_").read_bytes(), data)
            if options:
                with zuv.peer(zuv.answer(GOT)) as (address, requests):
                    self.expect(zuv.run("profile", "get", "-e", address, "--dime", "--attach", one), 0)
                self.assertIn(b"\r\nContent-Type: application/dime\r\n", requests[0])
                self.assertIn(data, requests[0])
                continue
            sent = email.message_from_bytes(requests[0].partition(b"\r\n")[2], policy=email.policy.HTTP).get_payload()
            self.assertEqual([(part["Content-ID"], part.get_content_type(), part["Content-Description"]) for part in sent[1:]],
                             [("<pic>", "image/png", "one.bin"), ("<attachment-2>", "application/octet-stream", "two.txt")])
            self.assertIn(b"\r\n\r\n" + data + b"\r\n--", requests[0])

    def test_data_ports_are_read_and_written(self):
        data = random.Random(2).randbytes(300000)
        source, back = self.file("source", data), os.path.join(self.folder, "back")
        attach = ('<s:attachRequest xmlns:s="%s/StatusReport" xmlns:c="%s"><s:attachment/></s:attachRequest>' % (zuv.COMMON, zuv.COMMON))
        with zuv.service() as address:
            report = json.loads(zuv.run("statusreport", "create", "--json", "-e", address).stdout)
            held = zuv.run("statusreport", "attach", "-", "-t", report["thisURI"][0], "--json", "-e", address, given=attach)
            uri = json.loads(self.expect(held, 0).stdout)["attachment"][0]["dataPort"][0]["dataURI"]
            self.expect(zuv.run("data", "put", uri, source), 0)
            self.expect(zuv.run("data", "get", uri, "-o", back), 0)
            self.assertEqual(pathlib.Path(back).read_bytes(), data)
            self.assertEqual(zuv.run("data", "get", uri, text=False).stdout, data)
            self.expect(zuv.run("data", "get", uri + "-not"), 6, "404")
        with zuv.peer(zuv.answer(b"x" * 5)[:-2]) as (address, _):
            self.expect(zuv.run("data", "get", address + "/d"), 4)

    def test_what_does_not_arrive_whole_replaces_no_file(self):
        held, before = self.file("held", b"precious"), 0o640
        os.chmod(held, before)
        cut = zuv.answer(b"x" * 100000)[:-2]
        with zuv.peer(cut, zuv.answer(b"new")) as (address, _):
            self.expect(zuv.run("data", "get", address + "/d", "-o", held), 4)
            self.assertEqual((os.listdir(self.folder), open(held, "rb").read()), (["held"], b"precious"))
            link = os.path.join(self.folder, "link")
            os.symlink(held, link)
            self.expect(zuv.run("data", "get", address + "/d", "-o", link), 0)
        self.assertEqual((os.path.islink(link), open(held, "rb").read(), os.stat(held).st_mode & 0o777), (True, b"new", before))
        os.unlink(link)
        listener = socket.create_server(("127.0.0.1", 0))
        with listener, subprocess.Popen([zuv.PROGRAM, "data", "get", "-o", held, "http://127.0.0.1:%d/d" % listener.getsockname()[1]],
                                        stderr=subprocess.DEVNULL) as program:
            connection, _ = listener.accept()
            with connection:
                connection.sendall(cut)
                connection.recv(1)  # it is past the start, and waits for the rest
                program.send_signal(signal.SIGINT)
                self.assertEqual(program.wait(zuv.LIMIT_S), -signal.SIGINT)
        self.assertEqual((os.listdir(self.folder), open(held, "rb").read()), (["held"], b"new"))
        parts = (b"--B\r\nContent-ID: <r>\r\nContent-Type: text/xml\r\n\r\n%s\r\n--B\r\nContent-ID: <a>\r\n\r\n%s" % (GOT.encode(), b"y" * 100000))
        kept = os.path.join(self.folder, "kept")
        with zuv.peer(zuv.answer(parts, headers=['Content-Type: multipart/related; boundary="B"; type="text/xml"; start="<r>"'])) as (address, _):
            zuv.run("profile", "get", "-e", address, "--save-attachments", kept)
        self.assertEqual(os.listdir(kept), [])

    def test_whatever_comes_back_ends_in_a_documented_code(self):
        rows = random.Random(3)
        seeds = [zuv.answer(GOT), zuv.answer(zuv.envelope("<p:getResponse>" + "<p:profile>" * 5000)),
                 zuv.answer(zuv.envelope("<E:Fault><faultcode>E:Client</faultcode><detail><c:Client><c:detail/></c:Client></detail></E:Fault>"), "500 x")]
        answers = [seeds[1]]
        for _ in range(60):
            bytes_ = bytearray(rows.choice(seeds[::2]))
            for _ in range(rows.randrange(1, 8)):
                bytes_[rows.randrange(len(bytes_))] = rows.choice(b"<>&/\"'=: \r\n\x00\xff\x1b09a")
            answers.append(bytes(bytes_[:rows.randrange(len(bytes_)) if rows.random() < .3 else None]))
        with zuv.peer(*answers) as (address, _):
            for bytes_ in answers:
                run = zuv.run("profile", "get", "-e", address, "--json", "--silence-limit", "20", text=False)
                self.assertIn(run.returncode, (0, 4, 6, 7, 8, 10), (bytes_, run))
                self.assertNotIn(b"\x1b", run.stdout + run.stderr)

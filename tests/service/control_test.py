"""What serves developers: faults and delays on request, the access log, the last exchanges and the page that shows them."""
import base64
import concurrent.futures
import gzip
import json
import os
import pathlib
import re
import resource
import signal
import ssl
import subprocess
import tempfile
import time
import unittest
import urllib.error
import urllib.request

import browser  # of the tests of the command line
import zuv
from by_hand import Connection, call, envelope, exchange, post, request, target

CREATE = post("Profile", envelope("Profile", request("create")))
GET = post("Profile", envelope("Profile", request("get"), target("urn:x")))
ATTACH = "<attachment/><dataPortPreference><c:transport>HTTP</c:transport></dataPortPreference>"
CONTROL, RECENT = "/zuv/v1.0/control", "/zuv/v1.0/recent"


def ask(address, method, path, body="", *headers, host="localhost"):
    lines = ["%s %s HTTP/1.1" % (method, path), "Host: " + host, "Content-Length: %d" % len(body.encode()), *headers]
    return exchange(address, "\r\n".join([*lines, "", ""]) + body)


def rules(address, *wanted):
    return ask(address, "POST", CONTROL, json.dumps(wanted), "Content-Type: application/json")


def until(holds):
    """Waits for what follows an answer, and not for ever."""
    end = time.monotonic() + 10
    while not holds() and time.monotonic() < end:
        pass


def recent(address, last):
    """Once so many exchanges are noted, which happens after their answers."""
    until(lambda: json.loads(ask(address, "GET", RECENT).body)["last"] == last)
    return json.loads(ask(address, "GET", RECENT).body)


class control(unittest.TestCase):
    def test_a_rule_holds_for_the_next_calls_of_its_operation(self):
        with zuv.service("--control") as address:
            for rule, status, present in (
                    ({"fault": "Client.ObjectNotFound", "text": "gone"}, 500, "subcode>Client.ObjectNotFound<"),
                    ({"fault": "Server.Processing", "status": 503}, 503, "subcode>Server.Processing<"),
                    ({"status": 429}, 429, "subcode>Client<"),
                    ({"chunked": True}, 200, "Transfer-Encoding: chunked"),
                    ({"gzip": True}, 200, "Content-Encoding: gzip"),
                    ({"cut_after": 40}, 200, "HTTP/1.1 200"), ({"cut_after": 0}, 0, ""),
                    ({"length_error": 7}, 200, "Connection: close"), ({"length_error": -7}, 200, "Connection: close")):
                with self.subTest(rule):
                    self.assertEqual(rules(address, {"port": "Profile", "operation": "create", **rule}).status, 200)
                    self.assertNotIn("urn:x is", exchange(address, GET), "another operation")
                    with Connection(address) as peer:
                        answer = peer.send(CREATE).receive()
                        rest = peer.received + (b"" if "keep-alive" in answer else peer.socket.recv(100))
                    self.assertEqual((answer.status, present in answer), (status, True), answer)
                    if "gzip" in rule:
                        self.assertIn(b"createResponse", gzip.decompress(answer.body))
                    if "cut_after" in rule:
                        self.assertEqual(len(answer.head + answer.body), rule["cut_after"])
                    if "length_error" in rule:
                        noted = int(re.search(rb"Content-Length: (\d+)", answer.head)[1])
                        self.assertEqual(noted - len(answer.body + rest), rule["length_error"])
                    self.assertEqual(exchange(address, CREATE).status, 200, "it held for one call")

    def test_a_delay_holds_up_its_own_connection_alone(self):
        with zuv.service("--control") as address, Connection(address) as slow:
            rules(address, {"operation": "create", "delay_ms": 1500}, {"operation": "get", "delay_ms": 600000})
            begun = time.monotonic()
            slow.send(CREATE)
            until(lambda: json.loads(ask(address, "GET", CONTROL).body)[0]["operation"] != "create")  # the call has taken its rule
            self.assertEqual(exchange(address, CREATE).status, 200)
            self.assertLess(time.monotonic() - begun, 1.5)
            self.assertEqual(slow.receive().status, 200)
            self.assertGreaterEqual(time.monotonic() - begun, 1.5)
            with Connection(address) as endless:  # which doesn't hold up the end of the service
                endless.send(GET)
                until(lambda: not json.loads(ask(address, "GET", CONTROL).body))
                address.process.terminate()
                self.assertEqual(address.process.wait(zuv.LIMIT_S), 0)

    def test_rules_come_from_a_file_and_from_this_machine_only(self):
        with tempfile.TemporaryDirectory() as folder:
            name = os.path.join(folder, "rules.json")
            with open(name, "w") as file:
                json.dump({"operation": "create", "times": 0, "status": 502}, file)
            with zuv.service("--rules", name) as address, zuv.service("--control") as open_one:
                self.assertEqual([exchange(address, CREATE).status for _ in range(3)], 3 * [502])
                self.assertEqual(rules(address, {"status": 500}).status, 404)
                self.assertEqual(ask(open_one, "POST", CONTROL, "{}", "Content-Type: application/json", host="x.test").status, 403)
                self.assertEqual(ask(open_one, "POST", CONTROL, "{}", "Content-Type: text/plain").status, 415)
                for wrong in ({"statsu": 500}, {"status": 200}, {"fault": "Client.No"}, {"port": "No"}, {"times": -1}, {"text": 1}, 3):
                    answer = rules(open_one, {"status": 500}, wrong)
                    self.assertEqual((answer.status, "rule:" in answer), (400, True), answer)
                self.assertEqual(ask(open_one, "POST", CONTROL, "[", "Content-Type: application/json").status, 400)
                self.assertEqual(ask(open_one, "GET", CONTROL).body, b"[]", "all or none")
                rules(open_one, {"status": 500})
                self.assertEqual(ask(open_one, "DELETE", CONTROL).status, 200)
                self.assertEqual(exchange(open_one, CREATE).status, 200)
                with open(name, "w") as file:
                    file.write('{"status": 99}')
                run = subprocess.run([zuv.SERVICE, "--port", "0", "--rules", name], capture_output=True, text=True, timeout=60)
                self.assertEqual((run.returncode, '"status"' in run.stderr), (1, True), run)

    def test_a_seeded_store_is_reset_on_request(self):
        seed = "<createRequest xmlns='%s'><thisURI>urn:%s</thisURI></createRequest>"
        json_type = "Content-Type: application/json"
        with tempfile.TemporaryDirectory() as folder:
            def put(name, text):
                pathlib.Path(folder, name + ".xml").write_text(text)
            put("ada", seed % (zuv.PROFILE, "ada"))
            put("bob", seed % (zuv.COMMON + "/StatusReport", "bob"))
            base = os.path.join(folder, "documents.db")
            with zuv.service("--seed", folder, "--control", "--database", base) as address:
                names = ("Profile", "urn:ada"), ("StatusReport", "urn:bob"), ("Profile", call(address, "Profile", "create").first("thisURI"))
                report = call(address, "StatusReport", "create").first("thisURI")
                url = call(address, "StatusReport", "attach", ATTACH, target(report)).first("dataURI").removeprefix(address)
                self.assertEqual(ask(address, "POST", url, "signal").status, 200)

                def found():
                    return [call(address, port, "get", header=target(uri)).status for port, uri in names]
                self.assertEqual((found(), len(os.listdir(base + "-data"))), ([200, 200, 200], 1))
                with Connection(address) as held:
                    held.send(CREATE[:-40])  # a call that is arriving meanwhile
                    answer = ask(address, "POST", CONTROL + "/reset", "{}", json_type)
                    self.assertEqual((answer.status, json.loads(answer.body)), (200, {"seeded": 2}))
                    self.assertEqual((found(), os.listdir(base + "-data")), ([200, 200, 500], []))
                    self.assertEqual(held.send(CREATE[-40:]).receive().status, 200)
                for method, kind, host, status in (("POST", "text/plain", "localhost", 415), ("POST", "application/json", "x.test", 403),
                                                   ("GET", "", "localhost", 405), ("DELETE", "", "localhost", 405)):
                    self.assertEqual(ask(address, method, CONTROL + "/reset", "{}", "Content-Type: " + kind, host=host).status, status)
                with Connection(address) as bare:  # no length: no body to wait for
                    bare.send(("POST %s/reset HTTP/1.1\r\nHost: localhost\r\n%s\r\n\r\n" % (CONTROL, json_type)).encode())
                    self.assertEqual(bare.receive().status, 200)
                put("bob", seed % (zuv.PROFILE, "ada"))
                answer = ask(address, "POST", CONTROL + "/reset", "{}", json_type)
                self.assertEqual((answer.status, "bob.xml: There is a document named urn:ada already" in answer), (500, True), answer)
                self.assertEqual(found(), [500, 500, 500])
                kept = call(address, "Profile", "create").first("thisURI")
            with zuv.service("--seed", folder, "--database", base) as address:  # which isn't empty
                self.assertEqual(call(address, "Profile", "get", header=target(kept)).status, 200)
                self.assertEqual(ask(address, "POST", CONTROL + "/reset", "{}", json_type).status, 404)
            for text, wrong in (("<a/>", "no operation"), ("", "no whole XML"), (CREATE.decode()[:-9], "no operation"),
                                (seed.replace("<this", "<that").replace("</this", "</that") % (zuv.PROFILE, "x"), "'thatURI'")):
                put("bob", text)
                run = subprocess.run([zuv.SERVICE, "--port", "0", "--seed", folder], capture_output=True, text=True, timeout=60)
                self.assertEqual((run.returncode, "bob.xml: " in run.stderr, wrong in run.stderr), (1, True, True), run)

    def test_recorded_calls_are_answered_again(self):
        data = bytes(range(256)) * 500
        secret = "<c:credentials><c:password>sesame</c:password><c:token>a&lt;sesame</c:token></c:credentials>"
        attached = ('--edge\r\nContent-Type: text/xml\r\n\r\n%s\r\n--edge\r\nContent-ID: <x>\r\n\r\n' % envelope("ProblemReport", request(
            "submit", "<c:attachment><c:dataHandler>cid:x</c:dataHandler></c:attachment>"))).encode() + data + b"\r\n--edge--"
        mime = "multipart/related; boundary=edge"
        with tempfile.TemporaryDirectory() as folder:
            file = os.path.join(folder, "calls")
            with zuv.service("--record", file, "--control") as address:
                sent = [post("Profile", envelope("Profile", request("create", secret)), "Authorization: Basic c2VzYW1l"), GET,
                        post("ProblemReport", attached, kind=mime)]
                body = CREATE.partition(b"\r\n\r\n")[2]
                sent += [post("Profile", gzip.compress(body), "Content-Encoding: gzip"), CREATE + b"x"]
                rules(address, *[{"port": "Profile", "operation": "get"}, {"operation": "submit"}, {"operation": "create", "times": 2},
                                 {"operation": "create", "gzip": True, "chunked": True}])
                given = [exchange(address, one) for one in sent]
                report = given[2].first("thisURI")
                sent.append(post("ProblemReport", b"--edge\r\nContent-Type: text/xml\r\n\r\n%s\r\n--edge--" % envelope(
                    "ProblemReport", request("get"), target(report)).encode(), kind=mime))
                given.append(exchange(address, sent[5]))
                given[4].body = gzip.decompress(given[4].body)
                self.assertIn(data, given[5])

                def many(_):
                    with Connection(address) as peer:
                        return [peer.send(GET).receive().status for _ in range(20)]
                with concurrent.futures.ThreadPoolExecutor(8) as threads:
                    self.assertEqual(sum(threads.map(many, range(8)), []), 160 * [500])
            lines = pathlib.Path(file).read_text().splitlines()
            lines.sort()  # the first member is the time
            kept = [json.loads(line) for line in lines]
            self.assertEqual((len(kept), os.stat(file).st_mode & 0o777), (166, 0o600))
            self.assertEqual([(one["port"] + "/" + one["operation"], one["response"]["status"]) for one in kept[:7]], [
                ("Profile/create", 200), ("Profile/get", 500), ("ProblemReport/submit", 200), ("Profile/create", 200),
                ("Profile/create", 200), ("ProblemReport/get", 200), ("Profile/get", 500)])
            self.assertTrue(data in base64.b64decode(kept[2]["request"]["body_base64"]) and "Authorization: ***" in kept[0]["request"]["head"])
            self.assertEqual([one["request"]["body"] for one in kept[3:5]], 2 * [body.decode()])
            self.assertFalse(re.search("sesame|c2VzYW1l", str(lines)))
            pathlib.Path(file).write_text("\n".join(lines[5::-1]) + "\n")
            with zuv.service("--replay", file, "--control", "--chunked") as address:
                for _ in range(2):
                    for place in 3, 0, 5, 1, 4, 2:
                        answer = exchange(address, sent[place])
                        expected = given[place].body.replace(b"a&lt;sesame", 11 * b"X").replace(b"sesame", b"XXXXXX")
                        self.assertEqual((answer.status, answer.body, "chunked" in answer), (given[place].status, expected, True), place)
                    self.assertIn("Nothing is recorded of Profile/remove; what is: ProblemReport/get (1), ProblemReport/submit (1), "
                                  "Profile/create (3), Profile/get (1).", call(address, "Profile", "remove"))
                    self.assertIn("The 3 recorded of Profile/create have been answered", exchange(address, CREATE))
                    self.assertEqual(ask(address, "POST", CONTROL + "/reset", "{}", "Content-Type: application/json").status, 200)

    def test_what_is_no_recording_is_refused_at_the_start(self):
        good = {"time": "t", "port": "p", "operation": "o", "request": {"body": ""}, "response": {"status": 200, "head": ["content-type: x"], "body": ""}}
        line = json.dumps(good)
        with tempfile.TemporaryDirectory() as folder:
            file = os.path.join(folder, "calls")
            rows = [(line + "\n" + text, "--replay", "line 2: " + words) for text, words in (
                (line[:-9], "not well-formed"), ("\n", "not well-formed"), ("\0\xff", "not well-formed"), (100000 * "[", "no exchange"),
                ("3", "no exchange"), (line.replace('"p"', "7"), "no exchange"), (line.replace("200", "199"), "the status"),
                (line.replace("200", "1e2"), "no exchange"), (line.replace("content", "x"), "the head"),
                (line.replace('body": ""}}', 'body_base64": "x-"}}'), '"body_base64"'))]
            for text, option, words in rows + [("", "--replay", "no exchange"), (line, "--record", "cut short"), (None, "--record", "directory")]:
                if text is None:
                    file = folder
                else:
                    pathlib.Path(file).write_text(text, encoding="latin-1")
                run = subprocess.run([zuv.SERVICE, "--port", "0", option, file], capture_output=True, text=True, timeout=60)
                self.assertEqual((run.returncode, "recording %s: " % file in run.stderr, words in run.stderr), (1, True, True), (text, run))
            one = os.path.join(folder, "one")
            run = subprocess.run([zuv.SERVICE, "--port", "0", "--record", one, "--trace", folder + "/./one"], capture_output=True, text=True)
            self.assertEqual((run.returncode, os.path.exists(one)), (1, False), run)

    def test_calls_that_a_full_disk_leaves_out_are_reported_once(self):
        with tempfile.TemporaryDirectory() as folder, tempfile.TemporaryFile("w+") as log:
            file = os.path.join(folder, "calls")
            with zuv.service("--record", file, stderr=log) as address:
                exchange(address, GET)
                until(lambda: os.stat(file).st_size)
                limit = os.stat(file).st_size + 100
                resource.prlimit(address.process.pid, resource.RLIMIT_FSIZE, (limit, resource.RLIM_INFINITY))
                self.assertEqual([exchange(address, GET).status for _ in range(3)], 3 * [500])
                with Connection(address) as peer:  # its second answer comes once the first call is recorded, or not
                    peer.send(GET).receive()
                    peer.send(GET).receive()
                    resource.prlimit(address.process.pid, resource.RLIMIT_FSIZE, 2 * (resource.RLIM_INFINITY,))
                    self.assertIn("ObjectNotFound", peer.send(GET).receive())
            log.seek(0)
            self.assertEqual(log.read(), "zuv-service: recording %s: File too large; exchanges are missing from here on\n" % file)
            self.assertGreaterEqual(len([json.loads(line) for line in pathlib.Path(file).read_text().splitlines()]), 2)

    def test_exchanges_are_logged_and_shown_without_secrets(self):
        secret = ("<c:credentials><c:username>ada</c:username><c:password>sesame</c:password><c:token><![CDATA[a</b>sesame]]></c:token>"
                  "<c:key href='#s'/></c:credentials><profileAuthority>&lt;script></profileAuthority>")
        with tempfile.TemporaryDirectory() as folder:
            log = os.path.join(folder, "access")
            with zuv.service("--access-log", log) as address:
                for number, sent in enumerate((
                        post("Profile", envelope("Profile", request("create", secret) + '<x id = "s">sesame</x>'), "Authorization: Basic c2VzYW1l"),
                        "no HTTP\r\n\r\n", "GET /zuv/v1.0/data/sesame?token=sesame HTTP/1.1\r\n\r\n",
                        "GET /a\x7f?token=sesame HTTP/1.1\r\n\r\n"), 1):
                    exchange(address, sent)
                    recent(address, number)
                os.rename(log, log + ".1")
                address.process.send_signal(signal.SIGHUP)
                until(lambda: os.path.exists(log))
                exchange(address, CREATE)
                shown = recent(address, 5)
                self.assertEqual([one["status"] for one in shown["exchanges"]], [200, 400, 404, 404, 200])
                self.assertIn("<c:password>***</c:password><c:token>***</c:token>", shown["exchanges"][0]["request"])
                self.assertIn("createResponse", shown["exchanges"][0]["answer"])
                self.assertNotIn("sesame", json.dumps(shown))
                self.assertEqual(json.loads(ask(address, "GET", RECENT + "?after=4").body)["exchanges"], shown["exchanges"][4:])
                for _ in range(60):
                    exchange(address, CREATE)
                self.assertEqual([one["number"] for one in recent(address, 65)["exchanges"]], list(range(16, 66)))
                self.assertEqual(ask(address, "GET", RECENT, host="rebound.test").status, 403)
            before, after = (pathlib.Path(name).read_text().splitlines() for name in (log + ".1", log))
            for line, words in zip((line for line in before if RECENT not in line), (
                    "POST Profile/create 200", "- - 400", "GET /zuv/v1.0/data/*** 404", "GET /a%7F 404")):
                self.assertRegex(line, r"^\d{4}-\d\d-\d\dT[\d:.]+Z 127\.0\.0\.1:\d+ %s in=\d+ out=[1-9]\d* ms=[\d.]+$" % re.escape(words))
            self.assertEqual(os.stat(log).st_mode & 0o777, 0o600)
            self.assertGreaterEqual(len(before + after), 69, "one for each exchange")
            self.assertNotIn("sesame", str(before + after))

    def test_the_page_shows_hostile_content_as_text(self):
        browser.need(self)
        hostile = "&lt;/pre>&lt;img src=x onerror=alert(1)>"
        with zuv.service() as address:
            exchange(address, post("Profile", envelope("Profile", request(
                "create", "<profileAuthority>%s</profileAuthority>" % hostile))))
            recent(address, 1)
            shown = browser.dom(address + "/#open", "--virtual-time-budget=3000")
            with tempfile.NamedTemporaryFile(suffix=".html") as page, urllib.request.urlopen(address) as answer:
                page.write(answer.read())
                page.flush()
                for dark in (True, False):
                    for width, needed, *_ in browser.measured(page.name, dark):
                        self.assertLessEqual(needed, width)
        self.assertRegex(shown, r">200</span><span[^>]*>POST Profile/create</span>")
        self.assertIn("&lt;profileAuthority&gt;" + hostile.replace("&", "&amp;").replace(">", "&gt;"), shown)
        self.assertIn("1 exchanges so far", shown)

    def test_https_with_an_authority_of_its_own_and_client_certificates(self):
        with tempfile.TemporaryDirectory() as folder:
            made, basic = os.path.join(folder, "made"), os.path.join(folder, "basic")
            ca, client = os.path.join(made, "ca.pem"), os.path.join(made, "client.pem")
            pathlib.Path(basic).write_text("ada:sesame\nmore\n")
            wsdl = "/zuv/v1.0/services/Profile?wsdl"

            def fetch(address, **how):
                request = urllib.request.Request(address + wsdl, headers={"Authorization": "Basic YWRhOnNlc2FtZQ=="})
                trust = ssl.create_default_context(cafile=ca)
                if how.get("certificate"):
                    trust.load_cert_chain(client)
                with urllib.request.urlopen(request, timeout=60, context=trust) as answer:
                    return answer.read().decode()
            with zuv.service("--tls", "--make-ca", made, "--basic", basic) as address:
                for host in "127.0.0.1", "localhost":
                    own = address.replace("127.0.0.1", host)
                    self.assertIn('location="%s' % own, fetch(own))
                with self.assertRaises(urllib.error.URLError):
                    urllib.request.urlopen(address, timeout=60)
                with self.assertRaisesRegex(urllib.error.HTTPError, "401"):
                    urllib.request.urlopen(address, timeout=60, context=ssl.create_default_context(cafile=ca))
            self.assertEqual([os.stat(os.path.join(made, name)).st_mode & 0o777
                              for name in ("server.pem", "client.pem")], 2 * [0o600])
            both = os.path.join(made, "server.pem")
            with zuv.service("--tls", "--cert", both, "--key", both, "--client-ca", ca) as address:
                self.assertIn("portType", fetch(address, certificate=True))
                with self.assertRaises(OSError):
                    fetch(address)
            for options in (["--tls"], ["--cert", both], ["--tls", "--cert", basic], ["--tls", "--cert", both, "--key", ca]):
                run = subprocess.run([zuv.SERVICE, "--port", "0", *options], capture_output=True, text=True, timeout=60)
                self.assertEqual((run.returncode in (1, 2), run.stdout, run.stderr == ""), (True, "", False), run)

"""What the ports do beyond the walk through all operations, which tests/interop takes, and the faults that they may answer
with, which contract_handed_out.py asks for."""
import datetime
import unittest

import by_hand
import zuv
from by_hand import call, target

ADA = "<credentials><c:username>ada</c:username></credentials>"


def elements(words, prefix=""):
    """Elements with text, from "name=text name=text"."""
    return "".join("<%s%s>%s</%s%s>" % (prefix, name, text, prefix, name)
                   for name, text in (word.split("=") for word in words.split()))


class ports(unittest.TestCase):
    @classmethod
    def setUpClass(cls):
        cls.address = cls.enterClassContext(zuv.service("--account", "ada:sesame", "--account", "bob:x"))

    def ask(self, port, operation, content="", header="", fault=None):
        """The answer; with the fault of this name in it, or none."""
        answer = call(self.address, port, operation, content, header)
        self.assertEqual(answer.first("faultcode") is None, fault is None, answer)
        if fault:
            self.assertEqual(answer.first("subcode"), fault, answer)
        return answer

    def made(self, port, operation="create", content=""):
        return self.ask(port, operation, content).first("thisURI")

    def test_credentials_of_the_same_holder_are_refreshed_and_new_ones_added(self):
        uri = self.made("Profile", content=ADA)
        for user, held in ("ada", 1), ("someone else", 2):
            answer = self.ask("Profile", "refreshCredentials", ADA.replace("ada", user), target(uri))
            self.assertEqual(len(answer.all("credentials")), held)
            self.assertEqual(answer.all("state")[-1], "valid")
            self.assertTrue(answer.all("token")[-1])
            end = datetime.datetime.fromisoformat(answer.all("expiration")[-1].replace("Z", "+00:00"))
            left = end - datetime.datetime.now(datetime.timezone.utc)
            self.assertAlmostEqual(left.total_seconds(), 365 * 86400, delta=600)

    def test_what_a_request_lacks_is_told(self):
        missing = self.ask("Profile", "get", header=target("urn:nobody"), fault="Client.ObjectNotFound")
        self.assertIn("urn:nobody", missing.first("description"))
        self.ask("Profile", "get", fault="Client.InsufficientInformation")
        self.ask("Profile", "refreshCredentials", header=target("urn:nobody"), fault="Client.InsufficientInformation")

    def test_a_target_has_other_names_and_the_answer_s_header_names_the_exchange(self):
        uri = self.made("Profile")
        answer = self.ask("Profile", "get", header="<c:compoundTargetURI><c:uri>%s</c:uri></c:compoundTargetURI>"
                          "<c:correlationId>c-2</c:correlationId><c:note>not echoed</c:note>" % uri)
        self.assertEqual((answer.first("thisURI"), answer.first("correlationId")), (uri, "c-2"))
        self.assertNotIn("echoed", answer)
        self.assertNotIn("Header", self.ask("Profile", "remove", "<thisURI>%s</thisURI>" % uri))

    def test_expired_credentials_are_refused(self):
        header = target(self.made("Profile"))
        good = "<c:credentials><c:expiration>2999-01-01T00:00:00Z</c:expiration></c:credentials>"
        for expired in "<c:state>expired</c:state>", "<c:expiration>2001-02-03T04:05:06Z</c:expiration>":
            answer = self.ask("Profile", "get", header=header + good + "<c:credentials>%s</c:credentials>" % expired,
                              fault="Client.Authentication.CredentialsExpired")
            self.assertEqual(len(answer.all("credentials")), 1, "those that have expired")
        self.ask("Profile", "get", header=header + good)

    def test_a_report_stays_as_it_ended(self):
        header = target(self.made("StatusReport"))
        self.ask("StatusReport", "close", header=header)
        for operation in "cancel", "submit":
            self.ask("StatusReport", operation, header=header, fault="Client.InvalidRequest")
        self.assertEqual(self.ask("StatusReport", "get", header=header).first("state"), "closed")

    def test_a_data_port_takes_data_and_notes_how_it_goes(self):
        header = target(self.made("StatusReport"))
        attached = self.ask("StatusReport", "attach", "<attachment/><dataPortPreference>%s</dataPortPreference>" %
                            elements("transport=FTP transport=HTTP", "c:"), header)
        self.assertEqual(attached.first("transport"), "HTTP")
        path = attached.first("dataURI").removeprefix(self.address)

        def send(where, rest):
            return by_hand.exchange(self.address, b"POST %s HTTP/1.1\r\n%s" % (where.encode(), rest)).status
        for sent, held in ((b"Content-Length: 12\r\n\r\n\0<binary>\r\n\xff", b"\0<binary>\r\n\xff"),
                           (b"Transfer-Encoding: chunked\r\n\r\n3\r\nabc\r\n2\r\nde\r\n0\r\n\r\n", b"abcde")):
            self.assertEqual(send(path, sent), 200)
            self.assertEqual(by_hand.exchange(self.address, "GET %s HTTP/1.1\r\n\r\n" % path).body, held)
        self.assertEqual(send(path + "x", b"Content-Length: 1\r\n\r\nx"), 404)

        name = "attachmentURI=%s " % attached.first("attachmentURI")
        for progress, states, problem in (("percentComplete=40", ["pending", "open"], False),
                                      ("percentComplete=100", ["complete", "closed"], False),
                                      ("problemEncountered=true recommendedAttachmentState=error", ["error", "closed"], True)):
            noted = self.ask("StatusReport", "attachStatus", elements(name + progress, "c:"), header)
            self.assertEqual(noted.all("state")[-2:], states, noted)
            self.assertEqual("<protocol:error" in noted, problem, noted)
        self.ask("StatusReport", "attachStatus", elements("attachmentURI=urn:nothing", "c:"), header, "Client.ObjectNotFound")
        self.ask("StatusReport", "attachStatus", "", header, "Client.InsufficientInformation")

    def test_data_ports_that_the_service_does_not_have_are_refused(self):
        header = target(self.made("StatusReport"))
        for wanted in "transport=FTP", "direction=out", "authentication=private", "dataURIType=indirect":
            preference = "<dataPortPreference>%s</dataPortPreference>" % elements(wanted, "c:")
            refused = self.ask("StatusReport", "attach", "<attachment/>" + preference, header, "Client.DataPortIncompatibility")
            self.assertEqual([refused.all(name) for name in ("direction", "transport", "authentication")],
                             [["in"], ["HTTP"], ["anonymous"]])
            kept = self.ask("StatusReport", "attach", "<attachment><c:data>here</c:data></attachment>" + preference, header)
            self.assertNotIn("pending", kept, "data that is there needs no port, and nothing refused was kept")
            self.assertEqual((kept.all("state")[-1], kept.first("dataPort")), ("complete", None))

    def test_a_problem_report_is_answered_at_once_by_what_its_words_say(self):
        action = 'xsi:type="protocolProblemReport:Action.Update.Install"'
        for title, text, update in (("Heavy load", "Under it the controller hangs.", "FW-120"),
                                    ("Question", "Is DRV-5 of use to me?", "DRV-5"), ("Coffee", "It is cold.", None)):
            answer = self.ask("ProblemReport", "submit",
                              "<title>%s</title><problemDescription>%s</problemDescription>" % (title, text))
            self.assertEqual((action in answer, answer.first("updateId")), (update is not None, update), answer)
            self.assertTrue(answer.first("submitDateTime"))
            self.assertEqual(answer.first("confidence"), "90" if title == "Question" else answer.first("confidence"))

    def test_the_state_of_an_order_says_how_far_it_came(self):
        quiet = elements("includeData=false includeUpdateIdExpansionDetail=false")
        for order, state, details in ((elements("updateId=FW-100") + quiet, "complete.available", 0),
                                      (elements("updateScope=tape"), "complete.noUpdates", 0),
                                      (elements("updateId=X"), "complete.noUpdates", 1)):
            answer = self.ask("UpdateOrder", "submit", order)
            self.assertEqual((answer.first("state"), len(answer.all("updateIdExpansionDetail"))), (state, details), answer)
            self.assertEqual(answer.all("attachment"), [])
        header = target(self.made("UpdateOrder", "submit", elements("updateId=FW-100")))
        self.assertEqual(self.ask("UpdateOrder", "cancel", header=header).first("state"), "cancelled")
        self.ask("UpdateOrder", "close", header=header, fault="Client.InvalidRequest")
        self.ask("UpdateOrder", "submit", fault="Client.InsufficientInformation")

    def test_what_cannot_be_delivered_is_told(self):
        post, ftp = "<medium>physical</medium>", "<c:dataPortPreference><c:transport>FTP</c:transport></c:dataPortPreference>"
        for preferences, state, subcode, noted in (
                ([post], "preprocessed.identified", "Client.DeliveryIncompatibility", "medium>electronic<"),
                ([ftp], "preprocessed.identified", "Client.DataPortIncompatibility", "transport>HTTP<"),
                ([ftp, ""], "complete.available", None, "FW-100")):  # one way that works will do
            answer = self.ask("UpdateOrder", "submit", elements("updateId=FW-100") + "".join(
                "<deliveryPreference>%s</deliveryPreference>" % one for one in preferences))
            self.assertEqual((answer.first("state"), answer.first("subcode")), (state, subcode), answer)
            self.assertIn(noted, answer)

    def test_nested_requests_are_authenticated_each_by_itself(self):
        def nested(user, password, inner=""):
            return "<credentials>%s</credentials>%s" % (
                elements("username=%s%s" % (user, " password=" + password if password else ""), "c:"),
                "<authenticateRequest>%s</authenticateRequest>" % inner if inner else "")
        answer = self.ask("UpdateOrder", "authenticate", nested("ada", "sesame", nested("eve", "sesamf", nested("ada", ""))))
        self.assertEqual(answer.all("success"), ["true", "false", "false"])
        self.assertEqual(answer.all("subcode"), ["Client.Authentication.NotRecognized", "Client.InsufficientInformation"])
        self.assertEqual(answer.first("username"), "ada")
        self.assertNotIn("sesam", answer, "secrets are not sent back")

    def test_each_query_of_a_batch_is_answered(self):
        def query(type_, content=""):
            batch = '<c:QueryRequests><c:queryRequest xsi:type="%s">%s</c:queryRequest></c:QueryRequests>' % (type_, content)
            return by_hand.exchange(self.address, by_hand.post("Query", by_hand.envelope("Query", batch)))
        self.ask("ProblemReport", "submit", "<title>Smoke</title>")
        collections = "u:QueryRecognizedProductCollectionsRequest"
        prune = elements("recursivelyPruneEmptyProductCollectionLeaves=true", "u:")
        german = ('<c:inclusionFilter xsi:type="uf:Filter"><uf:expression xsi:type="uf:LanguageNameComparison" compareOp="equal">'
                  "<uf:languageName>Deutsch</uf:languageName></uf:expression></c:inclusionFilter>")
        for type_, content, present, absent in (
                ("r:QueryReportsRequest", "", "Smoke", "protocol:error"),
                ("r:QueryPatternReportsRequest", "", "Index is corrupt after restart", "Smoke"),
                ("c:QueryRecognizedSubjectsRequest", "", "ZX100 disk array", "ZX200"),
                ("c:QueryRecognizedSubjectsRequest",
                 elements("includeSubjectProperty=product includeSubjectProperty=operatingPlatform_name", "c:"),
                 "<protocol:product>ZX100</protocol:product><protocol:operatingPlatform><protocol:name>zxos</protocol:name>"
                 "</protocol:operatingPlatform>", "ZX100 disk array"),
                ("c:QueryRecognizedLanguagesRequest", "", "Fran\u00e7ais", "protocol:error"),
                ("c:QueryRecognizedLanguagesRequest", german, "Deutsch", "English"),
                ("c:QueryRecognizedLanguagesRequest", "<c:inclusionFilter/>", "Client.MalformedRequest", "English"),
                ("c:QueryRecognizedCountriesRequest", "", "Austria", "protocol:error"),
                (collections, "", "Servers", "recognizedSubject"),
                (collections, elements("includeSubjects=true", "u:") + prune, "<protocol:product>ZDB</protocol:product>", "Servers"),
                (collections, elements("formProductCollectionHierarchy=true productCollectionHierarchyRoot=storage", "u:") + prune,
                 "<protocolUpdateOrder:productCollection>disk<", "tape"),
                ("u:QueryRecognizedCategoriesRequest", "", "A group of updates", "protocol:error"),
                ("u:QueryRecognizedAttributesRequest", "", "reboot", "protocol:error"),
                ("c:QueryRequest", "", "Server.UnsupportedRequest", "recognized")):
            with self.subTest(query=type_, content=content):
                answer = query(type_, content)
                self.assertIn(present, answer)
                self.assertNotIn(absent, answer)
        ping = by_hand.envelope("Query", '<any xsi:type="c:PingRequest"/>', version=2)
        self.assertIn("protocol:PingResponse", by_hand.exchange(self.address, by_hand.post("Query", ping)))

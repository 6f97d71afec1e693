"""zuv new and zuv check: documents made from the contract, and held against it."""
import glob
import os
import pathlib
import tempfile
import unittest

from lxml import etree

import zuv

ROOT = '<p:ProfileContent xmlns:p="%s" xmlns:c="%s" xmlns:xsi="http://www.w3.org/2001/XMLSchema-instance">\n' % (zuv.PROFILE, zuv.COMMON)
XSD = "{http://www.w3.org/2001/XMLSchema}"


def check(xml, *options):
    return zuv.run("check", "-", *options, given=xml)


class documents(unittest.TestCase):
    def test_the_new_document_of_every_class_is_valid(self):
        classes = [line.split("\t") for line in zuv.run("new", "--list").stdout.splitlines()]
        self.assertGreater(len(classes), 400)
        if os.environ.get("ZUV_SANITIZED"):  # such a program takes long to start
            classes = classes[::8]
        with tempfile.TemporaryDirectory() as folder:
            for name, documentation in classes:
                run = zuv.run("new", name)
                self.assertEqual(run.returncode, 0, run.stderr)
                self.assertIn(documentation.split()[0], run.stdout, name)
                pathlib.Path(folder, name).write_text(run.stdout)
            run = zuv.run("check", *(os.path.join(folder, name) for name, _ in classes))
            self.assertEqual((run.returncode, run.stderr), (0, ""))
            self.assertEqual(run.stdout.count(": valid, "), len(classes))

    def test_members_are_explained_in_the_words_of_the_schema(self):
        explained = 0
        text = " ".join(zuv.run("new", "Credentials").stdout.split())
        schema = etree.parse(os.path.join(zuv.SOURCE, "schema", "common", "common.xsd"))
        for element in schema.iterfind(".//%scomplexType[@name='Credentials']//%selement" % (XSD, XSD)):
            words = " ".join(element.findtext(".//%sdocumentation" % XSD).split())
            self.assertIn(words, text)
            self.assertIn("<protocol:%s" % element.get("name"), text)
            explained += 1
        self.assertGreater(explained, 15)
        self.assertIn("one of valid, ", text)
        self.assertIn("compareOp=", zuv.run("new", "protocolPRFilter__BooleanComparison").stdout)
        for name, words in (("getRequest", "several classes"), ("nothing\x1b", 'no class has the name "nothing?"'), ("", "CLASS")):
            run = zuv.run("new", name)
            self.assertEqual(run.returncode, 2)
            self.assertIn(words, run.stderr)

    def refuses(self, rows, *options):
        for document, *words in rows:
            with self.subTest(document=document[-80:]):
                run = check(document, *options)
                self.assertEqual((run.returncode, run.stdout), (3, ""))
                for one in words:
                    self.assertIn(one, run.stderr)

    def test_what_is_wrong_is_reported_with_its_place(self):
        rows = (
            ("<p:state>activ</p:state>", "2:1: <p:state> should be one of active, "),
            ("<c:identity/>\n <c:identity/>", "3:2: <c:identity> is here a second time"),
            ("<c:state/>", "2:1: <c:state> is no member of protocolProfile:ProfileContent; its namespace should be that of protocolProfile:state"),
            ("<p:nothing>\u00e9</p:nothing>", "2:1: <p:nothing> is no member"),
            ("\u00e9\u00e9", "1:"),
            ("<c:contact>\u00e9<c:name/></c:contact>", "2:12: text where protocol:Contact has members"),
            ("<c:contact><c:name><b/></c:name></c:contact>", "2:20: <c:name> holds text, not elements"),
            ('<c:contact odd="1"/>', '2:1: <c:contact> has no attribute "odd"'),
            ('<c:contact xsi:type="c:Address"/>', '2:1: xsi:type="c:Address" is no class derived from protocol:Contact'),
            ("<c:credentials><c:expiration>soon</c:expiration></c:credentials>", "<c:expiration> should be a date and time"),
            ("<c:credentials><c:key>a</c:key></c:credentials>", "<c:key> should be bytes in base64"),
            ("<c:contact>", "not well-formed XML"),
            ("<p:profile>" * 1100 + "</p:profile>" * 1100, "more than 1000 elements within each other"),
        )
        self.refuses((ROOT + content + "</p:ProfileContent>", "standard input:", words) for content, words in rows)
        run = check(ROOT + "<p:odd/>\n" * 500 + "</p:ProfileContent>")
        self.assertEqual(run.stderr.count("\n"), 100)

    def test_json_that_is_no_document_of_the_class_is_refused_with_its_place(self):
        rows = (
            ('{"identity": {"nme": "x"}}', '/identity: "nme" is no member of protocol:Identity; did you mean "name"?'),
            ('{"state": 5}', "/state: should be one of active, "),
            ('{"contact": [{}, {"@type": "protocol:Adress"}]}', "/contact/1/@type: should name protocol:Contact"),
            ('{"contact": [5], "@odd": "1"}', "/contact/0: should be an object"),
            ('{"identity": [{}]}', "/identity: should be one value, not an array"),
            ('{"identity": {}, "identity": {}}', '"identity" is twice'),
            ('{"credentials": [{"expiration": 1}]}', "/credentials/0/expiration: should be a date and time"),
            ('{"contact": {"name": "\\u0001"}}', "/contact/name: a control character"),
            ('{"contact": {"name": {"text": "a", "x": 1}}}', '"x" is no member'),
            ('{"identity": {"@nil": "yes"}}', "/identity/@nil: should be true or false"),
            ('{"state": null,', "not JSON: parse error at line 1"),
            ('{"profile": [' * 600 + "]}" * 600, "more than 500 objects within each other"),
        )
        self.refuses(rows, "--class", "ProfileContent")
        self.assertIn("give it by --class", check("{}").stderr)
        good = '{"state": null, "contact": {"name": "x"}, "credentials": [{"key": {"@href": "cid:1"}}]}'
        self.assertEqual(check(good, "--class", "ProfileContent").returncode, 0)

    def test_what_is_right_passes_in_every_guise(self):
        content = ('<c:credentials><c:certificate>AQ ==</c:certificate><c:expiration> 2024-02-29T24:00:00.5+01:00 </c:expiration>'
                   '</c:credentials><p:state xsi:nil="true"/>')
        message = ('<E:Envelope xmlns:E="http://www.w3.org/2003/05/soap-envelope" xmlns:p="%s" xmlns:c="%s"><E:Header><c:header>'
                   '<c:targetURI>u</c:targetURI></c:header></E:Header><E:Body><p:setRequest>%s</p:setRequest></E:Body></E:Envelope>')
        for xml, options, type_ in (
                (ROOT + content + "</p:ProfileContent>", [], "protocolProfile:ProfileContent"),
                (ROOT.replace("ProfileContent", "setRequest") + content + "</p:setRequest>", [], "protocolProfile:ProfileContent"),
                ('<x xmlns="%s"><city>Graz</city></x>' % zuv.COMMON, ["--class", "address"], "protocol:Address"),
                (message % (zuv.PROFILE, zuv.COMMON, ""), [], "a SOAP message")):
            with self.subTest(xml=xml):
                run = check(xml, *options)
                self.assertEqual((run.returncode, run.stderr), (0, ""))
                self.assertIn(type_, run.stdout)
        wrong = check(message % (zuv.PROFILE, zuv.COMMON, "<p:odd/>"))
        self.assertIn("<p:odd> is no member", wrong.stderr)
        self.assertEqual(check("<x/>").returncode, 3)
        self.assertIn("it has no namespace (xmlns), protocolProfile:ProfileContent has", check("<ProfileContent/>").stderr)

    def test_the_library_s_examples_of_messages_are_what_the_contract_allows(self):
        seeds = glob.glob(os.path.join(zuv.SOURCE, "tests", "fuzz", "corpus", "*", "*"))
        for path in seeds:  # no input ends it otherwise
            run = zuv.run("check", "-", given=pathlib.Path(path).read_bytes(), text=False)
            self.assertIn(run.returncode, (0, 3), (path, run))

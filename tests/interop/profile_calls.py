"""Calls of a Profile service by zuv, a host of the library like any other: the profile that is sent, and what has to come back."""
import json
import subprocess

NAMESPACES = 'xmlns="http://www.zuv.example/xmlns/b2b/zuv/v1.0" xmlns:p="http://www.zuv.example/xmlns/b2b/zuv/v1.0/Profile"'
# Text beyond ASCII and markup, bytes, lists, enumerations, a profile in the profile.
CREDENTIALS = "<credentials><username>zoe</username><certificate>AAH+/w==</certificate></credentials>"
SAMPLE = """<p:ProfileContent %s>%%s
<identity><type>organization</type><name>Zo\u00eb &amp; &lt;co&gt; \U0001f6e0</name></identity>
<contact><name>Zo\u00eb</name><address><addressType>billing</addressType><city>Graz</city></address>
<email>zoe@workshop.example</email><email>second@workshop.example</email></contact>%s
<p:profile><identity><name>inner</name></identity></p:profile></p:ProfileContent>""" % (NAMESPACES, CREDENTIALS)
HELD = {
    "identity": {"type": "organization", "name": "Zo\u00eb & <co> \U0001f6e0"},
    "contact": [{"name": "Zo\u00eb", "address": [{"addressType": "billing", "city": "Graz"}],
                 "email": ["zoe@workshop.example", "second@workshop.example"]}],
    "credentials": [{"username": "zoe", "certificate": "AAH+/w=="}],
    "profile": [{"identity": {"name": "inner"}}],
}
LIMIT_S = 120
NO_SUCH_DOCUMENT = 8  # the exit status of a call that the service refuses


class Profiles:
    """A Profile service at an address; options go with every call."""

    def __init__(self, program, endpoint, *options):
        self.command, self.options, self.uri = [program, "profile"], ["-e", endpoint, "--json", *options], None

    def run(self, operation, *options, given=None):
        about = ["-t", self.uri] if self.uri else []
        return subprocess.run([*self.command, operation, *(["-"] if given else []), *about, *self.options, *options],
                              input=given, capture_output=True, text=True, timeout=LIMIT_S)

    def call(self, operation, *options, given=None, **different):
        """The answer, which has the document's name and holds what was sent but for members given as `different`."""
        run = self.run(operation, *options, given=given)
        assert run.returncode == 0, (operation, self.options, run.stderr)
        answer = json.loads(run.stdout)
        self.uri = self.uri or answer["thisURI"][0]
        expected = {"thisURI": [self.uri], **HELD, **different}
        assert {name: answer.get(name) for name in expected} == expected, (operation, answer)
        return answer

    def expect_not_found(self):
        run = self.run("get")
        assert run.returncode == NO_SUCH_DOCUMENT and "uri: " + self.uri in run.stderr, run

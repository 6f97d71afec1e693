#!/usr/bin/python3
"""An independent SOAP toolkit calls the Profile port of zuv-service, knowing nothing but the WSDL.

Usage: zeep_profile.py ZUV_SERVICE SCHEMA_DIR. Every request and every answer is validated against the published schemas.
"""
import os
import sys

import zeep
from lxml import etree

import messages
import zuv_service


class Recorder(zeep.Plugin):
    """Keeps what the schemas describe in each message."""

    def __init__(self):
        self.elements = []

    def egress(self, envelope, http_headers, operation, binding_options):
        self.elements += messages.parts(envelope)
        return envelope, http_headers

    def ingress(self, envelope, http_headers, operation):
        self.elements += messages.parts(envelope)
        return envelope, http_headers


def call_all(wsdl, address, soap12):
    recorder = Recorder()
    client = zeep.Client(wsdl, plugins=[recorder])
    binding = "{%s}%s" % (messages.PROFILE, "ProfileSoap12Binding" if soap12 else "ProfileSoapBinding")
    service = client.create_service(binding, address + zuv_service.PATH)
    header = client.get_element("{%s}header" % messages.COMMON)

    def call(operation, uri=None, **content):
        block = header(targetURI=uri, transactionId="transaction-" + operation)
        answer = service[operation](_soapheaders={"header": block}, **content)
        assert answer.header.header.transactionId == "transaction-" + operation, answer
        return answer.body

    created = call("create", identity={"name": "Zoë's workshop", "type": "organization"},
                   contact=[{"name": "Zoë", "email": ["zoe@workshop.example"]}],
                   credentials=[{"username": "zoe", "certificate": b"\0\1\xfe\xff"}],
                   profile=[{"identity": {"name": "inner"}}])
    uri = created.thisURI[0]
    assert created.state == "active", created

    got = call("get", uri)
    assert got.identity.name == "Zoë's workshop" and got.identity.type == "organization", got
    assert got.contact[0].email == ["zoe@workshop.example"], got
    assert got.credentials[0].certificate == b"\0\1\xfe\xff", got
    assert got.profile[0].identity.name == "inner", got

    changed = call("set", uri, identity={"name": "Zoë & co"}, contact=[{"name": "first"}],
                   credentials=[{"username": "zoe"}])
    assert changed.identity.name == "Zoë & co" and changed.thisURI == [uri] and not changed.profile, changed
    added = call("add", uri, contact=[{"name": "second"}])
    assert [contact.name for contact in added.contact] == ["first", "second"], added
    fresh = call("refreshCredentials", uri, credentials={"username": "zoe"})
    assert [one.state for one in fresh.credentials] == ["valid"] and fresh.credentials[0].token, fresh
    removed = call("remove", uri)
    assert removed.thisURI == [uri] and removed.state == "closed", removed
    expect_not_found(client, lambda: call("get", uri), uri, soap12)
    return recorder.elements


def expect_not_found(client, call, uri, soap12):
    try:
        call()
    except zeep.exceptions.Fault as fault:
        assert fault.message and etree.QName(fault.detail).localname == ("Detail" if soap12 else "detail"), fault
        typed = client.get_element("{%s}Client.ObjectNotFound" % messages.COMMON).parse(
            fault.detail[0], client.wsdl.types)
        assert typed.uri == [uri], typed
    else:
        raise AssertionError("a removed profile was found")


def main():
    program, schemas = sys.argv[1:]
    wsdl = os.path.join(schemas, "profile", "Profile.wsdl")
    with zuv_service.running(program) as address:
        for soap12 in (False, True):
            elements = call_all(wsdl, address, soap12)
            assert len(elements) == 28, "seven calls, a header block and the content each way, not %d" % len(elements)
            messages.validate(schemas, elements)
            print("SOAP 1.%d: 6 operations and a fault, %d elements valid" % (2 if soap12 else 1, len(elements)))


if __name__ == "__main__":
    main()

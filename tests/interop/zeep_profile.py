#!/usr/bin/python3
"""An independent SOAP toolkit calls the Profile port of zuv-service, knowing nothing but the WSDL.

Usage: zeep_profile.py ZUV_SERVICE SCHEMA_DIR. Every request and every answer is validated against the published schemas.
"""
import os
import subprocess
import sys
import tempfile

import zeep
from lxml import etree

import zuv_service

PROFILE = "{http://www.zuv.example/xmlns/b2b/zuv/v1.0/Profile}"
COMMON = "{http://www.zuv.example/xmlns/b2b/zuv/v1.0}"


class Recorder(zeep.Plugin):
    """Keeps the Body's child of each message."""

    def __init__(self):
        self.bodies = []

    def keep(self, envelope):
        body = next(child for child in envelope if etree.QName(child).localname == "Body")
        if len(body) and etree.QName(body[0]).localname != "Fault":
            self.bodies.append(etree.tostring(body[0]))

    def egress(self, envelope, http_headers, operation, binding_options):
        self.keep(envelope)
        return envelope, http_headers

    def ingress(self, envelope, http_headers, operation):
        self.keep(envelope)
        return envelope, http_headers


def call_all(wsdl, address, soap12):
    recorder = Recorder()
    client = zeep.Client(wsdl, plugins=[recorder])
    binding = PROFILE + ("ProfileSoap12Binding" if soap12 else "ProfileSoapBinding")
    service = client.create_service(binding, address + "/zuv/v1.0/services/Profile")
    header = client.get_element(COMMON + "header")

    created = service.create(state="active", identity={"name": "Zoë's workshop"},
                             contact=[{"name": "Zoë", "email": ["zoe@workshop.example"]}],
                             credentials=[{"username": "zoe"}])
    created = getattr(created, "body", created)
    uri = created.thisURI[0]
    target = {"header": header(targetURI=uri)}

    def body(answer):
        return getattr(answer, "body", answer)

    got = body(service.get(_soapheaders=target))
    assert got.identity.name == "Zoë's workshop", got
    assert got.contact[0].email == ["zoe@workshop.example"], got
    changed = body(service.set(identity={"name": "Zoë & co"}, _soapheaders=target))
    assert changed.identity.name == "Zoë & co" and changed.thisURI == [uri], changed
    added = body(service.add(contact=[{"name": "second"}], _soapheaders=target))
    assert [c.name for c in added.contact][-1] == "second", added
    fresh = body(service.refreshCredentials(credentials={"username": "zoe"}, _soapheaders=target))
    assert fresh.credentials[-1].token and fresh.credentials[-1].state == "valid", fresh
    removed = body(service.remove(_soapheaders=target))
    assert removed.thisURI == [uri], removed
    try:
        service.get(_soapheaders=target)
    except zeep.exceptions.Fault as fault:
        detail = etree.tostring(fault.detail).decode()
        assert "Client.ObjectNotFound" in detail and uri in detail, detail
    else:
        raise AssertionError("a removed profile was found")
    return recorder.bodies


def validate(schema, bodies):
    with tempfile.TemporaryDirectory() as folder:
        names = []
        for number, body in enumerate(bodies):
            names.append(os.path.join(folder, "%d.xml" % number))
            with open(names[-1], "wb") as file:
                file.write(body)
        subprocess.run(["xmllint", "--noout", "--nonet", "--schema", schema, *names], check=True, capture_output=True)


def main():
    program, schemas = sys.argv[1:]
    wsdl = os.path.join(schemas, "profile", "Profile.wsdl")
    with zuv_service.running(program) as address:
        for soap12 in (False, True):
            bodies = call_all(wsdl, address, soap12)
            assert len(bodies) == 13, "six requests with answers, and one that ended in a fault"
            validate(os.path.join(schemas, "profile", "profile.xsd"), bodies)
            print("SOAP 1.%d: 6 operations and a fault, %d messages valid" % (2 if soap12 else 1, len(bodies)))


if __name__ == "__main__":
    main()

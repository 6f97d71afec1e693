#!/usr/bin/python3
"""An independent SOAP toolkit calls every operation of zuv-service, knowing nothing but the WSDLs: for SOAP 1.1 the files, for
SOAP 1.2 what the service itself hands out at the address of the port, which gives the port's address too.

Usage: zeep_ports.py ZUV_SERVICE SCHEMA_DIR. Every request and every answer is validated against the published schemas.
"""
import sys
import urllib.request

import zeep
from lxml import etree

import messages
import zuv_service


class Peer(zeep.Plugin):
    """A port in one of its two bindings. Keeps what the schemas describe in each message."""

    def __init__(self, schemas, port, address, soap12):
        self.elements, self.called, self.count, self.soap12 = [], set(), 0, soap12
        endpoint = address + messages.service_path(port)
        self.client = zeep.Client(endpoint + "?wsdl" if soap12 else messages.wsdl(schemas, port), plugins=[self])
        self.namespace = messages.namespace(port)
        self.service = (self.client.bind(port, port + "Soap12") if soap12 else
                        self.client.create_service("{%s}%sSoapBinding" % (self.namespace, port), endpoint))
        self.header = self.client.get_element("{%s}header" % messages.COMMON)

    def egress(self, envelope, http_headers, operation, binding_options):
        self.elements += messages.parts(envelope)
        return envelope, http_headers

    def ingress(self, envelope, http_headers, operation):
        self.elements += messages.parts(envelope)
        return envelope, http_headers

    def call(self, operation, uri=None, state=None, **content):
        """The answer's content; its document has to be in the state."""
        self.count += 1
        self.called.add(operation)
        block = self.header(targetURI=uri, transactionId="transaction-%d" % self.count)
        answer = self.service[operation](_soapheaders={"header": block}, **content)
        assert answer.header.header.transactionId == "transaction-%d" % self.count, answer
        assert state is None or answer.body.state == state, answer
        assert uri is None or answer.body.thisURI == [uri], answer
        return answer.body

    def make(self, type_name, **content):
        """A value of a type of the port, which goes out with its name."""
        return self.client.get_type("{%s}%s" % (self.namespace, type_name))(**content)

    def expect_not_found(self, uri):
        try:
            self.call("get", uri)
        except zeep.exceptions.Fault as fault:
            assert fault.message and etree.QName(fault.detail).localname == ("Detail" if self.soap12 else "detail"), fault
            typed = self.client.get_element("{%s}Client.ObjectNotFound" % messages.COMMON).parse(
                fault.detail[0], self.client.wsdl.types)
            assert typed.uri == [uri], typed
        else:
            raise AssertionError("a removed document was found")


def profile(peer):
    created = peer.call("create", state="active", identity={"name": "Zoë's workshop", "type": "organization"},
                        contact=[{"name": "Zoë", "email": ["zoe@workshop.example"]}],
                        credentials=[{"username": "zoe", "certificate": b"\0\1\xfe\xff"}],
                        profile=[{"identity": {"name": "inner"}}])
    uri = created.thisURI[0]

    got = peer.call("get", uri)
    assert got.identity.name == "Zoë's workshop" and got.identity.type == "organization", got
    assert got.contact[0].email == ["zoe@workshop.example"], got
    assert got.credentials[0].certificate == b"\0\1\xfe\xff", got
    assert got.profile[0].identity.name == "inner", got

    changed = peer.call("set", uri, identity={"name": "Zoë & co"}, contact=[{"name": "first"}],
                        credentials=[{"username": "zoe"}])
    assert changed.identity.name == "Zoë & co" and not changed.profile, changed
    added = peer.call("add", uri, contact=[{"name": "second"}])
    assert [contact.name for contact in added.contact] == ["first", "second"], added
    fresh = peer.call("refreshCredentials", uri, credentials={"username": "zoe"})
    assert [one.state for one in fresh.credentials] == ["valid"] and fresh.credentials[0].token, fresh
    peer.call("remove", uri, "closed")
    return uri


def inventory_report(peer):
    first = peer.call("submit", state="processing", subject={"product": "ZX100"},
                      attachment=[{"description": "still to come", "state": "pending"}]).thisURI[0]
    peer.call("cancel", first, "cancelled")
    uri = peer.call("submit", state="complete", clientURI="urn:mine:1", test=True, dateTime="2024-02-29T12:00:00Z",
                    reportingPeriod="P1D", contact=[{"name": "Zoë"}], inventoryReport=[{"clientURI": "inner"}]).thisURI[0]
    got = peer.call("get", uri, "complete")
    assert got.test is True and got.dateTime.isoformat() == "2024-02-29T12:00:00+00:00", got
    assert got.reportingPeriod.days == 1 and got.inventoryReport[0].clientURI == "inner", got
    peer.call("close", uri, "closed")
    peer.call("remove", uri, "closed")
    return uri


def update_order(peer):
    accepted = peer.call("authenticate", credentials={"username": "ada", "password": "sesame"})
    assert accepted.success is True and accepted.credentials.state == "valid", accepted
    refused = peer.call("authenticate", credentials={"username": "ada", "password": "x"},
                        authenticateRequest=[{"credentials": {"username": "ada", "password": "sesame"}}])
    assert refused.success is False and refused.authenticateResponse[0].success is True, refused
    assert type(refused.error[0]).__name__ == "Client.Authentication.CredentialsMismatch", refused

    order = {"updateId": ["FW-120", "NONE-1"], "includeRequisites": True, "includeMetaData": True,
             "includeUpdateIdExpansionDetail": True, "includeData": True, "includeOperatingPlatforms": False,
             "includeSupersedes": False}
    found = peer.call("submit", state="complete.available.partial", **order)
    uri = found.thisURI[0]
    assert found.updateIdExpansion == ["FW-120", "BIOS-20", "DRV-5"], found
    firmware, *_, unknown = found.updateIdExpansionDetail
    assert type(firmware.metaData[0]).__name__ == "UpdateMetaData", firmware
    assert [type(one).__name__ for one in firmware.metaData[0].requisite] == ["Prerequisite", "Corequisite"], firmware
    assert type(unknown.error).__name__ == "Client.ObjectNotFound" and unknown.error.uri == ["NONE-1"], unknown
    with urllib.request.urlopen(found.attachment[0].dataURI, timeout=60) as data:
        assert len(data.read()) == int(found.attachment[0].size), found.attachment[0]
    assert peer.call("get", uri).updateIdExpansion == found.updateIdExpansion
    second = peer.call("submit", **order).thisURI[0]
    peer.call("cancel", second, "cancelled")
    peer.call("close", uri, "closed")
    peer.call("remove", uri, "closed")
    return uri


def attach(peer, uri, state):
    """Adds data through a data port, and says that it is there."""
    attached = peer.call("attach", uri, state, attachment={"description": "log"},
                         dataPortPreference={"transport": ["HTTP"], "direction": ["in"]}).attachment[0]
    port, = attached.dataPort
    assert attached.state == "pending" and port.attachmentURI == attached.thisURI, attached
    assert type(port.transportDetail[0].exchange[0]).__name__ == "HttpPost", port
    with urllib.request.urlopen(port.dataURI, data=b"bytes", timeout=60) as answer:
        assert answer.status == 200
    noted = peer.call("attachStatus", uri, attachmentURI=attached.thisURI, percentComplete=100.0, sizeTransferred=5)
    assert noted.attachment[0].state == "complete" and noted.attachment[0].size == 5, noted


def status_report(peer):
    reason = peer.make("Reason.Event.Component.Changed", description="new", component={"serialNumber": "4711"})
    uri = peer.call("create", state="open", reason=[reason], subject={"name": "Zoë's array"}).thisURI[0]
    got = peer.call("get", uri, "open")
    assert type(got.reason[0]).__name__ == "Reason.Event.Component.Changed", got
    assert got.reason[0].component.serialNumber == "4711" and got.subject.name == "Zoë's array", got
    attach(peer, uri, "open")
    peer.call("submit", uri, "complete", reason=[reason])
    peer.call("close", uri, "closed")
    second = peer.call("create", state="open").thisURI[0]
    peer.call("cancel", second, "cancelled")
    peer.call("remove", uri, "closed")
    return uri


def problem_report(peer):
    tried = peer.make("Action.Update.Install.Permanent", description="tried", timing="afterProblemOccurrence",
                      result=["noChange", "problemManifest", "noChange"], updateInformation=[{"updateId": "DB-10"}])
    submitted = peer.call("submit", state="open", title="deadlock & rollback", problemDescription="with FW-120",
                          problemType=["intermittent", "other"], severity=2, actionTaken=[tried])
    uri = submitted.thisURI[0]
    noted, proposed, *_ = submitted.answer
    assert type(noted).__name__ == "Answer.Server.Administration.Acknowledgment", noted
    assert type(proposed).__name__ == "Answer.Server.Action" and type(proposed.action).__name__ == "Action.Update.Install"
    attach(peer, uri, "open")
    got = peer.call("get", uri, "open")
    assert got.title == "deadlock & rollback" and got.problemType == ["intermittent", "other"] and got.severity == 2, got
    assert type(got.actionTaken[0]).__name__ == "Action.Update.Install.Permanent", got
    assert got.actionTaken[0].result == ["noChange", "problemManifest", "noChange"], got
    assert got.actionTaken[0].updateInformation[0].updateId == "DB-10", got
    peer.call("remove", uri, "closed")
    return uri


WALKS = {"Profile": profile, "InventoryReport": inventory_report, "UpdateOrder": update_order,
         "StatusReport": status_report, "ProblemReport": problem_report}


def main():
    program, schemas = sys.argv[1:]
    with zuv_service.running(program, "--account", "ada:sesame") as address:
        for port in messages.PORTS:
            for soap12 in (False, True):
                peer = Peer(schemas, port, address, soap12)
                peer.expect_not_found(WALKS[port](peer))
                assert peer.called == messages.operations(schemas, port), peer.called
                assert len(peer.elements) == 4 * peer.count, "a header block and the content each way, not %d" % len(peer.elements)
                messages.validate(schemas, [port], peer.elements)
                print("%s, SOAP 1.%d: %d operations and a fault, %d elements valid"
                      % (port, 2 if soap12 else 1, len(peer.called), len(peer.elements)))


if __name__ == "__main__":
    main()

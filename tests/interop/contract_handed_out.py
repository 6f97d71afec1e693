#!/usr/bin/python3
"""The contract as a stranger's toolkit meets it: every link that zuv-service writes is answered as it is, and every
operation is answered with the faults that its WSDL declares, and with no others.

Usage: contract_handed_out.py ZUV_SERVICE SCHEMA_DIR
"""
import glob
import os
import re
import sqlite3
import sys
import tempfile
import urllib.request

import zeep
from lxml import etree

import by_hand
import listening
import messages
from by_hand import target

WSDL = "{http://schemas.xmlsoap.org/wsdl/}"
MAX_BODY = 60000  # bytes; small, so that documents soon are too large
# For services that say less than this one, or other faults.
UNUSED = {"Client", "Client.Authentication", "Server", "Server.ServiceUnavailable"}
# Answered only where memory is short, and to a binary value next to the message.
RARE = {("UpdateOrder", "authenticate", "Server.Processing"), ("Profile", "refreshCredentials", "Client.InvalidInformation")}


def fetched(url):
    with urllib.request.urlopen(url, timeout=60) as answer:
        return answer.headers["Content-Type"], answer.read()


def without_links(text):
    return re.sub(rb'(schemaLocation|:address location)="[^"]*"', rb"\1", text)


def check_links(schemas, address):
    """From each way to a WSDL to all that it leads to; every file of the contract is reached, and is what it is."""
    ports = [address + messages.service_path(port) for port in messages.PORTS]
    waiting = [port + query for port in ports for query in ("?wsdl", "?WSDL", "?Wsdl", "")] + [address + "/?wSDL", address + "/"]
    seen = {}
    while waiting:
        url = waiting.pop()
        if url in seen:
            continue
        assert re.fullmatch(re.escape(address) + r"(/[\w-]+(\.[\w-]+)*)*/?(\?wsdl)?", url, re.I), url
        kind, seen[url] = fetched(url)
        assert kind == ("text/html" if url == address + "/" else "text/xml") + "; charset=utf-8", (url, kind)
        waiting += [link.decode() for link in re.findall(rb'(?:[lL]ocation|href)="([^"]*)"', seen[url])]
    for name in glob.glob("*/*.xsd", root_dir=schemas) + glob.glob("*/*.wsdl", root_dir=schemas):
        with open(os.path.join(schemas, name), "rb") as file:
            assert without_links(seen[address + "/zuv/v1.0/contract/" + name]) == without_links(file.read()), name
    assert set(zeep.Client(address + "/?WSDL").wsdl.services) == set(messages.PORTS)
    return len(seen)


def declared(schemas, port):
    """The faults of each operation, which port type and bindings name alike."""
    root, found = etree.parse(messages.wsdl(schemas, port)).getroot(), {}
    for operation in root.iter(WSDL + "operation"):
        names = [fault.get("name") for fault in operation.findall(WSDL + "fault")]
        assert len(names) == len(set(names)), (port, operation.get("name"))
        for fault in operation.findall(WSDL + "fault"):
            named = fault.get("message") or fault[0].get("name")
            assert named.rpartition(":")[2] == fault.get("name"), (port, named)
        assert found.setdefault(operation.get("name"), set(names)) == set(names), (port, operation.get("name"))
    for message in root.findall(WSDL + "message"):
        if "Request" not in message.get("name")[-9:] and message[0].get("name") == "detail":
            assert message[0].get("element") == "protocol:" + message.get("name"), message.get("name")
    return found


class Caller:
    """Writes requests to one port by hand."""

    def __init__(self, address, port):
        self.address, self.port, self.answered = address, port, {}

    def send(self, *request):
        return etree.fromstring(by_hand.call(self.address, self.port, *request).body)

    def refused(self, fault, operation, *request):
        entries = [etree.QName(one).localname for one in messages.parts(self.send(operation, *request))]
        assert entries[-1:] == [fault], "%s.%s: %s for %s" % (self.port, operation, entries, fault)
        self.answered.setdefault(operation, set()).add(fault)

    def name_in(self, kind, *request):
        """The first name of something of the kind in the answer."""
        return re.search(r"urn:zuv:%s:[\w-]+" % kind.lower(), etree.tostring(self.send(*request)).decode())[0]


def chain(tag):
    """Two deep elements, one of which goes on in the other: too deep for a document."""
    deep, end = 300 * ("<%s>" % tag), 300 * ("</%s>" % tag)
    return '%s<%s href="#a"/>%s<%s id="a">%s%s</%s>' % (deep, tag, end, tag, deep, end, tag)


LONG = "x" * 8000
CREDENTIALS = "<credentials><c:username>%s</c:username></credentials>" % LONG
ATTACH = "<attachment>%s</attachment>"
PROGRESS = ("<c:attachmentURI>%s</c:attachmentURI><c:problemEncountered>true</c:problemEncountered><c:description>" + LONG +
            "</c:description>")
PREFERENCE = "<dataPortPreference><c:transport>FTP</c:transport></dataPortPreference>"
ORDER = "<updateId>FW-100</updateId>"
NESTED = "<inclusionFilter>" + "".join('<f:%s xsi:type="f:Not">' % one for one in ["expression"] + 119 * ["operand"]) + \
    119 * "</f:operand>" + "</f:expression></inclusionFilter>"
ENDLESS = '<authenticateRequest id="a"><authenticateRequest href="#a"/></authenticateRequest>'


def refusals(port, operation, small, large, attachment, ended):
    """(fault, content, header) of what the operation refuses. The large document grows too large with what is added."""
    made = operation in ("create", "submit", "set", "add")
    content = {"refreshCredentials": CREDENTIALS, "attach": ATTACH % "", "attachStatus": PROGRESS % attachment,
               "submit": ORDER if port == "UpdateOrder" else ""}.get(operation, "")
    yield "Client.Authentication.CredentialsExpired", content, "<c:credentials><c:state>expired</c:state></c:credentials>"
    yield "Client.MalformedRequest", content, "<c:credentials><c:state>gone</c:state></c:credentials>"
    reports = operation == "submit" and port in ("StatusReport", "InventoryReport")
    if operation not in ("create", "submit", "authenticate") or reports:
        yield "Client.InsufficientInformation", content, target("")
        yield "Client.ObjectNotFound", content, target("urn:none")
    if made:
        many, deep = ("<c:contact/>", "profile") if port == "Profile" else ("<c:attachment/>", "c:attachment")
        yield "Server.DataTooLarge", content + 3000 * many, "" if operation in ("create", "submit") else target(large)
        yield "Client.InvalidInformation", content + chain(deep), "" if operation in ("create", "submit") else target(small)
    if operation == "attach":
        yield "Client.InvalidInformation", ATTACH % chain("c:attachment"), target(small)
        yield "Server.DataTooLarge", ATTACH % "<c:description>%s</c:description>" % LONG, target(large)
        yield "Client.DataPortIncompatibility", content + PREFERENCE, target(small)
    if operation in ("refreshCredentials", "attachStatus"):
        yield "Server.DataTooLarge", content, target(large)
    if operation in ("close", "cancel") or reports or (port, operation) == ("StatusReport", "attach"):
        yield "Client.InvalidRequest", content, target(ended)
    if (port, operation) == ("UpdateOrder", "submit"):
        yield "Client.InsufficientInformation", "", ""
        yield "Client.InvalidRequest", content + 101 * "<deliveryPreference/>", ""
        yield "Server.UnsupportedRequest.FilterExpressionTooComplex", content + NESTED, ""
    if operation == "authenticate":
        yield "Client.InvalidRequest", ENDLESS, ""
    else:
        yield "Server.Processing", content, "" if operation in ("create", "submit") else target(small)


def check_faults(schemas, address, database):
    callers = {port: Caller(address, port) for port in messages.PORTS}
    broken = []  # what takes a broken database comes last
    for port, caller in callers.items():
        operations = declared(schemas, port)
        make, first = "create" if "create" in operations else "submit", ORDER if port == "UpdateOrder" else ""
        text = "<c:contact><c:name>%s</c:name></c:contact>" if port == "Profile" else \
            "<c:attachment><c:description>%s</c:description></c:attachment>"
        large, small, ended = (caller.name_in(port, make, first + text % ("x" * size)) for size in (MAX_BODY - 4000, 0, 0))
        attachment = caller.name_in("attachment", "attach", ATTACH % "", target(large)) if "attach" in operations else ""
        if "close" in operations:
            caller.send("close", "", target(ended))
        for operation in operations:
            for fault, *request in refusals(port, operation, small, large, attachment, ended):
                if fault == "Server.Processing":
                    broken.append((caller, fault, operation, *request))
                else:
                    caller.refused(fault, operation, *request)
    with sqlite3.connect(database) as connection:
        connection.execute("UPDATE document SET xml = x'3c'")
        connection.execute("CREATE TRIGGER full BEFORE INSERT ON document BEGIN SELECT RAISE(FAIL, 'no space'); END")
    for caller, *refusal in broken:
        caller.refused(*refusal)
    for port, caller in callers.items():
        for operation, names in declared(schemas, port).items():
            rare = {fault for where, what, fault in RARE if (where, what) == (port, operation)}
            assert caller.answered[operation] == names - UNUSED - rare, \
                "%s.%s: %s" % (port, operation, caller.answered[operation] ^ (names - UNUSED - rare))
    return sum(map(len, (names for caller in callers.values() for names in caller.answered.values())))


def main():
    program, schemas = sys.argv[1:]
    with tempfile.TemporaryDirectory() as folder:
        database = os.path.join(folder, "zuv.db")
        with listening.started([program, "--port", "0", "--database", database, "--max-body", str(MAX_BODY)]) as address:
            print("%d documents of the contract, each link answered" % check_links(schemas, address))
            print("%d faults, each declared" % check_faults(schemas, address, database))


if __name__ == "__main__":
    main()

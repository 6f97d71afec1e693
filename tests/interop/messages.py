"""Splits SOAP messages, and holds what is in them against the published schemas."""
import copy
import os
import pathlib
import re
import subprocess
import tempfile

from lxml import etree

COMMON = "http://www.zuv.example/xmlns/b2b/zuv/v1.0"
PORTS = ("Profile", "InventoryReport", "UpdateOrder", "StatusReport", "ProblemReport")


def namespace(port):
    return "%s/%s" % (COMMON, port)


def service_path(port):
    return "/zuv/v1.0/services/" + port


def wsdl(schemas, port):
    return os.path.join(schemas, port.lower(), port + ".wsdl")


def operations(schemas, port):
    """The names of a port's operations."""
    return set(etree.parse(wsdl(schemas, port)).xpath("//*[local-name() = 'portType']/*/@name"))


def parts(envelope):
    """The elements of a message that the schemas describe: header block, Body's child, entries of a fault's detail."""
    found = []
    for part in envelope:
        for child in part:
            if etree.QName(child).localname == "Fault":
                found.extend(entry for element in child.iter() if etree.QName(element).localname in ("detail", "Detail")
                             and element.getparent() is child for entry in element)
            else:
                found.append(child)
    return found


def _body(head, rest):
    """The body that begins `rest`, and what follows it."""
    if not re.search(rb"\r\nTransfer-Encoding: chunked", head):
        length = int(re.search(rb"\r\nContent-Length: (\d+)", head)[1])
        return rest[:length], rest[length:]
    body = b""
    while True:
        size, _, rest = rest.partition(b"\r\n")
        length = int(size, 16)
        body, rest = body + rest[:length], rest[length + 2:]
        if length == 0:
            return body, rest


def in_trace(path):
    """The SOAP messages in a file of HTTP requests, of answers, or of both in turn."""
    rest = pathlib.Path(path).read_bytes()
    while rest:
        head, _, rest = rest.partition(b"\r\n\r\n")
        body, rest = _body(head, rest)
        if body and re.search(rb"\r\nContent-Type: (text/xml|application/soap\+xml)", head):
            yield etree.fromstring(body)


def _schema_of(schemas, ports):
    """A schema that takes in what the types of the ports' WSDLs do, and no more."""
    lines = set()
    for port in ports:
        for one in etree.parse(wsdl(schemas, port)).iter("{http://www.w3.org/2001/XMLSchema}import"):
            location = os.path.realpath(os.path.join(os.path.dirname(wsdl(schemas, port)), one.get("schemaLocation")))
            lines.add('<xsd:import namespace="%s" schemaLocation="%s"/>' % (one.get("namespace"), location))
    return '<xsd:schema xmlns:xsd="http://www.w3.org/2001/XMLSchema">%s</xsd:schema>' % "".join(sorted(lines))


def _without_envelope_attributes(element):
    """A copy without mustUnderstand and its like, which a header block bears for the envelope."""
    envelope = etree.QName(element.getroottree().getroot()).namespace
    lone = copy.deepcopy(element)
    for name in [name for name in lone.attrib if etree.QName(name).namespace == envelope]:
        del lone.attrib[name]
    return lone


def validate(schemas, ports, elements):
    """Lets xmllint validate each element as a document of its own; raises AssertionError with its words."""
    with tempfile.TemporaryDirectory() as folder:
        schema = os.path.join(folder, "ports.xsd")
        pathlib.Path(schema).write_text(_schema_of(schemas, ports), "utf-8")
        names = [os.path.join(folder, "%d.xml" % number) for number in range(len(elements))]
        for name, element in zip(names, elements):
            pathlib.Path(name).write_bytes(etree.tostring(_without_envelope_attributes(element), with_tail=False))
        run = subprocess.run(["xmllint", "--noout", "--nonet", "--schema", schema, *names], capture_output=True, text=True)
        assert run.returncode == 0, [line for line in run.stderr.splitlines() if not line.endswith(" validates")]

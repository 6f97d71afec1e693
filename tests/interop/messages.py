"""Takes SOAP messages apart, and holds what is in them against the published schemas."""
import os
import re
import subprocess
import tempfile

from lxml import etree

PROFILE = "http://www.zuv.example/xmlns/b2b/zuv/v1.0/Profile"
COMMON = "http://www.zuv.example/xmlns/b2b/zuv/v1.0"
_SCHEMAS = {PROFILE: "profile/profile.xsd", COMMON: "common/common.xsd"}


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


def in_trace(path):
    """The envelopes in a file of HTTP requests that are not chunked."""
    with open(path, "rb") as file:
        rest = file.read()
    while rest:
        head, _, rest = rest.partition(b"\r\n\r\n")
        length = int(re.search(rb"\r\nContent-Length: (\d+)", head)[1])
        yield etree.fromstring(rest[:length])
        rest = rest[length:]


def validate(schemas, elements):
    """Lets xmllint validate each element as a document of its own; raises AssertionError with its words."""
    with tempfile.TemporaryDirectory() as folder:
        files = {}
        for number, element in enumerate(elements):
            name = os.path.join(folder, "%d.xml" % number)
            with open(name, "wb") as file:
                file.write(etree.tostring(element, with_tail=False))
            files.setdefault(_SCHEMAS[etree.QName(element).namespace], []).append(name)
        for schema, names in files.items():
            run = subprocess.run(["xmllint", "--noout", "--nonet", "--schema", os.path.join(schemas, schema), *names],
                                 capture_output=True, text=True)
            assert run.returncode == 0, run.stderr

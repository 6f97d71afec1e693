#!/usr/bin/python3
"""The wire reference shows every class of the library, its links lead somewhere, and its examples are valid.

Usage: wire_reference_test.py SOURCE_DIR GENERATED_DIR
"""
import glob
import os
import pathlib
import re
import subprocess
import sys
import tempfile

from lxml import etree

source, generated = (os.path.abspath(path) for path in sys.argv[1:])
sys.path.insert(0, os.path.join(source, "tools", "wire_reference"))
from contract import XSD, Contract, uri_of  # noqa: E402
from example import example  # noqa: E402

SCHEMA = os.path.join(source, "schema")
TEST_URI = "urn:test"


def cpp_classes():
    return set(re.findall(r"X\((\w+)\)", pathlib.Path(generated, "src", "class_list.h").read_text("utf-8")))


def check_pages(folder):
    """Every class and enumeration has its place, and every link within the pages leads to one."""
    places, links = set(), set()
    for path in glob.glob(os.path.join(folder, "*.html")):
        name = os.path.basename(path)
        text = pathlib.Path(path).read_text("utf-8")
        places |= {name} | {"%s#%s" % (name, anchor) for anchor in re.findall(r'<h2 id="([^"]+)"', text)}
        links |= {link if not link.startswith("#") else name + link for link in re.findall(r'href="([^"]+)"', text)}
    assert len(links) > 400 and links <= places, sorted(links - places)
    missing = cpp_classes() - {place.partition("#")[2] for place in places}
    assert not missing, "classes without a place: %s" % sorted(missing)


def check_examples(contract):
    """Each class gets an element of its own next to the contract's, under which its example is validated."""
    classes = [type_ for type_ in contract.types.values() if type_.is_class and not type_.anonymous]
    schema = etree.Element(XSD + "schema", nsmap={**{p: u for u, p in contract.prefixes.items()}, "t": TEST_URI},
                           targetNamespace=TEST_URI)
    for path in sorted(glob.glob(os.path.join(SCHEMA, "*", "*.xsd"))):
        etree.SubElement(schema, XSD + "import", schemaLocation=path,
                         namespace=etree.parse(path).getroot().get("targetNamespace"))
    for number, type_ in enumerate(classes):
        etree.SubElement(schema, XSD + "element", name="e%d" % number, type=contract.short(type_.name))
    validator = etree.XMLSchema(etree.fromstring(etree.tostring(schema), base_url=SCHEMA + "/"))
    documents = [example(contract, type_, "{%s}e%d" % (TEST_URI, number)) for number, type_ in enumerate(classes)]
    documents += [example(contract, contract.types[type_], element) for element, type_ in contract.elements.items()
                  if type_ in contract.types and contract.types[type_].is_class]
    for document in documents:
        assert validator.validate(etree.fromstring(etree.tostring(document))), \
            "%s\n%s" % (validator.error_log, etree.tostring(document, pretty_print=True, encoding="unicode"))
    return len(documents)


def check_repetition(contract):
    """A repeated class is more than one repeated member: generators of the .NET family make an array of such a one, and
    serializers for arrays of these fail."""
    repeated = {contract.type_of(member) for type_ in contract.types.values() for member in type_.members if member.most != 1}
    for key in repeated & contract.types.keys():
        chain = contract.chain(contract.types[key])
        members = [member for each in chain for member in each.members]
        assert len(members) != 1 or members[0].most == 1 or any(each.wildcard for each in chain), key


def main():
    with tempfile.TemporaryDirectory() as folder:
        subprocess.run([sys.executable, "-B", os.path.join(source, "tools", "wire_reference", "wire_reference.py"), SCHEMA,
                        folder], check=True, stdout=subprocess.DEVNULL)
        check_pages(folder)
    contract = Contract(SCHEMA)
    check_repetition(contract)
    assert all(uri_of(type_.name) for type_ in contract.types.values())
    print("%d classes, %d examples valid" % (len(cpp_classes()), check_examples(contract)))


if __name__ == "__main__":
    main()

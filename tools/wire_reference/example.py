"""Examples of documents, made from the contract alone: every member of a class once, what lies deeper only as far as it must."""
from lxml import etree

from contract import XSD_URI, local, uri_of

XSI_TYPE = "{http://www.w3.org/2001/XMLSchema-instance}type"
VALUES = {"string": "text", "boolean": "true", "int": "1", "double": "0.5", "dateTime": "2026-01-31T12:00:00Z",
          "duration": "PT8H", "nonNegativeInteger": "1", "positiveInteger": "1", "base64Binary": "AAEC/w==",
          "anyURI": "cid:part@host.example", "decimal": "1"}


def simple_value(contract, name):
    """The text of a simple type's first value; None for a class."""
    if uri_of(name) == XSD_URI:
        return VALUES[local(name)]
    type_ = contract.types[name]
    if type_.is_class:
        return None
    return type_.words[0] if type_.words else simple_value(contract, type_.base)


def members(contract, type_):
    return [member for each in contract.chain(type_) for member in each.members]


def put_member(contract, parent, member, whole):
    name = contract.type_of(member)
    text = simple_value(contract, name)
    if member.value:
        parent.text = text
    elif member.attribute:
        parent.set(member.name, text)
    else:
        for _ in range(max(member.least, 1)):
            child = etree.SubElement(parent, member.name)
            if text is not None:
                child.text = text
            else:
                fill(contract, child, contract.types[name], whole)


def fill(contract, element, type_, whole):
    """Puts the type's members into the element: all of them, or those that must be there."""
    for member in members(contract, type_):
        if whole or member.least > 0 or member.value:
            put_member(contract, element, member, False)


def example(contract, type_, name):
    """An element of this name that holds every member of the type once. A derived type says so by xsi:type."""
    prefixes = {prefix: uri for uri, prefix in contract.prefixes.items()}
    element = etree.Element(name, nsmap=prefixes)
    fill(contract, element, type_, True)
    etree.cleanup_namespaces(element)
    return element

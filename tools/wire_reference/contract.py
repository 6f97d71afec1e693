"""The contract as the reference pages need it: types, elements and ports, read from schema/.

Here: reading. Elsewhere: examples of documents (example.py), pages (wire_reference.py). The C++ declarations come from
another reader, contract2cpp.
"""
import dataclasses
import glob
import os

from lxml import etree

XSD = "{http://www.w3.org/2001/XMLSchema}"
XSD_URI = XSD[1:-1]
WSDL = "{http://schemas.xmlsoap.org/wsdl/}"
SOAP = "{http://schemas.xmlsoap.org/wsdl/soap/}"
UNBOUNDED = None


@dataclasses.dataclass
class Member:
    name: str                # qualified, {uri}local; of an attribute without a namespace: local
    type: str                # qualified
    least: int
    most: int                # UNBOUNDED for any number
    nillable: bool
    text: str
    attribute: bool = False
    value: bool = False      # the text content itself
    default: str = None


@dataclasses.dataclass
class Type:
    name: str                # qualified; of an anonymous type that of its element, after that of the class around it
    anonymous: bool
    text: str
    base: str = ""           # qualified, of a derived class or of simple content
    words: list = dataclasses.field(default_factory=list)  # of an enumeration
    members: list = dataclasses.field(default_factory=list)  # its own, in order
    is_class: bool = True
    wildcard: bool = False   # attributes of other namespaces are allowed


@dataclasses.dataclass
class Operation:
    name: str
    text: str
    request: str             # element
    response: str
    faults: list             # elements


@dataclasses.dataclass
class Port:
    name: str
    text: str
    address: str
    operations: list


def documentation(node):
    text = node.find(XSD + "annotation/" + XSD + "documentation")
    if text is None:
        text = node.find(WSDL + "documentation")
    return " ".join("".join(text.itertext()).split()) if text is not None else ""


def qualified(node, name):
    prefix, _, local = name.rpartition(":")
    uri = node.nsmap.get(prefix or None)
    if uri is None:
        raise ValueError("%s: no namespace for %s" % (node.base, name))
    return "{%s}%s" % (uri, local)


def local(name):
    return name.rpartition("}")[2]


def uri_of(name):
    return name[1:].partition("}")[0] if name.startswith("{") else ""


class Contract:
    """All of schema/: `prefixes` by URI, `titles` by URI, `types`, `elements` (name to type) and `ports`, by name."""

    def __init__(self, folder):
        self.prefixes, self.titles, self.types, self.elements, self.ports = {}, {}, {}, {}, []
        self.element_texts, self.nillable = {}, set()  # texts by name; names of elements
        with open(os.path.join(folder, "namespaces.txt"), encoding="utf-8") as rows:
            for row in rows:
                if row.strip() and not row.startswith("#"):
                    prefix, uri, _ = row.split()
                    self.prefixes[uri] = prefix
        roots = [etree.parse(path).getroot() for path in sorted(glob.glob(os.path.join(folder, "*", "*.xsd")))]
        for root in roots:
            self.titles[root.get("targetNamespace")] = documentation(root)
            for node in root:
                self.read_global(node, "{%s}" % root.get("targetNamespace"))
        for path in sorted(glob.glob(os.path.join(folder, "*", "*.wsdl"))):
            self.read_port(etree.parse(path).getroot())

    def short(self, name):
        """The name with the prefix of the namespace table."""
        uri = uri_of(name)
        return "%s:%s" % (self.prefixes[uri], local(name)) if uri else name

    def cpp(self, type_):
        """The C++ class or enumeration of a type."""
        name = "%s__%s" % (self.prefixes[uri_of(type_.name)], local(type_.name).replace(".", "_x002e"))
        return "_" + name if type_.anonymous else name

    def chain(self, type_):
        """The type and its bases, the oldest first."""
        base = self.types.get(type_.base)
        return (self.chain(base) if base else []) + [type_]

    def derived(self, name):
        return [type_ for type_ in self.types.values() if type_.base == name and type_.is_class]

    def read_global(self, node, scope):
        if node.tag not in (XSD + "element", XSD + "complexType", XSD + "simpleType"):
            return
        name = scope + node.get("name")
        if node.tag != XSD + "element":
            self.types[name] = self.read_type(node, name, False)
            return
        self.element_texts[name] = documentation(node)
        if node.get("nillable") == "true":
            self.nillable.add(name)
        if node.get("type"):
            self.elements[name] = qualified(node, node.get("type"))
            return
        self.elements[name] = self.read_anonymous(node, name)

    def read_anonymous(self, node, name):
        """Enters the type that an element holds, under the name given; the key of it."""
        kind = node.find(XSD + "complexType")
        if kind is None:
            kind = node.find(XSD + "simpleType")
        type_ = self.read_type(kind, name, True)
        type_.text = type_.text or documentation(node)
        self.types[name + "()"] = type_
        return name + "()"

    def read_type(self, node, name, anonymous):
        type_ = Type(name, anonymous, documentation(node), is_class=node.tag == XSD + "complexType")
        extension = node.find(".//" + XSD + "extension")
        if extension is not None:
            type_.base = qualified(extension, extension.get("base"))
        restriction = node.find(XSD + "restriction")
        if restriction is not None:
            type_.base = qualified(restriction, restriction.get("base"))
            type_.words = [word.get("value") for word in restriction.findall(XSD + "enumeration")]
        if node.find(XSD + "simpleContent") is not None:
            type_.members.append(Member("", type_.base, 1, 1, False, "The text of the element.", value=True))
            type_.base = ""
        content = extension if extension is not None else node
        type_.wildcard = content.find(XSD + "anyAttribute") is not None
        for part in [*content.findall(XSD + "sequence/" + XSD + "element"), *content.findall(XSD + "attribute")]:
            type_.members.append(self.read_member(part, name))
        return type_

    def read_member(self, node, owner):
        uri = uri_of(owner)
        attribute = node.tag == XSD + "attribute"
        reference = node.get("ref")
        name = qualified(node, reference) if reference else node.get("name") if attribute else "{%s}%s" % (uri, node.get("name"))
        if reference:
            type_ = ""
        elif node.get("type"):
            type_ = qualified(node, node.get("type"))
        else:
            type_ = self.read_anonymous(node, "%s_%s" % (owner, node.get("name")))
        if attribute:
            least, most = int(node.get("use") == "required"), 1
        else:
            least, most = int(node.get("minOccurs", "1")), node.get("maxOccurs", "1")
            most = UNBOUNDED if most == "unbounded" else int(most)
        return Member(name, type_, least, most, node.get("nillable") == "true", documentation(node), attribute,
                      default=node.get("default"))

    def type_of(self, member):
        """The qualified name of a member's type, through the element that it refers to if it does."""
        return member.type or self.elements[member.name]

    def text_of(self, member):
        return member.text or self.element_texts.get(member.name, "")

    def read_port(self, root):
        messages = {}
        for message in root.findall(WSDL + "message"):
            part = message.find(WSDL + "part")
            messages["{%s}%s" % (root.get("targetNamespace"), message.get("name"))] = qualified(part, part.get("element"))
        port = root.find(WSDL + "portType")
        operations = [Operation(node.get("name"), documentation(node),
                                messages[qualified(node, node.find(WSDL + "input").get("message"))],
                                messages[qualified(node, node.find(WSDL + "output").get("message"))],
                                [messages[qualified(node, fault.get("message"))] for fault in node.findall(WSDL + "fault")])
                      for node in port.findall(WSDL + "operation")]
        address = root.find(".//" + SOAP + "address").get("location")
        self.ports.append(Port(port.get("name"), documentation(port) or documentation(root), address, operations))

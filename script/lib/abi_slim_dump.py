"""Makes an abidw dump small enough to keep: what no host can link with is removed.

Usage: abi_slim_dump.py < DUMP > SLIM

Removed: inline functions, which have no symbol (nearly all of them members of std::vector and std::string), types that are
named within classes, and then all types that nothing left refers to. Layouts, tables of virtual operations, and the
signatures of exported functions stay.
"""
import sys
import xml.etree.ElementTree as ET

REFERENCES = ("type-id", "underlying-type", "naming-typedef-id")


def is_inline(element):
    if element.tag == "member-function":
        return element.get("vtable-offset") is None and all(f.get("elf-symbol-id") is None for f in element)
    return element.tag == "member-template" or element.tag == "function-decl" and element.get("elf-symbol-id") is None


def take_out(parent, unwanted):
    for child in list(parent):
        if unwanted(child):
            parent.remove(child)
        else:
            take_out(child, unwanted)


def main():
    corpus = ET.parse(sys.stdin).getroot()
    take_out(corpus, is_inline)
    # Types are declarations with an id; what refers to them is any element within, up to the next type.
    used_by, roots = {}, set()

    def walk(element, owner):  # owner: id of the innermost type
        owner = element.get("id") or owner
        for name in REFERENCES:
            if element.get(name):
                (used_by.setdefault(owner, set()) if owner else roots).add(element.get(name))
        for child in element:
            if child.tag == "member-type":  # kept with its class, but keeps nothing itself
                for inner in child:
                    used_by.setdefault(inner.get("id"), set()).add(owner)
            walk(child, owner if child.tag != "member-type" else None)

    walk(corpus, None)
    for element in corpus.iter():  # a class with exported members is a root
        if element.get("id") and any(f.get("elf-symbol-id") for f in element.iter("function-decl")):
            roots.add(element.get("id"))
    wanted, waiting = set(), list(roots)
    while waiting:
        name = waiting.pop()
        if name not in wanted:
            wanted.add(name)
            waiting += used_by.get(name, ())
    take_out(corpus, lambda e: e.get("id") is not None and e.get("id") not in wanted)
    take_out(corpus, lambda e: e.tag in ("member-type", "namespace-decl") and len(e) == 0)
    ET.indent(corpus, " ")
    ET.ElementTree(corpus).write(sys.stdout.buffer, encoding="utf-8")
    print()


main()

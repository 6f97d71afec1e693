#!/usr/bin/python3
"""Writes the wire reference: a page for each namespace and port of the contract, with every class, its members and an example.

Usage: wire_reference.py SCHEMA_DIR OUTPUT_DIR
"""
import html
import os
import sys

from lxml import etree

from contract import Contract, UNBOUNDED, XSD_URI, local, uri_of
from example import example

STYLE = """body{font:16px/1.5 system-ui,sans-serif;max-width:62em;margin:2em auto;padding:0 1em;color:#1b2733}
h1,h2,h3{line-height:1.2}h2{margin-top:2.5em;border-top:1px solid #d5dde5;padding-top:1em}
table{border-collapse:collapse;width:100%;font-size:.92em}th,td{text-align:left;vertical-align:top;padding:.3em .8em .3em 0;
border-bottom:1px solid #e6ebf0}code,pre{font:.9em/1.45 ui-monospace,monospace}pre{background:#f5f7f9;padding:1em;overflow:auto}
a{color:#0a5ea8;text-decoration:none}a:hover{text-decoration:underline}.quiet{color:#5b6b7a}summary{cursor:pointer}
@media(prefers-color-scheme:dark){body{background:#12181e;color:#d7dfe6}pre{background:#1b232b}a{color:#6cb4f5}
th,td,h2{border-color:#2b3742}.quiet{color:#93a3b1}}"""


def escape(text):
    return html.escape(text, quote=False)


def occurrence(member):
    most = "*" if member.most is UNBOUNDED else str(member.most)
    return most if str(member.least) == most else "%d..%s" % (member.least, most)


class Pages:
    def __init__(self, contract):
        self.contract = contract

    def page_of(self, uri):
        return self.contract.prefixes[uri] + ".html"

    def link(self, name):
        """A type's short name, linked to its description."""
        if uri_of(name) == XSD_URI:
            return "<code>xsd:%s</code>" % local(name)
        type_ = self.contract.types[name]
        return '<a href="%s#%s"><code>%s</code></a>' % (self.page_of(uri_of(name)), self.contract.cpp(type_),
                                                        escape(self.contract.short(type_.name)))

    def member_row(self, member):
        contract = self.contract
        if member.value:
            name = '<span class="quiet">text</span>'
        else:
            name = "<code>%s%s</code>" % ("@" if member.attribute else "", escape(contract.short(member.name)))
        text = escape(contract.text_of(member)) + (' <span class="quiet">May be nil.</span>' if member.nillable else "")
        return "<tr><td>%s<td>%s<td>%s<td>%s" % (name, self.link(contract.type_of(member)), occurrence(member), text)

    def class_section(self, key, type_):
        contract = self.contract
        name = contract.cpp(type_)
        parts = ['<h2 id="%s"><code>%s</code></h2>' % (name, escape(contract.short(type_.name))),
                 "<p>%s</p>" % escape(type_.text)]
        facts = [("Class" if type_.is_class else "Enumeration" if type_.words else "Type", "<code>%s</code>" % name)]
        bases = contract.chain(type_)[:-1]
        if bases:
            facts.append(("Extends", " › ".join(self.link(base.name) for base in bases)))
        derived = contract.derived(key)
        if derived:
            facts.append(("Extended by", ", ".join(self.link(each.name) for each in derived)))
        elements = [element for element, of in contract.elements.items() if of == key]
        if elements:
            facts.append(("Elements", ", ".join("<code>%s</code>" % escape(contract.short(each)) for each in elements)))
        if type_.wildcard:
            facts.append(("Besides", "attributes of other namespaces"))
        parts.append("<p>" + "<br>".join('<span class="quiet">%s:</span> %s' % row for row in facts) + "</p>")
        if type_.words:
            parts.append("<table><tr><th>Code<th>Word" + "".join(
                "<tr><td>%d<td><code>%s</code>" % row for row in enumerate(map(escape, type_.words))) + "</table>")
        elif type_.is_class:
            parts += [self.members_of(type_), self.example_of(type_, elements)]
        return "\n".join(parts)

    def members_of(self, type_):
        rows = []
        for each in self.contract.chain(type_):
            if each is not type_ and each.members:
                rows.append('<tr><td colspan="4" class="quiet">from %s' % self.link(each.name))
            rows += map(self.member_row, each.members)
        if not any(each.members for each in self.contract.chain(type_)):
            return '<p class="quiet">No members.</p>'
        return "<table><tr><th>Member<th>Type<th>How often<th>What\n" + "\n".join(rows) + "</table>"

    def example_of(self, type_, elements):
        document = example(self.contract, type_, elements[0] if elements else type_.name)
        text = etree.tostring(document, pretty_print=True, encoding="unicode")
        return "<details><summary>Example</summary><pre>%s</pre></details>" % escape(text)

    def namespace_page(self, uri):
        contract = self.contract
        own = [(key, type_) for key, type_ in contract.types.items() if uri_of(type_.name) == uri]
        names = ", ".join('<a href="#%s">%s</a>' % (contract.cpp(type_), escape(local(type_.name))) for _, type_ in own)
        body = ["<p><a href=\"index.html\">Wire reference</a></p><h1><code>%s</code></h1>" % contract.prefixes[uri],
                "<p>%s</p><p>Namespace <code>%s</code></p>" % (escape(contract.titles[uri]), escape(uri)),
                "<details><summary>%d types</summary><p>%s</p></details>" % (len(own), names)]
        body += [self.class_section(key, type_) for key, type_ in own]
        return page(contract.prefixes[uri], "\n".join(body))

    def port_section(self, port):
        elements = self.contract.elements
        rows = "".join("<tr><td><code>%s</code><td>%s<td>%s<td>%s<td>%s" %
                       (each.name, self.link(elements[each.request]), self.link(elements[each.response]), escape(each.text),
                        ", ".join(self.link(elements[fault]) for fault in each.faults)) for each in port.operations)
        return ("<h2>%s</h2><p>%s</p><p class=\"quiet\">Default endpoint <code>%s</code></p>"
                "<table><tr><th>Operation<th>Request<th>Response<th>What<th>Faults%s</table>" %
                (port.name, escape(port.text), escape(port.address), rows))

    def index(self):
        contract = self.contract
        spaces = "".join('<tr><td><a href="%s"><code>%s</code></a><td>%s<td>%s' %
                         (self.page_of(uri), contract.prefixes[uri], escape(uri), escape(title))
                         for uri, title in contract.titles.items())
        return page("Wire reference",
                    "<h1>Wire reference</h1><p>What goes over the wire, made from the contract: every class with its members and an "
                    "example. Members are in the order in which they are written; a reader takes them in any order.</p>"
                    "<table><tr><th>Prefix<th>Namespace<th>What" + spaces + "</table>" +
                    "\n".join(map(self.port_section, contract.ports)))


def page(title, body):
    return ('<!DOCTYPE html><html lang="en"><meta charset="utf-8"><meta name="viewport" content="width=device-width">'
            "<title>%s</title><style>%s</style><body>%s\n" % (escape(title), STYLE, body))


def main():
    if len(sys.argv) != 3:
        sys.exit(__doc__)
    schema, output = sys.argv[1:]
    contract = Contract(schema)
    pages = Pages(contract)
    os.makedirs(output, exist_ok=True)
    written = {pages.page_of(uri): pages.namespace_page(uri) for uri in contract.titles}
    written["index.html"] = pages.index()
    for name, text in written.items():
        with open(os.path.join(output, name), "w", encoding="utf-8") as file:
            file.write(text)
    print("%d pages in %s" % (len(written), output))


if __name__ == "__main__":
    main()

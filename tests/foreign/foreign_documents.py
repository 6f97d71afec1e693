"""Documents as other senders might write them, read by the library and compared by what they mean.

Usage: foreign_documents.py <rewrite> <schema directory> [documents] [seed]

The schemas alone say what a document is: the script walks them, makes up a meaning for every class and every
top-level element, and spells it with prefixes of its own, children out of order, comments, CDATA, character
references, encodings, unknown elements. The library reads each document and writes it out again (rewrite.cpp);
what it wrote must mean the same, member by member in the order of the schema. Nothing here knows the library.
"""
import base64
import os
import random
import subprocess
import sys
import tempfile

from lxml import etree

sys.path.insert(0, os.path.join(os.path.dirname(os.path.abspath(__file__)), '..', '..', 'tools', 'wire_reference'))
import contract  # noqa: E402  the schemas, as the wire reference reads them

XSD = '{http://www.w3.org/2001/XMLSchema}'
XSI = 'http://www.w3.org/2001/XMLSchema-instance'
STRICT, UTF_STRINGS = 0x1000, 0x2000000
DEPTH = 3


# ---- the contract

class Class:
    def __init__(self, type_):
        self.base, self.own_members, self.own_attributes = named(type_.base), [], []
        self.text, self.own_wildcard = False, type_.wildcard
        for m in type_.members:
            if m.value:
                self.text = True
            elif m.attribute:
                self.own_attributes.append((m.name, named(m.type), m.least == 1))
            else:
                self.own_members.append(Member(m))

    def chain(self):
        return (CLASSES[self.base].chain() if self.base else []) + [self]

    def members(self):
        return [m for c in self.chain() for m in c.own_members]

    def attributes(self):
        return [a for c in self.chain() for a in c.own_attributes]

    def wildcard(self):  # for attributes of other namespaces
        return any(c.own_wildcard for c in self.chain())


class Member:
    def __init__(self, member):
        self.tag, self.least, self.many, self.default = member.name, member.least, member.most != 1, member.default
        self.kind, self.nillable = (named(member.type), member.nillable) if member.type else ELEMENTS[member.name]


CLASSES, SIMPLE, ELEMENTS, DERIVED = {}, {}, {}, {}
PREFIXES = {}  # of the contract, by namespace
NAMES = {}  # of types without a name, by their keys in the contract: those of their elements, of a member "Class-member"


def named(key):
    return NAMES.get(key, key)


def spelled(name):
    namespace, local = name[1:].split('}')
    return '%s:%s' % (PREFIXES[namespace], local)


def load(directory):
    read = contract.Contract(directory)
    PREFIXES.update(read.prefixes)
    for key, type_ in read.types.items():
        NAMES.setdefault(key, type_.name)
        for member in type_.members:
            if member.type.endswith('()'):
                NAMES[member.type] = '%s-%s' % (type_.name, contract.local(member.name))
    ELEMENTS.update((name, (named(key), name in read.nillable)) for name, key in read.elements.items())
    SIMPLE.update((named(key), type_.words or type_.base) for key, type_ in read.types.items() if not type_.is_class)
    CLASSES.update((named(key), Class(type_)) for key, type_ in read.types.items() if type_.is_class)
    for name, c in CLASSES.items():
        for base in c.chain():
            DERIVED.setdefault(next(n for n, other in CLASSES.items() if other is base), []).append(name)


# ---- meanings: (tag, xsi:type or None, {attribute: word}, text or list of meanings); nil has None for content

class Nil:
    pass


def built_in(kind):
    while kind in SIMPLE and isinstance(SIMPLE[kind], str):
        kind = SIMPLE[kind]
    return kind


def held_as_text(kind):
    kind = built_in(kind)
    return kind not in SIMPLE and kind.split('}')[1] not in ('boolean', 'int', 'double', 'base64Binary')


def text_of(rng, wide):
    letters = 'abc  \n\t<>&"\';]0189\u00e9\u00fc\u00a0' + ('\u20ac\u0416\u4e2d\U0001f600' if wide else '')
    return ''.join(rng.choice(letters) for _ in range(rng.choice((0, 1, 3, 9, 30, 400))))


def value_of(rng, kind, wide):
    kind = built_in(kind)
    if isinstance(SIMPLE.get(kind), list):
        return rng.choice(SIMPLE[kind])
    local = kind.split('}')[1]
    made = {
        'boolean': lambda: rng.choice(('true', 'false')),
        'int': lambda: str(rng.randint(-2**31, 2**31 - 1)),
        'double': lambda: repr(rng.uniform(-1e6, 1e6)),
        'dateTime': lambda: '2026-11-21T05:06:07.%dZ' % rng.randint(0, 99),
        'duration': lambda: 'P%dDT1H' % rng.randint(0, 99),
        'base64Binary': lambda: base64.b64encode(rng.randbytes(rng.randint(1, 60))).decode(),
        'anyURI': lambda: 'cid:part%d' % rng.randint(0, 9),
        'string': lambda: text_of(rng, wide)}
    made.update(dict.fromkeys(('integer', 'nonNegativeInteger', 'positiveInteger'),
                              lambda: str(rng.randint(1, 10**30))))
    return made[local]()


def meaning(rng, tag, kind, depth, wide):
    if kind not in CLASSES:
        return (tag, None, {}, value_of(rng, kind, wide), kind)
    actual = rng.choice(DERIVED[kind]) if rng.random() < 0.5 else kind
    c = CLASSES[actual]
    attributes = {n: value_of(rng, k, wide) for n, k, required in c.attributes() if required or rng.random() < 0.5}
    if c.text:
        return (tag, None, attributes, text_of(rng, wide), '{}string')
    content = []
    for m in c.members():
        if m.many:
            count = m.least + (rng.randint(0, 2) if depth > 0 and rng.random() < 0.4 else 0)
        else:
            count = 1 if m.least or (rng.random() < 0.4 and (depth > 0 or m.kind not in CLASSES)) else 0
        for _ in range(count):
            if m.nillable and m.default is None and rng.random() < 0.1:
                content.append((m.tag, None, {}, Nil, m.kind))
            else:
                content.append(meaning(rng, m.tag, m.kind, depth - 1, wide))
    return (tag, actual, attributes, content, kind)


def expected(node):
    """What the library writes for a meaning: no nil but for required members, defaults, types of derived classes. Items of
    lists that are nil are left out, so those that a list needs at least must not be nillable."""
    tag, actual, attributes, content, kind = node
    if content is Nil:
        return (tag, None, {'{%s}nil' % XSI: 'true'}, [])
    if not isinstance(content, list):
        return (tag, None, attributes, normal(content, kind))
    c = CLASSES[actual]
    type_name = spelled(actual) if c.base else None
    kept = []
    for m in c.members():
        found = [n for n in content if n[0] == m.tag]
        if not found and m.default is not None:
            kept.append((m.tag, None, {}, m.default))
        for n in found:
            if n[3] is not Nil or m.least:
                kept.append(expected(n))
    return (tag, type_name, attributes, kept)


def normal(text, kind):
    local = built_in(kind).split('}')[1]
    return float(text) if local == 'double' else text


# ---- spelling

class Spelling:
    """One way to write documents down: prefixes, quotes, noise. Strict documents have no noise that changes names."""

    def __init__(self, rng, strict):
        self.rng, self.strict = rng, strict
        self.encoding = rng.choice(('ISO-8859-1', 'windows-1252')) if rng.random() < 0.3 else 'UTF-8'

    def document(self, node, root_type):
        self.scope = {}
        head = self.rng.choice(
            ('', '<?xml version="1.0"?>', "<?xml version='1.0' encoding='UTF-8' standalone='yes'?>\n"))
        if self.encoding != 'UTF-8':
            head = '<?xml version="1.0" encoding="%s"?>' % self.encoding
        mark = '\ufeff' if self.encoding == 'UTF-8' and self.rng.random() < 0.1 else ''
        text = mark + head + self.gap() + self.element(node, {}, root_type) + self.gap()
        return text.encode(self.encoding, 'xmlcharrefreplace')

    def gap(self):
        return self.rng.choice(('', '', '', '\n', ' \t\r\n ', '<!-- <a> & -->', '<?pi <b>?>', '<!--x--> '))

    def prefix(self, namespace, scope, declared):
        """A prefix for the namespace: one in scope, or a new one declared on the element at hand."""
        usable = [p for p, n in scope.items() if n == namespace]
        if usable and self.rng.random() < 0.95:
            self.used.add(usable[0])
            return usable[0]
        new = self.rng.choice(('', 'a', 'ns1', 'SOAP-ENV', 'protocol', 'x-y.z', '\u00e9',
                               'n%d' % self.rng.randint(0, 99)))
        if new in declared or new in self.used or (new == '' and namespace == XSI):
            new = 'q%d' % len(scope)
        self.used.add(new)
        declared[new] = namespace
        scope[new] = namespace
        return new

    def name(self, name, scope, declared, attribute=False):
        namespace, local = name[1:].split('}')
        if not namespace:  # a default namespace ends here
            declared.update({'': ''} if scope.get('') else {})
            scope[''] = ''
            self.used.add('')
            return local
        prefix = self.prefix(namespace, scope, declared)
        if attribute and prefix == '':
            prefix = 'q%d' % len(scope)
            declared[prefix] = scope[prefix] = namespace
        return prefix + ':' + local if prefix else local

    def element(self, node, scope, root_type=None):
        tag, actual, attributes, content, kind = node
        scope, declared, written, self.used = dict(scope), {}, [], set()
        typed = root_type or (actual if actual != kind and content is not Nil else None)
        if typed is None and actual and self.rng.random() < 0.1 and actual not in ELEMENTS and '-' not in actual:
            typed = actual
        if not actual and kind[1] != '}' and '-' not in kind and self.rng.random() < 0.05:
            typed = kind if self.strict else self.rng.choice((kind, XSD + 'string'))  # of a simple value
        written += [(n, v) for n, v in attributes.items()]
        tagname = self.name(tag, scope, declared)
        if typed:
            namespace, local = typed[1:].split('}')
            prefix = self.prefix(namespace, scope, declared)
            value = prefix + ':' + local if prefix else local
            value = self.rng.choice(('', '', ' ', '\n')) + value + self.rng.choice(('', ' '))
            written.append((self.name('{%s}type' % XSI, scope, declared, True), value))
        if content is Nil:
            written.append((self.name('{%s}nil' % XSI, scope, declared, True), self.rng.choice(('true', '1'))))
        elif self.rng.random() < 0.03:
            written.append((self.name('{%s}nil' % XSI, scope, declared, True), self.rng.choice(('false', '0'))))
        if not self.strict and self.rng.random() < 0.1:
            written.append((self.rng.choice(('note', 'xml:lang', 'types')), 'de "&" at'))
        elif actual in CLASSES and CLASSES[actual].wildcard() and self.rng.random() < 0.5:
            written.append(('xml:lang', 'de "&" at'))
        written += [('xmlns:' + p if p else 'xmlns', n) for p, n in declared.items()]
        self.rng.shuffle(written)
        start = '<' + tagname + ''.join(self.attribute(n, v) for n, v in written) + self.rng.choice(('', '', ' ', '\n'))
        if content is Nil:
            inside = ''
        elif isinstance(content, list):
            inside = self.children(content, actual, scope)
        else:
            inside = self.text(self.variant(content, kind))
            if not held_as_text(kind):
                inside = self.rng.choice(('', '', ' ', '\n\t')) + inside + self.rng.choice(('', '', ' '))
        if inside == '' and self.rng.random() < 0.7:
            return start + '/>'
        return start + '>' + inside + '</' + tagname + self.rng.choice(('', '', ' ')) + '>'

    def attribute(self, name, value):
        quote = self.rng.choice('"\'')
        value = value.replace('&', '&amp;').replace('<', '&lt;').replace(quote, '&#%d;' % ord(quote))
        return '%s%s%s=%s%s%s%s' % (self.rng.choice((' ', '\n')), name, self.rng.choice(('', '', ' ')),
                                    self.rng.choice(('', '', ' ')), quote, value, quote)

    def children(self, content, actual, scope):
        groups = {}
        for n in content:
            groups.setdefault(n[0], []).append(n)
        order = [t for t, nodes in groups.items() for _ in nodes]
        if self.rng.random() < 0.5:
            self.rng.shuffle(order)  # a list keeps its own order
        parts = []
        for t in order:
            node = groups[t].pop(0)
            parts.append(self.element(node, scope))
            if not self.strict and self.rng.random() < 0.05 and self.single(actual, t):
                parts.append(self.element((t, None, {}, 'a second one', '{}string'), scope))
            if not self.strict and self.rng.random() < 0.08:
                parts.append(self.unknown(t, scope))
        return self.gap() + ''.join(p + self.gap() for p in parts)

    @staticmethod
    def single(actual, tag):
        return any(m.tag == tag and not m.many for m in CLASSES[actual].members())

    def unknown(self, tag, scope):
        """An element that no schema declares: a name of a member in another namespace, with content of any kind."""
        scope, declared, self.used = dict(scope), {}, set()
        local = self.rng.choice((tag.split('}')[1], 'x', 'root'))
        name = self.name('{urn:unknown:%d}%s' % (self.rng.randint(0, 2), local), scope, declared)
        known = '' if self.rng.random() < 0.5 else self.element((tag, None, {}, 'deep', '{}string'), scope)
        return '<%s%s>%s<u k="v>"/>text<![CDATA[</u>]]>%s</%s>' % (
            name, ''.join(self.attribute('xmlns:' + p if p else 'xmlns', n) for p, n in declared.items()),
            self.gap(), known, name)

    def variant(self, text, kind):
        local = built_in(kind).split('}')[1]
        if local == 'boolean' and self.rng.random() < 0.5:
            return {'true': '1', 'false': '0'}[text]
        if local == 'double' and self.rng.random() < 0.5:
            return '%.17E' % float(text)
        if local == 'base64Binary':
            return ''.join(c + self.rng.choice(('', '', '', '', '\n ')) for c in text)
        return text

    def text(self, text):
        out, i = [], 0
        while i < len(text):
            length = self.rng.choice((1, 5, 50))
            part, i = text[i:i + length], i + length
            how = self.rng.random()
            if how < 0.15 and part.encode(self.encoding, 'ignore').decode(self.encoding) == part:
                out.append('<![CDATA[' + part.replace(']]>', ']]]]><![CDATA[>') + ']]>')
            elif how < 0.3:
                out.append(''.join(self.rng.choice(('&#%d;', '&#x%X;')) % ord(c) for c in part))
            else:
                part = part.replace('&', '&amp;').replace('<', '&lt;').replace('>', '&gt;')
                part = part.replace('"', self.rng.choice(('"', '&quot;')))
                out.append(part.replace("'", self.rng.choice(("'", '&apos;'))))
            if self.rng.random() < 0.1:
                out.append(self.rng.choice(('<!-- - -->', '<?pi?>')))
        return ''.join(out)


# ---- comparison

def read_back(node):
    typed = node.get('{%s}type' % XSI)
    attributes = {n: v for n, v in node.attrib.items() if n != '{%s}type' % XSI}
    children = [c for c in node if isinstance(c.tag, str)]
    return (node.tag, typed, attributes, [read_back(c) for c in children] if children else node.text or '')


def differs(want, got, path=''):
    path += '/' + want[0].split('}')[-1]
    if want[0] != got[0] or want[1] != got[1] or want[2] != got[2]:
        return '%s: wanted %r, got %r' % (path, want[:3], got[:3])
    if isinstance(want[3], float):
        return None if float(got[3]) == want[3] else '%s: %r, %r' % (path, want[3], got[3])
    if not isinstance(want[3], list) or not want[3] or not isinstance(got[3], list):
        return None if (want[3] or '') == (got[3] or '') else '%s: wanted %r, got %r' % (path, want[3], got[3])
    for w, g in zip(want[3], got[3]):
        difference = differs(w, g, path)
        if difference:
            return difference
    if len(want[3]) != len(got[3]):
        return '%s: wanted %r, got %r' % (path, [c[0] for c in want[3]], [c[0] for c in got[3]])
    return None


def roots():
    """(class asked for, tag asked for, tag, type) of every class and every top-level element."""
    for name in sorted(CLASSES):
        if name not in ELEMENTS:
            yield spelled(name), '*', '{}thing', name
            if '-' not in name:
                yield '?', '*', '{}thing', name  # found by its xsi:type
                yield '?', '*', name, name  # found by its own name
    for name in sorted(ELEMENTS):
        kind = ELEMENTS[name][0]
        if kind in CLASSES:
            yield (spelled(kind), spelled(name), name, kind) if kind != name else ('?', '*', name, name)


# ---- what strict reading refuses

MISMATCH, TYPE_MISMATCH, NIL, REQUIRED, OCCURS = 3, 4, 23, 42, 44
BAD_VALUES = {'boolean': '2', 'int': '1x', 'double': 'one'}


def refusals(rng):
    """(class, what is wrong, its meaning, error in strict mode, error otherwise), for every class and member."""
    for name, c in sorted(CLASSES.items()):
        attributes = {n: value_of(rng, k, False) for n, k, required in c.attributes() if required}
        members = c.members()
        least = [meaning(rng, m.tag, m.kind, -1, False) for m in members for _ in range(m.least)]

        def case(wrong, strict, otherwise, content=least, given=attributes):
            return name, wrong, (name if name in ELEMENTS else '{}thing', name, given, content, name), strict, otherwise

        for n, k, required in c.attributes():
            if required:
                yield case('no ' + n, REQUIRED, 0, given={a: v for a, v in attributes.items() if a != n})
            yield case(n + ' without meaning', TYPE_MISMATCH, TYPE_MISMATCH, given=dict(attributes, **{n: 'no word'}))
        if c.text:
            continue
        yield case('nothing', 0, 0)
        if least:
            yield case('no content', OCCURS, 0, [])
        for tag in ('{urn:unknown}x', '{urn:unknown}description', '{}description'):
            yield case('unknown ' + tag, MISMATCH, 0, least + [(tag, None, {}, '', '{}string')])
        for m in members:
            others = [n for n in least if n[0] != m.tag]
            one = meaning(rng, m.tag, m.kind, -1, False)
            if m.least:
                yield case('too few ' + m.tag, OCCURS, 0, others + [one] * (m.least - 1))
            if not m.many:
                yield case('two ' + m.tag, MISMATCH, 0, others + [one, one])
            words = SIMPLE.get(m.kind)
            values = [(BAD_VALUES.get(built_in(m.kind).split('}')[1]), TYPE_MISMATCH, TYPE_MISMATCH)]
            if isinstance(words, list):
                values = [(' ', TYPE_MISMATCH, TYPE_MISMATCH), (words[0].upper() + '_', TYPE_MISMATCH, TYPE_MISMATCH),
                          ('-1', TYPE_MISMATCH, 0), (str(len(words)), TYPE_MISMATCH, 0), (str(len(words) - 1), 0, 0)]
            for value, strict, otherwise in values:
                if value:
                    bad = [(m.tag, None, {}, value, '{}string')] * max(m.least, 1)
                    yield case('%r in %s' % (value, m.tag), strict, otherwise, others + bad)
            if isinstance(words, list) and m.many:
                yield case('nil in ' + m.tag, NIL, 0, others + [(m.tag, None, {}, Nil, m.kind)] * max(m.least, 1))


def main():
    program, directory = sys.argv[1:3]
    wanted = int(sys.argv[3]) if len(sys.argv) > 3 else 3000
    seed = int(sys.argv[4]) if len(sys.argv) > 4 else 20261121
    load(directory)
    all_roots = list(roots())
    cases, batch = [], []
    for i in range(max(wanted, len(all_roots))):
        rng = random.Random(seed * 1000003 + i)
        asked, asked_tag, tag, kind = all_roots[i % len(all_roots)]
        strict, wide = rng.random() < 0.3, rng.random() < 0.5
        node = meaning(rng, tag, kind, DEPTH, wide)
        if asked == '?' and tag == '{}thing':
            typed = node[1] or kind
        else:
            typed = node[1] if node[1] and node[1] != kind else None
        document = Spelling(rng, strict).document(node, typed)
        etree.fromstring(document, etree.XMLParser(huge_tree=True))  # whatever else it is, it is XML
        mode = (STRICT if strict else 0) | (UTF_STRINGS if wide else 0)
        batch.append(b'%d %s %s %d\n' % (mode, asked.encode(), asked_tag.encode(), len(document)) + document)
        want = expected(node)
        cases.append((i, document, ('root', spelled(node[1] or kind)) + want[2:]))
    for name, wrong, node, *errors in refusals(rng):
        for mode, error in zip((STRICT, 0), errors):
            typed = name if name not in ELEMENTS and '-' not in name else None
            document = Spelling(rng, True).document(node, typed)
            asked = '?' if name in ELEMENTS else spelled(name)
            batch.append(b'%d %s * %d\n' % (mode, asked.encode(), len(document)) + document)
            cases.append(('%s: %s' % (spelled(name), wrong), document, error))
    with tempfile.TemporaryDirectory() as place:
        sent, answered = os.path.join(place, 'in'), os.path.join(place, 'out')
        with open(sent, 'wb') as file:
            file.write(b''.join(batch))
        subprocess.run([program, sent, answered], check=True, timeout=240)
        with open(answered, 'rb') as file:
            wrong = sum(not judge(file, *case) for case in cases)
    print('%d documents of %d roots, %d bytes, seed %d: %d wrong' %
          (len(cases), len(all_roots), sum(map(len, batch)), seed, wrong))
    return 1 if wrong else 0


def judge(file, number, document, want):
    """Whether the answer that comes next is the one wanted: a meaning, or an error."""
    error, length = map(int, file.readline().split())
    written = file.read(length)
    difference = 'error %d' % error
    if isinstance(want, int):
        difference = None if error == want else 'wanted error %d, got %d' % (want, error)
    elif error == 0:
        difference = differs(want, read_back(etree.fromstring(written, etree.XMLParser(huge_tree=True, recover=True))))
    if difference:
        print('document %s: %s\n%s\n-> %s\n' % (number, difference, document[:3000].decode('latin-1'),
                                               written[:3000].decode('utf-8', 'replace')))
    return not difference


if __name__ == '__main__':
    sys.exit(main())

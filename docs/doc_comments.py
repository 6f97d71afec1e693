#!/usr/bin/python3
"""Doxygen's input filter for the public headers: their plain comments become those that Doxygen reads.

Usage: doc_comments.py HEADER. Prints the header.

How the headers are documented:

- The opening comment describes the file. A comment that begins "// --- title ---" opens a section.
- A comment right above a declaration describes it and the ones that follow it without a blank line; a comment at the end of
  a line describes what the line declares.
- A row of a table is indented by three blanks: a name, two blanks or more, and its text, which may go on in lines that are
  indented further. Names of arguments become parameters, the others results. A row whose name is neither an argument of a
  function nor looks like a result becomes an argument that Doxygen doesn't find: the documents are not built.
- Macros that declare members (soap_class.h, soap_proxy.h) are written out, each member with its row in the macro's comment.
"""
import os
import re
import sys

MACRO_HEADERS = ("soap_class.h", "soap_proxy.h")
RESULT = re.compile(r"SOAP_[A-Z_]+|XML_[A-Z]+|STATUS_\w+|TLS_\w+|null|true|false|[-<>]? ?\d+|target|returns")
ROW = re.compile(r"  ([^\s,]+(?: \d+)?(?:, [^\s,]+)*)(?:  +(\S.*)|)$")


class Comment:
    """Text of a block of // lines: paragraphs, rows of a table, and lines that stand as they are."""

    def __init__(self, lines):
        self.text, self.rows = [], []
        verbatim = False
        for number, line in enumerate(lines):
            row = ROW.match(line)
            deeper = number + 1 < len(lines) and re.match(r" {4,}\S", lines[number + 1])
            if row and (row[2] or deeper or all(RESULT.fullmatch(name) for name in row[1].split(", "))):
                self.rows.append((row[1].split(", "), [row[2] or ""]))
            elif self.rows and re.match(r" {4,}\S", line):
                self.rows[-1][1].append(line.strip())
            elif re.match(r" {4,}\S", line):
                self.text += [] if verbatim else ["\\verbatim"]
                self.text.append(line)
                verbatim = True
                continue
            else:
                self.text += ["\\endverbatim"] if verbatim else []
                self.text.append(escaped(line.strip()))
                # Paragraphs after a table stay after it in the source only.
            verbatim = False
        self.text += ["\\endverbatim"] if verbatim else []

    def row(self, name):
        return next((" ".join(text) for names, text in self.rows if name in names), None)

    def lines(self, declared=None, others=(), templates=()):
        """For a declaration with these arguments, also of its template; `others` are those of the declarations that share the
        comment."""
        result = list(self.text)
        if declared and declared[0] in ("ctx", "ctx_") and self.row("ctx") is None:
            result.append("\\param %s the context" % declared[0])
        for names, text in self.rows:
            described = escaped(" ".join(text).strip())
            if declared is None:
                result += ["", "- <b>%s</b> %s" % (escaped(", ".join(names)), described)]
            elif names[0] in templates:
                result += ["\\tparam %s %s" % (names[0], described)]
            elif any(name in declared for name in names):
                result += ["\\param %s %s" % (",".join(name for name in names if name in declared), described)]
            elif names == ["returns"]:
                result += ["\\return " + described]
            elif all(RESULT.fullmatch(name) for name in names):
                result += ["\\retval %s %s" % (name.replace(" ", ""), described) for name in names]
            elif not all(name in others for name in names):
                result += ["\\param %s %s" % (names[0], described)]
        return result


def escaped(text):
    """As Doxygen shows it as it is; what is between double quotes it takes literally."""
    html = {"&": "&amp;", "<": "&lt;", ">": "&gt;"}
    text = re.sub(r'("[^"]*")|[\\@$#%&<>]', lambda found: found[1] or html.get(found[0], "\\" + found[0]), text)
    return re.sub(r"`([^`]+)`", r"<code>\1</code>", text)


def split_line(line):
    """Code and trailing comment of a line, the latter null if there is none."""
    found = re.search(r"//", re.sub(r'"(?:\\.|[^"\\])*"', lambda quoted: "~" * len(quoted[0]), line))
    return (line[:found.start()].rstrip(), line[found.start() + 2:].strip(), found.start()) if found else (line, None, 0)


def arguments(declaration):
    """Names of a function's arguments; null if it is none."""
    code = re.sub(r"\s+", " ", re.sub(r"//.*", "", re.sub(r'"(?:\\.|[^"\\])*"', '""', declaration)))
    start = re.search(r"\w\(|operator[^\w\s(]+\(", code)
    if not start or re.match(r"\s*(#|using|typedef|constexpr|enum)", code):
        return None
    depth, pieces = 0, [""]
    for letter in code[start.end() - 1:]:
        depth += (letter in "(") - (letter in ")")
        if depth == 0:
            break
        if letter == "," and depth == 1:
            pieces.append("")
        elif not (letter == "(" and depth == 1):
            pieces[-1] += letter
    names = [piece.partition("=")[0].strip() for piece in pieces]
    pointers = [re.search(r"\(\*(\w+)\)", name) or re.search(r"(\w+)(?:\[\d*\])?$", name) for name in names]
    return [found[1] for found in pointers if found]


def gives_nothing(declaration):
    """A function without a result: void, a constructor, a destructor."""
    return re.search(r"\bvoid \w+\(|^\s*(?:explicit )?~?\w+\(", declaration) is not None


def template_arguments(declaration):
    return re.findall(r"(?:class|typename)(?:\.\.\.)? (\w+)", declaration) if "template <" in declaration else []


class Macro:
    """A macro with its comment, as a header defines it."""

    def __init__(self, definition, comment):
        head = re.match(r"#define (\w+)\(([^)]*)\)\s*", definition)
        self.name, self.parameters = head[1], [word.strip() for word in head[2].split(",")]
        self.body = re.sub(r"\s*\\\n", "\n", definition[head.end():])
        self.comment = comment

    def expanded(self, values):
        values = dict(zip(self.parameters, values))
        pattern = r"(?:##)?\b(%s)\b(?:##)?" % "|".join(self.parameters)
        body = re.sub(pattern, lambda found: values[found[1]], self.body.replace("##", "\0##\0").replace("\0", ""))
        return body.replace("##", "")


def split_values(text):
    return [value.strip() for value in re.findall(r'(?:"(?:\\.|[^"])*"|[^,"])+', text)]


def declarations_of(body):
    """The members that a macro's body declares, a function's body with it."""
    found, current, depth = [], "", 0
    for line in body.split("\n"):
        current += line + "\n"
        depth += line.count("{") - line.count("}")
        if depth == 0 and line.rstrip().endswith((";", "}")):
            found.append(current.strip())
            current = ""
    return found


class Filter:
    def __init__(self, path, macros):
        with open(path, encoding="utf-8") as file:
            self.lines = file.read().split("\n")
        self.macros = macros
        self.helpers = set(re.findall(r"^#undef (\w+)", "\n".join(self.lines), re.M))
        self.out, self.at = [], 0
        self.sections = [False]  # one open, for each nested class

    def comment(self, lines, indent="", trailing=False):
        if not trailing and self.out and "///<" in self.out[-1]:
            self.out.append("")  # else they would be one comment
        self.out += [indent + ("///< " if trailing else "/// ") + line for line in lines]

    def take_comment(self):
        lines = []
        while self.at < len(self.lines) and (found := re.match(r"\s*// ?(.*)$", self.lines[self.at])):
            lines.append(found[1])
            self.at += 1
        return lines

    def close_section(self):
        if self.sections[-1]:
            self.out.append("///@}")
            self.sections[-1] = False

    def section(self, lines):
        self.close_section()
        self.out.append("/// \\name " + re.match(r"--- (.*) ---", lines[0])[1])
        self.comment(Comment(lines[1:]).lines())
        self.out.append("///@{")
        self.sections[-1] = True

    def take_declaration(self):
        """The lines of one declaration, or of the head of a class."""
        lines, depth, parens = [], 0, 0
        while self.at < len(self.lines):
            line = self.lines[self.at]
            code = split_line(line)[0]
            lines.append(line)
            self.at += 1
            if lines[0].startswith("#"):
                if not line.endswith("\\"):
                    break
                continue
            depth += code.count("{") - code.count("}")
            parens += code.count("(") - code.count(")")
            if re.match(r"\s*(?:extern \"C\" )?(?:struct|class|enum|union)\b[^;()]*\{$", " ".join(map(str.strip, lines))) \
                    or (depth <= 0 and parens == 0 and (code.endswith((";", "}", ","))
                                                                or re.fullmatch(r"\s*[A-Z_]+\(.*\)", " ".join(lines)))) \
                    or not code.strip():
                break
        return lines

    def take_trailing(self, lines):
        """What is at the ends of the lines, and continues below them."""
        parts = [split_line(line) for line in lines]
        found = [part[1] for part in parts if part[1] is not None]
        if found and parts[-1][1] is not None:
            while self.at < len(self.lines) and (more := re.match(r"(\s{5,})// ?(.*)$", self.lines[self.at])) \
                    and len(more[1]) == parts[-1][2]:
                found.append(more[2].strip())
                self.at += 1
        return found

    def write_members(self, macro, values, above):
        documented = self.macros["SOAP_CLASS_OPERATIONS"] if macro.name == "SOAP_DERIVED_CLASS_OPERATIONS" else macro
        owner = values[0]
        for declaration in declarations_of(macro.expanded(values)):
            name = re.search(r"(~?\w+|operator=)\s*(?:\(|= )", declaration)[1]
            if macro.name in ("SOAP_PROXY_CALL", "SOAP_CLASS_MAKER"):
                described = above + [""] + macro.comment.lines(arguments(declaration), others=macro.comment_names)
            else:
                key = {owner: "constructors", "~" + owner: "destructor", owner + "_init": "P_init"}.get(name, name)
                row = documented.comment.row(key)
                if row is None:
                    sys.exit("%s: %s is not in the comment of %s" % (sys.argv[1], key, macro.name))
                about, _, result = re.sub(r"\bP\(", owner + "(", row).partition(" Returns ")
                names = arguments(declaration) or []
                described = [escaped(about)] + [
                    "\\param %s %s" % (name, escaped(documented.comment.row(name) or "")) for name in names]
                described += ["\\return " + escaped(result)] if result and not gives_nothing(declaration) else []
            self.comment(described, "    ")
            self.out += declaration.split("\n")

    def write_list(self, name, member, described):
        """A list of X macros, applied to a macro of the same file."""
        text = "\n".join(self.lines)
        body = re.search(r"#define %s\(X\)((?:.*\\\n)*.*)" % name, text)[1].replace("\\\n", " ")
        shape = Macro(re.search(r"#define %s\(.*(?:\\\n.*)*" % member, text)[0], None)
        for entry in re.findall(r'X\(((?:"(?:\\.|[^"])*"|[^()"])*)\)', body):
            values = split_values(entry)
            self.out.append(shape.expanded(values))
            words = described or [escaped("%s %s" % (values[1], values[2].strip('"')))]
            self.comment(words, trailing=True)

    def write(self, lines, above, shared):
        first = lines[0].strip()
        trailing = self.take_trailing(lines)
        code = [split_line(line)[0] for line in lines]
        joined = " ".join(part.strip() for part in code)
        applied = re.match(r"(\w+)\((.*)\)$", joined)
        if applied and applied[1] in self.macros:
            return self.write_members(self.macros[applied[1]], split_values(applied[2]), above.lines() if above else [])
        if applied and re.fullmatch(r"\w+", applied[2]) and "#define %s(X)" % applied[1] in "\n".join(self.lines):
            return None if applied[2] == "SOAP_DETAIL_CLASS" else self.write_list(applied[1], applied[2],
                                                                              [escaped(" ".join(trailing))] if trailing else [])
        if first.startswith("#"):
            name = re.match(r"#(?:define|undef) (\w+)", first)
            if name and name[1] in self.helpers:
                return None
            if above:
                self.comment(above.lines())
            self.out += lines
            return None
        if re.match(r"(struct|class|enum class) \w+(?: : int)?;", joined):
            self.out.append(joined)
            return None
        doc = above or (None if trailing else shared)
        if doc:
            indent = re.match(r" *", lines[0])[0]
            described = doc.lines(arguments(joined), self.shared_names, template_arguments(joined))
            self.comment([line for line in described if not gives_nothing(joined) or not line.startswith("\\ret")], indent)
        several = re.match(r"(\s*)((?:const )?[\w:]+) ([^()=]+, [^()=]+);$", code[0] if len(code) == 1 else "")
        for number, each in enumerate(several[3].split(", ")) if several else [(0, None)]:
            self.comment(doc.lines(), several[1]) if doc and number else None
            self.out += ["%s%s %s;" % (several[1], several[2], each)] if several else code
            if trailing:
                self.comment([escaped(line) for line in trailing], "    ", trailing=True)
        if joined.endswith("{"):
            self.sections.append(False)
        return None

    def take_label(self):
        """A line such as "public:"."""
        if re.match(r"\s*(public|protected|private):$", self.lines[self.at]):
            self.out.append(self.lines[self.at])
            self.at += 1
            return True
        return False

    def names_ahead(self):
        """Arguments of all declarations up to the next blank line."""
        names, at = [], self.at
        while self.at < len(self.lines) and self.lines[self.at].strip() and not self.lines[self.at].strip().startswith("//"):
            names += arguments(" ".join(split_line(line)[0] for line in self.take_declaration())) or []
        self.at = at
        return names

    def run(self):
        opening = self.take_comment()
        self.comment(["\\file"] + Comment(opening).lines())
        shared = None
        self.shared_names = []
        while self.at < len(self.lines):
            line = self.lines[self.at]
            if not line.strip():
                self.out.append(line)
                self.at += 1
                shared = None
            elif re.match(r"\s*}", line) and len(self.sections) > 1:
                self.close_section()
                self.sections.pop()
                self.out.append(line)
                self.at += 1
                shared = None
            elif line.strip().startswith("//"):
                where = self.at
                lines = self.take_comment()
                if lines[0].startswith("--- "):
                    self.section(lines)
                    continue
                if self.at == len(self.lines) or not self.lines[self.at].strip():
                    sys.exit("%s:%d: a comment of nothing: a section begins \"// --- title ---\"" % (sys.argv[1], where + 1))
                shared = Comment(lines)
                self.shared_names = self.names_ahead()
                self.write(self.take_declaration(), shared, shared)
            elif not self.take_label():
                self.write(self.take_declaration(), None, shared)
            if self.out[-1].endswith("{"):
                shared = None
        self.close_section()
        print("\n".join(self.out))


def defined_macros(folder):
    """Those of the headers that declare members."""
    macros = {}
    for name in MACRO_HEADERS:
        with open(os.path.join(folder, name), encoding="utf-8") as file:
            text = file.read()
        for found in re.finditer(r"((?:^//.*\n)*)^(#define \w+\([^)]*\)(?:.*\\\n)+.*)", text, re.M):
            macro = Macro(found[2], Comment([re.sub("^// ?", "", line) for line in found[1].splitlines()]))
            macro.comment_names = [name for names, _ in macro.comment.rows for name in names]
            macros[macro.name] = macro
    return macros


if __name__ == "__main__":
    here = os.path.dirname(os.path.abspath(__file__))
    Filter(sys.argv[1], defined_macros(os.path.join(here, "..", "include", "zuv_client_pro"))).run()

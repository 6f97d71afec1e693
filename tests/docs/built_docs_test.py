#!/usr/bin/python3
"""The built documents show what they speak of: a proxy's page holds its members with their arguments and what is said of them, a
symbol without documentation fails the build, the page about the command line is found from the first page, and its pictures
are whole PNG files on which something can be seen.

Usage: built_docs_test.py SOURCE_DIR DOXYFILE FOLDER
"""
import glob
import html
import os
import pathlib
import re
import struct
import subprocess
import sys
import tempfile
import zlib

PICTURES = {"service.png", "trace.png", "trace-open.png"}
# Of the page of a class: a member as it is declared, and words of what is said there of it or of its arguments.
MEMBERS = {
    "classProfileSoapBindingProxy.html": [
        ("ProfileSoapBindingProxy (int imode, int omode)", "MODE_... for output"),
        ("ProfileSoapBindingProxy (const char *endpoint, int iomode)", "Without arguments the modes are 0"),
        ("virtual int create (protocolProfile__ProfileContent *request, __protocolProfile__createResponse &response)",
         "Creates a profile."),
        ("virtual int _create (const char *endpoint, const char *soap_action, protocolProfile__ProfileContent *request, "
         "__protocolProfile__createResponse &response)", "the service sent a fault: Client or Sender"),
        ("virtual char * soap_print_fault_buffer (char *buffer, std::size_t length)", "bytes in the buffer"),
        ("const char * endpoint", "Borrowed: the text must outlive every call."),
    ],
    "classprotocol____Identity.html": [
        ("virtual int soap_out (struct soap *ctx, const char *tag, int id, const char *type) const",
         "number for an id attribute"),
        ("std::string * name", ""),
    ],
    "soap__error_8h.html": [
        ("int soap_fault_set_copied (soap *ctx, const char *code, const char *subcode, const char *text, const char *detail)",
         "SOAP_OUT_OF_MEMORY the fault is as it was"),
        ("SOAP_TLS_ERROR", "30 SSL/TLS error"),
    ],
}


def picture(path):
    """Width, height and the bytes of the rows of a PNG file, each part of which is as its checksum says."""
    data = pathlib.Path(path).read_bytes()
    assert data[:8] == b"\x89PNG\r\n\x1a\n", path
    place, kind, size, rows = 8, b"", (0, 0), b""
    while kind != b"IEND":
        length, kind = struct.unpack_from(">I4s", data, place)
        content = data[place + 8:place + 8 + length]
        assert zlib.crc32(kind + content) == struct.unpack_from(">I", data, place + 8 + length)[0], path
        if kind == b"IHDR":
            size = struct.unpack_from(">II", content)
        elif kind == b"IDAT":
            rows += content
        place += length + 12
    return *size, zlib.decompress(rows)


def words(text):
    """The text of a page or of a declaration, blanks between words alone."""
    return " ".join(html.unescape(re.sub(r"<[^>]*>", " ", text)).split())


def spelled(text):
    """A declaration whatever its blanks."""
    return re.sub(r"\s*([^\w\s])\s*", r"\1", words(text))


def check_members(folder):
    for name, members in MEMBERS.items():
        page = pathlib.Path(folder, name).read_text("utf-8")
        for declaration, said in members:
            assert spelled(html.escape(declaration)) in spelled(page), "%s lacks %s" % (name, declaration)
            assert said in words(page), "%s doesn't say \"%s\"" % (name, said)


def check_functions(source, folder):
    """No function of the hand-written headers is lost on the way."""
    count = 0
    for path in glob.glob(os.path.join(source, "include", "zuv_client_pro", "*.h")):
        names = re.findall(r"^(?:extern \"C\" )?ZUV_API[^;{}(]*?(\w+)\(", pathlib.Path(path).read_text("utf-8"), re.M)
        page = os.path.join(folder, os.path.basename(path).replace("_", "__").replace(".h", "_8h.html"))
        if names:
            shown = words(pathlib.Path(page).read_text("utf-8"))
            missing = [name for name in names if name + " (" not in shown]
            assert not missing, "%s: not shown: %s" % (page, missing)
        count += len(names)
    assert count > 300, count


def check_undocumented(source, doxyfile):
    """A header with a symbol, an argument or a result without documentation isn't accepted; one with all of them is."""
    header = "// a.h - a header.\n#pragma once\n\n%sint f(int x);\n"
    whole = "// Doubles.\n//   x        a number\n//   returns  twice of it\n"
    for comment, accepted in ((whole, True), ("", False), ("// Doubles.\n//   y        a number\n//   returns  two\n", False),
                              ("// Doubles.\n//   x        a number\n", False), ("// Doubles.\n//   returns  two\n", False)):
        with tempfile.TemporaryDirectory() as folder:
            pathlib.Path(folder, "a.h").write_text(header % comment, "utf-8")
            settings = "@INCLUDE = %s\nINPUT = %s\nOUTPUT_DIRECTORY = %s\nSTRIP_FROM_PATH =\nIMAGE_PATH =\n" % (
                doxyfile, os.path.join(folder, "a.h"), folder)
            run = subprocess.run(["doxygen", "-"], input=settings, text=True, capture_output=True, cwd=source, timeout=60)
        assert (run.returncode == 0) == accepted, "%s\n%s" % (comment, run.stderr)


def main():
    source, doxyfile, folder = (os.path.abspath(path) for path in sys.argv[1:])
    folder = os.path.join(folder, "api")
    check_members(folder)
    check_functions(source, folder)
    check_undocumented(source, doxyfile)
    first = pathlib.Path(folder, "index.html").read_text("utf-8")
    assert 'href="command_line.html"' in first, "the first page doesn't lead to the command line"
    page = pathlib.Path(folder, "command_line.html").read_text("utf-8")
    shown = set(re.findall(r'<img src="([^"]+)"', page))
    assert shown == PICTURES, shown
    assert "zuv trace" in page and "<!--picture" not in page.replace(" ", "")
    for name in sorted(shown):
        width, height, rows = picture(os.path.join(folder, name))
        assert width == 1240 and 400 <= height <= 2000, (name, width, height)
        assert len(rows) >= 3 * width * height and len(set(rows)) > 100, "%s: nothing to be seen" % name
        print("%s: %d x %d" % (name, width, height))


if __name__ == "__main__":
    main()

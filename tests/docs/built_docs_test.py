#!/usr/bin/python3
"""The built documents show what they speak of: the page about the command line is found from the first page, and its pictures
are whole PNG files on which something can be seen.

Usage: built_docs_test.py FOLDER
"""
import os
import re
import struct
import sys
import zlib

PICTURES = {"trace.png", "trace-open.png"}


def picture(path):
    """Width, height and the bytes of the rows of a PNG file, each part of which is as its checksum says."""
    with open(path, "rb") as file:
        data = file.read()
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


def main():
    folder = os.path.join(sys.argv[1], "api")
    with open(os.path.join(folder, "index.html"), encoding="utf-8") as file:
        assert 'href="command_line.html"' in file.read(), "the first page doesn't lead to the command line"
    with open(os.path.join(folder, "command_line.html"), encoding="utf-8") as file:
        page = file.read()
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

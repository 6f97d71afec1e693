#!/usr/bin/python3
"""Files and folders of this tree that a comment names exist: a path as it is written, a name alone in any folder.

Usage: comment_files_test.py SOURCE_DIR GENERATED_DIR
"""
import os
import re
import subprocess
import sys

ROOTS = ("src", "include", "tests", "service", "cli", "tools", "examples", "bench", "script", "cmake")
NAME = re.compile(r"(?<![\w./*<>$-])((?:[\w.-]+/)*[\w-]+\.(?:cpp|h|md|py|cmake|sed|sh))(?![\w*/])")
FOLDER = re.compile(r"(?<![\w./*<>${}-])((?:%s)/[\w-]+(?:/[\w-]+)*)(?![\w*<$.{/-])" % "|".join(ROOTS))
FOREIGN = {"host.cpp"}  # what a user of the library writes


def comments(path, text):
    """Line number and text of each comment."""
    marks = r"//|/\*|^ *\*" if path.endswith((".cpp", ".h")) else r"(?:^|(?<=\s))#(?!!)"
    for number, line in enumerate(text.splitlines(), 1):
        if found := re.search(marks, re.sub(r'"(?:\\.|[^"\\])*"', lambda quoted: " " * len(quoted[0]), line)):
            yield number, line[found.end():]


def main():
    source, generated = sys.argv[1:]
    listed = subprocess.run(["git", "ls-files", "--cached", "--others", "--exclude-standard"], cwd=source, text=True,
                            capture_output=True).stdout.splitlines()
    files = [path for path in listed if os.path.isfile(os.path.join(source, path))]
    made = [os.path.relpath(os.path.join(folder, name), generated) for folder, _, names in os.walk(generated) for name in names]
    if not files:  # not a checkout
        print("no list of files")
        sys.exit(77)
    known = set()
    for path in files + made:
        parts = path.split("/")
        known |= {"/".join(parts[first:last]) for first in range(len(parts)) for last in range(first + 1, len(parts) + 1)}
    missing, looked_at = [], 0
    for path in files:
        if path.split("/")[0] not in ROOTS or not path.endswith((".cpp", ".h", ".py", ".cmake", ".sh")) \
                and os.path.dirname(path) != "script":
            continue
        with open(os.path.join(source, path), encoding="utf-8", errors="replace") as file:
            for number, comment in comments(path, file.read()):
                for name in NAME.findall(comment) + FOLDER.findall(comment):
                    looked_at += 1
                    if name not in known and name not in FOREIGN:
                        missing.append("%s:%d: there is no %s" % (path, number, name))
    assert not missing, "\n".join(missing)
    assert looked_at > 300, "only %d names found: comments were not read" % looked_at
    print("%d names of files and folders in comments" % looked_at)


if __name__ == "__main__":
    main()

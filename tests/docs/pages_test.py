#!/usr/bin/python3
"""What the pages show is so: their C++ stands in programs that compile and run, and their links lead somewhere.

Usage: pages_test.py SOURCE_DIR ZUV_SERVICE GUIDE README_HOST. The programs call a zuv-service started here.
"""
import os
import re
import subprocess
import sys
import tempfile

sys.path.insert(0, os.path.join(os.path.dirname(os.path.abspath(__file__)), "..", "interop"))
import messages
import zuv_service


def blocks(page, language):
    return re.findall(r"^```%s\n(.*?)^```" % language, page, re.S | re.M)


def words(code):
    return " ".join(code.split())


def anchors(page):
    titles = re.findall(r"^#+ (.*)$", page, re.M)
    return {re.sub(r"[^\w\- ]", "", title.lower()).replace(" ", "-") for title in titles}


def check_links(path):
    with open(path, encoding="utf-8") as file:
        page = file.read()
    for target in re.findall(r"\]\(([^)\s]+)\)", page):
        if re.match(r"https?:", target):
            continue
        name, _, anchor = target.partition("#")
        place = os.path.join(os.path.dirname(path), name) if name else path
        assert os.path.exists(place), "%s: no file for the link %s" % (path, target)
        if anchor:
            with open(place, encoding="utf-8") as file:
                assert anchor in anchors(file.read()), "%s: no heading for the link %s" % (path, target)


def check_guide(source):
    with open(os.path.join(source, "docs", "host-guide.md"), encoding="utf-8") as page:
        pieces = blocks(page.read(), "cpp")
    with open(os.path.join(source, "examples", "guide.cpp"), encoding="utf-8") as program:
        compiled = words(program.read())
    assert len(pieces) > 10, "the guide's code was not found"
    for piece in pieces:
        assert words(piece) in compiled, "not in examples/guide.cpp:\n" + piece


def check_run(program, arguments, expected, **environment):
    with tempfile.TemporaryDirectory() as folder:
        run = subprocess.run([program, *arguments], cwd=folder, text=True, capture_output=True, timeout=60,
                             env={**os.environ, **environment})
    assert run.returncode == 0, run.stdout + run.stderr
    for pattern in expected:
        assert re.search(pattern, run.stdout, re.M), "not printed: %s\n%s" % (pattern, run.stdout)


def main():
    source, service, guide, readme_host = sys.argv[1:]
    pages = subprocess.run(["git", "ls-files", "*.md"], cwd=source, text=True, capture_output=True).stdout.split()
    pages = pages or ["README.md", "docs/host-guide.md", "docs/architecture.md"]  # not a checkout
    for page in pages:
        check_links(os.path.join(source, page))
    check_guide(source)
    with zuv_service.running(service) as address:
        endpoint = address + messages.service_path("Profile")
        check_run(guide, [endpoint], [r"^Ada's workshop$", r"^still here: Ada's workshop$", r"^not found: urn:not:there$",
                                      r"^\d+ bytes$"])
        check_run(readme_host, [], [r"^kept as urn:zuv:profile:"], ZUV_README_ENDPOINT=endpoint)
    print("%d pages, the guide's code and the README's host" % len(pages))


if __name__ == "__main__":
    main()

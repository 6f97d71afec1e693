#!/usr/bin/python3
"""What is handed out was compiled and linked as cmake/hardening.cmake has it: read from the files themselves.

Usage: hardening_test.py LIBRARY PROGRAM..."""
import platform
import re
import subprocess
import sys


def read(*command):
    return subprocess.run(command, check=True, capture_output=True, text=True).stdout


def findings(path, program):
    """Whether each kind of protection is there."""
    head, dynamic = read("readelf", "-hlW", path), read("readelf", "-dW", path)
    imported = re.findall(r" UND (\w+)", read("readelf", "-W", "--dyn-syms", path))
    segments = re.findall(r"^ +(\w+) +0x.* ([R ][W ][E ]) +0x[0-9a-f]+$", head, re.M)
    yield "read-only relocations", "GNU_RELRO" in dict(segments)
    yield "all bound at the start", re.search(r"\(FLAGS\) .*BIND_NOW|\(FLAGS_1\) .*NOW", dynamic)
    yield "code at its place as it is in the file", "TEXTREL" not in dynamic
    yield "a stack that isn't executed", dict(segments).get("GNU_STACK") == "RW "
    yield "nothing both written and executed", segments and not any("W" in flags and "E" in flags for _, flags in segments)
    yield "guarded stack frames", "__stack_chk_fail" in imported
    if not program: # a program has no arrays of its own that anything is copied into, so nothing there shows it
        yield "checked copies", {"__memcpy_chk", "__snprintf_chk"} <= set(imported)
    if program:
        yield "loaded anywhere", re.search(r"Type: +DYN", head) and re.search(r"\(FLAGS_1\) .*PIE", dynamic)
    if platform.machine() == "x86_64":
        code = read("objdump", "-d", path)
        yield "large stack frames touched page by page", re.search(r"\torq? +\$0x0,\(%rsp\)", code)
        # The whole file isn't marked for it, as Debian's start files aren't; ours is each function that can be jumped to.
        marked = {int(address, 16) for address in re.findall(r"^ *([0-9a-f]+):\tf3 0f 1e fa", code, re.M)}
        functions = re.findall(r": ([0-9a-f]{16}) +\d+ FUNC +(?:GLOBAL|WEAK) +(?:DEFAULT|HIDDEN) +\d+ (\S+)", read("readelf", "-sW", path))
        reachable = {int(address, 16) for address, name in functions if name == "main" or "@@VERS_" in name}
        yield "marked targets of jumps", reachable and reachable <= marked


failed = False
for number, path in enumerate(sys.argv[1:]):
    for what, there in findings(path, program=number > 0):
        failed |= not there
        print("%-6s%s: %s" % ("ok" if there else "FAILS", path.rpartition("/")[2], what))
sys.exit(failed)

#!/usr/bin/python3
"""Runs clang-tidy on units, several at a time, each in a process of its own: the analyzer's check of va_list keeps what it learnt
in the first file of a process and then finds faults in the next that aren't there.

Usage: tidy.py JOBS < UNITS, in the source tree; by build/release/compile_commands.json, which leaves out units that it doesn't name.
A unit that passed isn't looked at again while it, what it includes, its compilation, the checks and clang-tidy stay as they were,
wherever the tree is: the user's cache (XDG_CACHE_HOME, ~/.cache) has an empty file in zuv-tidy for each that passed; remove the folder
to begin anew. Exit status 1: something was found.
"""
import concurrent.futures
import hashlib
import json
import os
import pathlib
import shlex
import subprocess
import sys

ROOT, BUILD = os.getcwd(), "build/release"
PASSED = pathlib.Path(os.environ.get("XDG_CACHE_HOME") or os.path.expanduser("~/.cache")) / "zuv-tidy"
CONFIGURATIONS = (".clang-tidy", "tests/.clang-tidy")
# A comment may switch a check off, so they count; lines' numbers and files' places don't.
PREPROCESS = ["-E", "-CC", "-P", "-o", "-"]


def key(command, common):
    """Of all that the result depends on; None if that can't be made out."""
    words, kept = iter(shlex.split(command["command"].removeprefix("ccache "))), []
    for word in words:
        if word in ("-o", "-MT", "-MF"):
            next(words)
        elif word != "-MD":
            kept.append(word)
    run = subprocess.run([*kept, *PREPROCESS], cwd=command["directory"], capture_output=True)
    if run.returncode != 0:
        return None
    return hashlib.sha256(common + (" ".join(kept).encode() + run.stdout).replace(ROOT.encode(), b"")).hexdigest()


def check(command, common):
    """What was found in the unit, None for nothing, and whether it was looked at."""
    name = key(command, common)
    if name is not None and (PASSED / name).exists():
        return None, False
    run = subprocess.run(["clang-tidy", "-p", BUILD, "--quiet", command["file"]], stdout=subprocess.PIPE, stderr=subprocess.DEVNULL,
                         text=True, errors="replace")
    if run.returncode != 0:
        return "%s%s: clang-tidy ends with %d" % (run.stdout, command["file"], run.returncode), True
    if name is not None:
        (PASSED / name).touch()
    return None, True


def main():
    PASSED.mkdir(parents=True, exist_ok=True)
    wanted = {os.path.abspath(line.strip()) for line in sys.stdin}
    with open(os.path.join(BUILD, "compile_commands.json")) as file:
        commands = list({one["file"]: one for one in reversed(json.load(file)) if one["file"] in wanted}.values())
    common = subprocess.run(["clang-tidy", "--version"], capture_output=True, check=True).stdout
    common += b"".join(pathlib.Path(path).read_bytes() for path in CONFIGURATIONS)
    found = looked_at = 0
    with concurrent.futures.ThreadPoolExecutor(int(sys.argv[1])) as pool:
        for number, (command, (text, anew)) in enumerate(
                zip(commands, pool.map(lambda one: check(one, common), commands)), 1):
            found += text is not None
            looked_at += anew
            print("\r[%d/%d]" % (number, len(commands)), end="", file=sys.stderr, flush=True)
            if text is not None:
                print("\n" + text, flush=True)
    print("\r%d units, %d looked at, %d with findings" % (len(commands), looked_at, found), file=sys.stderr)
    sys.exit(1 if found or not commands else 0)


if __name__ == "__main__":
    main()

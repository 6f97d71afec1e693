#!/usr/bin/env python3
"""Checks that the layers of src/ depend on each other as listed here, by what is included and by what is linked.

Usage: script/layers.py [BUILD]    BUILD: a build with the objects of the library; build/release without argument.
Exit status 1 if a layer uses one that it may not; each line names both ends.
Three checks: the headers that a file includes; the symbols that an object leaves to others; and a link of each layer with
those that it may use and with nothing else.
"""
import collections
import pathlib
import re
import subprocess
import sys
import tempfile

# What each layer may use, bottom to top. What the generator makes of classes and tables belongs to binding, what it makes of
# ports to exchange.
LAYERS = {
    "core": [],
    "net": ["core"],
    "xml": ["core"],
    "identity": ["core", "xml"],
    "values": ["core", "xml", "identity"],
    "attachments": ["core", "xml", "identity"],
    "binding": ["core", "xml", "identity", "values", "attachments"],
    "exchange": ["core", "net", "xml", "identity", "values", "attachments", "binding"],
    "client": ["core", "net", "xml", "identity", "values", "attachments", "binding", "exchange"],
}
LIBRARIES = ["-lssl", "-lcrypto", "-lz"]
root = pathlib.Path(__file__).resolve().parent.parent


def generated_layer(stem):
    return "exchange" if stem.endswith("Proxy") else "binding"


def layer_of_object(path):
    return generated_layer(path.name.split(".")[0]) if "generated" in path.parts else path.parent.name


def is_current(path):
    """An object of a source that has gone or moved may still lie in the build."""
    return "generated" in path.parts or (root / "src" / path.parent.name / path.name.removesuffix(".o")).exists()


def forbidden(user, used):
    return used != user and used not in LAYERS[user]


def check_includes():
    for path in sorted((root / "src").rglob("*")):
        layer = path.parent.name
        if path.is_dir():
            if layer == "src" and path.name not in LAYERS:
                yield f"src/{path.name}: no layer; name it in script/layers.py, and what it may use"
            continue
        for number, line in enumerate(path.read_text().splitlines(), 1):
            included = re.match(r'#include "(\w+)/', line)
            if included and forbidden(layer, included[1]):
                yield f"src/{layer}/{path.name}:{number}: {layer} may not use {included[1]}: {line}"


def symbols(objects):
    """Per object: what it defines and what it leaves to others, with readable names."""
    listing = subprocess.run(["nm", "-C", "-A", *map(str, objects)], check=True, capture_output=True, text=True).stdout
    defined, wanted = {}, collections.defaultdict(set)
    for line in listing.splitlines():
        found = re.match(r"(.*?\.o):[0-9a-f ]* ([A-Za-z]) (.*)", line)
        if not found:
            continue
        path, kind, name = pathlib.Path(found[1]), found[2], found[3]
        if kind == "U":
            wanted[path].add(name)
        elif kind in "TBDRuG":
            defined[name] = path
    return defined, wanted


def check_symbols(objects):
    defined, wanted = symbols(objects)
    for path in sorted(wanted):
        user = layer_of_object(path)
        for name in sorted(wanted[path]):
            home = defined.get(name)
            if home and forbidden(user, layer_of_object(home)):
                yield (f"{user}/{path.stem}: {user} may not use {layer_of_object(home)}: "
                       f"{name} of {layer_of_object(home)}/{home.stem}")


def check_links(objects):
    by_layer = collections.defaultdict(list)
    for path in objects:
        by_layer[layer_of_object(path)].append(str(path))
    with tempfile.TemporaryDirectory() as scratch:
        for layer, below in LAYERS.items():
            used = [path for name in [layer, *below] for path in by_layer[name]]
            link = subprocess.run(["c++", "-shared", "-Wl,-z,defs", "-o", f"{scratch}/{layer}.so", *used, *LIBRARIES],
                                  capture_output=True, text=True)
            if link.returncode:
                missing = sorted(set(re.findall(r"undefined reference to `(.*?)'", link.stderr)))
                yield f"{layer} doesn't link with {', '.join(below) or 'nothing'} alone: " + (
                    ", ".join(missing[:10]) or link.stderr[-500:])


def main():
    build = pathlib.Path(sys.argv[1] if len(sys.argv) > 1 else root / "build" / "release")
    objects = sorted((build / "CMakeFiles" / "zuv_objects.dir").rglob("*.o"))
    if not objects:
        sys.exit(f"script/layers.py: {build} holds no objects of the library: run script/build release")
    objects = [path for path in objects if is_current(path)]
    findings = [*check_includes(), *check_symbols(objects)]
    findings += check_links(objects) if not findings else []
    print(*findings, sep="\n", end="\n" if findings else "")
    return bool(findings)


if __name__ == "__main__":
    sys.exit(main())

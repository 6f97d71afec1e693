"""What the shared object exports and needs.

Usage: abi_surface.py LIBRARY NAMES HEADERS... [--renew]

Checks soname, symbol version, needed libraries, what is left to the host's OpenSSL and zlib, that each exported function and
object is declared in a public header (of the directories HEADERS) and each declared one exported, and that the exported names
are those of the file NAMES. --renew writes that file instead.

In the file a line is one function or object by its full signature, or a class. A class by itself has the operations of every
data class, its vtable and its type information; what more or less a class has is listed after it.
"""
import collections
import pathlib
import re
import subprocess
import sys

SONAME = "libzuv_client_pro.so.1.5.1"
VERSION = "VERS_1.0"
NEEDED = {"libstdc++.so.6", "libm.so.6", "libc.so.6"}
OPENSSL_OR_ZLIB = re.compile(
    r"(ASN1|BIO|CRYPTO|DH|ERR|EVP|GENERAL_NAMES?|OPENSSL|PEM|RAND|SSL|SSL_CTX|TLS|X509)_\w+|(in|de)flate\w*|crc32|zError")
# What every process has: the loader's optional hooks, and the unwinder of the C++ runtime.
OF_THE_PROCESS = {"_ITM_deregisterTMCloneTable", "_ITM_registerTMCloneTable", "__gmon_start__", "_Unwind_Resume"}
CLASS_MEMBERS = {
    "soap_type() const", "soap_default(soap*)", "soap_serialize(soap*) const",
    "soap_put(soap*, char const*, char const*) const", "soap_out(soap*, char const*, int, char const*) const",
    "soap_get(soap*, char const*, char const*)", "soap_in(soap*, char const*, char const*)",
    "CLASS()", "~CLASS()", "vtable", "typeinfo", "typeinfo name"}


def output(*command, text=None):
    return subprocess.run(command, check=True, capture_output=True, text=True, input=text).stdout


def symbols(library):
    """(name, version or None, defined) of each dynamic symbol."""
    for line in output("nm", "--dynamic", "--with-symbol-versions", library).splitlines():
        kind, name = line.split()[-2:]
        name, _, version = name.partition("@")
        yield name, version.lstrip("@") or None, kind not in "Uwv"


def surface(names):
    """Lines of the file for exported names: functions and objects, then classes."""
    plain, classes = set(), collections.defaultdict(set)
    for name in output("c++filt", text="\n".join(names)).splitlines():
        name = name.removeprefix("zuv::")  # the one namespace
        about = re.fullmatch(r"(vtable|typeinfo name|typeinfo) for (\w+)", name)
        member = re.fullmatch(r"(\w+)::(.*)", name)
        if about:
            classes[about[2]].add(about[1])
        elif member:
            classes[member[1]].add(re.sub(rf"^(~?){member[1]}\(", r"\1CLASS(", member[2]))
        else:
            plain.add(name)
    lines = sorted(plain)
    for name, members in sorted(classes.items()):
        lines.append(f"class {name}")
        if CLASS_MEMBERS - members and len(CLASS_MEMBERS & members) > len(CLASS_MEMBERS) // 2:
            lines += [f"    without {member}" for member in sorted(CLASS_MEMBERS - members)]
            members -= CLASS_MEMBERS
        elif CLASS_MEMBERS <= members:
            members -= CLASS_MEMBERS
        lines += [f"    {member}" for member in sorted(members)]
    return lines


def declared(directories):
    """Names that public headers mark as exported: functions and objects, and classes."""
    functions, classes = set(), set()
    for directory in directories:
        for path in pathlib.Path(directory).glob("*.h"):
            text = re.sub(r"//[^\n]*|^#[^\n]*", "", path.read_text(), flags=re.M)
            functions.update(re.findall(r"\bZUV_API\b[^;({\[]*?(\w+)\s*[;(\[]", text))
            classes.update(re.findall(r"\bZUV_CLASS\s+(\w+)", text))
    return functions, classes


def main():
    renew = "--renew" in sys.argv
    library, expected, *headers = [argument for argument in sys.argv[1:] if argument != "--renew"]
    faults = []

    dynamic = output("readelf", "--dynamic", "--wide", library)
    soname = re.findall(r"SONAME.*\[(.*)\]", dynamic)
    if soname != [SONAME] or pathlib.Path(library).resolve().name != SONAME:
        faults.append(f"soname {soname}, file {pathlib.Path(library).resolve().name}: both should be {SONAME}")
    needed = set(re.findall(r"NEEDED.*\[(.*)\]", dynamic))
    if needed - NEEDED or "libc.so.6" not in needed:
        faults.append(f"needs {sorted(needed)}")

    exported = set()
    for name, version, defined in symbols(library):
        if defined and name != VERSION:
            exported.add(name)
            if version != VERSION:
                faults.append(f"{name} has version {version}")
        elif not defined and version is None and name not in OF_THE_PROCESS and not OPENSSL_OR_ZLIB.fullmatch(name):
            faults.append(f"{name} comes from no library that a host has")

    lines = surface(sorted(exported))
    functions, classes = declared(headers)
    seen_functions = {re.match(r"\w+", line)[0] for line in lines if line[0] not in " " and not line.startswith("class ")}
    seen_classes = {line.split()[1] for line in lines if line.startswith("class ")}
    for kind, wanted, seen in ("function or object", functions, seen_functions), ("class", classes, seen_classes):
        faults += [f"{kind} {name} is exported, but in no public header" for name in sorted(seen - wanted)]
        faults += [f"{kind} {name} of the public headers isn't exported" for name in sorted(wanted - seen)]

    path = pathlib.Path(expected)
    if renew:
        path.write_text("\n".join(lines) + "\n")
    else:
        known = path.read_text().splitlines()
        faults += [f"not listed any more: {line.strip()}" for line in sorted(set(known) - set(lines))]
        faults += [f"new: {line.strip()}" for line in sorted(set(lines) - set(known))]
        if not faults and known != lines:
            faults.append("the same names in another order")
        if faults:
            faults.append("if the change is meant: script/abi --renew, and a word in CHANGELOG.md")
    print("\n".join(faults) or f"{len(exported)} names exported, as listed")
    return 1 if faults else 0


sys.exit(main())

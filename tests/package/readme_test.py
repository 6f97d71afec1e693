#!/usr/bin/python3
"""The README's commands for who installs the library and builds a host, run as they are written there.

Usage: readme_test.py SOURCE_DIR BUILD_DIR PACKAGES. The build's place and the service's address are put in for those that the
README names; nothing is installed outside a folder for the time of the test.
"""
import glob
import os
import pathlib
import re
import subprocess
import sys
import tempfile

source, build, packages = (os.path.abspath(path) for path in sys.argv[1:])
sys.path.insert(0, os.path.join(source, "tests", "interop"))
import zuv_service  # noqa: E402

PROJECT = "cmake_minimum_required(VERSION 3.25)\nproject(host CXX)\nadd_executable(host host.cpp)\n"
LIMIT_S = 300


def found(pattern, text):
    match = re.search(pattern, text, re.S | re.M)
    assert match, "not in the README: " + pattern
    return match[1]


def run(command, folder, **environment):
    made = subprocess.run(command, shell=True, cwd=folder, capture_output=True, text=True, timeout=LIMIT_S,
                          env={**os.environ, **environment})
    assert made.returncode == 0, "%s: %s" % (command, made.stdout + made.stderr)
    return made.stdout


def check_packages(readme, prefix):
    """The packages have the names that the README gives, and hold the same files as the installed tree."""
    named = found(r"makes three Debian packages, (.*?);", readme)
    files = glob.glob(os.path.join(packages, "*.deb"))
    names = {run("dpkg-deb -f %s Package" % file, packages).strip() for file in files}
    assert names == set(re.findall("`(.*?)`", named)), (names, named)
    held = {line.removeprefix("./usr/") for file in files
            for line in run("dpkg-deb --fsys-tarfile %s | tar -t" % file, packages).split() if not line.endswith("/")}
    laid = {os.path.relpath(os.path.join(place, file), prefix) for place, _, files in os.walk(prefix) for file in files}
    assert len(laid) > 50 and laid == held, laid ^ held


def main():
    readme = pathlib.Path(source, "README.md").read_text("utf-8")
    with tempfile.TemporaryDirectory() as folder:
        prefix = os.path.join(folder, "usr")
        run(found(r"`(cmake --install [^`]*)`", readme).replace("build/release", build) + " --prefix " + prefix, folder)
        check_packages(readme, prefix)
        library = os.path.dirname(glob.glob(os.path.join(prefix, "lib", "**", "libzuv_client_pro.so"), recursive=True)[0])
        where = {"LD_LIBRARY_PATH": library, "PKG_CONFIG_PATH": os.path.join(library, "pkgconfig"), "CMAKE_PREFIX_PATH": prefix}
        with zuv_service.running(os.path.join(build, "zuv-service")) as address:
            source_text = found(r"^```cpp\n(.*?)^```", readme).replace("http://127.0.0.1:9080", address)
            pathlib.Path(folder, "host.cpp").write_text(source_text, "utf-8")
            pathlib.Path(folder, "CMakeLists.txt").write_text(PROJECT + found(r"^```cmake\n(.*?)^```", readme), "utf-8")
            for command, host in ((found(r"``(g\+\+ .*?)``", readme), "./a.out"), ("cmake -B b && cmake --build b", "b/host")):
                run(command, folder, **where)
                assert run(host, folder, **where).startswith("kept as urn:zuv:profile:"), host
                print("a host built by: " + command)


if __name__ == "__main__":
    main()

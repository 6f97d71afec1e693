#!/usr/bin/python3
"""The example host, on the library, calls a Profile service that an independent SOAP stack serves from the WSDL.

Usage: npm_profile.py PROFILE_HOST SCHEMA_DIR WORK_DIR. The stack is installed below WORK_DIR.
"""
import os
import select
import shutil
import subprocess
import sys

EXPECTED = """\
create               urn:other:1, Ada's workshop, 1 contacts, 0 credentials
get                  urn:other:1, Ada's workshop, 1 contacts, 0 credentials
add                  urn:other:1, Ada's workshop, 2 contacts, 0 credentials
set                  urn:other:1, Ada's new workshop, 1 contacts, 0 credentials
refreshCredentials   urn:other:1, Ada's new workshop, 1 contacts, 1 credentials
remove               urn:other:1, Ada's new workshop, 1 contacts, 1 credentials
"""


def main():
    host, schemas, work = (os.path.abspath(argument) for argument in sys.argv[1:])
    source = os.path.join(os.path.dirname(os.path.abspath(__file__)), "soap_server")
    os.makedirs(work, exist_ok=True)
    for name in ("package.json", "package-lock.json", "server.js"):
        shutil.copy(os.path.join(source, name), work)
    subprocess.run(["npm", "ci", "--no-audit", "--no-fund", "--loglevel=error"], cwd=work, check=True)
    server = subprocess.Popen(["node", "server.js", os.path.join(schemas, "profile", "Profile.wsdl")], cwd=work,
                              stdout=subprocess.PIPE, text=True)
    try:
        ready, _, _ = select.select([server.stdout], [], [], 30)
        line = server.stdout.readline() if ready else ""
        assert line.startswith("listening on "), "the service did not start: " + repr(line)
        endpoint = line[len("listening on "):].strip() + "/zuv/v1.0/services/Profile"
        first = subprocess.run([host, endpoint], cwd=work, text=True, capture_output=True, timeout=60)
        assert first.returncode == 0 and first.stdout == EXPECTED, first.stdout + first.stderr
    finally:
        server.terminate()
        server.wait(30)
    print("six operations against an independent stack")


if __name__ == "__main__":
    main()

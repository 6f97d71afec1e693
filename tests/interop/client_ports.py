#!/usr/bin/python3
"""The library's clients call the five ports, of zuv-service and of a service on an independent SOAP stack, from the WSDLs.

Usage: client_ports.py PROFILE_CLIENT CARE_HOST PROBLEM_REPORT_HOST ZUV_SERVICE NPM_FOLDER SCHEMA_DIR. The clients check the
answers; what the library sends, and what it gets, is validated here against the published schemas.
"""
import os
import subprocess
import sys
import tempfile

from lxml import etree

import messages
import zuv_service

VARIANTS = ([], ["--keep-alive", "--calls", "20"], ["--chunked"], ["--keep-alive", "--chunked", "--size", "300000"])
TRACE = "wsTrace.log"  # what a host leaves where it ran


def run(client, *arguments, folder=None):
    ran = subprocess.run([client, *arguments], capture_output=True, text=True, timeout=120, cwd=folder)
    assert ran.returncode == 0, (client, arguments, ran.stdout, ran.stderr)
    return ran.stdout


def check_profile(client, address, schemas, version):
    endpoint = address + messages.service_path("Profile")
    for variant in VARIANTS:
        assert "fault: " in run(client, endpoint, *variant, *version)
    with tempfile.TemporaryDirectory() as folder:
        run(client, endpoint, "--trace", "sent", *version, folder=folder)
        elements = [part for envelope in messages.in_trace(os.path.join(folder, "sent")) for part in messages.parts(envelope)]
    assert len(elements) == 2 * 7, "seven requests, each a header block and the content, not %d" % len(elements)
    messages.validate(schemas, ["Profile"], elements)


def check_host(host, ports, address, schemas, version):
    """A host calls all operations of the ports."""
    with tempfile.TemporaryDirectory() as folder:
        run(host, address, *version, folder=folder)
        elements = [part for envelope in messages.in_trace(os.path.join(folder, TRACE)) for part in messages.parts(envelope)]
    names = [etree.QName(element) for element in elements if etree.QName(element).namespace != messages.COMMON]
    for suffix in ("Request", "Response"):
        seen = {(name.namespace, name.localname) for name in names if name.localname.endswith(suffix)}
        assert seen == {(messages.namespace(port), operation + suffix)
                        for port in ports for operation in messages.operations(schemas, port)}, seen
    messages.validate(schemas, ports, elements)
    return len(elements)


def main():
    profile_client, care_host, problem_host, service, npm_folder, schemas = map(os.path.abspath, sys.argv[1:])
    for version in ([], ["--soap12"]):
        for name, running in (("zuv-service", zuv_service.running(service, "--account", "ada:sesame")),
                              ("npm's soap", zuv_service.running_npm(npm_folder, schemas, *version))):
            with running as address:
                check_profile(profile_client, address, schemas, version)
                count = check_host(care_host, ("InventoryReport", "UpdateOrder", "StatusReport"), address, schemas, version)
                count += check_host(problem_host, ("ProblemReport",), address, schemas, version)
            print("%s, SOAP 1.%d: five ports, %d elements of the hosts valid" % (name, 2 if version else 1, count))


if __name__ == "__main__":
    main()

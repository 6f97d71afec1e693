#!/usr/bin/python3
"""The library's clients call the five ports, of zuv-service and of a service on an independent SOAP stack, from the WSDLs.

Usage: client_ports.py ZUV CARE_HOST PROBLEM_REPORT_HOST ZUV_SERVICE NPM_FOLDER SCHEMA_DIR. The hosts check the answers; what the library sends, and what it gets, is validated here against the published schemas.
"""
import os
import subprocess
import sys
import tempfile
from unittest.mock import ANY
from xml.sax.saxutils import escape

from lxml import etree

import messages
import profile_calls
import zuv_service

VARIANTS = ([], ["--keep-alive", "--repeat", "20"], ["--chunked"])
TRACE = "wsTrace.log"  # what a host leaves where it ran


def run(client, *arguments, folder=None):
    ran = subprocess.run([client, *arguments], capture_output=True, text=True, timeout=120, cwd=folder)
    assert ran.returncode == 0, (client, arguments, ran.stdout, ran.stderr)
    return ran.stdout


def check_walk(profiles, framing):
    """Every operation of the Profile port."""
    profiles.call("create", given=profile_calls.SAMPLE % "")
    profiles.call("get", *framing)
    text = "|<&>\"' z" + 300000 * "x"
    given = profile_calls.SAMPLE % ("<p:profileAuthority>%s</p:profileAuthority>" % escape(text))
    profiles.call("set", *framing, given=given, profileAuthority=text)
    more = "<p:addRequest %s><contact><name>added</name></contact></p:addRequest>" % profile_calls.NAMESPACES
    profiles.call("add", given=more, contact=profile_calls.HELD["contact"] + [{"name": "added"}])
    request = "<p:refreshCredentialsRequest %s>%s</p:refreshCredentialsRequest>" % (
        profile_calls.NAMESPACES, profile_calls.CREDENTIALS.replace("credentials>", "p:credentials>"))
    fresh, = profiles.call("refreshCredentials", given=request, contact=ANY, credentials=ANY)["credentials"]
    assert (fresh["username"], fresh["state"]) == ("zoe", "valid") and fresh["token"], fresh
    profiles.call("remove", contact=ANY, credentials=ANY)
    profiles.expect_not_found()


def check_profile(zuv, address, schemas, version):
    endpoint = address + messages.service_path("Profile")
    with tempfile.TemporaryDirectory() as folder:
        trace = os.path.join(folder, TRACE)
        for framing in VARIANTS:
            options = ["--transaction", "T", *version, *([] if framing else ["--trace", trace])]
            check_walk(profile_calls.Profiles(zuv, endpoint, *options), framing)
        elements = [part for envelope in messages.in_trace(trace) for part in messages.parts(envelope)]
    headers = [element for element in elements if etree.QName(element).localname == "header"]
    assert len(elements) - len(headers) == 2 * 7, "seven calls, each way the content, not %d" % (len(elements) - len(headers))
    assert len(headers) >= 2 * 7 - 1, "each way a header but for the fault of some, not %d" % len(headers)
    assert {header.findtext("{%s}transactionId" % messages.COMMON) for header in headers} == {"T"}
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
    zuv, care_host, problem_host, service, npm_folder, schemas = map(os.path.abspath, sys.argv[1:])
    for version in ([], ["--soap12"]):
        for name, running in (("zuv-service", zuv_service.running(service, "--account", "ada:sesame")),
                              ("npm's soap", zuv_service.running_npm(npm_folder, schemas, *version))):
            with running as address:
                check_profile(zuv, address, schemas, version)
                count = check_host(care_host, ("InventoryReport", "UpdateOrder", "StatusReport"), address, schemas, version)
                count += check_host(problem_host, ("ProblemReport",), address, schemas, version)
            print("%s, SOAP 1.%d: five ports, %d elements of the hosts valid" % (name, 2 if version else 1, count))


if __name__ == "__main__":
    main()

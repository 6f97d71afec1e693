#!/usr/bin/python3
"""The library's client calls a Profile service: zuv-service, and one that an independent SOAP stack serves from the WSDL.

Usage: client_profile.py PROFILE_CLIENT ZUV_SERVICE NPM_FOLDER SCHEMA_DIR. The client checks the answers; its requests are
validated here against the published schemas.
"""
import os
import subprocess
import sys
import tempfile

import messages
import zuv_service

VARIANTS = ([], ["--keep-alive", "--calls", "20"], ["--chunked"], ["--keep-alive", "--chunked", "--size", "300000"])


def call_all(client, endpoint, *options):
    run = subprocess.run([client, endpoint, *options], capture_output=True, text=True, timeout=120)
    assert run.returncode == 0 and "fault: " in run.stdout, (options, run.stdout, run.stderr)


def check_requests(client, endpoint, schemas, version):
    with tempfile.TemporaryDirectory() as folder:
        trace = os.path.join(folder, "sent")
        call_all(client, endpoint, "--trace", trace, *version)
        elements = [part for envelope in messages.in_trace(trace) for part in messages.parts(envelope)]
        assert len(elements) == 2 * 7, "seven requests, each a header block and the content, not %d" % len(elements)
        messages.validate(schemas, elements)


def main():
    client, service, npm_folder, schemas = (os.path.abspath(argument) for argument in sys.argv[1:])
    for version in ([], ["--soap12"]):
        for name, running in (("zuv-service", zuv_service.running(service)),
                              ("npm's soap", zuv_service.running_npm(npm_folder, schemas, *version))):
            with running as address:
                for variant in VARIANTS:
                    call_all(client, address + zuv_service.PATH, *variant, *version)
                check_requests(client, address + zuv_service.PATH, schemas, version)
            print("%s, SOAP 1.%d: 6 operations and a fault" % (name, 2 if version else 1))


if __name__ == "__main__":
    main()

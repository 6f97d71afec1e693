#!/usr/bin/python3
"""Pictures for the documentation: some calls to the reference service, on its own page and on that of their trace.

Usage: screenshots.py FOLDER; programs come from the environment as for the tests.
"""
import os
import re
import shutil
import sys
import tempfile

import browser  # of the tests of the command line, as is zuv
import zuv

PROFILE = """<p:ProfileContent xmlns:p="%s" xmlns:c="%s"><c:identity><c:type>organization</c:type><c:name>Ada's workshop</c:name>
</c:identity><c:contact><c:name>Ada</c:name><c:email>ada@workshop.example</c:email></c:contact></p:ProfileContent>""" % (
    zuv.PROFILE, zuv.COMMON)
CREDENTIALS = '<c:Credentials xmlns:c="%s"><c:username>ada</c:username><c:password>x</c:password></c:Credentials>' % zuv.COMMON


def make_calls(folder, log, address):
    credentials = os.path.join(folder, "credentials.xml")
    with open(credentials, "w") as file:
        file.write(CREDENTIALS)

    def call(*arguments, **more):
        return zuv.run(*arguments, "-e", address, "--trace", log, "--trace-times", **more).stdout
    created = call("profile", "create", "-", "--credentials", credentials, given=PROFILE)
    uri = re.search("urn:[^<]*", created)[0]
    call("profile", "get", "--soap12", "-t", uri)
    call("profile", "set", "-", "-t", uri, "--gzip", "--chunked", given=PROFILE)
    call("updateorder", "submit")
    call("statusreport", "create")
    call("problemreport", "submit")
    call("profile", "get", "-t", "urn:zuv:profile:unknown")
    zuv.run("profile", "get", "-e", address + "/elsewhere", "--trace", log, "--trace-times")


def main():
    target = sys.argv[1]
    if not shutil.which("chromium"):
        sys.exit("screenshots.py: chromium is not installed; script/setup test installs it")
    os.makedirs(target, exist_ok=True)
    with tempfile.TemporaryDirectory() as folder:
        log, page = os.path.join(folder, "wsTrace.log"), os.path.join(folder, "trace.html")
        with zuv.service("--control") as address:
            make_calls(folder, log, address)
            browser.screenshot(address + "/#open", os.path.join(target, "service.png"), (1240, 1200), "--virtual-time-budget=3000")
        zuv.run("trace", log, "--html", page)
        browser.screenshot(page, os.path.join(target, "trace.png"), (1240, 620))
        with open(page) as file:
            text = file.read()
        with open(page, "w") as file:
            file.write(text.replace('<details class="exchange">', '<details class="exchange" open>', 1))
        browser.screenshot(page, os.path.join(target, "trace-open.png"), (1240, 1250))
    print("\n".join(os.path.join(target, name) for name in ("service.png", "trace.png", "trace-open.png")))


if __name__ == "__main__":
    main()

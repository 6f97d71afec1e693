#!/usr/bin/python3
"""Counts the system calls of a call on a kept connection, without and with time limits, with strace.

Usage: system_calls.py CALL_CLIENT ZUV_SERVICE. Skipped, with status 77, where no process may be traced. What a call costs is
the difference between a run of many calls and one of few: one send, one receive and the question whether the connection
still lives; with time limits a wait before each transfer; and nothing else.
"""
import collections
import os
import re
import subprocess
import sys
import tempfile

import messages
import zuv_service
from programs import Caller, certificates, stunnel

FEW, MANY = 10, 110
TRANSFERS = {"sendto": 1, "recvfrom": 1}
LIMITS = ["--connect 10 --send 10 --recv 10 --whole 10"]


def counted(caller, folder, rule, endpoint, calls, *options):
    """The system calls of a whole run, by name."""
    file = os.path.join(folder, "strace")
    caller.run("%s, %d calls" % (rule, calls), endpoint, "--keep-alive --calls", calls, *options, codes=0, connections=1,
               before=["strace", "-f", "-c", "-o", file])
    with open(file, encoding="utf-8") as table:
        rows = re.findall(r"^ *[\d.]+ +[\d.]+ +\d+ +(\d+)(?: +\d+)? +(\w+)$", table.read(), re.MULTILINE)
    return collections.Counter({name: int(count) for count, name in rows if name != "total"})


def main():
    client, service = (os.path.abspath(argument) for argument in sys.argv[1:])
    trial = subprocess.run(["strace", "-c", "-o", os.devnull, "true"], capture_output=True, text=True)
    if trial.returncode != 0:
        print("skipped: strace can't trace here:", trial.stderr.strip())
        sys.exit(77)
    caller = Caller(client)
    with tempfile.TemporaryDirectory() as folder, zuv_service.running(service) as zuv:
        certificates(folder)
        with stunnel(folder, zuv) as (port,):
            secure = "https://localhost:%d%s" % (port, messages.service_path("Profile"))
            ways = (("plain", zuv + messages.service_path("Profile"), []),
                    ("TLS", secure, ["--ca", os.path.join(folder, "ca.pem")]))
            for rule, endpoint, options in [*ways, *((rule + ", limits", end, [*more, *LIMITS]) for rule, end, more in ways)]:
                few = counted(caller, folder, rule, endpoint, FEW, *options)
                many = counted(caller, folder, rule, endpoint, MANY, *options)
                many.subtract(few)
                # An answer may arrive in two pieces now and then: what isn't in every call is not its cost.
                found = {name: count / (MANY - FEW) for name, count in many.items()}
                found = {name: round(each, 1) for name, each in found.items() if abs(each) >= 0.05}
                print("%s: system calls of one call: %s" % (rule, found))
                assert found == {**TRANSFERS, "pselect6": 3 if "limits" in rule else 1}, found


if __name__ == "__main__":
    main()

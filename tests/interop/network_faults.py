#!/usr/bin/python3
"""Calls over networks that are slow, lose packets or fall silent: two network namespaces with a cable between them.

Usage: network_faults.py CALL_CLIENT ZUV_SERVICE. Skipped, with status 77, where namespaces can't be made (they need root). The
part with delay and loss needs the kernel's netem, and says so where there is none.
"""
import contextlib
import os
import subprocess
import sys

import listening
import messages
import zuv_service
from programs import Call, Caller, EOF_ERROR, LIMIT_S, TCP_ERROR, command, words

CLIENT, SERVER = "10.213.7.1", "10.213.7.2"  # each in a namespace of its own, so nothing else sees them
NO_HOST = "10.213.7.9"
SLACK_MS = 5000


def run(*arguments):
    return subprocess.run(arguments, capture_output=True, text=True)


class Network:
    """The two ends. Each namespace is that of a process that waits for its input to end, and goes with it: nothing has to be
    mounted, and nothing stays, however the test ends."""

    def __init__(self):
        self.ends = [subprocess.Popen(["unshare", "--net", "cat"], stdin=subprocess.PIPE, stdout=subprocess.PIPE,
                                      stderr=subprocess.PIPE, bufsize=0) for _ in range(2)]
        self.in_near, self.in_far = (["nsenter", "--net=/proc/%d/ns/net" % end.pid] for end in self.ends)
        self.failure = self._set_up()

    def _set_up(self):
        for end in self.ends:
            with contextlib.suppress(BrokenPipeError):
                end.stdin.write(b"\n")
            if not end.stdout.readline():
                return end.stderr.read().decode().strip()
        near, far = ([*inside, command("ip")] for inside in (self.in_near, self.in_far))
        for step in ([*near, "link", "add", "cable", "type", "veth", "peer", "name", "cable", "netns", str(self.ends[1].pid)],
                     [*near, "address", "add", CLIENT + "/24", "dev", "cable"], [*near, "link", "set", "cable", "up"],
                     [*far, "address", "add", SERVER + "/24", "dev", "cable"], [*far, "link", "set", "cable", "up"],
                     [*far, "link", "set", "lo", "up"],
                     # an address where packets go, and from which none come back
                     [*near, "neigh", "add", NO_HOST, "lladdr", "02:00:00:00:00:09", "dev", "cable"]):
            done = run(*step)
            if done.returncode != 0:
                return "%s: %s" % (" ".join(step), done.stderr.strip())
        return None

    def end(self):
        for end in self.ends:
            end.communicate()

    @contextlib.contextmanager
    def unplugged(self):
        """From here to the end of the block packets leave and vanish, both ways."""
        for step in ["replace", "lladdr", "02:00:00:00:00:09"], ["del"]:
            for inside, other in ((self.in_near, SERVER), (self.in_far, CLIENT)):
                assert run(*inside, command("ip"), "neigh", step[0], other, *step[1:], "dev", "cable").returncode == 0
            if step != ["del"]:
                yield

    def impaired(self, *how):
        """Makes the cable so, both ways. An error text, or none."""
        for inside in (self.in_near, self.in_far):
            done = run(*inside, command("tc"), "qdisc", "replace", "dev", "cable", "root", "netem", *how)
            if done.returncode != 0:
                return done.stderr.strip()
        return None


class Steps:
    """A call_client that makes its calls when it is asked to."""

    def __init__(self, before, client, *options):
        self.process = subprocess.Popen([*before, client, *words(options), "--steps"], stdin=subprocess.PIPE,
                                        stdout=subprocess.PIPE, text=True)

    def call(self):
        return Call(self.process.stdout.readline().strip())

    def next(self):
        self.process.stdin.write("\n")
        self.process.stdin.flush()
        return self.call()

    def end(self):
        self.process.stdin.close()
        rest = self.process.stdout.read()
        self.process.stdout.close()
        assert self.process.wait(LIMIT_S) == 0, rest


def expect(rule, call, code, least_ms):
    print("%-44s code %-3d %5d ms %s" % (rule, call.code, call.ms, call.fault), flush=True)
    assert call.code == code and least_ms <= call.ms < least_ms + SLACK_MS, (rule, call.code, call.ms, call.fault)


def silent_network(network, client, endpoint):
    limits = ["--connect 1 --send 1 --recv 1"]
    caller = Caller(client)
    caller.run("no host there", "http://%s:80/" % NO_HOST, *limits, "--calls 2", codes=TCP_ERROR, least_ms=1000,
               most_ms=1000 + SLACK_MS, before=network.in_near)
    caller.run("no host there, then a service", "http://%s:80/ %s" % (NO_HOST, endpoint), *limits, codes=0, least_ms=1000,
               most_ms=1000 + SLACK_MS, before=network.in_near)
    steps = Steps(network.in_near, client, endpoint, *limits, "--keep-alive --calls 10 --size 100")
    expect("a cable", steps.call(), 0, 0)
    expect("the kept connection", steps.next(), 0, 0)
    with network.unplugged():
        expect("no cable, on the kept connection", steps.next(), EOF_ERROR, 1000)
        expect("no cable, anew", steps.next(), TCP_ERROR, 1000)
    expect("the cable is back", steps.next(), 0, 0)
    steps.end()
    caller.run("no host there, and a brief whole", "http://%s:80/ %s" % (NO_HOST, endpoint), "--connect 30 --whole 1",
               codes=TCP_ERROR, least_ms=1000, most_ms=1000 + SLACK_MS, before=network.in_near)
    steps = Steps(network.in_near, client, endpoint, "--connect 1 --send 1 --recv 30 --keep-alive --calls 10 --size 8000000")
    expect("a large message", steps.call(), 0, 0)
    with network.unplugged():
        expect("no cable while a large message is sent", steps.next(), EOF_ERROR, 1000)
    expect("the cable is back", steps.next(), 0, 0)
    steps.end()


def slow_network(network, client, endpoint):
    caller = Caller(client)
    limits = ["--connect 20 --send 20 --recv 20"]
    failure = network.impaired("delay", "50ms")
    if failure:
        print("left out: delay and loss, for this kernel has no netem (%s)" % failure)
        return
    caller.run("50 ms each way", endpoint, *limits, "--keep-alive --calls 3", codes=0, connections=1, least_ms=100,
               before=network.in_near)
    caller.run("50 ms each way, a brief limit", endpoint, "--recv -60000 --connect 5 --calls 2", codes=EOF_ERROR, least_ms=60,
               before=network.in_near)
    caller.run("50 ms each way, connected too late", endpoint, "--connect -60000 --calls 2", codes=TCP_ERROR, least_ms=60,
               before=network.in_near)
    assert not network.impaired("delay", "10ms", "5ms", "loss", "5%")
    caller.run("one of 20 packets lost", endpoint, *limits, "--keep-alive --calls 20 --size 20000", codes=0, connections=1,
               before=network.in_near)


def main():
    client, service = (os.path.abspath(argument) for argument in sys.argv[1:])
    network = Network()
    try:
        if network.failure:
            print("skipped: needs root and network namespaces (%s)" % network.failure)
            sys.exit(77)
        with listening.started([*network.in_far, service, "--host", SERVER, "--port", "0"]) as address:
            endpoint = address + messages.service_path("Profile")
            silent_network(network, client, endpoint)
            slow_network(network, client, endpoint)
    finally:
        network.end()


if __name__ == "__main__":
    main()

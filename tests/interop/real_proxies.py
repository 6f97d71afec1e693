#!/usr/bin/python3
"""Calls through proxies as they are met in the field: Squid and Tinyproxy, to plain services and through CONNECT to TLS.

Usage: real_proxies.py CALL_CLIENT ZUV_SERVICE. All run from a directory of their own, on free ports of the loopback.
"""
import os
import sys
import tempfile

import messages
import zuv_service
from programs import Caller, EOF_ERROR, TCP_ERROR, certificates, command, filled, password_file, server, stunnel

SQUID = """
http_port 127.0.0.1:@port0@
@user@
pid_filename @folder@/squid.pid
access_log none
cache_log stdio:/dev/stderr
coredump_dir @folder@
cache deny all
shutdown_lifetime 0 seconds
pinger_enable off
visible_hostname localhost
hosts_file @folder@/hosts
@access@
http_access allow all
"""
SQUID_LOCKED = """
auth_param basic program /usr/lib/squid/basic_ncsa_auth @folder@/users
auth_param basic realm the proxy
auth_param basic casesensitive on
acl known proxy_auth REQUIRED
http_access deny !known
"""

TINYPROXY = """
Port @port0@
Listen 127.0.0.1
Timeout 60
MaxClients 20
LogLevel Error
@access@
"""

def all_ways(caller, name, proxy, plain, secure, trust, locked):
    """Through one proxy: plain and CONNECT, with the password where one is wanted."""
    through = ["--proxy", "127.0.0.1", "--proxy-port", proxy]
    user = ["--proxy-user", "Aladdin:sesame"] if locked else []
    name += ", locked" if locked else ""
    # Tinyproxy ends a connection after each answer without having said so; a call may come upon the end.
    kept = {0, EOF_ERROR} if name.startswith("tinyproxy") else 0
    for limits in ([], ["--connect", 10, "--send", 10, "--recv", 10]):
        what = name + (", limits" if limits else "")
        caller.run(what + ", plain", plain, *through, *user, *limits, "--keep-alive", "--calls", 20, "--size", 5000, codes=kept)
        caller.run(what + ", plain, anew", plain, *through, *user, *limits, "--calls", 3, codes=0, connections=3)
        caller.run(what + ", CONNECT", secure, *through, *user, *limits, *trust, "--keep-alive", "--calls", 20, "--size", 5000,
                   codes=0, connections=1)
        caller.run(what + ", CONNECT, anew", secure, *through, *user, *limits, *trust, "--calls", 3, codes=0, connections=3)
    if locked:
        for wrong in ([], ["--proxy-user", "Aladdin:x"]):
            what = name + (", wrong password" if wrong else ", no password")
            answer = 407 if name.startswith("squid") else {401, 407}
            caller.run(what, plain, *through, *wrong, "--keep-alive", "--calls", 2, codes=answer)
            caller.run(what + ", CONNECT", secure, *through, *wrong, *trust, "--keep-alive", "--calls", 2, codes=answer)
    for scheme in ("http", "https"):
        caller.run("%s, %s service gone" % (name, scheme), scheme + "://127.0.0.1:9/", *through, *user, *trust, "--calls", 2,
                   codes={500, 502, 503})


def main():
    client, service = (os.path.abspath(argument) for argument in sys.argv[1:])
    caller = Caller(client)
    with tempfile.TemporaryDirectory() as folder, zuv_service.running(service) as zuv:
        os.chmod(folder, 0o755)  # a proxy that gives up its privileges reads its files
        certificates(folder)
        password_file(os.path.join(folder, "users"))
        with open(os.path.join(folder, "hosts"), "w", encoding="utf-8") as hosts:
            hosts.write("127.0.0.1 localhost\n")  # Squid tries a name's first address only, which elsewhere is ::1
        words = {"zuv": zuv.removeprefix("http://"), "user": "cache_effective_user proxy" if os.geteuid() == 0 else ""}
        trust = ["--ca", os.path.join(folder, "ca.pem")]
        plain = zuv + messages.service_path("Profile")
        with stunnel(folder, words["zuv"]) as (tls,):
            secure = "https://localhost:%d%s" % (tls, messages.service_path("Profile"))
            for locked in (False, True):
                text = filled(SQUID, {**words, "access": SQUID_LOCKED if locked else ""})
                with server(folder, "squid", [command("squid"), "-N", "-f", "@file@"], text) as (port,):
                    all_ways(caller, "squid", port, plain, secure, trust, locked)
                text = filled(TINYPROXY, {"access": 'BasicAuth Aladdin sesame' if locked else ""})
                with server(folder, "tinyproxy", [command("tinyproxy"), "-d", "-c", "@file@"], text) as (port,):
                    all_ways(caller, "tinyproxy", port, plain, secure, trust, locked)
        caller.run("no proxy there", plain, "--proxy", "127.0.0.1", "--proxy-port", 9, codes=TCP_ERROR)


if __name__ == "__main__":
    main()

#!/usr/bin/python3
"""Calls through servers and proxies as they are met in the field: nginx and HAProxy before zuv-service, nginx also before
a service on an independent stack, Squid and Tinyproxy. Elsewhere: sessions of TLS (tests/unit/tls_test.cpp).

Usage: servers.py CALL_CLIENT ZUV ZUV_SERVICE NPM_FOLDER SCHEMA_DIR. All run from a directory of their own, on free ports of the
loopback.
"""
import os
import re
import socket
import subprocess
import sys
import tempfile

import messages
import profile_calls
import zuv_service
from programs import (Caller, EOF_ERROR, LIMIT_S, NO_DATA, TCP_ERROR, TLS_ERROR, certificates, command, filled, password_file,
                      server, stunnel)

PATH = messages.service_path("Profile")
LARGE = 5_000_000  # bytes

NGINX = """
daemon off; worker_processes 1; @user@
pid @folder@/nginx.pid; error_log stderr error;
events { worker_connections 64; }
http {
    access_log off; client_max_body_size 64m; keepalive_requests 100000;
    client_body_temp_path @folder@/1; proxy_temp_path @folder@/2; fastcgi_temp_path @folder@/3;
    uwsgi_temp_path @folder@/4; scgi_temp_path @folder@/5;
    proxy_http_version 1.1; proxy_set_header Connection "";
    ssl_certificate @folder@/server.crt; ssl_certificate_key @folder@/server.key; ssl_session_cache shared:S:1m;
    upstream zuv { server @zuv@; keepalive 4; }
    upstream npm { server @npm@; keepalive 4; }
    log_format exchange '$connection $status request=$http_transfer_encoding answer=$upstream_http_transfer_encoding';
    server {                                 # the usual
        listen 127.0.0.1:@port0@;
        location / { proxy_pass http://zuv; }
        location /few { keepalive_requests 3; proxy_pass http://zuv@path@; }
        location /hasty { keepalive_timeout 0; proxy_pass http://zuv@path@; }
        location /slow { limit_rate 20k; proxy_pass http://zuv@path@; }
        location /packed { proxy_set_header Accept-Encoding gzip; proxy_pass http://127.0.0.1:@port1@@path@; }
        location /locked { auth_basic "staff only"; auth_basic_user_file @folder@/users; proxy_set_header Authorization "";
                           proxy_pass http://zuv@path@; }
        location /small { client_max_body_size 1k; proxy_pass http://zuv@path@; }
        location /moved { return 301 http://127.0.0.1:9/; }
        location /empty { return 200; }
        location /text { default_type text/plain; return 200 "hello"; }
        location /dead { proxy_pass http://127.0.0.1:@dead@; }
        location /silent { proxy_read_timeout 1s; proxy_pass http://127.0.0.1:@silent@; }
    }
    server {                                 # compresses
        listen 127.0.0.1:@port1@;
        location / { gzip on; gzip_types text/xml application/soap+xml; gzip_min_length 1; proxy_pass http://zuv; }
    }
    server { listen 127.0.0.1:@port2@ ssl; ssl_protocols TLSv1.2; location / { proxy_pass http://zuv; } }
    server { listen 127.0.0.1:@port3@ ssl; ssl_protocols TLSv1.3; location / { proxy_pass http://zuv; } }
    server {
        listen 127.0.0.1:@port4@ ssl; ssl_client_certificate @folder@/ca.pem; ssl_verify_client on;
        location / { proxy_pass http://zuv; }
    }
    server {                                 # passes bytes on as they arrive; /stored/ reads requests to the end first
        listen 127.0.0.1:@port5@;
        access_log @folder@/access.log exchange;
        proxy_buffering off;
        location /zuv/ { proxy_pass http://zuv; proxy_request_buffering off; }
        location /npm/ { proxy_pass http://npm/; proxy_request_buffering off; }
        location /stored/ { proxy_pass http://zuv/; }
    }
}
"""

HAPROXY = """
global
    maxconn 64
defaults
    mode http
    timeout connect 10s
    timeout client 30s
    timeout server 1s
    retries 0
frontend old
    bind 127.0.0.1:@port0@ ssl crt @folder@/server.pem ssl-max-ver TLSv1.2
    default_backend zuv
frontend new
    bind 127.0.0.1:@port1@ ssl crt @folder@/server.pem ssl-min-ver TLSv1.3
    default_backend zuv
frontend closed
    bind 127.0.0.1:@port2@ ssl crt @folder@/server.pem ca-file @folder@/ca.pem verify required
    default_backend zuv
frontend broken
    bind 127.0.0.1:@port3@
    use_backend silent if { path /silent }
    default_backend dead
backend zuv
    server zuv @zuv@
backend silent
    server silent 127.0.0.1:@silent@
backend dead
    server dead 127.0.0.1:@dead@
"""

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


def nginx(folder, words):
    """Gives the ports of its servers."""
    text = filled(NGINX, {**words, "user": "user root;" if os.geteuid() == 0 else ""})
    return server(folder, "nginx", [command("nginx"), "-e", "stderr", "-p", folder, "-c", "@file@"], text, count=6)


def through_nginx(caller, folder, words):
    with nginx(folder, words) as (plain, _, tls12, tls13, closed, _):
        at = lambda place: "http://127.0.0.1:%d/%s" % (plain, place)
        whole = PATH[1:]
        for framing in ([], ["--chunked"], ["--gzip"]):
            caller.run("nginx " + " ".join(framing), at(whole), "--keep-alive --calls 50 --size 3000", *framing, codes=0,
                       connections=1)
        caller.run("nginx, no keeping asked for", at(whole), "--calls 5", codes=0, connections=5)
        caller.run("nginx, 3 calls a connection", at("few"), "--keep-alive --calls 10", codes=0, connections=4)
        caller.run("nginx, keeps no connection", at("hasty"), "--keep-alive --calls 5", codes=0, connections=5)
        caller.run("nginx, gzip in chunks", at("packed"), "--keep-alive --calls 20 --size 200000", codes=0, connections=1)
        caller.run("nginx, a slow body", at("slow"), "--keep-alive --size 60000 --recv 5", codes=0, least_ms=500)
        caller.run("nginx, locked", at("locked"), "--keep-alive --calls 2", codes=401)
        caller.run("nginx, wrong password", at("locked"), "--user Aladdin:x", codes=401)
        caller.run("nginx, password", at("locked"), "--keep-alive --calls 5 --user Aladdin:sesame", codes=0, connections=1)
        caller.run("nginx, request too large", at("small"), "--size 5000 --calls 2", codes=413)
        caller.run("nginx, moved", at("moved"), "--calls 2 --keep-alive", codes=301)
        caller.run("nginx, no body", at("empty"), "--calls 2 --keep-alive", codes=NO_DATA)
        caller.run("nginx, no XML", at("text"), "--calls 2 --keep-alive", codes=200)
        caller.run("nginx, service gone", at("dead"), "--calls 2 --keep-alive", codes=502)
        caller.run("nginx, service silent", at("silent"), "--keep-alive", codes=504, least_ms=900)
        caller.run("nginx, service silent, own limit", at("silent"), "--recv -200000", codes=EOF_ERROR, least_ms=200,
                   most_ms=5000)
        trust = ["--ca", os.path.join(folder, "ca.pem")]
        for version, port in (("1.2", tls12), ("1.3", tls13)):
            endpoint = "https://localhost:%d%s" % (port, PATH)
            caller.run("nginx, TLS " + version, endpoint, *trust, "--keep-alive --calls 50 --size 30000", codes=0,
                       connections=1)
            caller.run("nginx, TLS %s, limits" % version, endpoint, *trust,
                       "--recv 10 --send 10 --connect 10 --calls 5 --size 300000", codes=0, connections=5)
        endpoint = "https://localhost:%d%s" % (closed, PATH)
        key = ["--key", os.path.join(folder, "client.pem")]
        caller.run("nginx, client's certificate", endpoint, *trust, *key, "--calls 3", codes=0, connections=3)
        caller.run("nginx, no client's certificate", endpoint, *trust, "--calls 2", codes={3, 5, 6, 39, 400})
        caller.run("nginx, TLS to a plain port", "https://localhost:%d/" % plain, *trust, codes=TLS_ERROR)
        caller.run("nginx, plain to a TLS port", "http://localhost:%d/" % tls12, codes={3, 5, 6, 39, 400})
        caller.run("nginx, not trusted", endpoint, "--ca", os.path.join(folder, "client.crt"), codes=TLS_ERROR)


def profiles_through_nginx(program, folder, words, chunked_answers):
    """Profiles of a host in turn: a small one many times over one connection, a large one, and one that isn't there. Then a look
    at nginx's log: connections, and the framing both ways."""
    runs = [(place, many, chunked, ["--soap12"] if soap12 else [])
            for place in ("zuv", "stored/zuv") for soap12 in (False, True)
            for many, chunked in ((500, False), (20, True))] + [("npm/zuv", 200, False, []), ("npm/zuv", 20, True, [])]
    large = "a" * LARGE
    with nginx(folder, words) as ports:
        for place, many, chunked, version in runs:
            endpoint = "http://127.0.0.1:%d/%s/v1.0/services/Profile" % (ports[-1], place)
            profiles = profile_calls.Profiles(program, endpoint, *(["--chunked"] if chunked else []), *version)
            profiles.call("create", given=profile_calls.SAMPLE % "")
            profiles.call("get", "--keep-alive", "--repeat", str(many))
            profiles.call("set", "--keep-alive", "--repeat", "2", profileAuthority=large,
                          given=profile_calls.SAMPLE % ("<p:profileAuthority>%s</p:profileAuthority>" % large))
            profiles.uri = "urn:none"
            profiles.expect_not_found()
    with open(os.path.join(folder, "access.log"), encoding="utf-8") as file:
        log = [re.match(r"(\d+) (\d+) request=(\S+) answer=(\S+)$", line).groups() for line in file]
    os.unlink(os.path.join(folder, "access.log"))
    count = len(log)
    for place, many, chunked, _ in runs:
        run, log = log[:many + 4], log[many + 4:]
        connections, statuses, requests, answers = zip(*run)
        assert statuses[:-1] == (many + 3) * ("200",) and statuses[-1] in ("400", "500"), statuses
        assert len(set(connections)) == 4, "one each for create, all of get, both of set, and what isn't there"
        assert list(connections) == sorted(connections, key=connections.index), "none is come back to"
        assert set(requests) == {"chunked" if chunked else "-"}, run[0]
        assert set(answers) == {"chunked" if chunked_answers or place.startswith("npm") else "-"}, run[0]
    assert not log, log
    print("%d calls of profiles through nginx, answers %s" % (count, "in chunks" if chunked_answers else "with a length"))


def through_haproxy(caller, folder, words):
    with server(folder, "haproxy", [command("haproxy"), "-db", "-f", "@file@"], filled(HAPROXY, words), count=4) as ports:
        trust = ["--ca", os.path.join(folder, "ca.pem")]
        key = ["--key", os.path.join(folder, "client.pem")]
        at = lambda port: "https://127.0.0.1:%d%s" % (port, PATH)
        strict = ["--tls-flags", 1 | 16 | 512]
        for version, port in zip(("1.2", "1.3"), ports):
            caller.run("HAProxy, TLS " + version, at(port), *trust, *strict, "--keep-alive --calls 50 --size 30000", codes=0,
                       connections=1)
            caller.run("HAProxy, TLS %s, anew each time" % version, at(port), *trust, "--calls 10", codes=0, connections=10)
        caller.run("HAProxy, client's certificate", at(ports[2]), *trust, *key, "--calls 2", codes=0)
        caller.run("HAProxy, no client's certificate", at(ports[2]), *trust, "--calls 2", codes={EOF_ERROR, TLS_ERROR})
        plain = "http://127.0.0.1:%d/" % ports[3]
        caller.run("HAProxy, service gone", plain, "--calls 2", codes=503)
        caller.run("HAProxy, service silent", plain + "silent", codes=504, least_ms=900)


def all_ways(caller, name, proxy, plain, secure, trust, locked):
    """Through one proxy: plain and CONNECT, with the password where one is wanted."""
    through = ["--proxy", "127.0.0.1", "--proxy-port", proxy]
    user = ["--proxy-user", "Aladdin:sesame"] if locked else []
    name += ", locked" if locked else ""
    # Tinyproxy ends a connection after each answer without having said so; a call may come upon the end.
    kept = {0, EOF_ERROR} if name.startswith("tinyproxy") else 0
    for limits in ([], ["--connect 10 --send 10 --recv 10"]):
        what = name + (", limits" if limits else "")
        caller.run(what + ", plain", plain, *through, *user, *limits, "--keep-alive --calls 20 --size 5000", codes=kept)
        caller.run(what + ", plain, anew", plain, *through, *user, *limits, "--calls 3", codes=0, connections=3)
        caller.run(what + ", CONNECT", secure, *through, *user, *limits, *trust, "--keep-alive --calls 20 --size 5000", codes=0,
                   connections=1)
        caller.run(what + ", CONNECT, anew", secure, *through, *user, *limits, *trust, "--calls 3", codes=0, connections=3)
    if locked:
        for wrong in ([], ["--proxy-user", "Aladdin:x"]):
            what = name + (", wrong password" if wrong else ", no password")
            answer = 407 if name.startswith("squid") else {401, 407}
            caller.run(what, plain, *through, *wrong, "--keep-alive --calls 2", codes=answer)
            caller.run(what + ", CONNECT", secure, *through, *wrong, *trust, "--keep-alive --calls 2", codes=answer)
    for scheme in ("http", "https"):
        caller.run("%s, %s service gone" % (name, scheme), scheme + "://127.0.0.1:9/", *through, *user, *trust, "--calls 2",
                   codes={500, 502, 503})


def through_proxies(caller, folder, words):
    with open(os.path.join(folder, "hosts"), "w", encoding="utf-8") as hosts:
        hosts.write("127.0.0.1 localhost\n")  # Squid tries a name's first address only, which elsewhere is ::1
    words = {**words, "user": "cache_effective_user proxy" if os.geteuid() == 0 else ""}
    trust, plain = ["--ca", os.path.join(folder, "ca.pem")], "http://" + words["zuv"] + PATH
    with stunnel(folder, words["zuv"]) as (tls,):
        secure = "https://localhost:%d%s" % (tls, PATH)
        for locked in (False, True):
            for name, text, arguments in (
                    ("squid", filled(SQUID, {**words, "access": SQUID_LOCKED if locked else ""}), ["-N", "-f"]),
                    ("tinyproxy", filled(TINYPROXY, {"access": "BasicAuth Aladdin sesame" if locked else ""}), ["-d", "-c"])):
                with server(folder, name, [command(name), *arguments, "@file@"], text) as (port,):
                    all_ways(caller, name, port, plain, secure, trust, locked)
    caller.run("no proxy there", plain, "--proxy", "127.0.0.1", "--proxy-port 9", codes=TCP_ERROR)


def main():
    client, program, service, npm_folder, schemas = (os.path.abspath(argument) for argument in sys.argv[1:])
    caller = Caller(client)
    with tempfile.TemporaryDirectory() as folder, zuv_service.running_npm(npm_folder, schemas) as npm, \
            zuv_service.running(service) as zuv, zuv_service.running(service, "--chunked") as chunked, \
            socket.create_server(("127.0.0.1", 0)) as silent, socket.socket() as dead:
        dead.bind(("127.0.0.1", 0))  # bound, but nothing listens
        os.chmod(folder, 0o755)  # a proxy that gives up its privileges reads its files
        certificates(folder)
        password_file(os.path.join(folder, "users"))
        words = {"zuv": zuv.removeprefix("http://"), "npm": npm.removeprefix("http://"), "path": PATH,
                 "silent": str(silent.getsockname()[1]), "dead": str(dead.getsockname()[1])}
        profiles_through_nginx(program, folder, words, False)
        profiles_through_nginx(program, folder, {**words, "zuv": chunked.removeprefix("http://")}, True)
        for part in through_nginx, through_haproxy, through_proxies:
            part(caller, folder, words)


if __name__ == "__main__":
    main()

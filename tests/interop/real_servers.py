#!/usr/bin/python3
"""Calls through servers as they are met in the field: nginx, HAProxy and stunnel before zuv-service, and openssl s_server.

Usage: real_servers.py CALL_CLIENT ZUV_SERVICE. All run from a directory of their own, on free ports of the loopback.
"""
import os
import re
import socket
import subprocess
import sys
import tempfile
import threading

import messages
import zuv_service
from programs import Caller, EOF_ERROR, LIMIT_S, NO_DATA, TLS_ERROR, certificates, command, filled, password_file, server, stunnel

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

def through_nginx(caller, folder, words):
    password_file(os.path.join(folder, "users"))
    words = {**words, "user": "user root;" if os.geteuid() == 0 else ""}
    with server(folder, "nginx", [command("nginx"), "-e", "stderr", "-p", folder, "-c", "@file@"], filled(NGINX, words),
                count=5) as ports:
        plain, _, tls12, tls13, closed = ports
        at = lambda place: "http://127.0.0.1:%d/%s" % (plain, place)
        whole = messages.service_path("Profile")[1:]
        for framing in ([], ["--chunked"], ["--gzip"]):
            caller.run("nginx " + " ".join(framing), at(whole), "--keep-alive", "--calls", 50, "--size", 3000, *framing,
                       codes=0, connections=1)
        caller.run("nginx, no keeping asked for", at(whole), "--calls", 5, codes=0, connections=5)
        caller.run("nginx, 3 calls a connection", at("few"), "--keep-alive", "--calls", 10, codes=0, connections=4)
        caller.run("nginx, keeps no connection", at("hasty"), "--keep-alive", "--calls", 5, codes=0, connections=5)
        caller.run("nginx, gzip in chunks", at("packed"), "--keep-alive", "--calls", 20, "--size", 200000, codes=0,
                   connections=1)
        caller.run("nginx, a slow body", at("slow"), "--keep-alive", "--size", 60000, "--recv", 5, codes=0, least_ms=500)
        caller.run("nginx, locked", at("locked"), "--keep-alive", "--calls", 2, codes=401)
        caller.run("nginx, wrong password", at("locked"), "--user", "Aladdin:x", codes=401)
        caller.run("nginx, password", at("locked"), "--keep-alive", "--calls", 5, "--user", "Aladdin:sesame", codes=0,
                   connections=1)
        caller.run("nginx, request too large", at("small"), "--size", 5000, "--calls", 2, codes=413)
        caller.run("nginx, moved", at("moved"), "--calls", 2, "--keep-alive", codes=301)
        caller.run("nginx, no body", at("empty"), "--calls", 2, "--keep-alive", codes=NO_DATA)
        caller.run("nginx, no XML", at("text"), "--calls", 2, "--keep-alive", codes=200)
        caller.run("nginx, service gone", at("dead"), "--calls", 2, "--keep-alive", codes=502)
        caller.run("nginx, service silent", at("silent"), "--keep-alive", codes=504, least_ms=900)
        caller.run("nginx, service silent, own limit", at("silent"), "--recv", -200000, codes=EOF_ERROR, least_ms=200,
                   most_ms=5000)
        trust = ["--ca", os.path.join(folder, "ca.pem")]
        for version, port in (("1.2", tls12), ("1.3", tls13)):
            endpoint = "https://localhost:%d%s" % (port, messages.service_path("Profile"))
            caller.run("nginx, TLS " + version, endpoint, *trust, "--keep-alive", "--calls", 50, "--size", 30000, codes=0,
                       connections=1)
            caller.run("nginx, TLS %s, limits" % version, endpoint, *trust, "--recv", 10, "--send", 10, "--connect", 10,
                       "--calls", 5, "--size", 300000, codes=0, connections=5)
        endpoint = "https://localhost:%d%s" % (closed, messages.service_path("Profile"))
        key = ["--key", os.path.join(folder, "client.pem")]
        caller.run("nginx, client's certificate", endpoint, *trust, *key, "--calls", 3, codes=0, connections=3)
        caller.run("nginx, no client's certificate", endpoint, *trust, "--calls", 2, codes={3, 5, 6, 39, 400})
        caller.run("nginx, TLS to a plain port", "https://localhost:%d/" % plain, *trust, codes=TLS_ERROR)
        caller.run("nginx, plain to a TLS port", "http://localhost:%d/" % tls12, codes={3, 5, 6, 39, 400})
        caller.run("nginx, not trusted", endpoint, "--ca", os.path.join(folder, "client.crt"), codes=TLS_ERROR)


def through_haproxy(caller, folder, words):
    with server(folder, "haproxy", [command("haproxy"), "-db", "-f", "@file@"], filled(HAPROXY, words), count=4) as ports:
        trust = ["--ca", os.path.join(folder, "ca.pem")]
        key = ["--key", os.path.join(folder, "client.pem")]
        at = lambda port: "https://127.0.0.1:%d%s" % (port, messages.service_path("Profile"))
        strict = ["--tls-flags", 1 | 16 | 512]
        for version, port in zip(("1.2", "1.3"), ports):
            caller.run("HAProxy, TLS " + version, at(port), *trust, *strict, "--keep-alive", "--calls", 50, "--size", 30000,
                       codes=0, connections=1)
            caller.run("HAProxy, TLS %s, anew each time" % version, at(port), *trust, "--calls", 10, codes=0, connections=10)
        caller.run("HAProxy, client's certificate", at(ports[2]), *trust, *key, "--calls", 2, codes=0)
        caller.run("HAProxy, no client's certificate", at(ports[2]), *trust, "--calls", 2, codes={EOF_ERROR, TLS_ERROR})
        plain = "http://127.0.0.1:%d/" % ports[3]
        caller.run("HAProxy, service gone", plain, "--calls", 2, codes=503)
        caller.run("HAProxy, service silent", plain + "silent", codes=504, least_ms=900)


def through_stunnel(caller, folder, words):
    with stunnel(folder, words["zuv"]) as (port,):
        endpoint = "https://localhost:%d%s" % (port, messages.service_path("Profile"))
        trust = ["--ca", os.path.join(folder, "ca.pem")]
        caller.run("stunnel", endpoint, *trust, "--keep-alive", "--calls", 30, "--size", 30000, codes=0, connections=1)
        caller.run("stunnel, anew each time", endpoint, *trust, "--calls", 10, codes=0, connections=10)


def answer_for(request):
    """A whole answer to a request to create."""
    name = re.search(rb">(call-\d+)<", request)[1]
    body = (b'<E:Envelope xmlns:E="http://schemas.xmlsoap.org/soap/envelope/"'
            b' xmlns:p="http://www.zuv.example/xmlns/b2b/zuv/v1.0/Profile"'
            b' xmlns:c="http://www.zuv.example/xmlns/b2b/zuv/v1.0"><E:Body><p:createResponse><c:identity><c:name>' + name +
            b"</c:name></c:identity></p:createResponse></E:Body></E:Envelope>")
    return b"HTTP/1.1 200 OK\r\nContent-Type: text/xml\r\nContent-Length: %d\r\n\r\n%s" % (len(body), body)


class OpensslServer:
    """openssl s_server, whose connections are answered through its pipes; keeps what it says of its sessions."""

    def __init__(self, folder, version):
        path = lambda name: os.path.join(folder, name)
        self.process = subprocess.Popen(
            ["openssl", "s_server", "-accept", "127.0.0.1:0", "-cert", path("server.crt"), "-key", path("server.key"),
             "-" + version], stdin=subprocess.PIPE, stdout=subprocess.PIPE, stderr=subprocess.DEVNULL)
        self.said = b""
        for line in iter(self.process.stdout.readline, b""):
            if found := re.match(rb"ACCEPT .*:(\d+)", line):
                self.port = int(found[1])
                break
        self.thread = threading.Thread(target=self._serve)
        self.thread.start()

    def _serve(self):
        request = b""
        while data := os.read(self.process.stdout.fileno(), 65536):
            self.said += data
            request += data
            if b"</SOAP-ENV:Envelope>" in request:
                self.process.stdin.write(answer_for(request))
                self.process.stdin.flush()
                request = b""

    def resumed(self):
        """Stops it; of how many connections it resumed the session."""
        self.process.terminate()
        self.process.wait(LIMIT_S)
        self.thread.join(LIMIT_S)
        self.process.stdin.close()
        self.process.stdout.close()
        return len(re.findall(rb"^Reused session-id", self.said, re.MULTILINE))


def resumed_sessions(caller, folder):
    for version in ("tls1_2", "tls1_3"):
        for forgets in (False, True):
            peer = OpensslServer(folder, version)
            try:
                caller.run("s_server %s%s" % (version, ", sessions forgotten" if forgets else ""),
                           "https://localhost:%d/" % peer.port, "--ca", os.path.join(folder, "ca.pem"), "--calls", 5,
                           *(["--forget-sessions"] if forgets else []), codes=0, connections=5)
            finally:
                reused = peer.resumed()
            assert reused == (0 if forgets else 4), (version, forgets, peer.said.decode(errors="replace"))
            print("    of 5 connections the server resumed the session of %d" % reused)


def main():
    client, service = (os.path.abspath(argument) for argument in sys.argv[1:])
    caller = Caller(client)
    with tempfile.TemporaryDirectory() as folder, zuv_service.running(service) as zuv, \
            socket.create_server(("127.0.0.1", 0)) as silent, socket.socket() as dead:
        dead.bind(("127.0.0.1", 0))  # bound, but nobody listens
        certificates(folder)
        words = {"zuv": zuv.removeprefix("http://"), "path": messages.service_path("Profile"),
                 "silent": str(silent.getsockname()[1]), "dead": str(dead.getsockname()[1])}
        through_nginx(caller, folder, words)
        through_haproxy(caller, folder, words)
        through_stunnel(caller, folder, words)
        resumed_sessions(caller, folder)


if __name__ == "__main__":
    main()

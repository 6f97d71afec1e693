// server.cpp - see server.h.
#include "server.h"

#include <cstdlib>
#include <cstring>
#include <netinet/in.h>
#include <netinet/tcp.h>
#include <sched.h>
#include <stdexcept>
#include <sys/prctl.h>
#include <sys/signal.h>
#include <sys/socket.h>
#include <sys/wait.h>
#include <thread>
#include <unistd.h>

#include <openssl/ssl.h>

namespace call_bench {

namespace {

// One connection: the bytes of requests come in by `receive` and answers leave by `send`.
template <class Receive, class Send> void serve(const std::string &answer, Receive receive, Send send)
{
    std::string bytes(65536, '\0');
    for (std::size_t have = 0;;) {
        const ssize_t count = receive(bytes.data() + have, bytes.size() - have);
        if (count <= 0)
            return;
        have += static_cast<std::size_t>(count);
        const std::string_view text(bytes.data(), have);
        const std::size_t head = text.find("\r\n\r\n");
        const std::size_t length = text.find("Content-Length: ");
        if (head == text.npos || length == text.npos ||
            have < head + 4 + std::strtoul(bytes.data() + length + 16, nullptr, 10))
            continue;
        have = 0;
        if (send(answer.data(), answer.size()) <= 0)
            return;
    }
}

void serve_plain(int socket, const std::string &answer)
{
    serve(
        answer, [&](char *to, std::size_t size) { return recv(socket, to, size, 0); },
        [&](const char *from, std::size_t length) { return send(socket, from, length, MSG_NOSIGNAL); });
    close(socket);
}

void serve_tls(int socket, const std::string &answer, SSL_CTX *context)
{
    SSL *const ssl = SSL_new(context);
    SSL_set_fd(ssl, socket);
    if (SSL_accept(ssl) == 1) {
        serve(
            answer,
            [&](char *to, std::size_t size) -> ssize_t { return SSL_read(ssl, to, static_cast<int>(size)); },
            [&](const char *from, std::size_t length) -> ssize_t {
                return SSL_write(ssl, from, static_cast<int>(length));
            });
        SSL_shutdown(ssl);
    }
    SSL_free(ssl);
    close(socket);
}

[[noreturn]] void run(int listener, const std::string &answer, const std::string &pair)
{
    SSL_CTX *context = nullptr;
    if (!pair.empty()) {
        context = SSL_CTX_new(TLS_server_method());
        SSL_CTX_use_certificate_file(context, pair.c_str(), SSL_FILETYPE_PEM);
        SSL_CTX_use_PrivateKey_file(context, pair.c_str(), SSL_FILETYPE_PEM);
        SSL_CTX_set_session_id_context(context, reinterpret_cast<const unsigned char *>("bench"), 5);
    }
    for (int client; (client = accept(listener, nullptr, nullptr)) >= 0;) {
        const int on = 1;
        setsockopt(client, IPPROTO_TCP, TCP_NODELAY, &on, sizeof on);
        std::thread([=] {
            context ? serve_tls(client, answer, context) : serve_plain(client, answer);
        }).detach();
    }
    std::_Exit(0);
}

} // namespace

void bind_to_core(int core)
{
    cpu_set_t cores;
    CPU_ZERO(&cores);
    for (int i = 0; i < CPU_SETSIZE; ++i)
        if (core < 0 || i == core)
            CPU_SET(i, &cores);
    if (sched_setaffinity(0, sizeof cores, &cores) != 0)
        throw std::runtime_error("can't bind to a processor");
}

server::server(std::string answer, int core, const std::string &pair)
{
    const int listener = socket(AF_INET, SOCK_STREAM, 0);
    sockaddr_in address{};
    socklen_t size = sizeof address;
    address.sin_family = AF_INET;
    address.sin_addr.s_addr = htonl(INADDR_LOOPBACK);
    if (::bind(listener, reinterpret_cast<sockaddr *>(&address), size) != 0 || listen(listener, 64) != 0 ||
        getsockname(listener, reinterpret_cast<sockaddr *>(&address), &size) != 0)
        throw std::runtime_error("can't listen");
    port_ = ntohs(address.sin_port);
    process_ = fork();
    if (process_ == 0) {
        prctl(PR_SET_PDEATHSIG, SIGKILL);
        signal(SIGPIPE, SIG_IGN);
        bind_to_core(core);
        run(listener, answer, pair);
    }
    close(listener);
}

server::~server()
{
    kill(process_, SIGKILL);
    waitpid(process_, nullptr, 0);
}

} // namespace call_bench

// connection.cpp - see connection.h.
#include "connection.h"

#include <chrono>

#include <malloc.h>
#include <openssl/ssl.h>
#include <poll.h>
#include <sys/socket.h>

#include <zuv_client_pro/soap_memory.h>

namespace service {

namespace {

constexpr std::int64_t LARGE = std::int64_t{8} << 20;   // bytes that an exchange held
constexpr std::chrono::milliseconds LINGER_LIMIT(5000); // time that a peer gets to read the last answer

// A connection closed with unread input is reset, and the peer may lose the answer. What it still sends is
// dropped until it has closed its side.
void let_peer_read(soap *ctx)
{
    using namespace std::chrono;
    const int socket = ctx->socket;
    if (ctx->tls_connection != nullptr)
        SSL_shutdown(ctx->tls_connection); // shows the peer that nothing was cut off
    if (shutdown(socket, SHUT_WR) != 0)
        return;
    const auto end = steady_clock::now() + LINGER_LIMIT;
    char dropped[16384];
    for (auto left = LINGER_LIMIT; left.count() > 0;
         left = duration_cast<milliseconds>(end - steady_clock::now())) {
        pollfd readable{socket, POLLIN, 0};
        if (poll(&readable, 1, static_cast<int>(left.count())) <= 0 ||
            recv(socket, dropped, sizeof dropped, MSG_DONTWAIT) <= 0)
            return;
    }
}

// After a large exchange memory goes back to the system: the next ones are usually small.
void free_memory(soap *ctx, const reception &received)
{
    soap_discard_objects(ctx, nullptr);
    soap_block_free(ctx, nullptr);
    soap_call_scratch_free(ctx);
    if (received.memory() > LARGE)
        malloc_trim(0);
}

} // namespace

void serve_connection(soap *ctx, const settings &config, session &borrowed)
{
    reception received(ctx, config, borrowed);
    bool more = true;
    while (more) {
        more = serve_exchange(ctx, received);
        free_memory(ctx, received);
        if (more)
            soap_discard_all(ctx);
    }
    let_peer_read(ctx);
    ctx->keep_alive = 0;
    soap_discard_all(ctx);
}

} // namespace service

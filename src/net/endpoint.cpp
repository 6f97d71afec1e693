// endpoint.cpp - from an endpoint's text to a connection that serves it.
//
// Elsewhere: sockets (on_open and its default tcp_connect), the request on the connection
// (exchange/connect.cpp).
//
//   endpoint = [scheme "://"] authority [path]
//   authority = ("[" IPv6 "]" / host) [":" port]
#include <cstdlib>
#include <cstring>

#include <zuv_client_pro/soap_error.h>
#include <zuv_client_pro/soap_http.h>
#include <zuv_client_pro/soap_io.h>
#include <zuv_client_pro/soap_memory.h>
#include <zuv_client_pro/soap_tcp.h>
#include <zuv_client_pro/soap_tls.h>
#include <zuv_client_pro/soap_xml.h>

#include "core/failure.h"
#include "net/call_record.h"
#include "net/endpoint.h"
#include "net/head_memory.h"
#include "net/tcp_socket.h"
#include "net/tcp_wait.h"
#include "net/tls_connection.h"

namespace {

constexpr int HTTP_PORT = 80;
constexpr int HTTPS_PORT = 443;

// Copies `length` bytes of `source`, or what fits, into a field of SOAP_TEXT_SIZE bytes.
void copy_field(char *field, const char *source, std::size_t length)
{
    const std::size_t copied = length < SOAP_TEXT_SIZE ? length : SOAP_TEXT_SIZE - 1;
    std::memcpy(field, source, copied);
    field[copied] = '\0';
}

endpoint_parts split_url(const char *url)
{
    const char *const colon = std::strchr(url, ':');
    const bool has_scheme = colon != nullptr && colon[1] == '/' && colon[2] == '/';
    const char *const authority = has_scheme ? colon + 3 : url;
    const bool bracketed = *authority == '[';
    const char *const host = bracketed ? authority + 1 : authority;
    const std::size_t host_length = std::strcspn(host, bracketed ? "]" : "/:");
    const char *const end = host + host_length;
    const char *const rest = bracketed && *end == ']' ? end + 1 : end;
    const char *const path = std::strchr(rest, '/');
    const int port = soap_tag_match(url, "https:*") == 0 ? HTTPS_PORT : HTTP_PORT;
    const std::size_t length = std::strlen(url);
    return {length, static_cast<std::size_t>(host - url), host_length,
            path != nullptr ? static_cast<std::size_t>(path - url) : length,
            *rest == ':' ? static_cast<int>(std::strtol(rest + 1, nullptr, 10)) : port};
}

// The parts of an endpoint, which nearly always is that of the last call.
endpoint_parts parts_of(soap *ctx, const char *url)
{
    endpoint_memory *const kept = endpoint_memory_keep(ctx, url);
    if (kept == nullptr)
        return split_url(url);
    if (!kept->split)
        kept->parts = split_url(url);
    kept->split = true;
    return kept->parts;
}

void store_parts(soap *ctx, const char *url, const endpoint_parts &parts)
{
    ctx->port = parts.port;
    copy_field(ctx->endpoint, url, parts.length);
    copy_field(ctx->host, url + parts.host, parts.host_length);
    if (parts.path != parts.length)
        copy_field(ctx->path, url + parts.path, parts.length - parts.path);
}

// --- the route of a connection ---

bool is_secure(const char *endpoint)
{
    return soap_tag_match(endpoint, "https:*") == 0;
}

bool is_datagrams(const char *endpoint)
{
    return std::strncmp(endpoint, "soap.udp:", 9) == 0;
}

std::uint16_t tls_rules(const soap *ctx)
{
    return static_cast<std::uint16_t>(ctx->tls_flags & ~TLS_CLIENT_SIDE); // set on the way
}

const char *http_proxy(const soap *ctx)
{
    return ctx->proxy_host == nullptr ? "" : ctx->proxy_host;
}

void note_route(soap *ctx, const char *endpoint)
{
    soap_route &route = ctx->route;
    route.known = true;
    route.secure = is_secure(endpoint);
    route.datagrams = is_datagrams(endpoint);
    route.rules = tls_rules(ctx);
    route.port = ctx->port;
    route.proxy_port = ctx->proxy_port;
    copy_field(route.host, ctx->host, std::strlen(ctx->host));
    copy_field(route.proxy_host, http_proxy(ctx), std::strlen(http_proxy(ctx)));
}

// An https call never rides on a plain socket, whatever the mode flags say, nor a plain one on TLS.
bool leads_to(const soap *ctx, const char *endpoint)
{
    const soap_route &route = ctx->route;
    return route.known && route.port == ctx->port && std::strcmp(route.host, ctx->host) == 0 &&
           route.datagrams == is_datagrams(endpoint) && route.secure == is_secure(endpoint) &&
           (route.secure ? tls_established(ctx) : !tls_active(ctx));
}

bool has_same_proxy(const soap *ctx)
{
    const soap_route &route = ctx->route;
    return std::strcmp(route.proxy_host, http_proxy(ctx)) == 0 &&
           (route.proxy_host[0] == '\0' || route.proxy_port == ctx->proxy_port);
}

bool has_same_rules(const soap *ctx)
{
    return !ctx->route.secure || (ctx->route.rules == tls_rules(ctx) && tls_has_own_rules(ctx));
}

bool connection_is_reusable(soap *ctx, const char *endpoint)
{
    const bool any_route = (ctx->legacy & LEGACY_ANY_ROUTE) != 0;
    return ctx->keep_alive != 0 && soap_socket_open(ctx) && !ctx->response_unfinished &&
           leads_to(ctx, endpoint) && (any_route || (has_same_proxy(ctx) && has_same_rules(ctx))) &&
           ctx->on_poll != nullptr && ctx->on_poll(ctx) == 0;
}

int end_connection(soap *ctx)
{
    ctx->error = SOAP_OK;
    ctx->keep_alive = 0;
    return tcp_release(ctx);
}

// Keeps the connection of an earlier exchange if it serves this endpoint too; otherwise closes it and opens a
// new one.
int provide_connection(soap *ctx, const char *endpoint)
{
    const bool reused = connection_is_reusable(ctx, endpoint);
    call_note_connection(ctx, reused);
    if (reused)
        return SOAP_OK;
    if (is_datagrams(endpoint))
        ctx->output_mode |= MODE_UDP;
    else
        ctx->output_mode &= ~MODE_UDP;
    if (end_connection(ctx) != SOAP_OK)
        return ctx->error;
    ctx->socket = ctx->on_open(ctx, endpoint, ctx->host, ctx->port);
    ctx->socket_abandoned = false;
    ctx->opened_by = tcp_process();
    ctx->socket_accepted = false;
    ctx->response_unfinished = false;
    if (ctx->error != SOAP_OK)
        return ctx->error;
    note_route(ctx, endpoint);
    call_note_ready(ctx);
    ctx->keep_alive = (ctx->output_mode & MODE_KEEP_ALIVE) != 0 ? 1 : 0;
    return SOAP_OK;
}

} // namespace

void soap_parse_endpoint(soap *ctx, const char *url)
{
    char own_copy[SOAP_TEXT_SIZE];
    if (url == ctx->endpoint) { // the target of a redirect, about to be overwritten
        copy_field(own_copy, url, std::strlen(url));
        url = own_copy;
    }
    ctx->endpoint[0] = '\0';
    ctx->host[0] = '\0';
    copy_field(ctx->path, "/", 1);
    ctx->port = HTTP_PORT;
    if (url != nullptr && *url != '\0')
        store_parts(ctx, url, parts_of(ctx, url));
}

// A call without an endpoint of its own doesn't go to the one called before.
int connection_provide(soap *ctx, const char *endpoint)
{
    if (ctx->on_open != nullptr && endpoint != nullptr && ctx->host[0] != '\0')
        return provide_connection(ctx, endpoint);
    return ctx->route.known && ctx->on_connect == nullptr ? end_connection(ctx) : SOAP_OK;
}

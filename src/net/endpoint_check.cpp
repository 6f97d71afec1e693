// endpoint_check.cpp - may a call go there? Asked before anything of it is sent.
//
// Elsewhere: splitting a URL, which takes anything (endpoint.cpp).
//
//   endpoints = *" " item *( 1*" " item ) *" "
//   item      = [ scheme "://" ] ( host / "[" IPv6 "]" ) [ ":" port ] [ "/" anything ]
#include <algorithm>
#include <charconv>
#include <string_view>

#include <zuv_client_pro/soap_error.h>
#include <zuv_client_pro/soap_http.h>
#include <zuv_client_pro/soap_memory.h>
#include <zuv_client_pro/soap_xml.h>

#include "core/failure.h"
#include "net/head_memory.h"

namespace {

constexpr int PORT_MAX = 65535;
constexpr std::size_t QUOTED_END = 900; // bytes of a text up to the end of the endpoint in it

bool is_control(char c)
{
    return static_cast<unsigned char>(c) <= ' ' || c == '\x7F';
}

// As net recognises schemes: the case counts for some.
bool is_known_scheme(std::string_view item)
{
    const std::string_view scheme = item.substr(0, item.find(':') + 1);
    char text[16] = "";
    scheme.copy(text, sizeof text - 1);
    return soap_tag_match(text, "http:") == 0 || soap_tag_match(text, "https:") == 0 || scheme == "httpg:" ||
           scheme == "soap.udp:";
}

// ":" and a port, or nothing.
bool is_port(std::string_view text)
{
    if (text.empty())
        return true;
    int port = 0;
    const char *const end = text.data() + text.size();
    return text[0] == ':' && text.size() > 1 && text[1] >= '0' && text[1] <= '9' &&
           std::from_chars(text.data() + 1, end, port).ptr == end && port >= 1 && port <= PORT_MAX;
}

// What is wrong with host and port; null: nothing.
const char *fault_of_authority(std::string_view text)
{
    const bool bracketed = !text.empty() && text[0] == '[';
    const std::size_t end = bracketed ? text.find(']') : std::min(text.find(':'), text.size());
    if (text.find('@') != std::string_view::npos)
        return "a user has no place there";
    if (end == std::string_view::npos)
        return "the address has no end";
    const std::string_view host = bracketed ? text.substr(1, end - 1) : text.substr(0, end);
    if (host.empty())
        return "there is no host";
    if (host.find_first_of("?#\\[]") != std::string_view::npos)
        return "that is no host";
    return is_port(text.substr(end + (bracketed ? 1 : 0))) ? nullptr : "the port is not from 1 to 65535";
}

// What is wrong with an endpoint; null: nothing.
const char *fault_of(std::string_view item)
{
    for (const char c : item) {
        if (is_control(c))
            return "it holds a control character";
    }
    // The first colon ends the scheme, wherever it is.
    const std::size_t colon = item.find(':');
    const bool has_scheme = colon != std::string_view::npos && item.substr(colon, 3) == "://";
    if (has_scheme && !is_known_scheme(item))
        return "the scheme is not known";
    if (!has_scheme && colon != std::string_view::npos && is_known_scheme(item))
        return "there is no host";
    if (has_scheme)
        item.remove_prefix(colon + 3);
    return fault_of_authority(item.substr(0, item.find('/')));
}

// Where the part of a user ends, whose password no text may show: after the last "@" of its stretch; 0 for
// none.
std::size_t end_of_user(std::string_view item)
{
    const std::size_t first = item.find('@');
    if (first == std::string_view::npos)
        return 0;
    return item.substr(0, item.find('/', first)).rfind('@');
}

int refuse(soap *ctx, std::string_view item, const char *why)
{
    char text[SOAP_TEXT_SIZE];
    std::size_t length = 0;
    const auto put = [&](std::string_view part, std::size_t end = QUOTED_END) {
        for (const char c : part.substr(0, end - length))
            text[length++] = is_control(c) && c != ' ' ? '?' : c;
    };
    put("No call can go to \"");
    if (const std::size_t user = end_of_user(item); user != 0) {
        const std::size_t scheme = item.find("://");
        put(scheme < user ? item.substr(0, scheme + 3) : "");
        put("...");
        item.remove_prefix(user);
    }
    put(item);
    put("\": ", sizeof text);
    put(why, sizeof text);
    const char *const own = soap_string_dup_n(ctx, text, length);
    if (own == nullptr)
        return ctx->error;
    return fail_as_sender(ctx, own, "nothing was sent", SOAP_TCP_ERROR);
}

} // namespace

int soap_endpoint_check(soap *ctx, const char *endpoints)
{
    if ((ctx->legacy & LEGACY_ANY_ENDPOINT) != 0)
        return SOAP_OK;
    const std::string_view all = endpoints == nullptr ? "" : endpoints;
    const endpoint_memory *const known = endpoint_memory_find(ctx, all.data());
    if (known != nullptr && known->accepted)
        return SOAP_OK;
    if (all.find_first_not_of(' ') == std::string_view::npos)
        return refuse(ctx, all, "there is no host");
    for (std::size_t start = all.find_first_not_of(' '); start != std::string_view::npos;) {
        const std::size_t end = std::min(all.find(' ', start), all.size());
        const std::string_view item = all.substr(start, end - start);
        if (const char *const why = fault_of(item))
            return refuse(ctx, item, why);
        start = all.find_first_not_of(' ', end);
    }
    if (endpoint_memory *const kept = endpoint_memory_keep(ctx, all.data()))
        kept->accepted = true;
    return SOAP_OK;
}

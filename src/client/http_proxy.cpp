// http_proxy.cpp - see http_proxy.h.
#include "client/http_proxy.h"

#include <cstdlib>

#include "core/hex_digit.h"

namespace zuv {

namespace {

std::string_view cut_before(std::string_view &text, char mark)
{
    const std::size_t at = text.find(mark);
    const std::string_view part = text.substr(0, at);
    text.remove_prefix(at == std::string_view::npos ? text.size() : at + 1);
    return part;
}

// "%41" as "A"; what isn't an escape stays.
std::string unescaped(std::string_view text)
{
    std::string plain;
    for (std::size_t at = 0; at < text.size(); ++at) {
        const bool escape = text[at] == '%' && at + 2 < text.size() && hex_digit(text[at + 1]) >= 0 &&
                            hex_digit(text[at + 2]) >= 0;
        plain +=
            escape ? static_cast<char>(hex_digit(text[at + 1]) * 16 + hex_digit(text[at + 2])) : text[at];
        at += escape ? 2 : 0;
    }
    return plain;
}

// The port at the end of "host:port"; 0 for none, -1 for what is none.
int port_in(std::string_view text)
{
    int port = 0;
    for (const char c : text)
        port = c < '0' || c > '9' || port > 65535 ? -1 : port < 0 ? port : port * 10 + (c - '0');
    return port > 65535 ? -1 : port;
}

// Host and port of "host[:port]". An IPv6 address that has a port is in brackets, which are left out.
std::string_view split_authority(std::string_view text, int &port)
{
    std::string_view host;
    if (!text.empty() && text.front() == '[') {
        text.remove_prefix(1);
        host = cut_before(text, ']');
        cut_before(text, ':');
    } else if (text.find(':') != text.rfind(':')) {
        return text;
    } else {
        host = cut_before(text, ':');
    }
    if (!text.empty())
        port = port_in(text);
    return host;
}

std::string_view without_scheme(std::string_view url)
{
    const std::size_t at = url.find("://");
    return at == std::string_view::npos ? url : url.substr(at + 3);
}

// A proxy as an option or a variable gives it.
http_proxy proxy_in(std::string_view text)
{
    http_proxy proxy;
    std::string_view rest = without_scheme(text);
    rest = cut_before(rest, '/');
    if (const std::size_t at = rest.rfind('@'); at != std::string_view::npos) {
        std::string_view login = rest.substr(0, at);
        rest.remove_prefix(at + 1);
        proxy.user = unescaped(cut_before(login, ':'));
        proxy.password = unescaped(login);
    }
    proxy.host = split_authority(rest, proxy.port);
    return proxy;
}

bool same_ignoring_case(std::string_view one, std::string_view other)
{
    const auto lower = [](char c) { return c >= 'A' && c <= 'Z' ? static_cast<char>(c + 32) : c; };
    bool same = one.size() == other.size();
    for (std::size_t at = 0; same && at < one.size(); ++at)
        same = lower(one[at]) == lower(other[at]);
    return same;
}

// Whether no_proxy exempts a host: "*", a host, or the domain that it is in, with or without a dot before it,
// each perhaps with a port; between commas or blanks.
bool is_exempt(std::string_view host, int port, std::string_view list)
{
    while (!list.empty()) {
        std::string_view entry = list.substr(0, list.find_first_of(", "));
        list.remove_prefix(entry.size() < list.size() ? entry.size() + 1 : list.size());
        int entry_port = 0;
        entry = split_authority(entry, entry_port);
        if (!entry.empty() && entry.front() == '.')
            entry.remove_prefix(1);
        if (entry.empty() || (entry_port != 0 && entry_port != port))
            continue;
        if (entry == "*" || same_ignoring_case(entry, host))
            return true;
        if (entry.size() < host.size() && host[host.size() - entry.size() - 1] == '.' &&
            same_ignoring_case(entry, host.substr(host.size() - entry.size())))
            return true;
    }
    return false;
}

std::string variable(const char *name, const char *other_name)
{
    const char *value = std::getenv(name);
    if (value == nullptr && other_name != nullptr)
        value = std::getenv(other_name);
    return value != nullptr ? value : "";
}

} // namespace

// HTTP_PROXY isn't asked: in a CGI program a client of the program sets it.
http_proxy proxy_for(const options &wanted, std::string_view endpoint)
{
    if (!wanted.proxy.empty() || !wanted.proxy_from_environment)
        return proxy_in(wanted.proxy);
    endpoint = endpoint.substr(0, endpoint.find(' '));
    const bool secure = same_ignoring_case(endpoint.substr(0, 6), "https:");
    const std::string named =
        secure ? variable("https_proxy", "HTTPS_PROXY") : variable("http_proxy", nullptr);
    std::string_view rest = without_scheme(endpoint);
    int port = secure ? 443 : 80;
    const std::string_view host = split_authority(cut_before(rest, '/'), port);
    return is_exempt(host, port, variable("no_proxy", "NO_PROXY")) ? http_proxy() : proxy_in(named);
}

} // namespace zuv

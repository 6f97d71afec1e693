// request_target.cpp - see request_target.h.
#include "request_target.h"

#include <algorithm>
#include <cctype>
#include <charconv>
#include <cstdlib>
#include <filesystem>
#include <regex>
#include <stdexcept>

#include <netdb.h>
#include <sys/socket.h>

namespace service {

namespace {

// The address and the port of a socket's own end, as numbers.
struct own_end {
    char host[NI_MAXHOST], port[NI_MAXSERV];
    explicit own_end(int socket)
    {
        sockaddr_storage address{};
        socklen_t length = sizeof address;
        auto *const generic = reinterpret_cast<sockaddr *>(&address);
        if (getsockname(socket, generic, &length) != 0 ||
            getnameinfo(generic, length, host, sizeof host, port, sizeof port,
                        NI_NUMERICHOST | NI_NUMERICSERV) != 0)
            throw std::runtime_error("cannot find the address of a socket");
    }
};

bool is_plain_root(const std::string &root)
{
    static const std::regex plain(R"(https?://([\w.~-]+|\[[0-9A-Fa-f:.]+\])(:[0-9]{1,5})?)");
    return std::regex_match(root, plain);
}

bool is_unreserved(unsigned code)
{
    return std::isalnum(static_cast<int>(code)) != 0 ||
           std::string_view("-._~").find(static_cast<char>(code)) != std::string_view::npos;
}

// Characters that need no encoding in a URL mean the same with one (RFC 3986, 6.2.2.2), dots too.
std::string decoded(std::string_view path)
{
    std::string result;
    for (std::size_t i = 0; i < path.size(); ++i) {
        unsigned code = 0;
        const std::string_view digits = path.substr(std::min(i + 1, path.size()), 2);
        const char *const end = digits.data() + digits.size();
        const bool encoded = path[i] == '%' && digits.size() == 2 &&
                             std::from_chars(digits.data(), end, code, 16).ptr == end && is_unreserved(code);
        result += encoded ? static_cast<char>(code) : path[i];
        i += encoded ? 2 : 0;
    }
    return result;
}

} // namespace

request_target parse_target(std::string_view url, int socket, bool tls)
{
    const std::size_t scheme = url.find("://");
    const std::size_t path = url.starts_with('/') || scheme == std::string_view::npos
                                 ? 0
                                 : std::min(url.find('/', scheme + 3), url.size());
    const std::size_t mark = std::min(url.find('?', path), url.size());
    request_target target;
    target.root = url.substr(0, path);
    if (!is_plain_root(target.root))
        target.root = root_of(socket, tls);
    target.path = std::filesystem::path(decoded(url.substr(path, mark - path))).lexically_normal();
    target.query = url.substr(std::min(mark + 1, url.size()));
    return target;
}

peer_address peer_of(int socket)
{
    sockaddr_storage address{};
    socklen_t length = sizeof address;
    auto *const generic = reinterpret_cast<sockaddr *>(&address);
    char host[NI_MAXHOST], port[NI_MAXSERV];
    if (getpeername(socket, generic, &length) != 0 ||
        getnameinfo(generic, length, host, sizeof host, port, sizeof port, NI_NUMERICHOST | NI_NUMERICSERV) !=
            0)
        return {};
    const std::string_view name = host;
    const bool v6 = name.find(':') != std::string_view::npos;
    return {(v6 ? "[" + std::string(name) + "]:" : std::string(name) + ":") + port,
            name == "::1" || name.starts_with("127.") || name.starts_with("::ffff:127.")};
}

bool is_loopback_root(std::string_view root)
{
    static const std::regex loopback(R"(https?://(localhost|127\.0\.0\.1|\[::1\])(:[0-9]+)?)",
                                     std::regex::icase);
    return std::regex_match(root.begin(), root.end(), loopback);
}

std::string root_of(int socket, bool tls)
{
    const own_end end(socket);
    std::string host = end.host;
    if (host.starts_with("::ffff:") && host.find('.') != std::string::npos)
        host.erase(0, 7);                               // an IPv4 peer of an IPv6 socket
    host.resize(std::min(host.find('%'), host.size())); // the zone means nothing elsewhere
    if (host.find(':') != std::string::npos)
        host = "[" + host + "]";
    return (tls ? "https://" : "http://") + host + ":" + end.port;
}

int port_of(int socket)
{
    return std::atoi(own_end(socket).port);
}

} // namespace service

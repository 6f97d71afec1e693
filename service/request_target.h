// request_target.h - what a request is for: the URL in its head, parsed.
#pragma once

#include <string>
#include <string_view>

namespace service {

struct request_target {
    std::string root;  // "http://host:9080", of this service as the client named it
    std::string path;  // percent-encoded letters and the like decoded, segments "." and ".." resolved
    std::string query; // after the "?"
};

// `url`: root, path and query; the root is from the Host header or an absolute target. If it is missing,
// or anything but a scheme, a host and a port, which documents can hold unchanged, it is root_of(socket, tls).
request_target parse_target(std::string_view url, int socket, bool tls);

struct peer_address {
    std::string name;      // "127.0.0.1:40000"; empty if the peer is gone
    bool is_local = false; // on this machine, over the loopback interface
};
peer_address peer_of(int socket);

// Whether the root names this machine over the loopback interface: localhost, 127.0.0.1 or [::1].
bool is_loopback_root(std::string_view root);

// The URL of a socket's own end, such as "http://127.0.0.1:9080", and its port. Throw std::runtime_error.
std::string root_of(int socket, bool tls);
int port_of(int socket);

} // namespace service

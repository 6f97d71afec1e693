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
// or anything but a scheme, a host and a port, which documents can hold unchanged, it is root_of(socket).
request_target parse_target(std::string_view url, int socket);

// The URL of a socket's own end, such as "http://127.0.0.1:9080", and its port. Throw std::runtime_error.
std::string root_of(int socket);
int port_of(int socket);

} // namespace service

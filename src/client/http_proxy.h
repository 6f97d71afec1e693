// http_proxy.h - which HTTP proxy a client's calls go through.
#pragma once

#include <string>
#include <string_view>

#include <zuv_client_pro/client_options.h>

namespace zuv {

// An HTTP proxy's address and credentials; no host: none.
struct http_proxy {
    std::string host, user, password;
    int port = 8080;
};

// The HTTP proxy for an endpoint, as the options or the environment say.
http_proxy proxy_for(const options &wanted, std::string_view endpoint);

} // namespace zuv

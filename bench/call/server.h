// server.h - a server in a process of its own that answers each request at once with the same bytes.
#pragma once

#include <string>

#include <sys/types.h>

namespace call_bench {

class server {
public:
    // Listens on a free port of 127.0.0.1; a thread serves each connection. `core`: the processor that the
    // process is bound to, -1 for none. `pair`: PEM of certificate and key, empty for plain TCP.
    server(std::string answer, int core, const std::string &pair);
    ~server();
    server(const server &) = delete;
    server &operator=(const server &) = delete;

    int port() const { return port_; }

private:
    pid_t process_ = -1;
    int port_ = 0;
};

// Binds the calling thread to a processor; -1 lets it run on all.
void bind_to_core(int core);

} // namespace call_bench

// raw_client.h - a client that sends the bytes it is told to, for requests that no proxy would make.
#pragma once

#include <string>
#include <string_view>

namespace service_test {

struct raw_answer {
    int status = 0;   // 0: the connection ended without an answer
    std::string head; // start line and headers
    std::string body; // chunks undone
    bool has(std::string_view header) const { return head.find(header) != head.npos; }
};

// One connection to a service on this machine.
class raw_client {
public:
    explicit raw_client(int port);
    ~raw_client();
    raw_client(const raw_client &) = delete;
    raw_client &operator=(const raw_client &) = delete;

    // False if the peer took not all of it.
    bool send(std::string_view bytes);
    void end_sending();
    // The next answer on the connection, interim ones (100) included.
    raw_answer receive();
    // True if the peer closes without sending anything more.
    bool ended();

private:
    bool fill();
    std::string take(std::size_t length);
    std::string take_line();

    int socket_;
    std::string received_;
};

// A POST to a port. `headers`: further ones, each with its line end.
std::string post(std::string_view port_name, std::string_view body, std::string_view headers = {});

// Sends a request on a connection of its own and reads the answer.
raw_answer exchange(int port, std::string_view bytes);

// SOAP messages around a Body's content, and a namespace's URI by the prefix used in them.
std::string soap11(std::string_view content, std::string_view header = {});
std::string soap12(std::string_view content, std::string_view header = {});
std::string uri_of(std::string_view prefix);

// The text of the first element of a name, however it is prefixed; empty if there is none.
std::string element_text(std::string_view xml, std::string_view local_name);

} // namespace service_test

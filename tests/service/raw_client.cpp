// raw_client.cpp - see raw_client.h.
#include "service/raw_client.h"

#include <cstdlib>

#include <arpa/inet.h>
#include <netinet/in.h>
#include <sys/socket.h>
#include <sys/time.h>
#include <unistd.h>

#include <zuv_client_pro/soap.h>

namespace service_test {

namespace {

constexpr int PATIENCE_S = 60; // longest silence that a test puts up with

std::string envelope(std::string_view uri, std::string_view content, std::string_view header)
{
    std::string xml = "<?xml version=\"1.0\" encoding=\"UTF-8\"?><E:Envelope xmlns:E=\"";
    xml.append(uri).append("\"");
    for (const char *prefix :
         {"xsi", "protocol", "protocolProfile", "protocolStatusReport", "protocolInventoryReport",
          "protocolUpdateOrder", "protocolUpdateOrderFilter", "protocolProblemReport", "protocolPRFilter"})
        xml.append(" xmlns:").append(prefix).append("=\"").append(uri_of(prefix)).append("\"");
    xml.append(">");
    if (!header.empty())
        xml.append("<E:Header><protocol:header>").append(header).append("</protocol:header></E:Header>");
    return xml.append("<E:Body>").append(content).append("</E:Body></E:Envelope>");
}

} // namespace

raw_client::raw_client(int port) : socket_(socket(AF_INET, SOCK_STREAM | SOCK_CLOEXEC, 0))
{
    sockaddr_in address{};
    address.sin_family = AF_INET;
    address.sin_port = htons(static_cast<std::uint16_t>(port));
    address.sin_addr.s_addr = htonl(INADDR_LOOPBACK);
    const timeval patience{PATIENCE_S, 0};
    setsockopt(socket_, SOL_SOCKET, SO_RCVTIMEO, &patience, sizeof patience);
    setsockopt(socket_, SOL_SOCKET, SO_SNDTIMEO, &patience, sizeof patience);
    if (connect(socket_, reinterpret_cast<sockaddr *>(&address), sizeof address) != 0) {
        close(socket_);
        socket_ = -1;
    }
}

raw_client::~raw_client()
{
    close(socket_);
}

bool raw_client::send(std::string_view bytes)
{
    while (!bytes.empty()) {
        const ssize_t sent = ::send(socket_, bytes.data(), bytes.size(), MSG_NOSIGNAL);
        if (sent <= 0)
            return false;
        bytes.remove_prefix(static_cast<std::size_t>(sent));
    }
    return true;
}

void raw_client::end_sending()
{
    shutdown(socket_, SHUT_WR);
}

bool raw_client::fill()
{
    char bytes[16384];
    const ssize_t got = recv(socket_, bytes, sizeof bytes, 0);
    if (got <= 0)
        return false;
    received_.append(bytes, static_cast<std::size_t>(got));
    return true;
}

std::string raw_client::take(std::size_t length)
{
    while (received_.size() < length && fill()) {
    }
    std::string taken = received_.substr(0, length);
    received_.erase(0, length);
    return taken;
}

std::string raw_client::take_line()
{
    std::size_t end;
    while ((end = received_.find("\r\n")) == received_.npos && fill()) {
    }
    return end == received_.npos ? take(received_.size()) : take(end + 2);
}

raw_answer raw_client::receive()
{
    raw_answer answer;
    std::size_t length = 0;
    bool chunked = false;
    for (std::string line = take_line(); !line.empty() && line != "\r\n"; line = take_line()) {
        answer.head += line;
        if (line.starts_with("Content-Length: "))
            length = std::strtoul(line.c_str() + 16, nullptr, 10);
        chunked = chunked || line.starts_with("Transfer-Encoding: chunked");
    }
    if (answer.head.starts_with("HTTP/1."))
        answer.status = std::atoi(answer.head.c_str() + 9);
    if (!chunked) {
        answer.body = take(length);
        return answer;
    }
    for (;;) {
        const std::size_t size = std::strtoul(take_line().c_str(), nullptr, 16);
        answer.body += take(size);
        take_line();
        if (size == 0)
            return answer;
    }
}

bool raw_client::ended()
{
    return received_.empty() && !fill();
}

std::string post(std::string_view port_name, std::string_view body, std::string_view headers)
{
    std::string request = "POST /zuv/v1.0/services/";
    request.append(port_name)
        .append(" HTTP/1.1\r\nHost: localhost\r\nContent-Type: text/xml\r\n")
        .append(headers);
    request.append("Content-Length: ").append(std::to_string(body.size())).append("\r\n\r\n").append(body);
    return request;
}

raw_answer exchange(int port, std::string_view bytes)
{
    raw_client client(port);
    client.send(bytes);
    return client.receive();
}

std::string soap11(std::string_view content, std::string_view header)
{
    return envelope("http://schemas.xmlsoap.org/soap/envelope/", content, header);
}

std::string soap12(std::string_view content, std::string_view header)
{
    return envelope("http://www.w3.org/2003/05/soap-envelope", content, header);
}

std::string uri_of(std::string_view prefix)
{
    for (const soap_namespace *row = soap_program_namespaces; row->prefix != nullptr; ++row)
        if (prefix == row->prefix)
            return row->uri;
    return {};
}

std::string element_text(std::string_view xml, std::string_view local_name)
{
    for (std::size_t at = 0; (at = xml.find(local_name, at)) != xml.npos; ++at) {
        const bool begins = at > 0 && (xml[at - 1] == ':' || xml[at - 1] == '<');
        const std::size_t behind = at + local_name.size();
        if (!begins || behind >= xml.size() || (xml[behind] != '>' && xml[behind] != ' '))
            continue;
        const std::size_t start = xml.find('>', behind) + 1;
        return std::string(xml.substr(start, xml.find('<', start) - start));
    }
    return {};
}

} // namespace service_test

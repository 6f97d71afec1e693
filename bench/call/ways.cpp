// ways.cpp - see ways.h.
#include "ways.h"

#include <arpa/inet.h>
#include <cstring>
#include <memory>
#include <netinet/in.h>
#include <netinet/tcp.h>
#include <stdexcept>
#include <sys/socket.h>
#include <unistd.h>

#include <curl/curl.h>
#include <openssl/ssl.h>

#include <zuv_client_pro/ProfileSoapBindingProxy.h>
#include <zuv_client_pro/protocol.h>
#include <zuv_client_pro/soap_error.h>
#include <zuv_client_pro/soap_http.h>
#include <zuv_client_pro/soap_log.h>
#include <zuv_client_pro/soap_tcp.h>
#include <zuv_client_pro/soap_tls.h>

#include "message.h"

namespace call_bench {

namespace {

void expect(bool holds, const char *who)
{
    if (!holds)
        throw std::runtime_error(std::string("not the answer expected: ") + who);
}

// --- the library ---

class library {
public:
    library(const target &to, bool keeps, bool resumes, bool polls = false)
        : url_(to.url()), ca_(to.ca), resumes_(resumes)
    {
        proxy_.wait_with_poll = polls ? 1 : 0;
        soap_log_set_received(&proxy_, nullptr);
        soap_log_set_sent(&proxy_, nullptr);
        proxy_.endpoint = url_.c_str();
        proxy_.input_mode = proxy_.output_mode = MODE_UTF_STRINGS | (keeps ? MODE_KEEP_ALIVE : 0);
        if (!ca_.empty())
            expect(soap_ssl_client_context(&proxy_, TLS_VERIFY_PEER | TLS_NO_DEFAULT_CA, nullptr, nullptr,
                                           ca_.c_str(), nullptr, nullptr) == 0,
                   "library");
    }
    void call()
    {
        if (!resumes_) {
            SSL_SESSION_free(proxy_.tls_session);
            proxy_.tls_session = nullptr;
        }
        protocol__IdentityType type = protocol__IdentityType::organization;
        protocol__Identity identity;
        identity.type = &type;
        identity.name = &order_.name;
        protocolProfile__ProfileContent request;
        request.identity = &identity;
        __protocolProfile__createResponse response{};
        proxy_.destroy();
        const int code = proxy_.create(&request, response);
        expect(code == 0 && response.result && response.result->contact.size() == CONTACTS, "library");
    }
    // The bytes that a call sends.
    std::string sent()
    {
        static std::string bytes;
        bytes.clear();
        const auto real = proxy_.on_send;
        proxy_.on_send = [](soap *ctx, const char *data, std::size_t length) {
            bytes.append(data, length);
            return tcp_send(ctx, data, length);
        };
        call();
        proxy_.on_send = real;
        return bytes;
    }

private:
    std::string url_, ca_;
    bool resumes_;
    order order_;
    ProfileSoapBindingProxy proxy_;
};

// --- sockets by hand ---

class connection {
public:
    explicit connection(int port) : socket_(socket(AF_INET, SOCK_STREAM, 0))
    {
        const int on = 1;
        sockaddr_in address{};
        address.sin_family = AF_INET;
        address.sin_port = htons(static_cast<std::uint16_t>(port));
        address.sin_addr.s_addr = htonl(INADDR_LOOPBACK);
        setsockopt(socket_, IPPROTO_TCP, TCP_NODELAY, &on, sizeof on);
        expect(connect(socket_, reinterpret_cast<sockaddr *>(&address), sizeof address) == 0, "connect");
    }
    ~connection() { close(socket_); }
    connection(const connection &) = delete;
    connection &operator=(const connection &) = delete;

    void send(const std::string &bytes)
    {
        expect(::send(socket_, bytes.data(), bytes.size(), 0) == static_cast<ssize_t>(bytes.size()), "send");
    }
    std::size_t recv(char *to, std::size_t size)
    {
        const ssize_t count = ::recv(socket_, to, size, 0);
        expect(count > 0, "recv");
        return static_cast<std::size_t>(count);
    }

private:
    int socket_;
};

// The same bytes as the library's, which no one looks at.
class bare_exchange {
public:
    bare_exchange(int port, std::string request)
        : connection_(port), request_(std::move(request)), length_(answer().size())
    {}
    void call()
    {
        connection_.send(request_);
        for (std::size_t have = 0; have < length_;)
            have += connection_.recv(buffer_, sizeof buffer_);
    }

private:
    connection connection_;
    std::string request_;
    std::size_t length_;
    char buffer_[65536];
};

// What a careful host would write: records to XML, a head, the answer's head, pugixml, records again. Its
// request declares the three namespaces that it uses and the further ones.
class hand_made {
public:
    hand_made(int port, std::string further) : connection_(port), port_(port), further_(std::move(further)) {}
    void call()
    {
        const std::string body = request_body(order_, further_);
        connection_.send("POST /profile HTTP/1.1\r\nHost: 127.0.0.1:" + std::to_string(port_) +
                         "\r\nContent-Type: text/xml; charset=utf-8\r\nContent-Length: " +
                         std::to_string(body.size()) + "\r\nSOAPAction: \"\"\r\n\r\n" + body);
        std::size_t have = 0, head = 0, length = 0;
        do {
            have += connection_.recv(buffer_ + have, sizeof buffer_ - 1 - have);
            buffer_[have] = '\0';
            if (head == 0)
                if (const char *const end = std::strstr(buffer_, "\r\n\r\n")) {
                    head = static_cast<std::size_t>(end - buffer_) + 4;
                    expect(std::strncmp(buffer_, "HTTP/1.1 200", 12) == 0, "hand-made");
                    length = std::strtoul(std::strstr(buffer_, "Content-Length: ") + 16, nullptr, 10);
                }
        } while (head == 0 || have < head + length);
        profile got;
        expect(bind(buffer_ + head, length, got), "hand-made");
    }

private:
    connection connection_;
    int port_;
    std::string further_;
    order order_;
    char buffer_[65536];
};

// The declarations among the library's bytes that the request made by hand lacks.
std::string further_declarations(const std::string &sent)
{
    const std::string own = request_body({}), start = " xmlns:";
    std::string further;
    for (std::size_t at = sent.find(start), end; at != std::string::npos; at = sent.find(start, end)) {
        const std::size_t uri = sent.find('"', at);
        end = sent.find('"', uri + 1) + 1;
        if (own.find(sent.substr(uri, end - uri)) == std::string::npos)
            further += sent.substr(at, end - at);
    }
    return further;
}

// --- libcurl ---

class curl_call {
public:
    curl_call(const target &to, bool binds, bool keeps, bool resumes)
        : binds_(binds), handle_(curl_easy_init()), headers_(nullptr)
    {
        for (const char *const line :
             {"Content-Type: text/xml; charset=utf-8", "SOAPAction: \"\"", "Expect:"})
            headers_ = curl_slist_append(headers_, line);
        set(CURLOPT_URL, to.url().c_str());
        set(CURLOPT_HTTPHEADER, headers_);
        set(
            CURLOPT_WRITEFUNCTION, +[](char *data, std::size_t one, std::size_t count, void *into) {
                static_cast<std::string *>(into)->append(data, one * count);
                return one * count;
            });
        set(CURLOPT_WRITEDATA, &got_);
        set(CURLOPT_NOSIGNAL, 1L);
        set(CURLOPT_FORBID_REUSE, keeps ? 0L : 1L);
        if (!to.ca.empty()) {
            set(CURLOPT_CAINFO, to.ca.c_str());
            set(CURLOPT_SSL_SESSIONID_CACHE, resumes ? 1L : 0L);
        }
    }
    ~curl_call()
    {
        curl_easy_cleanup(handle_);
        curl_slist_free_all(headers_);
    }
    curl_call(const curl_call &) = delete;
    curl_call &operator=(const curl_call &) = delete;

    void call()
    {
        const std::string body = request_body(order_);
        set(CURLOPT_POSTFIELDS, body.c_str());
        set(CURLOPT_POSTFIELDSIZE, static_cast<long>(body.size()));
        got_.clear();
        expect(curl_easy_perform(handle_) == CURLE_OK && got_.size() > 1000, "libcurl");
        profile made;
        if (binds_)
            expect(bind(got_.data(), got_.size(), made), "libcurl + pugixml");
    }

private:
    template <class Value> void set(CURLoption option, Value value)
    {
        curl_easy_setopt(handle_, option, value);
    }
    bool binds_;
    CURL *handle_;
    curl_slist *headers_;
    order order_;
    std::string got_;
};

template <class Caller, class... Arguments> way make(const char *name, Arguments... arguments)
{
    const auto caller = std::make_shared<Caller>(arguments...);
    return {name, [caller] { caller->call(); }};
}

} // namespace

std::vector<way> kept_ways(const target &to)
{
    std::vector<way> ways;
    const std::string sent = to.ca.empty() ? library(to, true, true).sent() : "";
    if (to.ca.empty())
        ways.push_back(make<bare_exchange>("bare exchange", to.port, sent));
    ways.push_back(make<library>("library", to, true, true));
    ways.push_back(make<library>("library, wait_with_poll", to, true, true, true));
    if (to.ca.empty()) {
        ways.push_back(make<hand_made>("hand-made call", to.port, further_declarations(sent)));
        ways.push_back(make<hand_made>("hand-made call, three namespaces", to.port, ""));
    }
    ways.push_back(make<curl_call>("libcurl", to, false, true, true));
    ways.push_back(make<curl_call>("libcurl + pugixml", to, true, true, true));
    return ways;
}

std::vector<way> fresh_ways(const target &to)
{
    std::vector<way> ways;
    ways.push_back(make<library>("library", to, false, true));
    if (!to.ca.empty())
        ways.push_back(make<library>("library, no session", to, false, false));
    ways.push_back(make<curl_call>("libcurl", to, false, false, true));
    if (!to.ca.empty())
        ways.push_back(make<curl_call>("libcurl, no session", to, false, false, false));
    return ways;
}

} // namespace call_bench

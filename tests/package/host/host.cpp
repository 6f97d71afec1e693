// host.cpp - a stranger's host: nothing but installed headers and the installed library. Usage: host ENDPOINT
// of a Profile port. Calls through a proxy, through callbacks of its own, and in a call cycle of its own, and
// lets an exception of its own cross the library. Says what failed; 0 when nothing did.
#include <cstdio>
#include <cstring>
#include <stdexcept>
#include <string>

#include <zuv_client_pro/ProfileSoapBindingProxy.h>
#include <zuv_client_pro/protocol.h>
#include <zuv_client_pro/protocolProfile.h>
#include <zuv_client_pro/soap_envelope.h>
#include <zuv_client_pro/soap_error.h>
#include <zuv_client_pro/soap_http.h>
#include <zuv_client_pro/soap_identity.h>
#include <zuv_client_pro/soap_io.h>
#include <zuv_client_pro/soap_log.h>
#include <zuv_client_pro/soap_memory.h>
#include <zuv_client_pro/soap_tcp.h>
#include <zuv_client_pro/soap_tls.h>
#include <zuv_client_pro/soap_xml.h>

namespace {

int failures = 0;

void expect(bool holds, const char *what)
{
    std::printf("%-5s %s\n", holds ? "ok" : "FAIL", what);
    failures += holds ? 0 : 1;
}

std::size_t bytes_sent = 0;

int count_and_send(soap *ctx, const char *data, std::size_t length)
{
    bytes_sent += length;
    return tcp_send(ctx, data, length);
}

int send_nothing(soap *, const char *, std::size_t)
{
    throw std::runtime_error("the host's own");
}

std::string make_profile(ProfileSoapBindingProxy &proxy)
{
    std::string name = "A stranger";
    protocol__Identity identity;
    identity.name = &name;
    protocolProfile__ProfileContent profile;
    profile.identity = &identity;
    __protocolProfile__createResponse created;
    proxy.on_send = count_and_send;
    const int error = proxy.create(&profile, created);
    if (error != 0)
        proxy.soap_print_fault(stderr);
    const bool made = error == 0 && created.result != nullptr && !created.result->thisURI.empty();
    expect(made, "a call through a proxy");
    expect(bytes_sent > 0, "a callback of the host's");
    return made ? created.result->thisURI.front() : std::string();
}

// The cycle of a call, written by the host over the exported functions: "get" without the proxy's operation.
bool get_by_hand(ProfileSoapBindingProxy &proxy, const char *endpoint, std::string uri)
{
    protocol__Header header;
    header.targetURI = &uri;
    _protocolProfile__getRequest request;
    request.soap_default(&proxy);
    const auto write = [&] {
        return soap_envelope_out_begin(&proxy) || soap_header_put(&proxy) || soap_body_out_begin(&proxy) ||
               request.soap_put(&proxy, "protocolProfile:getRequest", "") || soap_body_out_end(&proxy) ||
               soap_envelope_out_end(&proxy);
    };
    soap_reset_call(&proxy);
    proxy.soap_header(&header);
    soap_mark_header(&proxy);
    request.soap_serialize(&proxy);
    if (soap_count_begin(&proxy) || ((proxy.mode & MODE_COUNTING) != 0 && write()) || soap_count_end(&proxy))
        return false;
    if (soap_server_connect(&proxy, endpoint, "") || write() || soap_send_finish(&proxy))
        return false;
    protocolProfile__ProfileContent answer;
    answer.soap_default(&proxy);
    if (soap_receive_begin(&proxy) || soap_envelope_in_begin(&proxy) || soap_header_get(&proxy) ||
        soap_body_in_begin(&proxy) || !answer.soap_get(&proxy, "protocolProfile:getResponse", nullptr) ||
        soap_body_in_end(&proxy) || soap_envelope_in_end(&proxy) || soap_receive_finish(&proxy))
        return false;
    soap_socket_release(&proxy);
    return answer.identity != nullptr && answer.identity->name != nullptr &&
           *answer.identity->name == "A stranger";
}

bool own_exception_crosses(const char *endpoint)
{
    ProfileSoapBindingProxy proxy(endpoint);
    proxy.on_send = send_nothing;
    _protocolProfile__getRequest request;
    __protocolProfile__getResponse response;
    try {
        proxy.get(&request, response);
    } catch (const std::runtime_error &thrown) {
        return std::strcmp(thrown.what(), "the host's own") == 0;
    }
    return false;
}

} // namespace

int main(int argc, char **argv)
{
    if (argc != 2)
        return 2;
    ProfileSoapBindingProxy proxy(argv[1], MODE_KEEP_ALIVE | MODE_UTF_STRINGS);
    const std::string uri = make_profile(proxy);
    expect(!uri.empty() && get_by_hand(proxy, argv[1], uri), "a call cycle of the host's");
    expect(own_exception_crosses(argv[1]), "an exception of the host's crosses the library");
    expect(soap_ssl_client_context(&proxy, 0, nullptr, nullptr, nullptr, nullptr, nullptr) == 0,
           "OpenSSL is there");
    expect(IsIPAddr("127.0.0.1") != 0 && g_TraceLogFile[0] != '\0', "what is exported by its plain name");
    return failures == 0 ? 0 : 1;
}

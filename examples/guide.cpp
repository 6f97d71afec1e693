// guide.cpp - the pieces of code that docs/host-guide.md shows, as a host that compiles and runs.
//
// Usage: guide ENDPOINT, the Profile port of a service. Each function is one section of the guide; the
// guide's blocks are here word for word. Ends with 1 at the first call that goes another way than the guide
// says.
#include <atomic>
#include <chrono>
#include <csignal>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <string>
#include <thread>
#include <utility>
#include <vector>

#include <zuv_client_pro/ProfileSoapBindingProxy.h>
#include <zuv_client_pro/client.h>
#include <zuv_client_pro/client_attachment.h>
#include <zuv_client_pro/protocol.h>
#include <zuv_client_pro/protocolProfile.h>
#include <zuv_client_pro/protocolStatusReport.h>
#include <zuv_client_pro/soap_error.h>
#include <zuv_client_pro/soap_log.h>
#include <zuv_client_pro/soap_memory.h>
#include <zuv_client_pro/soap_plugin.h>
#include <zuv_client_pro/soap_report.h>
#include <zuv_client_pro/soap_tls.h>
#include <zuv_client_pro/soap_xml.h>

namespace {

const char *endpoint;

void expect(bool holds, const char *what)
{
    if (holds)
        return;
    std::fprintf(stderr, "guide: not so: %s\n", what);
    std::exit(1);
}

// A profile in the service, by its name.
std::string make_profile()
{
    ProfileSoapBindingProxy proxy(endpoint, MODE_UTF_STRINGS);
    std::string name = "Ada's workshop";
    protocol__Identity identity;
    identity.name = &name;
    protocolProfile__ProfileContent profile;
    profile.identity = &identity;
    __protocolProfile__createResponse created;
    expect(proxy.create(&profile, created) == 0, "a profile is created");
    return created.result && !created.result->thisURI.empty() ? created.result->thisURI[0] : "";
}

void options_of_a_client()
{
    zuv::options wanted;
    wanted.total_limit = std::chrono::seconds(60); // a call with its repetitions
    wanted.ca_file = "/etc/agent/ca.pem";
    wanted.proxy_from_environment = true; // http_proxy, https_proxy, no_proxy
    zuv::profile_client client("https://care.example/zuv/v1.0/services/Profile", wanted);
    expect(client.settings().ca_file == wanted.ca_file, "a client keeps its options");
}

void results_of_a_client(const std::string &uri)
{
    zuv::profile_client client(endpoint);
    const auto got = client.get({}, zuv::extras().target(uri).repeatable());
    if (!got) {
        std::fprintf(stderr, "%s\n", got.failure().message().c_str());
        for (const zuv::fault_info &fault : got.failure().faults())
            if (const auto *missing = fault.as<protocol__Client_x002eObjectNotFound>())
                std::printf("%zu not found\n", missing->uri.size());
    }
}

void members_by_a_document()
{
    zuv::profile_client client(endpoint);
    zuv::document document;
    protocolProfile__ProfileContent profile;
    zuv::set(zuv::make(profile.identity).name, "Ada's workshop");
    zuv::set(zuv::add(profile.contact).name, "Ada");
    const auto created = client.create(profile);
    if (created && created->identity)
        std::printf("kept for %s\n", zuv::text(created->identity->name, "nobody"));
}

// The endpoint is another port's and the file isn't there: the call fails.
void attachments_of_a_client()
{
    zuv::status_report_client reports(endpoint);
    protocolStatusReport__StatusReportContent report;
    zuv::attachments files;
    const zuv::part log =
        zuv::file_part("agent.log"); // log.reference() goes into a member such as dataHandler
    files.send(log).receive([](const zuv::received_part &) { return zuv::to_file("answer.bin"); });
    const auto kept = reports.create(report, zuv::extras().carry(files));
    expect(!kept && kept.failure().code(), "a file that isn't there can't be sent");
}

void life_of_a_proxy(std::string uri)
{
    ProfileSoapBindingProxy proxy(endpoint, MODE_KEEP_ALIVE | MODE_UTF_STRINGS);
    protocol__Header header;
    header.targetURI = &uri;
    for (int i = 0; i < 3; ++i) {
        proxy.soap_header(&header); // for the next call only
        _protocolProfile__getRequest request;
        __protocolProfile__getResponse response;
        const int error = proxy.get(&request, response);
        const auto *profile = error == 0 ? response.result : nullptr;
        if (profile && profile->identity && profile->identity->name) // whatever is optional may be null
            std::printf("%s\n", profile->identity->name->c_str());
        proxy.destroy(); // response.result is gone; the connection is not
    }
    expect(proxy.error == 0, "three calls are answered");
}

void ownership(std::string uri)
{
    ProfileSoapBindingProxy proxy(endpoint, MODE_UTF_STRINGS);
    protocol__Header header;
    header.targetURI = &uri;
    proxy.soap_header(&header);
    _protocolProfile__getRequest request;
    __protocolProfile__getResponse response;
    expect(proxy.get(&request, response) == 0, "the profile is there");

    std::string *name = nullptr;
    if (response.result && response.result->identity)
        std::swap(name, response.result->identity->name);
    soap_block_unlink(&proxy, name); // from here on it is ours
    proxy.destroy();
    if (name)
        std::printf("still here: %s\n", name->c_str());
    delete name;
}

void one_context_for_each_thread()
{
    ProfileSoapBindingProxy settings(endpoint, MODE_UTF_STRINGS);
    settings.connect_timeout = 5;
    std::vector<std::thread> threads;
    threads.reserve(4);
    for (int i = 0; i < 4; ++i)
        threads.emplace_back([&settings] {
            ProfileSoapBindingProxy proxy(settings); // modes, limits, callbacks, TLS as in `settings`
            proxy.endpoint = endpoint;               // but neither its endpoint nor its connection
            protocolProfile__ProfileContent profile;
            __protocolProfile__createResponse created;
            expect(proxy.create(&profile, created) == 0, "every thread's call is answered");
        });
    for (std::thread &thread : threads)
        thread.join();
}

void errors_and_faults()
{
    ProfileSoapBindingProxy proxy(endpoint, MODE_UTF_STRINGS);
    std::string uri = "urn:not:there";
    protocol__Header header;
    header.targetURI = &uri;
    proxy.soap_header(&header);
    _protocolProfile__getRequest request;
    __protocolProfile__getResponse response;

    switch (proxy.get(&request, response)) {
    case SOAP_OK:
        break;
    case SOAP_CLIENT_FAULT: // the service says that the request can't be served
    case SOAP_SERVER_FAULT: // the service says that it failed
    case SOAP_FAULT:        // a fault with another code
        if (const SOAP_ENV__Fault *fault = proxy.soap_fault(); fault != nullptr && fault->detail != nullptr) {
            if (const auto *missing = fault->detail->Client_x002eObjectNotFound)
                std::printf("not found: %s\n", missing->uri.empty() ? "" : missing->uri[0].c_str());
        }
        std::printf("the service: %s\n", proxy.soap_fault_string());
        break;
    case SOAP_TCP_ERROR: // no connection: try again later
    case SOAP_TLS_ERROR: // no trust: certificates or host name need a look
    case SOAP_EOF:       // the connection ended, or a time limit passed
    default:             // an HTTP status such as 401 or 503, or another code of soap_error.h
        proxy.soap_print_fault(stderr);
    }
    expect(proxy.error == SOAP_CLIENT_FAULT, "an unknown profile is the client's fault");
}

void time_limits()
{
    ProfileSoapBindingProxy proxy(endpoint);
    proxy.connect_timeout = 10;    // seconds, for each address that the host's name has
    proxy.send_timeout = 30;       // seconds of silence while sending
    proxy.recv_timeout = -500'000; // negative: microseconds, here half a second
    proxy.call_timeout = 120;      // seconds for the whole call
    protocolProfile__ProfileContent profile;
    __protocolProfile__createResponse created;
    expect(proxy.create(&profile, created) == 0, "the service answers in time");
}

std::atomic<soap *> running{nullptr};

void stop(int)
{
    if (soap *const ctx = running)
        soap_cancel(ctx);
}

void cancelling()
{
    ProfileSoapBindingProxy proxy(endpoint);
    if (soap_cancel_arm(&proxy) != SOAP_OK)
        return proxy.soap_print_fault(stderr);
    running = &proxy; // stop, a handler of SIGINT, calls soap_cancel(running)
    std::signal(SIGINT, stop);
    protocolProfile__ProfileContent profile;
    __protocolProfile__createResponse created;
    expect(proxy.create(&profile, created) == 0, "an armed context calls like any other");
    running = nullptr; // before the proxy ends
    std::signal(SIGINT, SIG_DFL);
}

void reporting()
{
    ProfileSoapBindingProxy proxy(endpoint);
    protocolProfile__ProfileContent profile;
    __protocolProfile__createResponse created;
    expect(proxy.create(&profile, created) == 0, "the service answers");
    if (const soap_report *report = soap_call_report(&proxy))
        std::printf("%s, %.1f ms, first byte after %.1f ms, %llu bytes received, HTTP status %d\n",
                    report->peer, static_cast<double>(report->total_time) / 1000,
                    static_cast<double>(report->first_byte_time) / 1000,
                    static_cast<unsigned long long>(report->wire_received), report->http_status);
    expect(soap_call_report(&proxy)->http_status == 200, "the report gives the status");
}

void older_behaviour()
{
    ProfileSoapBindingProxy proxy(endpoint);
    proxy.legacy = LEGACY_FIRST_ADDRESS; // as version 1.5.1 did
    protocolProfile__ProfileContent profile;
    __protocolProfile__createResponse created;
    expect(proxy.create(&profile, created) == 0, "the service answers at its first address");
}

void several_endpoints()
{
    // A list is tried in order while connections fail.
    const std::string list = std::string("http://127.0.0.1:1/zuv/v1.0/services/Profile ") + endpoint;
    ProfileSoapBindingProxy proxy(list.c_str(), MODE_KEEP_ALIVE);
    protocolProfile__ProfileContent profile;
    __protocolProfile__createResponse created;
    expect(proxy.create(&profile, created) == 0, "the second endpoint serves");
}

void kept_and_closed(const std::string &uri)
{
    ProfileSoapBindingProxy proxy(endpoint, MODE_KEEP_ALIVE);
    protocol__Header header;
    std::string target = uri;
    header.targetURI = &target;
    proxy.soap_header(&header);
    _protocolProfile__getRequest request;
    __protocolProfile__getResponse response;
    int error = proxy.get(&request, response);
    const soap_report *report = soap_call_report(&proxy);
    if (error != 0 && report && report->reused && report->ended_by == ENDED_BY_PEER &&
        report->first_byte_time < 0) {
        proxy.soap_header(&header); // a header is for one call
        error = proxy.get(&request, response);
    }
    expect(error == 0, "the service answers");
}

void tls(const char *bundle)
{
    ProfileSoapBindingProxy proxy("https://care.example/zuv/v1.0/services/Profile", MODE_KEEP_ALIVE);
    if (soap_ssl_client_context(&proxy, TLS_VERIFY_PEER | TLS_STRICT_HOST_CHECK, nullptr,
                                nullptr,         // our certificate and key in one PEM file, its password
                                bundle, nullptr, // whom we trust: a PEM file, a directory of hashes
                                nullptr) != 0)   // more seed
        proxy.soap_print_fault(stderr);
    expect(proxy.error == (bundle ? SOAP_TLS_ERROR : 0), "a set-up fails only for a file that isn't there");
}

void proxies_and_credentials()
{
    ProfileSoapBindingProxy proxy(endpoint);
    proxy.proxy_host = "127.0.0.1";
    proxy.proxy_port = 1; // nothing listens there
    proxy.proxy_user = "user";
    proxy.proxy_password = "secret";
    protocolProfile__ProfileContent profile;
    __protocolProfile__createResponse created;
    expect(proxy.create(&profile, created) == SOAP_TCP_ERROR, "without the proxy there is no connection");
    proxy.proxy_host = nullptr;

    proxy.auth_user = "ada"; // borrowed, and forgotten by `destroy`: set them before each call
    proxy.auth_password = "secret";
    expect(proxy.create(&profile, created) == 0, "a service without accounts takes any");
}

void compression()
{
    ProfileSoapBindingProxy proxy(endpoint, MODE_CHUNKED | MODE_DEFLATE); // gzip, sent as it is made
    protocolProfile__ProfileContent profile;
    __protocolProfile__createResponse created;
    expect(proxy.create(&profile, created) == 0, "a compressed request is answered");
}

void soap_1_2()
{
    ProfileSoapBindingProxy proxy(endpoint);
    std::vector<soap_namespace> rows;
    for (const soap_namespace *row = proxy.namespaces;; ++row) {
        rows.push_back(*row);
        if (row->prefix == nullptr)
            break;
    }
    rows[0].uri = "http://www.w3.org/2003/05/soap-envelope";
    rows[1].uri = "http://www.w3.org/2003/05/soap-encoding";
    soap_set_namespaces(&proxy, rows.data()); // borrowed: the rows outlive the proxy's calls
    protocolProfile__ProfileContent profile;
    __protocolProfile__createResponse created;
    expect(proxy.create(&profile, created) == 0 && proxy.soap_version == 2, "the call is SOAP 1.2");
}

void callbacks()
{
    ProfileSoapBindingProxy proxy(endpoint);
    static int (*write_line)(soap *, const char *, const char *);
    write_line = proxy.on_header_line;
    proxy.on_header_line = [](soap *ctx, const char *key, const char *value) {
        if (key != nullptr && std::strcmp(key, "SOAPAction") == 0) {
            if (const int error = write_line(ctx, "X-Request-Source", "agent"))
                return error;
        }
        return write_line(ctx, key, value);
    };
    protocolProfile__ProfileContent profile;
    __protocolProfile__createResponse created;
    expect(proxy.create(&profile, created) == 0, "a header more does no harm");
}

// A plug-in that counts the bytes sent.
struct byte_count {
    std::size_t sent = 0;
    int (*send)(soap *ctx, const char *data, std::size_t length) = nullptr;
};

constexpr char BYTE_COUNT[] = "byte count 1";

int byte_count_create(soap *ctx, soap_plugin_record *record, void *)
{
    auto *count = new byte_count;
    count->send = ctx->on_send;
    ctx->on_send = [](soap *on, const char *data, std::size_t length) {
        auto *found = static_cast<byte_count *>(soap_plugin_lookup(on, BYTE_COUNT));
        found->sent += length;
        return found->send(on, data, length);
    };
    record->id = BYTE_COUNT;
    record->data = count;
    record->copy_hook = [](soap *, soap_plugin_record *target, soap_plugin_record *source) {
        target->data = new byte_count(*static_cast<byte_count *>(source->data));
        return 0;
    };
    record->delete_hook = [](soap *, soap_plugin_record *gone) {
        delete static_cast<byte_count *>(gone->data);
    };
    return 0;
}

void plug_ins()
{
    ProfileSoapBindingProxy proxy(endpoint);
    soap_register_plugin_arg(&proxy, byte_count_create, nullptr);
    protocolProfile__ProfileContent profile;
    __protocolProfile__createResponse created;
    expect(proxy.create(&profile, created) == 0, "the call goes through the plug-in");
    std::printf("%zu bytes\n", static_cast<byte_count *>(soap_plugin_lookup(&proxy, BYTE_COUNT))->sent);
}

void trace()
{
    std::strcpy(g_TraceLogFile, "agent-trace.log"); // for contexts made from now on; "" means no trace
    ProfileSoapBindingProxy proxy(endpoint);
    soap_log_set_received(&proxy, nullptr); // or for one context and one direction
    soap_log_set_sent(&proxy, "agent-1.log");
    soap_log_set_received(&proxy, "agent-1.log");
    protocolProfile__ProfileContent profile;
    __protocolProfile__createResponse created;
    expect(proxy.create(&profile, created) == 0, "the call is traced");
    g_TraceLogFile[0] = '\0';
}

void strict_reading()
{
    ProfileSoapBindingProxy proxy(endpoint, MODE_STRICT | MODE_UTF_STRINGS);
    protocolProfile__ProfileContent profile;
    __protocolProfile__createResponse created;
    expect(proxy.create(&profile, created) == 0, "the service's answers keep to the contract");
}

} // namespace

int main(int argc, char **argv)
{
    if (argc != 2) {
        std::fprintf(stderr, "usage: guide ENDPOINT\n");
        return 2;
    }
    endpoint = argv[1];
    g_TraceLogFile[0] = '\0';
    const std::string uri = make_profile();
    options_of_a_client();
    results_of_a_client(uri);
    results_of_a_client("urn:nobody");
    members_by_a_document();
    attachments_of_a_client();
    life_of_a_proxy(uri);
    ownership(uri);
    one_context_for_each_thread();
    errors_and_faults();
    time_limits();
    cancelling();
    reporting();
    older_behaviour();
    several_endpoints();
    kept_and_closed(uri);
    tls(nullptr);
    tls("/no/such/bundle.pem");
    proxies_and_credentials();
    compression();
    soap_1_2();
    callbacks();
    plug_ins();
    trace();
    strict_reading();
    return 0;
}

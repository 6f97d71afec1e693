// profile_client.cpp - a host that calls every operation of a Profile service and checks what comes back.
//
// Usage: profile_client ENDPOINT [options]; see declare. Prints a line for each step, and ends with 1 at the
// first answer that isn't what the profile sent makes it.
#include <cstdio>
#include <stdexcept>
#include <string>
#include <vector>

#include <CLI/CLI.hpp>

#include <zuv_client_pro/ProfileSoapBindingProxy.h>
#include <zuv_client_pro/protocol.h>
#include <zuv_client_pro/soap_binary.h>
#include <zuv_client_pro/soap_error.h>
#include <zuv_client_pro/soap_log.h>

#include "host_options.h"

namespace {

using profile = protocolProfile__ProfileContent;

struct options {
    std::string endpoint, trace;
    bool soap12 = false, chunked = false, keep_alive = false;
    int calls = 1;        // of get
    std::size_t size = 0; // bytes of the profileAuthority that set gives

    void declare(CLI::App &app)
    {
        app.add_option("ENDPOINT", endpoint)->required();
        app.add_flag("--soap12", soap12, "Send SOAP 1.2");
        app.add_flag("--chunked", chunked, "Send requests in chunks");
        app.add_flag("--keep-alive", keep_alive,
                     "Keep the connection; it is a failure if that doesn't succeed");
        app.add_option("--calls", calls, "How often get is called");
        app.add_option("--size", size, "Bytes of text that set puts into the profile");
        app.add_option("--trace", trace, "File that takes the bytes sent");
    }
    int mode() const
    {
        return static_cast<int>(MODE_UTF_STRINGS | (chunked ? MODE_CHUNKED : MODE_BUFFERED) |
                                (keep_alive ? MODE_KEEP_ALIVE : 0));
    }
};

void expect(bool holds, const std::string &what)
{
    if (!holds)
        throw std::runtime_error("not so: " + what);
}

bool is(const std::string *text, const char *expected)
{
    return text != nullptr && *text == expected;
}

// The profile that is sent: text beyond ASCII and markup, bytes, lists, enumerations, a profile in the
// profile.
struct sample {
    std::string name = "Zo\xC3\xAB & <co> \xF0\x9F\x9B\xA0", city = "Graz", mail = "zoe@workshop.example",
                user = "zoe", inner_name = "inner";
    protocol__IdentityType kind = protocol__IdentityType::organization;
    protocol__AddressType address_type = protocol__AddressType::billing;
    unsigned char bytes[4] = {0, 1, 254, 255};
    xsd__base64Binary certificate;
    protocol__Identity identity, inner_identity;
    protocol__Address address;
    protocol__Contact contact;
    protocol__Credentials credentials;
    profile inner, whole;

    sample()
    {
        certificate.content = bytes;
        certificate.size = sizeof bytes;
        identity.type = &kind;
        identity.name = &name;
        inner_identity.name = &inner_name;
        address.addressType = &address_type;
        address.city = &city;
        contact.name = &name;
        contact.address = {&address};
        contact.email = {mail, "second@workshop.example"};
        credentials.username = &user;
        credentials.certificate = &certificate;
        inner.identity = &inner_identity;
        whole.identity = &identity;
        whole.contact = {&contact};
        whole.credentials = {&credentials};
        whole.profile = {&inner};
    }
    sample(const sample &) = delete;
    sample &operator=(const sample &) = delete;
};

void expect_sample(const profile &p)
{
    const sample sent;
    expect(p.identity != nullptr && p.identity->type != nullptr && *p.identity->type == sent.kind,
           "the identity's type");
    expect(is(p.identity->name, sent.name.c_str()), "the identity's name");
    expect(!p.contact.empty() && is(p.contact[0]->name, sent.name.c_str()), "the contact's name");
    expect(p.contact[0]->email == sent.contact.email, "the contact's addresses of mail");
    expect(p.contact[0]->address.size() == 1, "the contact's address");
    const protocol__Address &address = *p.contact[0]->address[0];
    expect(is(address.city, "Graz") && address.addressType != nullptr &&
               *address.addressType == sent.address_type,
           "the parts of the address");
    expect(p.credentials.size() == 1 && is(p.credentials[0]->username, "zoe"), "the credentials");
    const xsd__base64Binary *certificate = p.credentials[0]->certificate;
    expect(certificate != nullptr &&
               std::string(certificate->content, certificate->content + certificate->size) ==
                   std::string(sent.bytes, sent.bytes + sizeof sent.bytes),
           "the certificate's bytes");
    expect(p.profile.size() == 1 && p.profile[0]->identity != nullptr &&
               is(p.profile[0]->identity->name, "inner"),
           "the profile in the profile");
}

class client {
public:
    explicit client(const options &o) : options_(o), proxy_(o.endpoint.c_str(), o.mode())
    {
        soap_log_set_received(&proxy_, nullptr);
        soap_log_set_sent(&proxy_, o.trace.empty() ? nullptr : o.trace.c_str());
        if (o.soap12)
            expect(soap_set_namespaces(&proxy_, soap12_namespaces()) == 0, "the namespaces are installed");
        open_ = proxy_.on_open;
        proxy_.user = this;
        proxy_.on_open = [](soap *ctx, const char *endpoint, const char *host, int port) {
            auto *self = static_cast<client *>(ctx->user);
            ++self->opened_;
            return self->open_(ctx, endpoint, host, port);
        };
    }
    client(const client &) = delete;
    client &operator=(const client &) = delete;

    void run()
    {
        create();
        for (int i = 0; i < options_.calls; ++i)
            get();
        std::printf("get: %d answers hold what was created\n", options_.calls);
        set();
        add();
        refresh_credentials();
        remove();
        get_removed();
        expect(!options_.keep_alive || opened_ == 1, "one connection serves all calls");
        std::printf("connections: %d\n", opened_);
    }

private:
    // One call about the profile that was created; checks what all answers have in common.
    template <class Response, class Request>
    const profile &answer(const char *name, int (ProfileSoapBindingProxy::*call)(Request *, Response &),
                          Request &request)
    {
        proxy_.destroy(); // the last answer's objects
        transaction_ = std::string("transaction-") + name;
        header_.transactionId = &transaction_;
        header_.targetURI = uri_.empty() ? nullptr : &uri_;
        proxy_.soap_header(&header_);
        Response response{};
        const int error = (proxy_.*call)(&request, response);
        if (error != 0)
            proxy_.soap_print_fault(stderr);
        expect(error == 0 && response.result != nullptr, std::string(name) + " is answered");
        const SOAP_ENV__Header *header = proxy_.soap_header();
        expect(header != nullptr && header->header != nullptr &&
                   is(header->header->transactionId, transaction_.c_str()),
               std::string("the header of the answer names the exchange, ") + name);
        expect(proxy_.soap_version == (options_.soap12 ? 2 : 1), "the answer has the request's SOAP version");
        const std::vector<std::string> &uris = response.result->thisURI;
        expect(uris.size() == 1 && (uri_.empty() ? !uris[0].empty() : uris[0] == uri_),
               std::string("the document has its name, ") + name);
        return *response.result;
    }

    void create()
    {
        const profile &created = answer("create", &ProfileSoapBindingProxy::create, sample_.whole);
        expect_sample(created);
        uri_ = created.thisURI.front();
        std::printf("create: %s\n", uri_.c_str());
    }

    void get() { expect_sample(answer("get", &ProfileSoapBindingProxy::get, get_request_)); }

    void set()
    {
        std::string text(options_.size, 'x');
        for (std::size_t i = 0; i < text.size(); i += 61)
            text[i] = "<&>\"' z"[i % 7];
        if (!text.empty())
            text.front() = text.back() = '|';
        profile changed = sample_.whole;
        changed.profileAuthority = text.empty() ? nullptr : &text;
        const profile &held = answer("set", &ProfileSoapBindingProxy::set, changed);
        expect_sample(held);
        expect(text.empty() || (held.profileAuthority != nullptr && *held.profileAuthority == text),
               "the text of the profile that was set");
        std::printf("set: %zu bytes of text\n", text.size());
    }

    void add()
    {
        std::string name = "added";
        protocol__Contact contact;
        contact.name = &name;
        profile more;
        more.contact = {&contact};
        const profile &held = answer("add", &ProfileSoapBindingProxy::add, more);
        expect_sample(held);
        expect(held.contact.size() == 2 && is(held.contact[1]->name, "added"), "the contact added");
        std::printf("add: %zu contacts\n", held.contact.size());
    }

    void refresh_credentials()
    {
        _protocolProfile__refreshCredentialsRequest request;
        request.credentials = &sample_.credentials;
        const profile &held =
            answer("refreshCredentials", &ProfileSoapBindingProxy::refreshCredentials, request);
        const protocol__Credentials &fresh = *held.credentials.at(0);
        expect(is(fresh.username, "zoe") && fresh.state != nullptr &&
                   *fresh.state == protocol__CredentialsState::valid && fresh.token != nullptr &&
                   !fresh.token->empty(),
               "the refreshed credentials");
        std::printf("refreshCredentials: a token of %zu bytes\n", fresh.token->size());
    }

    void remove()
    {
        profile nothing;
        answer("remove", &ProfileSoapBindingProxy::remove, nothing);
        std::printf("remove: %s\n", uri_.c_str());
    }

    void get_removed()
    {
        header_.targetURI = &uri_;
        proxy_.soap_header(&header_);
        __protocolProfile__getResponse response{};
        const int error = proxy_.get(&get_request_, response);
        expect(error == SOAP_CLIENT_FAULT && response.result == nullptr,
               "a removed profile is the client's fault");
        expect(proxy_.soap_fault_string() != nullptr && *proxy_.soap_fault_string() != '\0',
               "the fault has a text");
        const SOAP_ENV__Fault &fault = *proxy_.soap_fault();
        const SOAP_ENV__Detail *detail = options_.soap12 ? fault.Detail : fault.detail;
        expect(detail != nullptr && detail->Client_x002eObjectNotFound != nullptr,
               "the fault is a typed one");
        expect(detail->Client_x002eObjectNotFound->uri == std::vector<std::string>{uri_},
               "the fault names the document");
        std::printf("fault: %s\n", proxy_.soap_fault_string());
    }

    options options_;
    ProfileSoapBindingProxy proxy_;
    int (*open_)(soap *, const char *, const char *, int) = nullptr;
    int opened_ = 0;
    sample sample_;
    std::string uri_, transaction_;
    protocol__Header header_;
    _protocolProfile__getRequest get_request_;
};

} // namespace

int main(int argc, char **argv)
{
    CLI::App app("Calls every operation of a Profile service and checks the answers");
    options o;
    o.declare(app);
    CLI11_PARSE(app, argc, argv);
    try {
        client(o).run();
        return 0;
    } catch (const std::exception &failure) {
        std::fprintf(stderr, "profile_client: %s\n", failure.what());
        return 1;
    }
}

// profile_host.cpp - a host in its smallest useful form: keeps a profile at the service, from creation to
// removal.
//
// Usage: profile_host [--readable] [ENDPOINT]. Without an endpoint the proxy calls the default one on this
// machine. All that goes over the wire is in the trace file, wsTrace.log; --readable indents the requests for
// it.
#include <cstdio>
#include <cstring>
#include <string>

#include <zuv_client_pro/ProfileSoapBindingProxy.h>
#include <zuv_client_pro/protocol.h>
#include <zuv_client_pro/protocolProfile.h>

namespace {

// Says how a call ended. On a failure the library says what happened.
bool report(ProfileSoapBindingProxy &proxy, const char *call, int error,
            const protocolProfile__ProfileContent *answer)
{
    if (error != 0 || answer == nullptr) {
        std::printf("%s failed with error %d\n", call, error);
        proxy.soap_print_fault(stderr);
        return false;
    }
    const char *uri = answer->thisURI.empty() ? "(no name)" : answer->thisURI.front().c_str();
    const char *name =
        answer->identity && answer->identity->name ? answer->identity->name->c_str() : "(no name)";
    std::printf("%-20s %s, %s, %zu contacts, %zu credentials\n", call, uri, name, answer->contact.size(),
                answer->credentials.size());
    return true;
}

bool keep_a_profile(ProfileSoapBindingProxy &proxy)
{
    // A request is made of the host's own objects: optional members are pointers, null when absent.
    std::string name = "Ada's workshop", city = "Graz", mail = "ada@workshop.example", user = "ada";
    protocol__IdentityType kind = protocol__IdentityType::organization;
    protocol__Identity identity;
    identity.type = &kind;
    identity.name = &name;
    protocol__Address address;
    address.city = &city;
    protocol__Contact contact;
    contact.name = &name;
    contact.address.push_back(&address);
    contact.email.push_back(mail);
    protocol__Credentials credentials;
    credentials.username = &user;
    protocolProfile__ProfileContent profile;
    profile.identity = &identity;
    profile.contact.push_back(&contact);

    __protocolProfile__createResponse created;
    int error = proxy.create(&profile, created);
    if (!report(proxy, "create", error, created.result))
        return false;

    // The header names the document that the following calls are about. It is the host's, and is set for each
    // call.
    std::string uri = created.result->thisURI.front();
    protocol__Header header;
    header.targetURI = &uri;

    _protocolProfile__getRequest get;
    __protocolProfile__getResponse got;
    proxy.soap_header(&header);
    error = proxy.get(&get, got);
    if (!report(proxy, "get", error, got.result))
        return false;

    protocolProfile__ProfileContent change;
    change.contact.push_back(&contact);
    __protocolProfile__addResponse added;
    proxy.soap_header(&header);
    error = proxy.add(&change, added);
    if (!report(proxy, "add", error, added.result))
        return false;

    name = "Ada's new workshop";
    __protocolProfile__setResponse set;
    proxy.soap_header(&header);
    error = proxy.set(&profile, set);
    if (!report(proxy, "set", error, set.result))
        return false;

    _protocolProfile__refreshCredentialsRequest refresh;
    refresh.credentials = &credentials;
    __protocolProfile__refreshCredentialsResponse refreshed;
    proxy.soap_header(&header);
    error = proxy.refreshCredentials(&refresh, refreshed);
    if (!report(proxy, "refreshCredentials", error, refreshed.result))
        return false;

    __protocolProfile__removeResponse removed;
    proxy.soap_header(&header);
    error = proxy.remove(&profile, removed);
    return report(proxy, "remove", error, removed.result);
}

} // namespace

int main(int argc, char **argv)
{
    ProfileSoapBindingProxy proxy(MODE_KEEP_ALIVE |
                                  MODE_UTF_STRINGS); // one connection for all calls, text in UTF-8
    for (int i = 1; i < argc; ++i) {
        if (std::strcmp(argv[i], "--readable") == 0)
            proxy.output_mode |= MODE_INDENT;
        else
            proxy.endpoint = argv[i];
    }
    const bool kept = keep_a_profile(proxy);
    proxy.destroy(); // frees all answers; the proxy could go on
    return kept ? 0 : 1;
}

// create_call.h - a call of Profile's create whose answer is recognised: it holds what its own request did.
#pragma once

#include <chrono>
#include <string>

#include <zuv_client_pro/ProfileSoapBindingProxy.h>
#include <zuv_client_pro/protocol.h>

struct created {
    int code;
    int milliseconds;
    bool own;   // the answer is the one to this request
    bool whole; // and has the request's text, which not every peer sends back
};

inline created call_create(ProfileSoapBindingProxy &proxy, std::string name, std::string text)
{
    protocol__Identity identity;
    identity.name = &name;
    protocolProfile__ProfileContent request;
    request.identity = &identity;
    request.profileAuthority = &text;
    __protocolProfile__createResponse response{};
    const auto began = std::chrono::steady_clock::now();
    const int code = proxy.create(&request, response);
    const auto took = std::chrono::steady_clock::now() - began;
    const auto holds = [](const std::string *member, const std::string &sent) {
        return member != nullptr && *member == sent;
    };
    const auto *const answer = response.result;
    const bool own =
        code == 0 && answer != nullptr && answer->identity != nullptr && holds(answer->identity->name, name);
    return {code, static_cast<int>(std::chrono::duration_cast<std::chrono::milliseconds>(took).count()), own,
            own && holds(answer->profileAuthority, text)};
}

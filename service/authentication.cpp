// authentication.cpp - see authentication.h.
#include "authentication.h"

#include "faults.h"
#include "secrets.h"

namespace service {

namespace {

using request = protocolUpdateOrder__AuthenticateRequest;
using response = protocolUpdateOrder__AuthenticateResponse;

// Requests may refer to each other: so there may be more nested ones than the message has, or endlessly many,
// and their answers may repeat one long user name.
constexpr unsigned DEPTH_MAX = 100;
constexpr std::uint64_t ANSWER_BYTES = 1000; // of one nested answer, the user's name left out

// Null if the credentials are good.
protocol__Fault *fault_with(call &c, protocol__Credentials *credentials)
{
    if (credentials == nullptr || credentials->username == nullptr || credentials->password == nullptr)
        return make_fault<protocol__Client_x002eInsufficientInformation>(c.ctx,
                                                                         "User name or password is missing.");
    const auto is_good = [&](const std::string &user, const std::string &password) {
        return *credentials->username == user && same_secret(*credentials->password, password);
    };
    bool known = false;
    if (!c.config.user.empty()) {
        if (is_good(c.config.user, c.config.password))
            return nullptr;
        known = *credentials->username == c.config.user;
    }
    for (const auto &[user, password] : c.config.accounts) {
        if (is_good(user, password))
            return nullptr;
        known = known || *credentials->username == user;
    }
    if (known)
        return make_fault<protocol__Client_x002eAuthentication_x002eCredentialsMismatch>(
            c.ctx, "The password is wrong.");
    return make_fault<protocol__Client_x002eAuthentication_x002eNotRecognized>(c.ctx,
                                                                               "The user is not known.");
}

// What the answer says of the credentials: the user, not the secret.
protocol__Credentials *without_secret(call &c, const protocol__Credentials *given, bool good)
{
    if (given == nullptr)
        return nullptr;
    auto *const result = make<protocol__Credentials>(c.ctx);
    result->username = given->username;
    result->state =
        make_value(c.ctx, good ? protocol__CredentialsState::valid : protocol__CredentialsState::invalid);
    return result;
}

// `left`: bytes that the answers may still take.
response *answer(call &c, const request &asked, unsigned depth, std::uint64_t &left)
{
    const std::uint64_t bytes =
        ANSWER_BYTES + (asked.credentials == nullptr ? 0 : text_of(asked.credentials->username).size());
    if (depth > DEPTH_MAX || bytes > left)
        refuse<protocol__Client_x002eInvalidRequest>(c.ctx, "The request nests too many requests.");
    left -= bytes;
    auto *const made = make<response>(c.ctx);
    protocol__Fault *const fault = fault_with(c, asked.credentials);
    made->success = fault == nullptr;
    made->credentials = without_secret(c, asked.credentials, made->success);
    if (fault != nullptr)
        made->error.push_back(fault);
    for (const request *nested : asked.authenticateRequest)
        if (nested != nullptr)
            made->authenticateResponse.push_back(answer(c, *nested, depth + 1, left));
    return made;
}

} // namespace

response *authenticate(call &c, request &asked)
{
    std::uint64_t left = grown(c.bytes);
    return answer(c, asked, 0, left);
}

} // namespace service

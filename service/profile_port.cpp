// profile_port.cpp - the operations on profiles.
#include <zuv_client_pro/protocol.h>
#include <zuv_client_pro/protocolProfile.h>

#include "port.h"
#include "repository.h"

namespace service {

namespace {

using profile = protocolProfile__ProfileContent;
using state = protocolProfile__ProfileState;

constexpr std::time_t CREDENTIALS_LIFE =
    std::time_t{365} * 24 * 3600; // seconds that refreshed credentials are valid

repository<profile> repository_of(call &c)
{
    return {c, "Profile", "profile"};
}

profile *create(call &c, profile &request)
{
    if (request.state == nullptr)
        request.state = make_value(c.ctx, state::active);
    repository_of(c).keep(request);
    return &request;
}

profile *get(call &c, _protocolProfile__getRequest &)
{
    return repository_of(c).find(target_of(c));
}

profile *set(call &c, profile &request)
{
    return repository_of(c).change(target_of(c, &request.thisURI), [&](profile *held) {
        request.thisURI = held->thisURI;
        if (request.state == nullptr)
            request.state = held->state;
        return &request;
    });
}

template <class T> void append(std::vector<T> &held, const std::vector<T> &added)
{
    held.insert(held.end(), added.begin(), added.end());
}

template <class T> void fill(T *&held, T *added)
{
    if (held == nullptr)
        held = added;
}

profile *add(call &c, profile &request)
{
    return repository_of(c).change(target_of(c, &request.thisURI), [&](profile *held) {
        fill(held->state, request.state);
        fill(held->contentInterpretation, request.contentInterpretation);
        fill(held->profileAuthority, request.profileAuthority);
        fill(held->identity, request.identity);
        append(held->contact, request.contact);
        append(held->credentials, request.credentials);
        append(held->association, request.association);
        append(held->profile, request.profile);
        return held;
    });
}

bool same(const std::string *one, const std::string *other)
{
    return one != nullptr && other != nullptr && *one == *other;
}

// The held credentials of the same holder; those given, now held too, if there are none.
protocol__Credentials *credentials_like(profile &held, protocol__Credentials *given)
{
    for (protocol__Credentials *candidate : held.credentials)
        if (candidate != nullptr &&
            (same(candidate->username, given->username) || same(candidate->id, given->id)))
            return candidate;
    held.credentials.push_back(given);
    return given;
}

profile *refresh_credentials(call &c, _protocolProfile__refreshCredentialsRequest &request)
{
    if (request.credentials == nullptr)
        refuse<protocol__Client_x002eInsufficientInformation>(c.ctx,
                                                              "The request holds no credentials to refresh.");
    return repository_of(c).change(target_of(c), [&](profile *held) {
        protocol__Credentials *const refreshed = credentials_like(*held, request.credentials);
        refreshed->state = make_value(c.ctx, protocol__CredentialsState::valid);
        refreshed->token = make_text(c.ctx, fresh_uuid());
        refreshed->expiration = make_text(c.ctx, moment_text(c.ctx, std::time(nullptr) + CREDENTIALS_LIFE));
        return held;
    });
}

profile *remove(call &c, profile &request)
{
    profile *const removed = repository_of(c).remove(target_of(c, &request.thisURI));
    removed->state = make_value(c.ctx, state::closed);
    return removed;
}

constexpr operation OPERATIONS[] = {
    row<create>("protocolProfile:createRequest", "protocolProfile:createResponse"),
    row<get>("protocolProfile:getRequest", "protocolProfile:getResponse"),
    row<set>("protocolProfile:setRequest", "protocolProfile:setResponse"),
    row<add>("protocolProfile:addRequest", "protocolProfile:addResponse"),
    row<refresh_credentials>("protocolProfile:refreshCredentialsRequest",
                             "protocolProfile:refreshCredentialsResponse"),
    row<remove>("protocolProfile:removeRequest", "protocolProfile:removeResponse"),
};

} // namespace

const port profile_port = {.name = "Profile", .operations = OPERATIONS};

} // namespace service

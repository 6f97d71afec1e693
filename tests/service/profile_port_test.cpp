// profile_port_test.cpp - the profile port as a host's proxy sees it.
#include <ctime>
#include <string>

#include <gtest/gtest.h>

#include <zuv_client_pro/ProfileSoapBindingProxy.h>
#include <zuv_client_pro/soap_error.h>
#include <zuv_client_pro/soap_primitive.h>

#include "service/port_client.h"

using namespace service_test;

namespace {

using port = ProfileSoapBindingProxy;

class ProfilePort : public testing::Test {
protected:
    ProfilePort()
    {
        identity.name = &name;
        credentials.username = &user;
        contact.name = &name;
        profile.identity = &identity;
        profile.credentials.push_back(&credentials);
        profile.contact.push_back(&contact);
    }

    // Makes a document; its name.
    std::string create()
    {
        const auto *const made = client.call(&port::create, profile);
        return made == nullptr ? "" : made->thisURI.at(0);
    }

    service_process service;
    port_client<port> client{service, "Profile"};
    std::string name = "Ada \xC3\xA9 <&>", user = "ada";
    protocol__Identity identity;
    protocol__Credentials credentials;
    protocol__Contact contact;
    protocolProfile__ProfileContent profile;
    _protocolProfile__getRequest get;
};

} // namespace

TEST_F(ProfilePort, KeepsAProfileFromCreationToRemoval)
{
    const std::string uri = create();
    EXPECT_EQ(uri.rfind("urn:zuv:profile:", 0), 0u);
    const auto *got = client.call(&port::get, get, uri);
    ASSERT_NE(got, nullptr);
    EXPECT_EQ(got->thisURI, std::vector<std::string>{uri});
    EXPECT_EQ(*got->state, protocolProfile__ProfileState::active);
    EXPECT_EQ(*got->identity->name, name);

    protocolProfile__ProfileContent more, other, by_name;
    std::string authority = "authority";
    more.profileAuthority = &authority;
    more.contact.push_back(&contact);
    const auto *const added = client.call(&port::add, more, uri);
    ASSERT_NE(added, nullptr);
    EXPECT_EQ(added->contact.size(), 2u);
    EXPECT_EQ(*added->identity->name, name) << "what was there stays";
    EXPECT_EQ(*added->profileAuthority, authority);

    protocolProfile__ProfileState state = protocolProfile__ProfileState::inactive_x002esuspended;
    other.state = &state;
    ASSERT_NE(client.call(&port::set, other, uri), nullptr);
    got = client.call(&port::get, get, uri);
    EXPECT_EQ(got->thisURI, std::vector<std::string>{uri}) << "the name is the service's";
    EXPECT_EQ(*got->state, state);
    EXPECT_EQ(got->contact.size(), 0u);

    by_name.thisURI.push_back(uri);
    const auto *const removed = client.call(&port::remove, by_name);
    ASSERT_NE(removed, nullptr);
    EXPECT_EQ(*removed->state, protocolProfile__ProfileState::closed);
    EXPECT_EQ(client.call(&port::get, get, uri), nullptr);
    EXPECT_EQ(client.error, SOAP_CLIENT_FAULT);
}

TEST_F(ProfilePort, RefreshesTheCredentialsOfTheSameHolderAndTakesNewOnes)
{
    const std::string uri = create();
    for (const std::size_t expected : {std::size_t{1}, std::size_t{2}}) {
        _protocolProfile__refreshCredentialsRequest request;
        request.credentials = &credentials;
        const auto *const refreshed = client.call(&port::refreshCredentials, request, uri);
        ASSERT_NE(refreshed, nullptr);
        ASSERT_EQ(refreshed->credentials.size(), expected);
        const protocol__Credentials &last = *refreshed->credentials.back();
        EXPECT_EQ(*last.state, protocol__CredentialsState::valid);
        EXPECT_FALSE(last.token->empty());
        std::time_t end = 0;
        ASSERT_EQ(soap_datetime_parse(&client.proxy, last.expiration->c_str(), &end), 0);
        EXPECT_NEAR(static_cast<double>(end), static_cast<double>(std::time(nullptr)) + 365 * 86400, 600);
        user = "someone else";
    }
}

TEST_F(ProfilePort, TellsOfDocumentsThatAreNotThere)
{
    ASSERT_EQ(client.call(&port::get, get, "urn:nobody"), nullptr);
    const auto *const missing = client.detail().Client_x002eObjectNotFound;
    ASSERT_NE(missing, nullptr);
    EXPECT_EQ(missing->uri, std::vector<std::string>{"urn:nobody"});
    EXPECT_EQ(*missing->subcode, "Client.ObjectNotFound");
    EXPECT_NE(missing->description->find("urn:nobody"), std::string::npos);
    ASSERT_EQ(client.call(&port::get, get), nullptr);
    EXPECT_NE(client.detail().Client_x002eInsufficientInformation, nullptr);
    _protocolProfile__refreshCredentialsRequest nothing;
    ASSERT_EQ(client.call(&port::refreshCredentials, nothing, "urn:nobody"), nullptr);
    EXPECT_NE(client.detail().Client_x002eInsufficientInformation, nullptr);
}

TEST_F(ProfilePort, TakesACompoundTargetAndEchoesWhatNamesTheExchange)
{
    std::string uri = create(), transaction = "t-1", correlation = "c-2";
    protocol__CompoundTargetURI compound;
    compound.uri = &uri;
    client.header.targetURI = nullptr;
    client.header.compoundTargetURI = &compound;
    client.header.transactionId = &transaction;
    client.header.correlationId = &correlation;
    client.header.note.push_back("not echoed");
    client.proxy.soap_header(&client.header);
    __protocolProfile__getResponse got{};
    ASSERT_EQ(client.proxy.get(&get, got), 0);
    EXPECT_EQ(got.result->thisURI.at(0), uri);
    const SOAP_ENV__Header *const received = client.proxy.soap_header();
    ASSERT_NE(received, nullptr);
    EXPECT_EQ(*received->header->transactionId, transaction);
    EXPECT_EQ(*received->header->correlationId, correlation);
    EXPECT_TRUE(received->header->note.empty());
    ASSERT_NE(client.call(&port::create, profile), nullptr);
    EXPECT_EQ(client.proxy.soap_header(), nullptr);
}

TEST_F(ProfilePort, RefusesExpiredCredentials)
{
    const std::string uri = create();
    protocol__CredentialsState expired = protocol__CredentialsState::expired;
    std::string past = "2001-02-03T04:05:06Z", future = "2999-01-01T00:00:00Z";
    protocol__Credentials by_state, by_time, good;
    by_state.state = &expired;
    by_time.expiration = &past;
    good.expiration = &future;
    for (protocol__Credentials *given : {&by_state, &by_time}) {
        client.header.credentials = {&good, given};
        ASSERT_EQ(client.call(&port::get, get, uri), nullptr);
        const auto *const refused = client.detail().Client_x002eAuthentication_x002eCredentialsExpired;
        ASSERT_NE(refused, nullptr);
        EXPECT_EQ(refused->credentials.size(), 1u);
    }
    client.header.credentials = {&good};
    EXPECT_NE(client.call(&port::get, get, uri), nullptr);
}

TEST_F(ProfilePort, TakesNestedAndLargeProfilesOnAllFramings)
{
    std::vector<protocolProfile__ProfileContent> nest(100);
    std::string text(10000, 'x');
    for (std::size_t i = 0; i + 1 < nest.size(); ++i) {
        nest[i].profile.push_back(&nest[i + 1]);
        nest[i].profileAuthority = &text;
    }
    for (const std::uint32_t mode : {MODE_BUFFERED, MODE_STORE, MODE_CHUNKED, MODE_BUFFERED | MODE_DEFLATE}) {
        client.proxy.output_mode = MODE_KEEP_ALIVE | MODE_UTF_STRINGS | mode;
        const auto *p = client.call(&port::create, nest.front());
        ASSERT_NE(p, nullptr);
        std::size_t depth = 1;
        for (; !p->profile.empty(); p = p->profile.front(), ++depth)
            ASSERT_EQ(*p->profileAuthority, text);
        EXPECT_EQ(depth, nest.size());
    }
}

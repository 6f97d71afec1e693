// profile_port_test.cpp - the profile port beside the walk through all operations, which tests/interop takes.
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
        credentials.username = &user;
        profile.credentials.push_back(&credentials);
    }

    // Makes a document; its name.
    std::string create()
    {
        const auto *const made = client.call(&port::create, profile);
        return made == nullptr ? "" : made->thisURI.at(0);
    }

    service_process service;
    port_client<port> client{service, "Profile"};
    std::string user = "ada";
    protocol__Credentials credentials;
    protocolProfile__ProfileContent profile;
    _protocolProfile__getRequest get;
};

} // namespace

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

TEST_F(ProfilePort, TellsWhatIsMissing)
{
    ASSERT_EQ(client.call(&port::get, get, "urn:nobody"), nullptr);
    EXPECT_EQ(client.error, SOAP_CLIENT_FAULT);
    const auto *const missing = client.detail().Client_x002eObjectNotFound;
    ASSERT_NE(missing, nullptr);
    EXPECT_EQ(*missing->subcode, "Client.ObjectNotFound");
    EXPECT_NE(missing->description->find("urn:nobody"), std::string::npos);
    ASSERT_EQ(client.call(&port::get, get), nullptr);
    EXPECT_NE(client.detail().Client_x002eInsufficientInformation, nullptr);
    _protocolProfile__refreshCredentialsRequest nothing;
    ASSERT_EQ(client.call(&port::refreshCredentials, nothing, "urn:nobody"), nullptr);
    EXPECT_NE(client.detail().Client_x002eInsufficientInformation, nullptr);
}

TEST_F(ProfilePort, FindsItsTargetByOtherNamesAndEchoesWhatNamesTheExchange)
{
    std::string uri = create(), correlation = "c-2";
    protocol__CompoundTargetURI compound;
    compound.uri = &uri;
    client.header.compoundTargetURI = &compound;
    client.header.correlationId = &correlation;
    client.header.note.push_back("not echoed");
    client.proxy.soap_header(&client.header);
    __protocolProfile__getResponse got{};
    ASSERT_EQ(client.proxy.get(&get, got), 0);
    EXPECT_EQ(got.result->thisURI.at(0), uri);
    const SOAP_ENV__Header *const received = client.proxy.soap_header();
    ASSERT_NE(received, nullptr);
    EXPECT_EQ(*received->header->correlationId, correlation);
    EXPECT_TRUE(received->header->note.empty());
    profile.thisURI = {uri};
    ASSERT_NE(client.call(&port::remove, profile), nullptr);
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

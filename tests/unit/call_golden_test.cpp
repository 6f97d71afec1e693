// call_golden_test.cpp - the requests of the Profile port, byte for byte, against golden files.
#include <gtest/gtest.h>

#include <zuv_client_pro/ProfileSoapBindingProxy.h>
#include <zuv_client_pro/protocol.h>
#include <zuv_client_pro/protocolProfile.h>
#include <zuv_client_pro/soap_binary.h>

#include "support/call_wire.h"
#include "support/golden.h"

namespace {

// A request filled by each test, its answer an empty document of the operation.
class ProfileRequest : public testing::Test {
protected:
    ProfileRequest() { wire.carry(proxy); }

    void answer_with(const std::string &operation)
    {
        wire.answers.push_back(http_answer(
            "<E:Envelope xmlns:E=\"http://schemas.xmlsoap.org/soap/envelope/\"><E:Body><p:" + operation +
            "Response "
            "xmlns:p=\"http://www.zuv.example/xmlns/b2b/zuv/v1.0/Profile\"/></E:Body></E:Envelope>"));
    }

    void target()
    {
        header.targetURI = &uri;
        proxy.soap_header(&header);
    }

    call_wire wire;
    ProfileSoapBindingProxy proxy;
    std::string uri = "urn:zuv:profile:1";
    protocol__Header header;
};

TEST_F(ProfileRequest, create)
{
    protocolProfile__ProfileState state = protocolProfile__ProfileState::active;
    std::string authority = "registry & co", name = "Ada's <workshop>", city = "Graz";
    protocol__IdentityType kind = protocol__IdentityType::organization;
    protocol__AddressType use = protocol__AddressType::billing;
    protocol__Identity identity;
    identity.type = &kind;
    identity.name = &name;
    identity.customerNumber = {"1001", "1002"};
    protocol__Address address;
    address.addressType = &use;
    address.city = &city;
    protocol__Contact contact;
    contact.address = {&address};
    contact.email = {"ada@workshop.example"};
    contact.contactPreference = {protocol__ContactPreference::email, protocol__ContactPreference::voice};
    protocolProfile__ProfileContent request;
    request.state = &state;
    request.profileAuthority = &authority;
    request.identity = &identity;
    request.contact = {&contact};
    answer_with("create");
    __protocolProfile__createResponse response;
    ASSERT_EQ(0, proxy.create(&request, response));
    EXPECT_NE(nullptr, response.result);
    EXPECT_EQ(golden::read("profile_create.txt").whole(), wire.sent);
}

TEST_F(ProfileRequest, get)
{
    _protocolProfile__getRequest request;
    target();
    answer_with("get");
    __protocolProfile__getResponse response;
    ASSERT_EQ(0, proxy.get(&request, response));
    EXPECT_EQ(golden::read("profile_get.txt").whole(), wire.sent);
}

TEST_F(ProfileRequest, set)
{
    unsigned char bytes[] = {0, 1, 2, 255};
    xsd__base64Binary certificate, key;
    certificate.content = bytes;
    certificate.size = sizeof bytes;
    key.content = bytes;
    std::string user = "ada";
    protocol__Credentials credentials;
    credentials.username = &user;
    credentials.certificate = &certificate;
    credentials.key = &key;
    protocolProfile__ProfileContent request;
    request.thisURI = {uri};
    request.credentials = {&credentials};
    target();
    answer_with("set");
    __protocolProfile__setResponse response;
    ASSERT_EQ(0, proxy.set(&request, response));
    EXPECT_EQ(golden::read("profile_set.txt").whole(), wire.sent);
}

TEST_F(ProfileRequest, add)
{
    std::string id = "17", parent = "parent", name = "nested";
    bool authorized = true;
    protocolProfile__AssociationRelationship relationship;
    relationship.type = &parent;
    protocolProfile__Association association;
    association.id = &id;
    association.relationship = &relationship;
    protocol__RecognizedSubject subject;
    subject.name = &name;
    subject.authorized = &authorized;
    protocolProfile__ProfileContent request, nested;
    nested.identity = &subject;
    request.association = {&association};
    request.profile = {&nested};
    target();
    answer_with("add");
    __protocolProfile__addResponse response;
    ASSERT_EQ(0, proxy.add(&request, response));
    EXPECT_EQ(golden::read("profile_add.txt").whole(), wire.sent);
}

TEST_F(ProfileRequest, refreshCredentials)
{
    std::string token = "t-1", expiration = "2026-11-21T00:00:00Z";
    protocol__CredentialsState state = protocol__CredentialsState::expired;
    protocol__Credentials credentials;
    credentials.state = &state;
    credentials.token = &token;
    credentials.expiration = &expiration;
    _protocolProfile__refreshCredentialsRequest request;
    request.credentials = &credentials;
    target();
    answer_with("refreshCredentials");
    __protocolProfile__refreshCredentialsResponse response;
    ASSERT_EQ(0, proxy.refreshCredentials(&request, response));
    EXPECT_EQ(golden::read("profile_refreshCredentials.txt").whole(), wire.sent);
}

TEST_F(ProfileRequest, remove)
{
    protocolProfile__ProfileContent request;
    proxy.input_mode = proxy.output_mode = MODE_KEEP_ALIVE;
    proxy.auth_user = "ada";
    proxy.auth_password = "secret";
    target();
    answer_with("remove");
    __protocolProfile__removeResponse response;
    ASSERT_EQ(0, proxy._remove(nullptr, "urn:remove", &request, response));
    EXPECT_EQ(golden::read("profile_remove.txt").whole(), wire.sent);
    EXPECT_EQ(0, wire.closed);
}

} // namespace

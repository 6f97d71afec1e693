// profile_port_test.cpp - the profile port as a host's proxy sees it.
#include <ctime>
#include <string>

#include <gtest/gtest.h>

#include <zuv_client_pro/ProfileSoapBindingProxy.h>
#include <zuv_client_pro/soap_error.h>
#include <zuv_client_pro/soap_log.h>
#include <zuv_client_pro/soap_primitive.h>
#include <zuv_client_pro/soap_xml.h>

#include "service/raw_client.h"
#include "service/service_process.h"

using namespace service_test;

namespace {

class ProfilePort : public testing::Test {
protected:
    ProfilePort() : proxy(url.c_str(), static_cast<int>(MODE_KEEP_ALIVE | MODE_UTF_STRINGS))
    {
        soap_log_set_received(&proxy, nullptr);
        soap_log_set_sent(&proxy, nullptr);
        identity.name = &name;
        credentials.username = &user;
        contact.name = &name;
        profile.identity = &identity;
        profile.credentials.push_back(&credentials);
        profile.contact.push_back(&contact);
    }

    // Makes a document; its name, which is also the target of the next call.
    std::string create()
    {
        __protocolProfile__createResponse created{};
        EXPECT_EQ(proxy.create(&profile, created), 0) << fault();
        target = created.result == nullptr ? "" : created.result->thisURI.at(0);
        aim();
        return target;
    }

    void aim()
    {
        header.targetURI = &target;
        proxy.soap_header(&header);
    }

    protocolProfile__ProfileContent *get()
    {
        __protocolProfile__getResponse got{};
        aim();
        EXPECT_EQ(proxy.get(&get_request, got), 0) << fault();
        return got.result;
    }

    std::string fault()
    {
        char text[1024];
        return proxy.soap_print_fault_buffer(text, sizeof text);
    }

    const SOAP_ENV__Detail &detail() { return *proxy.soap_fault()->detail; }

    service_process service;
    std::string url = service.url("Profile");
    ProfileSoapBindingProxy proxy;
    std::string name = "Ada \xC3\xA9 <&>", user = "ada", target;
    protocol__Identity identity;
    protocol__Credentials credentials;
    protocol__Contact contact;
    protocolProfile__ProfileContent profile;
    protocol__Header header;
    _protocolProfile__getRequest get_request;
};

} // namespace

TEST_F(ProfilePort, KeepsAProfileFromCreationToRemoval)
{
    const std::string uri = create();
    EXPECT_EQ(uri.rfind("urn:zuv:profile:", 0), 0u);
    protocolProfile__ProfileContent *got = get();
    ASSERT_NE(got, nullptr);
    EXPECT_EQ(got->thisURI, std::vector<std::string>{uri});
    EXPECT_EQ(*got->state, protocolProfile__ProfileState::active);
    EXPECT_EQ(*got->identity->name, name);

    __protocolProfile__addResponse added{};
    protocolProfile__ProfileContent more;
    std::string authority = "authority";
    more.profileAuthority = &authority;
    more.contact.push_back(&contact);
    aim();
    ASSERT_EQ(proxy.add(&more, added), 0) << fault();
    EXPECT_EQ(added.result->contact.size(), 2u);
    EXPECT_EQ(*added.result->identity->name, name) << "what was there stays";
    EXPECT_EQ(*added.result->profileAuthority, authority);

    __protocolProfile__setResponse set{};
    protocolProfile__ProfileState state = protocolProfile__ProfileState::inactive_x002esuspended;
    protocolProfile__ProfileContent other;
    other.state = &state;
    aim();
    ASSERT_EQ(proxy.set(&other, set), 0) << fault();
    got = get();
    EXPECT_EQ(got->thisURI, std::vector<std::string>{uri}) << "the name is the service's";
    EXPECT_EQ(*got->state, state);
    EXPECT_EQ(got->contact.size(), 0u);

    __protocolProfile__removeResponse removed{};
    protocolProfile__ProfileContent by_name;
    by_name.thisURI.push_back(uri);
    proxy.soap_noheader();
    ASSERT_EQ(proxy.remove(&by_name, removed), 0) << fault();
    EXPECT_EQ(*removed.result->state, protocolProfile__ProfileState::closed);
    __protocolProfile__getResponse gone{};
    aim();
    EXPECT_EQ(proxy.get(&get_request, gone), SOAP_CLIENT_FAULT);
}

TEST_F(ProfilePort, RefreshesTheCredentialsOfTheSameHolderAndTakesNewOnes)
{
    create();
    for (const std::size_t expected : {std::size_t{1}, std::size_t{2}}) {
        _protocolProfile__refreshCredentialsRequest request;
        request.credentials = &credentials;
        __protocolProfile__refreshCredentialsResponse refreshed{};
        aim();
        ASSERT_EQ(proxy.refreshCredentials(&request, refreshed), 0) << fault();
        ASSERT_EQ(refreshed.result->credentials.size(), expected);
        const protocol__Credentials &last = *refreshed.result->credentials.back();
        EXPECT_EQ(*last.state, protocol__CredentialsState::valid);
        EXPECT_FALSE(last.token->empty());
        std::time_t end = 0;
        ASSERT_EQ(soap_datetime_parse(&proxy, last.expiration->c_str(), &end), 0);
        EXPECT_NEAR(static_cast<double>(end), static_cast<double>(std::time(nullptr)) + 365 * 86400, 600);
        user = "someone else";
    }
}

TEST_F(ProfilePort, TellsOfDocumentsThatAreNotThere)
{
    target = "urn:nobody";
    __protocolProfile__getResponse got{};
    aim();
    ASSERT_EQ(proxy.get(&get_request, got), SOAP_CLIENT_FAULT);
    const auto *const missing = detail().Client_x002eObjectNotFound;
    ASSERT_NE(missing, nullptr);
    EXPECT_EQ(missing->uri, std::vector<std::string>{target});
    EXPECT_EQ(*missing->subcode, "Client.ObjectNotFound");
    EXPECT_NE(missing->description->find(target), std::string::npos);

    proxy.soap_noheader();
    ASSERT_EQ(proxy.get(&get_request, got), SOAP_CLIENT_FAULT);
    EXPECT_NE(detail().Client_x002eInsufficientInformation, nullptr);
    __protocolProfile__refreshCredentialsResponse refreshed{};
    _protocolProfile__refreshCredentialsRequest nothing;
    aim();
    ASSERT_EQ(proxy.refreshCredentials(&nothing, refreshed), SOAP_CLIENT_FAULT);
    EXPECT_NE(detail().Client_x002eInsufficientInformation, nullptr);
}

TEST_F(ProfilePort, FindsACompoundTarget)
{
    create();
    protocol__CompoundTargetURI compound;
    compound.uri = &target;
    header.targetURI = nullptr;
    header.compoundTargetURI = &compound;
    __protocolProfile__getResponse got{};
    proxy.soap_header(&header);
    ASSERT_EQ(proxy.get(&get_request, got), 0) << fault();
    EXPECT_EQ(got.result->thisURI.at(0), target);
}

TEST_F(ProfilePort, RefusesExpiredCredentials)
{
    create();
    protocol__CredentialsState expired = protocol__CredentialsState::expired;
    std::string past = "2001-02-03T04:05:06Z", future = "2999-01-01T00:00:00Z";
    protocol__Credentials by_state, by_time, good;
    by_state.state = &expired;
    by_time.expiration = &past;
    good.expiration = &future;
    for (protocol__Credentials *given : {&by_state, &by_time}) {
        header.credentials = {&good, given};
        __protocolProfile__getResponse got{};
        aim();
        ASSERT_EQ(proxy.get(&get_request, got), SOAP_CLIENT_FAULT);
        const auto *const refused = detail().Client_x002eAuthentication_x002eCredentialsExpired;
        ASSERT_NE(refused, nullptr);
        EXPECT_EQ(refused->credentials.size(), 1u);
    }
    header.credentials = {&good};
    EXPECT_NE(get(), nullptr);
}

TEST_F(ProfilePort, EchoesWhatNamesTheExchange)
{
    std::string transaction = "t-1", correlation = "c-2", note = "not echoed";
    header.transactionId = &transaction;
    header.correlationId = &correlation;
    header.note.push_back(note);
    proxy.soap_header(&header);
    __protocolProfile__createResponse created{};
    ASSERT_EQ(proxy.create(&profile, created), 0) << fault();
    const SOAP_ENV__Header *const received = proxy.soap_header();
    ASSERT_NE(received, nullptr);
    EXPECT_EQ(*received->header->transactionId, transaction);
    EXPECT_EQ(*received->header->correlationId, correlation);
    EXPECT_TRUE(received->header->note.empty());
    proxy.soap_noheader();
    ASSERT_EQ(proxy.create(&profile, created), 0) << fault();
    EXPECT_EQ(proxy.soap_header(), nullptr);
}

TEST_F(ProfilePort, SpeaksTheVersionOfTheRequest)
{
    static const soap_namespace *const program = soap_program_namespaces;
    std::vector<soap_namespace> table;
    for (const soap_namespace *row = program; row->prefix != nullptr; ++row)
        table.push_back(*row);
    table[0] = {"SOAP-ENV", "http://www.w3.org/2003/05/soap-envelope", nullptr, nullptr};
    table[1] = {"SOAP-ENC", "http://www.w3.org/2003/05/soap-encoding", nullptr, nullptr};
    table.push_back({nullptr, nullptr, nullptr, nullptr});
    ASSERT_EQ(soap_set_namespaces(&proxy, table.data()), 0);
    create();
    EXPECT_EQ(proxy.soap_version, 2);
    EXPECT_EQ(*get()->identity->name, name);
    target = "urn:nobody";
    __protocolProfile__getResponse got{};
    aim();
    ASSERT_EQ(proxy.get(&get_request, got), SOAP_CLIENT_FAULT);
    EXPECT_STREQ(proxy.soap_fault()->Code->Value, "SOAP-ENV:Sender");
    EXPECT_EQ(proxy.status, 400);
    ASSERT_NE(proxy.soap_fault()->Detail, nullptr);
    EXPECT_NE(proxy.soap_fault()->Detail->Client_x002eObjectNotFound, nullptr);
    soap_set_namespaces(&proxy, program);
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
        proxy.output_mode = MODE_KEEP_ALIVE | MODE_UTF_STRINGS | mode;
        __protocolProfile__createResponse created{};
        ASSERT_EQ(proxy.create(&nest.front(), created), 0) << fault();
        std::size_t depth = 1;
        for (const auto *p = created.result; !p->profile.empty(); p = p->profile.front(), ++depth)
            ASSERT_EQ(*p->profileAuthority, text);
        EXPECT_EQ(depth, nest.size());
    }
}

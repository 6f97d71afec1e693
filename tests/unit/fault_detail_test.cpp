// fault_detail_test.cpp - each fault that a detail may bring, as a service writes it and a client reads it:
// whole, met twice, cut short, and written with each send and each allocation refused. Elsewhere: read with each
// allocation refused (call_allocation_test.cpp).
#include <regex>

#include <zuv_client_pro/ProfileSoapBindingProxy.h>
#include <zuv_client_pro/protocol.h>

#include "support/memory_wire.h"
#include "support/testing.h"

namespace {

SOAP_ENV__Detail *detail_of(const soap &ctx)
{
    return ctx.soap_version == 1 ? ctx.fault->detail : ctx.fault->Detail;
}

// A context in which a message has begun.
struct sender : memory_wire {
    explicit sender(std::int16_t version, std::uint32_t mode_of_xml = 0)
    {
        soap_set_namespaces(this, namespaces_of(version));
        soap_version = version;
        mode = mode_of_xml;
        *soap_fault_code_field(this) = version == 1 ? "SOAP-ENV:Client" : "SOAP-ENV:Sender";
        *soap_fault_string_field(this) = "so";
        *soap_fault_detail_field(this) = nullptr;
    }
    int put(bool marked)
    {
        if (marked)
            soap_mark_fault(this);
        return soap_fault_put(this);
    }
};

int read_fault(memory_wire &ctx, std::int16_t version, const std::string &xml)
{
    soap_set_namespaces(&ctx, namespaces_of(version));
    soap_reset_call(&ctx);
    ctx.receive(xml);
    soap_receive_begin(&ctx);
    ctx.soap_version = version;
    return soap_fault_read(&ctx);
}

std::vector<const protocol__Fault *> faults_in(const SOAP_ENV__Detail &detail)
{
    std::vector<const protocol__Fault *> found;
#define FOUND(name)                                                                                          \
    if (detail.name)                                                                                         \
        found.push_back(detail.name);
    SOAP_DETAIL_FAULTS(FOUND)
#undef FOUND
    return found;
}

// What was sent, again: with each send and each allocation refused, and cut after each tag.
template <class Fill> void fails_wherever_it_ends(const sender &whole, std::int16_t version, Fill fill)
{
    for (std::size_t sends = 0; sends < whole.sends.size(); ++sends) {
        sender failing(version);
        fill(failing);
        failing.send_limit = sends;
        EXPECT_NE(failing.put(false), 0) << "after " << sends << " pieces";
    }
    const std::string xml = whole.sent();
    std::unique_ptr<sender> poor;
    int result = 0;
    const auto check = [&](bool refused) { // what only saves time can do without memory
        if (poor != nullptr) {
            EXPECT_TRUE(result == 0 ? std::string(poor->buffer, poor->buffer_index) == xml
                                    : refused && result == SOAP_OUT_OF_MEMORY);
        }
        poor = std::make_unique<sender>(version, MODE_BUFFERED);
        fill(*poor);
    };
    check(false);
    failing_malloc::at_each_allocation(
        failing_malloc::refuse::one, [&] { result = poor->put(false); }, check);
    memory_wire in;
    for (std::size_t cut = xml.find('>'); cut + 1 < xml.size(); cut = xml.find('>', cut + 1))
        EXPECT_TRUE(read_fault(in, version, xml.substr(0, cut)) != 0 || in.fault == nullptr)
            << xml.substr(0, cut);
}

template <class F>
void goes_both_ways(const char *spelled, F *SOAP_ENV__Detail::*member, std::int16_t version)
{
    F fault;
    std::string why = "why";
    fault.description = &why;
    sender out(version);
    detail_of(out)->*member = &fault;
    ASSERT_EQ(out.put(true), 0);
    const std::string xml = out.sent();
    const std::string name = "protocol:" + std::regex_replace(spelled, std::regex("_x002e"), ".");
    EXPECT_THAT(xml, HasSubstr("</" + name + ">"));
    memory_wire in;
    ASSERT_EQ(read_fault(in, version, xml), 0) << xml;
    const F *read = detail_of(in)->*member;
    ASSERT_NE(read, nullptr) << xml;
    EXPECT_EQ(faults_in(*detail_of(in)), std::vector<const protocol__Fault *>{read});
    EXPECT_EQ(soap_type_name(read->soap_type()), name);
    EXPECT_EQ(*read->description, why);
    EXPECT_TRUE(!detail_of(in)->__any && !detail_of(in)->fault);

    fails_wherever_it_ends(out, version, [&](sender &again) { detail_of(again)->*member = &fault; });
}

TEST(fault_detail, brings_every_fault_in_both_versions)
{
    int faults = 0;
    for (const std::int16_t version : {std::int16_t{1}, std::int16_t{2}}) {
#define BOTH_WAYS(name)                                                                                      \
    {                                                                                                        \
        SCOPED_TRACE(#name);                                                                                 \
        goes_both_ways(#name, &SOAP_ENV__Detail::name, version);                                             \
        ++faults;                                                                                            \
    }
        SOAP_DETAIL_FAULTS(BOTH_WAYS)
#undef BOTH_WAYS
    }
    EXPECT_EQ(faults, 2 * 29);
}

// What the detail's own members don't take: another class of the registry, and raw text; and all that the fault
// has besides.
TEST(fault_detail, brings_an_object_of_any_class_and_raw_text)
{
    protocol__Contact contact;
    std::string name = "n";
    contact.name = &name;
    const auto fill = [&](sender &out) {
        detail_of(out)->__type = contact.soap_type();
        detail_of(out)->fault = &contact;
        *soap_fault_detail_field(&out) = "<raw/>";
        *soap_fault_subcode_field(&out) = "SOAP-ENV:Client.Sub";
        out.fault->faultactor = out.fault->Node = out.fault->Role = const_cast<char *>("urn:who");
    };
    for (const std::int16_t version : {std::int16_t{1}, std::int16_t{2}}) {
        SCOPED_TRACE(version);
        sender out(version);
        fill(out);
        ASSERT_EQ(out.put(true), 0);
        memory_wire in;
        ASSERT_EQ(read_fault(in, version, out.sent()), 0) << out.sent();
        ASSERT_EQ(detail_of(in)->__type, contact.soap_type()) << out.sent();
        EXPECT_EQ(*static_cast<protocol__Contact *>(detail_of(in)->fault)->name, name);
        EXPECT_THAT(soap_fault_detail_value(&in), HasSubstr("raw"));
        EXPECT_STREQ(soap_fault_subcode_value(&in), version == 1 ? nullptr : "SOAP-ENV:Client.Sub");
        EXPECT_STREQ(in.fault->faultactor, "urn:who");
        EXPECT_STREQ(in.fault->Role, "urn:who");
        fails_wherever_it_ends(out, version, fill);
    }
}

TEST(fault_detail, refers_to_what_was_marked_twice)
{
    for (const bool marked : {false, true}) {
        protocol__Client fault;
        protocol__FaultDetail shared;
        fault.detail = &shared;
        protocol__Server other;
        other.detail = &shared;
        sender out(1, SOAP_XML_GRAPH);
        out.fault->detail->Client = &fault;
        out.fault->detail->Server = &other;
        ASSERT_EQ(out.put(marked), 0);
        EXPECT_EQ(out.sent().find("href=") != std::string::npos, marked) << out.sent();
    }
}

TEST(fault_detail, counts_once_even_if_it_is_nil)
{
    memory_wire in;
    ASSERT_EQ(read_fault(in, 1,
                         "<E:Fault xmlns:E=\"http://schemas.xmlsoap.org/soap/envelope/\" "
                         "xmlns:c=\"http://www.zuv.example/xmlns/b2b/zuv/v1.0\" "
                         "xmlns:x=\"http://www.w3.org/2001/XMLSchema-instance\"><detail x:nil=\"true\">"
                         "</detail><detail><c:Client/></detail></E:Fault>"),
              0);
    ASSERT_NE(in.fault, nullptr);
    EXPECT_EQ(in.fault->detail, nullptr);
}

} // namespace

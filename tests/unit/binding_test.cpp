// binding_test.cpp - the rules of data classes, on documents read from memory and objects written to it.
// Elsewhere: order and number of members, words and values that are refused, in every class (tests/foreign).
#include <zuv_client_pro/ProfileSoapBindingProxy.h>
#include <zuv_client_pro/protocol.h>
#include <zuv_client_pro/protocolHTTP.h>
#include <zuv_client_pro/protocolPRFilter.h>
#include <zuv_client_pro/protocolProblemReport.h>
#include <zuv_client_pro/protocolProfile.h>
#include <zuv_client_pro/protocolUpdateOrder.h>
#include <zuv_client_pro/type_ids.h>

#include "support/memory_wire.h"
#include "support/testing.h"

namespace {

// Reads a document on a context whose prefixes are the service's own; null when that failed.
template <class T> T *read_on(memory_wire &ctx, const std::string &xml, std::uint32_t mode)
{
    ctx.input_mode = mode;
    std::string declared = xml;
    const std::string name = xml.substr(1, xml.find_first_of(" />") - 1);
    std::string declarations = " xmlns:xsi=\"http://www.w3.org/2001/XMLSchema-instance\""
                               " xmlns:xsd=\"http://www.w3.org/2001/XMLSchema\""
                               " xmlns:SOAP-ENC=\"http://schemas.xmlsoap.org/soap/encoding/\""
                               " xmlns:SOAP-ENV=\"http://schemas.xmlsoap.org/soap/envelope/\"";
    for (const soap_namespace *row = ctx.namespaces; row->prefix; ++row) {
        if (std::string(row->prefix).rfind("protocol", 0) == 0)
            declarations += std::string(" xmlns:") + row->prefix + "=\"" + row->uri + "\"";
    }
    declared.insert(1 + name.size(), declarations);
    ctx.receive(declared);
    soap_reset_call(&ctx);
    soap_receive_begin(&ctx);
    ctx.soap_version = 1;
    auto *object = static_cast<T *>(soap_instantiate(&ctx, T().soap_type(), nullptr, nullptr, nullptr));
    if (!object->soap_in(&ctx, name.c_str(), nullptr))
        return nullptr;
    return soap_receive_finish(&ctx) ? nullptr : object;
}

class binding : public testing::Test {
protected:
    binding() : ctx(0, MODE_BARE_XML | MODE_BUFFERED)
    {
        soap_set_namespaces(&ctx, ProfileSoapBindingProxy().namespaces);
    }

    template <class T> T *read(const std::string &xml, std::uint32_t mode = 0)
    {
        return read_on<T>(ctx, xml, mode);
    }

    template <class T> std::string write(const T &object, const char *tag, std::uint32_t mode = 0)
    {
        ctx.output_mode = MODE_BARE_XML | MODE_BUFFERED | mode;
        ctx.sends.clear();
        ctx.encoding_style = nullptr;
        soap_reset_call(&ctx);
        object.soap_serialize(&ctx);
        soap_send_begin(&ctx);
        ctx.namespace_state = 1; // the root's declarations are not what is looked at
        EXPECT_EQ(0, object.soap_put(&ctx, tag, ""));
        soap_send_finish(&ctx);
        return ctx.sent();
    }

    memory_wire ctx;
};

TEST_F(binding, refuses_what_must_be_understood_and_is_unknown)
{
    EXPECT_EQ(nullptr, read<protocol__Contact>("<c><x SOAP-ENV:mustUnderstand=\"1\"/></c>"));
    EXPECT_EQ(SOAP_MUST_UNDERSTAND, ctx.error);
}

TEST_F(binding, xsi_type_makes_the_derived_class_and_an_unknown_one_the_base)
{
    const auto *query = read<protocolUpdateOrder__UpdateIdExpansionDetail>(
        "<d><protocolUpdateOrder:metaData "
        "xsi:type=\"protocolUpdateOrder:UpdateMetaData\"><protocolUpdateOrder:updateId>U1"
        "</protocolUpdateOrder:updateId></protocolUpdateOrder:metaData>"
        "<protocolUpdateOrder:metaData xsi:type=\"protocol:Unheard\"><protocolUpdateOrder:updateId>U2"
        "</protocolUpdateOrder:updateId></protocolUpdateOrder:metaData>"
        "<protocolUpdateOrder:metaData xsi:type=\"protocol:Contact\"/></d>");
    ASSERT_NE(nullptr, query) << ctx.error;
    ASSERT_EQ(3u, query->metaData.size());
    ASSERT_EQ(SOAP_TYPE_protocolUpdateOrder__UpdateMetaData, query->metaData[0]->soap_type());
    EXPECT_EQ("U1", *static_cast<protocolUpdateOrder__UpdateMetaData *>(query->metaData[0])->updateId);
    EXPECT_EQ(SOAP_TYPE_protocol__MetaData, query->metaData[1]->soap_type());
    EXPECT_EQ(SOAP_TYPE_protocol__MetaData, query->metaData[2]->soap_type()) << "a class outside the family";
    // Among white space, and by prefixes that no string of Latin-1 may hold.
    const std::tuple<const char *, const char *, std::uint32_t> prefixes[] = {
        {"p", "p", 0},
        {"\xC3\xA9", "\xC3\xA9", 0},
        {"\xC3\xA9", "&#xE9;", 0},
        {"\xE9", "\xE9", MODE_LATIN1},
        {"\xE9", "&#233;", MODE_LATIN1},
        {"\xD1\x82\xD0\xB8\xD0\xBF", "\xD1\x82\xD0\xB8\xD0\xBF", 0}};
    for (const auto &[declared, used, mode] : prefixes)
        for (const std::uint32_t strings : {0U, MODE_UTF_STRINGS}) {
            const auto *derived = read<protocolUpdateOrder__UpdateIdExpansionDetail>(
                std::string("<d><protocolUpdateOrder:metaData type='&#xE9;' xsi:type=' \n") + used +
                    ":UpdateMetaData\t' xmlns:" + declared +
                    "='http://www.zuv.example/xmlns/b2b/zuv/v1.0/UpdateOrder'/></d>",
                mode | strings);
            ASSERT_NE(nullptr, derived) << ctx.error << declared;
            EXPECT_EQ(SOAP_TYPE_protocolUpdateOrder__UpdateMetaData, derived->metaData[0]->soap_type())
                << declared << " in mode " << (mode | strings);
        }
    const std::string undeclared = "<d><protocolUpdateOrder:metaData xsi:type=\"undeclared:MetaData\"/></d>";
    EXPECT_NE(nullptr, read<protocolUpdateOrder__UpdateIdExpansionDetail>(undeclared));
    EXPECT_EQ(nullptr, read<protocolUpdateOrder__UpdateIdExpansionDetail>(undeclared, MODE_STRICT));
    EXPECT_EQ(SOAP_TYPE_MISMATCH, ctx.error);
}

TEST_F(binding, a_code_without_a_word_goes_out_as_its_number)
{
    protocol__DeliverySupported supported;
    protocol__Medium medium = static_cast<protocol__Medium>(99);
    supported.medium = &medium;
    EXPECT_EQ("<d><protocol:medium>99</protocol:medium></d>", write(supported, "d"));
}

TEST_F(binding, codes_are_numbers_of_32_bits_and_in_strict_mode_those_of_words)
{
    const std::tuple<std::string, int, int> cases[] = {
        // text, error of lenient and of strict reading
        {"0", 0, 0},          {"5", 0, 0},           {"6", 0, 4},
        {"-1", 0, 4},         {"2147483647", 0, 4},  {"2147483648", 4, 4},
        {"4294967296", 4, 4}, {"-4294967295", 4, 4}, {"99999999999999999999", 4, 4}};
    for (const auto &[text, lenient, strict] : cases)
        for (const std::uint32_t mode : {0U, MODE_STRICT}) {
            read<protocol__Contact>(
                "<c><protocol:contactPreference>" + text + "</protocol:contactPreference></c>", mode);
            EXPECT_EQ(mode == 0 ? lenient : strict, ctx.error) << text;
        }
}

TEST_F(binding, a_type_of_the_schema_or_the_encoding_says_nothing_of_a_simple_value_outside_strict_mode)
{
    const auto error_of = [this]<class T>(const T &, const std::string &member, const std::string &type,
                                          std::uint32_t mode, const char *text = "1") {
        read<T>("<c><protocol:" + member + " xsi:type=\"" + type + "\">" + text + "</protocol:" + member +
                    "></c>",
                mode);
        return ctx.error;
    };
    const std::tuple<std::string, int, int> types[] = {
        // type, error of lenient and of strict reading
        {"xsd:string", 0, 4},  {" xsd:string\n", 0, 4},    {"SOAP-ENC:string", 0, 4},  {"xsd:int", 0, 4},
        {"xsd:anyType", 0, 4}, {"protocol:Address", 4, 4}, {"undeclared:string", 4, 4}};
    for (const auto &[type, lenient, strict] : types)
        for (const std::uint32_t mode : {0U, MODE_STRICT}) {
            SCOPED_TRACE(type + " in mode " + std::to_string(mode));
            const int expected = mode == 0 ? lenient : strict;
            EXPECT_EQ(expected, error_of(protocol__Contact(), "contactPreference", type, mode)) << "a code";
            EXPECT_EQ(expected, error_of(protocol__ExtendedAttributes(), "containsData", type, mode))
                << "a boolean";
            EXPECT_EQ(type == "xsd:int" ? 0 : expected,
                      error_of(protocol__AttachStatusRequest(), "percentComplete", type, mode))
                << "a number";
        }
    const protocol__Contact contact;
    EXPECT_EQ(0, error_of(contact, "contactPreference", " protocol:ContactPreference ", MODE_STRICT, "fax"));
    EXPECT_EQ(0, error_of(contact, "contactPreference", "string\" xmlns=\"http://www.w3.org/2001/XMLSchema",
                          0, "<!-- by the default namespace -->fax"));
    EXPECT_EQ(SOAP_TYPE_MISMATCH, error_of(contact, "contactPreference", "xsd:string", 0, "telegraph"))
        << "the text decides";
}

TEST_F(binding, required_members_are_nil_when_null_and_attributes_come_first)
{
    protocolPRFilter__Not negation;
    EXPECT_EQ("<f xsi:type=\"protocolPRFilter:Not\"><protocolPRFilter:operand xsi:nil=\"true\"/></f>",
              write(negation, "f"));
    protocol__Server_x002eRedirection redirection;
    EXPECT_EQ("<f xsi:type=\"protocol:Server.Redirection\"><protocol:uri></protocol:uri>"
              "<protocol:term>permanent</protocol:term></f>",
              write(redirection, "f"));
    std::string product = "P";
    protocolPRFilter__ProductComparison comparison;
    comparison.compareOp = protocolPRFilter__StringCompareOp::containsPhrase;
    comparison.product = &product;
    EXPECT_EQ("<f xsi:type=\"protocolPRFilter:ProductComparison\" compareOp=\"containsPhrase\">"
              "<protocolPRFilter:product>P</protocolPRFilter:product></f>",
              write(comparison, "f"));
    EXPECT_EQ("<protocolPRFilter:caseSensitive compareOp=\"containsPhrase\"/><protocolPRFilter:text "
              "xsi:nil=\"true\"/>",
              write(protocolPRFilter__ReportTextComparison(), "-f"))
        << "without an element of its own";
    EXPECT_EQ(nullptr, read<protocol__Data>("<d/>")->encoding);
}

TEST_F(binding, nil_is_a_null_pointer_and_nil_mode_writes_it_back)
{
    const auto *contact = read<protocol__Contact>(
        "<c><protocol:name xsi:nil=\"true\"/><protocol:nameDetails xsi:nil=\"1\"/></c>");
    ASSERT_NE(nullptr, contact);
    EXPECT_TRUE(contact->name == nullptr && contact->nameDetails == nullptr);
    EXPECT_EQ("<c></c>", write(*contact, "c"));
    // Where there is no pointer to be null, nil leaves a vector without the item and a member as it was.
    const std::string codes = "<c><protocol:contactPreference xsi:nil=\"1\"/><protocol:contactPreference>fax"
                              "</protocol:contactPreference><protocol:contactPreference xsi:nil=\"1\">"
                              "</protocol:contactPreference></c>";
    const auto *preferences = read<protocol__Contact>(codes);
    ASSERT_NE(nullptr, preferences);
    EXPECT_EQ(std::vector{protocol__ContactPreference::fax}, preferences->contactPreference);
    const std::string
        order = "<o><protocolUpdateOrder:includeData xsi:nil=\"true\"/></o>",
        term = "<r><protocol:uri>u</protocol:uri><protocol:term xsi:nil=\"true\"></protocol:term></r>";
    const auto *content = read<protocolUpdateOrder__UpdateOrderContent>(order);
    ASSERT_NE(nullptr, content);
    EXPECT_TRUE(content->includeData);
    EXPECT_NE(nullptr, read<protocol__Server_x002eRedirection>(term));
    EXPECT_EQ(nullptr, read<protocol__Contact>(codes, MODE_STRICT));
    EXPECT_EQ(SOAP_NIL, ctx.error);
    EXPECT_EQ(nullptr, read<protocolUpdateOrder__UpdateOrderContent>(order, MODE_STRICT));
    EXPECT_EQ(nullptr, read<protocol__Server_x002eRedirection>(term, MODE_STRICT));
    const std::string nil = write(protocol__Function(), "c", MODE_NIL);
    EXPECT_EQ("<c><protocol:function xsi:nil=\"true\"/><protocol:functionName xsi:nil=\"true\"/>"
              "<protocol:description xsi:nil=\"true\"/></c>",
              nil);
}

TEST_F(binding, empty_values_are_there_and_absent_ones_are_not)
{
    for (const char *form : {"<protocol:certificate/>", "<protocol:certificate></protocol:certificate>",
                             "<protocol:certificate> </protocol:certificate>"}) {
        const auto *read_back =
            read<protocol__Credentials>(std::string("<c>") + form + "<protocol:token/></c>");
        ASSERT_NE(nullptr, read_back) << form;
        ASSERT_TRUE(read_back->certificate && read_back->certificate->content) << form;
        EXPECT_EQ(0, read_back->certificate->size);
        EXPECT_EQ("<c><protocol:certificate></protocol:certificate><protocol:token></protocol:token></c>",
                  write(*read_back, "c"));
    }
    protocol__Data data;
    EXPECT_EQ("<d></d>", write(data, "d"));
    EXPECT_EQ("", write(data, "d", MODE_NULL_STRINGS));
    EXPECT_EQ("<d xsi:nil=\"true\"/>", write(data, "d", MODE_NULL_STRINGS | MODE_NIL));
    protocol__Encoding encoding = protocol__Encoding::base64;
    data.encoding = &encoding;
    EXPECT_EQ("<d encoding=\"base64\"/>", write(data, "d", MODE_NULL_STRINGS));
    data.value = "x";
    EXPECT_EQ("<d encoding=\"base64\">x</d>", write(data, "d", MODE_NULL_STRINGS));
    const auto *nil =
        read<protocol__Attachment>("<a><protocol:language xsi:nil=\"1\"/><protocol:language/></a>");
    ASSERT_TRUE(nil && nil->language.size() == 2);
    EXPECT_EQ("<a><protocol:language></protocol:language></a>", write(*nil, "a"));
    EXPECT_EQ("<a></a>", write(*nil, "a", MODE_NULL_STRINGS));
}

TEST_F(binding, references_reach_texts_by_value_and_their_errors_have_codes)
{
    for (const char *xml :
         {"<f><protocol:uri href=\"#s\"/><protocol:subcode id=\"s\">urn:x</protocol:subcode></f>",
          "<f><protocol:subcode href=\"#s\"/><protocol:uri id=\"s\">urn:x</protocol:uri></f>"}) {
        const auto *redirection = read<protocol__Server_x002eRedirection>(xml);
        ASSERT_NE(nullptr, redirection) << ctx.error << " " << xml;
        EXPECT_EQ("urn:x", redirection->uri) << "a text by value";
        EXPECT_EQ("urn:x", *redirection->subcode) << xml;
    }
    static const std::pair<std::string, int> contents[] = {
        {"<protocol:contact id=\"c\"/><protocol:contact href=\"#c\"/>", 0},
        {"<protocol:contact href=\"#none\"/>", SOAP_MISSING_ID},
        {"<protocol:contact id=\"c\"/><protocol:contact id=\"c\"/>", SOAP_DUPLICATE_ID},
        {"<protocol:contact id=\"c\"/><protocol:identity href=\"#c\"/>", SOAP_ID_CONFLICT}};
    for (const auto &[content, error] : contents) {
        read<protocolProfile__ProfileContent>("<p>" + content + "</p>");
        EXPECT_EQ(error, ctx.error) << content;
    }
}

// Values that several members share, whichever of them has it and whichever comes first.
TEST_F(binding, references_reach_switches_words_and_lists_of_words)
{
    const auto both_ways = [](const std::string &one, const std::string &other, const std::string &value) {
        return std::vector<std::string>{
            "<u><" + one + " id=\"v\">" + value + "</" + one + "><" + other + " href=\"#v\"/></u>",
            "<u><" + one + " href=\"#v\"/><" + other + " id=\"v\">" + value + "</" + other + "></u>"};
    };
    const std::string order = "protocolUpdateOrder:", word = "protocol:contactPreference";
    for (const std::string &xml : both_ways(order + "includeData", order + "includeMetaData", "false")) {
        const auto *content = read<protocolUpdateOrder__UpdateOrderContent>(xml);
        ASSERT_NE(nullptr, content) << ctx.error << xml;
        EXPECT_TRUE(!content->includeData && !content->includeMetaData) << xml;
    }
    for (const std::string &xml : both_ways(order + "includePatches", order + "notifyWhenComplete", "true")) {
        const auto *content = read<protocolUpdateOrder__UpdateOrderContent>(xml);
        ASSERT_NE(nullptr, content) << ctx.error << xml;
        EXPECT_TRUE(content->includePatches && *content->includePatches && content->notifyWhenComplete &&
                    *content->notifyWhenComplete)
            << xml;
    }
    for (const std::string &xml : both_ways(word, word, "fax")) {
        const auto *contact = read<protocol__Contact>(xml);
        ASSERT_NE(nullptr, contact) << ctx.error << xml;
        EXPECT_EQ((std::vector{protocol__ContactPreference::fax, protocol__ContactPreference::fax}),
                  contact->contactPreference)
            << xml;
    }
}

TEST_F(binding, references_reach_words_by_value)
{
    const auto *fault = read<protocol__Server_x002eRedirection>(
        "<f><protocol:term href=\"#t\"></protocol:term><protocol:detail><protocol:nestedFault "
        "xsi:type=\"protocol:Server.Redirection\"><protocol:term id=\"t\">exchange</protocol:term>"
        "</protocol:nestedFault></protocol:detail></f>");
    ASSERT_NE(nullptr, fault) << ctx.error;
    EXPECT_EQ(protocol__Server_x002eRedirection_term::exchange, fault->term);
}

// A message whose element is a reference to what comes after it.
TEST_F(binding, an_object_by_reference_gets_all_that_its_target_holds)
{
    const auto read_whole = [this]<class T>(T &object, const std::string &content) {
        const std::string type = soap_type_name(object.soap_type());
        const std::string uri = "http://www.zuv.example/xmlns/b2b/zuv/v1.0";
        soap_reset_call(&ctx);
        ctx.receive("<c href=\"#o\"></c><o id=\"o\" xmlns:protocol=\"" + uri +
                    "\" xmlns:xsi=\"http://www.w3.org/2001/XMLSchema-instance\" xsi:type=\"" + type +
                    content);
        soap_receive_begin(&ctx);
        ctx.soap_version = 1;
        return object.soap_get(&ctx, "c", nullptr) != nullptr && soap_forward_resolve(&ctx) == 0;
    };
    protocol__Data data;
    EXPECT_TRUE(read_whole(data, "\" encoding=\"base64\">text</o>")) << ctx.error;
    EXPECT_EQ("text", data.value);
    ASSERT_NE(nullptr, data.encoding);
    protocol__Server_x002eRedirection fault;
    EXPECT_TRUE(read_whole(
        fault, "\"><protocol:description>d</protocol:description><protocol:uri>u</protocol:uri></o>"))
        << ctx.error;
    EXPECT_EQ("u d", fault.uri + " " + *fault.description);
    protocol__Contact contact;
    EXPECT_TRUE(read_whole(contact, "\"><protocol:contactPreference>fax</protocol:contactPreference></o>"))
        << ctx.error;
    EXPECT_EQ(1U, contact.contactPreference.size());
    xsd__base64Binary bytes;
    ctx.receive("<c>YQ==</c>");
    soap_reset_call(&ctx);
    EXPECT_NE(nullptr, bytes.soap_get(&ctx, "c", nullptr)) << ctx.error;
    EXPECT_EQ("<c>YQ==</c>", write(bytes, "c"));
}

TEST_F(binding, strict_reading_takes_no_object_with_wanted_members_by_reference)
{
    const auto code_of = [this]<class T>(const T &) {
        EXPECT_EQ(nullptr, read<T>("<f href=\"#f\"/>", MODE_STRICT));
        return ctx.error;
    };
    EXPECT_EQ(SOAP_OCCURS, code_of(protocolPRFilter__And())) << "a vector with a minimum";
    EXPECT_EQ(SOAP_OCCURS, code_of(protocolPRFilter__Not())) << "a required member";
    EXPECT_EQ(SOAP_MISSING_ID, code_of(protocol__Contact())) << "neither";
}

TEST_F(binding, the_registry_makes_finds_and_destroys_by_id)
{
    auto *identity = static_cast<protocol__Identity *>(
        soap_instantiate_array(&ctx, SOAP_TYPE_protocol__Identity, 3, nullptr, nullptr, nullptr));
    ASSERT_NE(nullptr, identity);
    EXPECT_EQ(&ctx, identity[2].soap);
    EXPECT_EQ(0, soap_write_element(&ctx, identity, "x", 0, 0));
    EXPECT_EQ(0, soap_write_element(&ctx, identity, "x", 0, 878));
    soap_discard_objects(&ctx, identity);
    EXPECT_EQ(nullptr, ctx.instance_list);
    EXPECT_EQ(nullptr, soap_instantiate(&ctx, 893, nullptr, nullptr, nullptr));
    for (const int id : {7, 893}) {
        soap_instance strange{};
        strange.array_size = -1;
        strange.type_id = id;
        EXPECT_EQ(-1, soap_delete_object(&strange));
    }
    EXPECT_EQ(SOAP_TYPE_protocol__Address, soap_type_by_name("protocol:Address"));
    EXPECT_EQ(0, soap_type_by_name("protocol:address"));
}

// What a reader that begins anew with each text gives: the error and where the reading ended, or the profile.
std::string outcome_of(memory_wire &ctx, const std::string &content, std::uint32_t mode)
{
    // The blanks keep bytes in the buffer after each tag.
    const auto *profile =
        read_on<protocolProfile__ProfileContent>(ctx, "<c>" + content + std::string(80, ' ') + "</c>", mode);
    const std::size_t held = ctx.look_ahead == XML_END ? 2 : ctx.look_ahead != 0 ? 1 : 0; // bytes pushed back
    std::ostringstream seen;
    seen << ctx.error << ' ' << ctx.tag << ' ' << ctx.nesting_level << ' ' << ctx.peeked << ' '
         << ctx.given - (ctx.buffer_length - ctx.buffer_index) - held << ' ';
    if (profile != nullptr) {
        ctx.sends.clear();
        soap_reset_call(&ctx);
        ctx.output_mode = MODE_BARE_XML | MODE_BUFFERED;
        soap_send_begin(&ctx);
        profile->soap_put(&ctx, "c", "");
        soap_send_finish(&ctx);
        seen << ctx.sent();
    }
    soap_discard_objects(&ctx, nullptr);
    soap_discard_all(&ctx);
    return seen.str();
}

// Whole tags in the buffer are read by short ways, with what earlier messages have taught of their order.
TEST_F(binding, short_ways_and_what_earlier_messages_taught_change_nothing)
{
    std::string uri;
    for (const soap_namespace *row = ctx.namespaces; row->prefix; ++row) {
        if (std::string(row->prefix) == "protocol")
            uri = row->uri;
    }
    const std::string state = "<protocolProfile:state>active</protocolProfile:state>";
    const auto contact = [](const std::string &members) {
        return "<protocol:contact>" + members + "</protocol:contact>";
    };
    const std::string name = "<protocol:name>A</protocol:name>", mail = "<protocol:email>B</protocol:email>";
    const auto in_prefix = [&](const std::string &attribute, const std::string &prefix) {
        return "<protocol:contact " + attribute + ">" + "<" + prefix + "name>A</" + prefix + "name><" +
               prefix + "email>B</" + prefix + "email></protocol:contact>" + contact(name + mail);
    };
    const std::string contents[] = {
        state + contact(name + mail) + contact(name),
        contact(mail + name + mail) + state,
        "\n " + contact("\n <protocol:name> A </protocol:name>\n\t" + mail + " <!-- c --> ") + state,
        state + state + contact(name + name),
        contact("<protocol:unknown><protocol:name>C</protocol:name></protocol:unknown>" + name),
        contact("<protocolProfile:name>C</protocolProfile:name>" + mail),
        in_prefix("xmlns:p='" + uri + "'", "p:"),
        in_prefix("xmlns:protocol='urn:other'", "protocol:"),
        in_prefix("xmlns='" + uri + "'", ""),
        in_prefix("xmlns='urn:other'", ""),
        in_prefix("xmlns:q='urn:other' xmlns:\xC3\xA9='" + uri + "'", "\xC3\xA9:"),
        // "u" and "protocol" have one place in the memory of prefixes
        "<protocol:contact xmlns:u='urn:other'><u:x/>" + name + "</protocol:contact>",
        in_prefix("", "undeclared:"),
        contact("<protocol:name xsi:nil='true'/><protocol:email a='b'>B</protocol:email>" + name),
        contact("<protocol:name>A &amp;&lt;&#65;<![CDATA[&]]>\xC3\xA9</protocol:name>" + mail),
        contact("<protocol:name>A</protocol:name ><protocol:email/>" + mail),
        "<protocolProfile:state> active </protocolProfile:state>",
        "<protocolProfile:state>1</protocolProfile:state>" + contact(mail),
        "<protocolProfile:state>unheard</protocolProfile:state>" + contact(mail),
        "<protocolProfile:state>active&amp;</protocolProfile:state>",
        contact("<protocol:name>A</protocol:nam>" + mail),
        contact("<protocol:name>A<protocol:email>B</protocol:email></protocol:name>"),
        contact(name + "</protocol:\xFF>") + state,
        "<protocol:contact>" + name,
    };
    for (const std::uint32_t mode : {0U, MODE_UTF_STRINGS, MODE_LATIN1, MODE_STRICT | MODE_UTF_STRINGS}) {
        for (const std::string &content : contents) {
            memory_wire slow;
            soap_set_namespaces(&slow, ctx.namespaces);
            slow.piece = [](std::size_t) { return 1; };
            const std::string expected = outcome_of(slow, content, mode);
            for (const std::string &lesson : contents) {
                memory_wire taught;
                soap_set_namespaces(&taught, ctx.namespaces);
                for (int times = 0; times < 3; ++times)
                    outcome_of(taught, lesson, mode & MODE_STRICT ? MODE_UTF_STRINGS : mode);
                EXPECT_EQ(outcome_of(taught, content, mode), expected) << content << "\nafter " << lesson;
            }
        }
    }
}

} // namespace

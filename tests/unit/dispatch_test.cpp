// dispatch_test.cpp - what is done by type id alone, over every id there is. Elsewhere: objects that are
// shared (tests/classes/graph_test.cpp).
#include <stdexcept>

#include <zuv_client_pro/ProfileSoapBindingProxy.h>
#include <zuv_client_pro/protocolProfile.h>
#include <zuv_client_pro/type_ids.h>

#include "binding/registry.h"
#include "support/memory_wire.h"
#include "support/testing.h"

using namespace binding;

namespace {

class dispatch : public testing::Test {
protected:
    dispatch() { soap_set_namespaces(&ctx, ProfileSoapBindingProxy().namespaces); }

    static void *given(void *made)
    {
        if (made == nullptr)
            throw std::runtime_error("nothing was made");
        return made;
    }

    // A new object with one thing in it where the kind holds things: an item, a target, a text.
    void *filled(int type)
    {
        const type_entry &entry = type_entries[type];
        void *object = given(soap_instantiate(&ctx, type, nullptr, nullptr, nullptr));
        switch (entry.kind) {
        case type_kind::chars:
            return given(soap_string_dup(&ctx, "xsd:chars")); // text, and a qualified name
        case type_kind::text:
            *static_cast<std::string *>(object) = "text";
            break;
        case type_kind::text_vector:
        case type_kind::code_vector:
        case type_kind::object_vector:
            EXPECT_TRUE(entry.vector->append(object, filled(entry.item)));
            break;
        case type_kind::request:
        case type_kind::response:
        case type_kind::pointer:
            *static_cast<void **>(object) = filled(entry.item);
            break;
        case type_kind::object:
            if (type == SOAP_TYPE_xsd__base64Binary) { // one without content isn't written
                auto *const bytes = static_cast<xsd__base64Binary *>(object);
                bytes->content = static_cast<unsigned char *>(given(soap_block_alloc(&ctx, 1)));
                bytes->content[0] = 'b';
                bytes->size = 1;
            }
            break;
        default:
            break;
        }
        return object;
    }

    std::string written(void *object, int type)
    {
        ctx.sends.clear();
        ctx.output_mode = MODE_BARE_XML | MODE_BUFFERED;
        ctx.encoding_style = nullptr;
        soap_reset_call(&ctx);
        soap_mark_object(&ctx, object, type);
        soap_send_begin(&ctx);
        ctx.soap_version = 1;
        ctx.namespace_state = 1; // the first element's declarations are not what is looked at
        EXPECT_EQ(0, soap_write_element(&ctx, object, "thing", -1, type));
        soap_send_finish(&ctx);
        return ctx.sent();
    }

    // Puts the reader after the start tag of an element that declares what `content` needs, and which doesn't end
    // if the content is cut.
    void receive(const std::string &content, bool cut = false)
    {
        std::string start = "<all xmlns:SOAP-ENC=\"http://schemas.xmlsoap.org/soap/encoding/\"";
        for (const soap_namespace *row = ctx.namespaces; row->prefix; ++row)
            if (std::strncmp(row->prefix, "SOAP-ENC", 8) != 0)
                start += std::string(" xmlns:") + row->prefix + "=\"" + row->uri + "\"";
        ctx.receive(start + ">" + content + (cut ? "" : "</all>"));
        soap_reset_call(&ctx);
        ctx.input_mode = MODE_BARE_XML;
        soap_receive_begin(&ctx);
        ctx.soap_version = 1;
        ASSERT_EQ(0, soap_element_in_begin(&ctx, "all", 0, nullptr)) << content;
    }

    // Runs `check` for each type that dispatch knows, with what is written of a filled object of it.
    template <class Check> void for_each_type(Check check)
    {
        for (int type = 1; type <= DISPATCH_ID_MAX; ++type) {
            if (type_entries[type].kind == type_kind::none)
                continue;
            const char *name = type_entries[type].xml_name;
            SCOPED_TRACE(std::to_string(type) + " " + (name ? name : "-"));
            check(type, written(filled(type), type));
            forget();
        }
    }

    void forget()
    {
        soap_discard_objects(&ctx, nullptr);
        soap_discard_all(&ctx);
        EXPECT_EQ(nullptr, ctx.instance_list);
    }

    memory_wire ctx;
};

TEST_F(dispatch, what_is_written_by_id_is_read_by_id_and_written_alike)
{
    std::set<type_kind> kinds;
    for_each_type([&](int type, const std::string &text) {
        ASSERT_NE("", text);
        const type_entry &entry = type_entries[type];
        if (entry.kind != type_kind::request && entry.kind != type_kind::response) {
            const type_entry &shown = entry.item ? type_entries[entry.item] : entry;
            EXPECT_EQ(0u, text.find(std::string("<thing xsi:type=\"") + shown.xml_name + "\"")) << text;
        }
        receive(text);
        void *back = read_by_type(&ctx, type);
        ASSERT_NE(nullptr, back) << ctx.error << " " << text;
        EXPECT_EQ(0, soap_element_in_end(&ctx, "all"));
        EXPECT_EQ(text, written(back, type));
        kinds.insert(entry.kind);
    });
    EXPECT_EQ(kinds.size(), static_cast<std::size_t>(type_kind::pointer)) << "all but type_kind::none";
}

TEST_F(dispatch, a_single_value_is_marked_for_the_reference_to_it)
{
    for (int type = 1; type <= DISPATCH_ID_MAX; ++type) {
        const type_kind kind = type_entries[type].kind;
        if (kind == type_kind::none || kind == type_kind::envelope)
            continue;
        SCOPED_TRACE(type);
        void *const object = filled(type);
        const bool is_value = kind == type_kind::chars || kind == type_kind::text ||
                              kind == type_kind::simple || kind == type_kind::enumeration;
        ctx.mode = SOAP_XML_GRAPH;
        soap_pointer_table_reset(&ctx);
        soap_mark_object(&ctx, object, type);
        soap_mark_object(&ctx, nullptr, type);
        if (is_value || kind == type_kind::text_vector || kind == type_kind::code_vector) {
            EXPECT_EQ(soap_pointer_find(&ctx, object, type, nullptr) != 0, is_value);
        }
        forget();
    }
}

TEST_F(dispatch, a_detail_is_marked_with_what_it_holds)
{
    ctx.mode = SOAP_XML_GRAPH;
    std::string name = "n";
    protocol__Identity held;
    held.name = &name;
    SOAP_ENV__Detail detail{};
    detail.fault = &held;
    detail.__type = held.soap_type();
    soap_mark_object(&ctx, &detail, SOAP_TYPE_SOAP_ENV__Detail);
    EXPECT_NE(0, soap_pointer_find(&ctx, &name, SOAP_TYPE_xsd__string, nullptr));
}

TEST_F(dispatch, an_absent_item_writes_nothing_and_a_nil_record_is_null)
{
    std::vector<protocol__Identity *> items = {
        nullptr, soap_instantiate_protocol__Identity(&ctx, -1, nullptr, nullptr, nullptr)};
    const std::string last = "<thing xsi:type=\"protocol:Identity\"></thing>";
    EXPECT_EQ(last, written(&items, SOAP_TYPE_vector_of_protocol__Identity));
    receive("<x><SOAP-ENV:Subcode "
            "xsi:nil=\"true\"></SOAP-ENV:Subcode><SOAP-ENV:Value>SOAP-ENV:Sender</SOAP-ENV:Value></x>");
    const auto *code = static_cast<SOAP_ENV__Code *>(read_by_type(&ctx, SOAP_TYPE_SOAP_ENV__Code));
    ASSERT_NE(nullptr, code) << ctx.error;
    EXPECT_EQ(nullptr, code->Subcode);
    EXPECT_STREQ("SOAP-ENV:Sender", code->Value);
}

TEST_F(dispatch, what_finds_no_memory_or_is_cut_short_is_refused)
{
    for_each_type([&](int type, const std::string &text) {
        void *back = nullptr;
        receive(text);
        failing_malloc::at_each_allocation(
            failing_malloc::refuse::one, [&] { back = read_by_type(&ctx, type); },
            [&](bool refused) {
                EXPECT_TRUE(back != nullptr || (refused && ctx.error == SOAP_OUT_OF_MEMORY)) << ctx.error;
                forget();
                receive(text);
            });
        for (std::size_t length = 0; length < text.size(); ++length) {
            forget();
            receive(text.substr(0, length), true);
            EXPECT_EQ(nullptr, read_by_type(&ctx, type)) << text.substr(0, length);
            EXPECT_NE(0, ctx.error);
        }
        forget();
    });
}

TEST_F(dispatch, arrays_are_made_of_whatever_may_be_in_one)
{
    for (int type = 1; type <= TYPE_ID_MAX; ++type) {
        const type_entry &entry = type_entries[type];
        if (entry.kind == type_kind::none)
            continue;
        SCOPED_TRACE(type);
        std::size_t one = 0, three = 0;
        const void *const made_one = soap_instantiate(&ctx, type, nullptr, nullptr, &one);
        ASSERT_NE(nullptr, made_one);
        if (entry.kind == type_kind::simple || entry.kind == type_kind::enumeration) {
            EXPECT_EQ(std::string(static_cast<const char *>(made_one), one), std::string(one, '\0'));
        }
        EXPECT_EQ(entry.vector == nullptr,
                  soap_instantiate_array(&ctx, type, 0, nullptr, nullptr, nullptr) != nullptr);
        const bool made = soap_instantiate_array(&ctx, type, 3, nullptr, nullptr, &three) != nullptr;
        EXPECT_EQ(entry.vector == nullptr, made);
        EXPECT_GT(one, 0u);
        EXPECT_EQ(3 * one, three);
    }
    soap_discard_objects(&ctx, nullptr); // the sanitizer sees what isn't freed as it was made
    EXPECT_EQ(nullptr, ctx.instance_list);
}

TEST_F(dispatch, elements_that_were_not_asked_for_are_known_by_type_name_or_id)
{
    const std::tuple<const char *, const char *, int, int> cases[] = {
        {"xsi:type", "<x xsi:type=\"protocol:Address\"/>", SOAP_TYPE_protocol__Address, 0},
        {"the type's name as tag", "<protocol:Address/>", SOAP_TYPE_protocol__Address, 0},
        {"a simple type", "<x xsi:type=\"xsd:int\">7</x>", SOAP_TYPE_xsd__int, 0},
        {"a text as characters", "<x xsi:type=\"xsd:string\">7</x>", 4, 0},
        {"an unknown name", "<x xsi:type=\"protocol:Unheard\"/>", 0, SOAP_TAG_MISMATCH},
        {"no element", "", 0, SOAP_NO_TAG},
        {"a wrong number", "<x xsi:type=\"xsd:int\">seven</x>", SOAP_TYPE_xsd__int, SOAP_TYPE_MISMATCH},
    };
    for (const char *const name :
         {"protocol:Filter", "protocolPRFilter:Filter", "protocolUpdateOrderFilter:Filter"})
        EXPECT_EQ(text_of(soap_type_name(soap_type_by_name(name))), name);
    for (const auto &[rule, xml, expected, error] : cases) {
        SCOPED_TRACE(rule);
        receive(xml);
        int type = -1;
        EXPECT_EQ(error == 0, soap_read_element(&ctx, &type) != nullptr);
        EXPECT_EQ(expected, type);
        EXPECT_EQ(error, ctx.error);
    }
}

} // namespace

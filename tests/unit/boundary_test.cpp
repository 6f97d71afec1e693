// boundary_test.cpp - values at the bounds of their types and tables.
#include <climits>
#include <cstdint>
#include <limits>
#include <string>

#include <gtest/gtest.h>

#include <zuv_client_pro/soap_envelope.h>
#include <zuv_client_pro/soap_error.h>
#include <zuv_client_pro/soap_http.h>
#include <zuv_client_pro/soap_identity.h>
#include <zuv_client_pro/soap_memory.h>
#include <zuv_client_pro/soap_primitive.h>
#include <zuv_client_pro/soap_xml.h>

#include "support/memory_wire.h"

namespace {

// Written and read back as an element; one beyond the bounds, where a text can say it, is refused.
template <class T>
void element_holds(int (*write)(soap *, const char *, int, const T *, const char *, int),
                   T *(*read)(soap *, const char *, T *, const char *, int), const char *beyond = nullptr)
{
    using bounds = std::numeric_limits<T>;
    for (const T value : {bounds::lowest(), bounds::max(), bounds::min(), T{0}}) {
        memory_wire ctx;
        ctx.namespace_state = 1;
        ASSERT_EQ(write(&ctx, "v", -1, &value, "", 3), 0);
        memory_wire in;
        in.receive(ctx.sent());
        T got = T{1};
        ASSERT_NE(read(&in, "v", &got, nullptr, 3), nullptr) << ctx.sent();
        EXPECT_EQ(got, value) << ctx.sent();
    }
    if (beyond) {
        memory_wire in;
        in.receive(std::string("<v>") + beyond + "</v>");
        T got = T{1};
        EXPECT_EQ(read(&in, "v", &got, nullptr, 3), nullptr) << beyond;
    }
}

TEST(boundary, every_number_is_written_and_read)
{
    element_holds(soap_byte_out, soap_byte_in, "-129");
    element_holds(soap_short_out, soap_short_in, "32768");
    element_holds(soap_int_out, soap_int_in, "-2147483649");
    element_holds(soap_long_out, soap_long_in, "9223372036854775808");
    element_holds(soap_ubyte_out, soap_ubyte_in, "256");
    element_holds(soap_ushort_out, soap_ushort_in, "65536");
    element_holds(soap_uint_out, soap_uint_in, "4294967296");
    element_holds(soap_ulong_out, soap_ulong_in, "18446744073709551616");
    element_holds(soap_float_out, soap_float_in);
    element_holds(soap_double_out, soap_double_in);
}

// An array is the same by its content and sizes, wherever its holder is.
TEST(boundary, an_array_is_found_for_its_id_by_content_and_sizes)
{
    struct holder {
        const char *content;
        std::int32_t sizes[2];
    };
    memory_wire ctx;
    ctx.soap_version = 2;
    ctx.encoding_style = "";
    ctx.mode = SOAP_XML_GRAPH;
    const char *const text = "content";
    const holder first = {text, {2, 3}}, alike = {text, {2, 3}}, longer = {text, {2, 4}},
                 stranger = {text + 1, {2, 3}};
    const auto id_of = [&](const holder &h, int id) {
        return soap_array_element_id(&ctx, id, h.content, &h, 2, 10);
    };
    EXPECT_EQ(soap_array_mark_pointer(&ctx, &first, &first, 2, 10), 0);
    EXPECT_EQ(soap_array_mark_pointer(&ctx, &longer, &longer, 2, 10), 0);
    EXPECT_EQ(id_of(alike, -1), 1);
    EXPECT_EQ(id_of(longer, -1), 2);
    EXPECT_EQ(id_of(longer, 7), 7);
    EXPECT_EQ(id_of(stranger, -1), 0);
    EXPECT_EQ(id_of(first, 0), 0);
}

// Offsets of an array's elements fit an int to its last value, and no further.
TEST(boundary, the_last_offset_of_an_array_is_the_largest_int)
{
    const int one_row[] = {1}, rows[] = {0, 1 << 15};
    EXPECT_EQ(soap_array_offset_parse("[2147483647]", one_row, nullptr, 1), INT_MAX);
    EXPECT_EQ(soap_array_offset_parse("[2147483648]", one_row, nullptr, 1), -1);
    EXPECT_EQ(soap_array_offset_parse("[65535,32767]", rows, nullptr, 2), INT_MAX);
    EXPECT_EQ(soap_array_offset_parse("[65535,32768]", rows, nullptr, 2), -1);
    int numbers[SOAP_POSITIONS_MAX];
    EXPECT_EQ(soap_position_parse("[-2147483648,2147483647,2147483648]", numbers), 2);
    EXPECT_EQ(numbers[0], INT_MIN);
    EXPECT_EQ(numbers[1], INT_MAX);
}

// The rows of prefixes are kept by a few places, which prefixes of other lengths share: none at all among
// them.
TEST(boundary, a_name_without_prefix_is_never_taken_for_one_with)
{
    const soap_namespace table[] = {{"a", "urn:a", nullptr, nullptr}, {nullptr, nullptr, nullptr, nullptr}};
    for (char letter = 'b'; letter <= 'w'; ++letter) {
        const std::string prefix(1, letter);
        memory_wire ctx;
        soap_set_namespaces(&ctx, table);
        ctx.receive("<" + prefix + ":v xmlns:" + prefix + "=\"urn:a\"><v/></" + prefix + ":v>");
        ASSERT_EQ(soap_element_in_begin(&ctx, "a:v", 0, nullptr), 0) << prefix;
        EXPECT_EQ(soap_element_in_begin(&ctx, "a:v", 0, nullptr), SOAP_TAG_MISMATCH) << prefix;
        EXPECT_EQ(soap_element_in_begin(&ctx, "v", 0, nullptr), 0) << prefix;
    }
}

TEST(boundary, without_a_callback_a_head_has_no_lines)
{
    memory_wire ctx(0, MODE_BUFFERED);
    ctx.mode = MODE_BUFFERED;
    ctx.status = STATUS_POST;
    ctx.on_header_line = nullptr;
    EXPECT_EQ(http_write_request(&ctx, "http://host/path", "host", 80, "path", "urn:a", 1), 0);
    EXPECT_EQ(soap_send_flush(&ctx), 0);
    EXPECT_EQ(ctx.sent(), "");
}

TEST(boundary, the_header_callback_judges_a_header_that_was_read)
{
    static int asked;
    asked = 0;
    memory_wire ctx;
    EXPECT_STREQ(ctx.language, "en");
    ctx.on_soap_header = [](soap *) { return ++asked == 1 ? 0 : 77; };
    for (const int judged : {0, 77}) {
        soap_reset_call(&ctx);
        ctx.receive(
            "<E:Envelope "
            "xmlns:E=\"http://schemas.xmlsoap.org/soap/envelope/\"><E:Header/><E:Body/></E:Envelope>");
        EXPECT_EQ(soap_receive_begin(&ctx) || soap_envelope_in_begin(&ctx), 0);
        EXPECT_EQ(soap_header_get(&ctx), judged);
    }
    EXPECT_EQ(asked, 2);
}

} // namespace

// boundary_test.cpp - values at the bounds of their types and tables.
#include <cstdint>
#include <limits>
#include <string>

#include <gtest/gtest.h>

#include <zuv_client_pro/soap_error.h>
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

TEST(Boundary, every_number_is_written_and_read)
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
TEST(Boundary, an_array_is_found_for_its_id_by_content_and_sizes)
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

} // namespace

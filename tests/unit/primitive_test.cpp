// primitive_test.cpp - simple elements, type checks, QNames, tables of names, numbers of arrays.
#include "support/memory_wire.h"
#include "support/testing.h"

namespace {

const soap_namespace TABLE[] = {
    {"SOAP-ENV", "http://schemas.xmlsoap.org/soap/envelope/", "http://www.w3.org/*/soap-envelope", nullptr},
    {"SOAP-ENC", "http://schemas.xmlsoap.org/soap/encoding/", "http://www.w3.org/*/soap-encoding", nullptr},
    {"xsi", "http://www.w3.org/2001/XMLSchema-instance", nullptr, nullptr},
    {"xsd", "http://www.w3.org/2001/XMLSchema", nullptr, nullptr},
    {"a", "urn:a", "urn:a-*", nullptr},
    {"b_", "urn:b", nullptr, nullptr},
    {nullptr, nullptr, nullptr, nullptr}};

const std::string DECLARED = " xmlns:xsi=\"http://www.w3.org/2001/XMLSchema-instance\""
                             " xmlns:s=\"http://www.w3.org/2001/XMLSchema\"";

class elements : public testing::Test {
protected:
    memory_wire ctx;

    void SetUp() override { soap_set_namespaces(&ctx, TABLE); }

    void receive(const std::string &xml)
    {
        soap_reset_call(&ctx);
        soap_set_namespaces(&ctx, TABLE);
        ctx.soap_version = 1;
        ctx.buffer_index = ctx.buffer_length = 0;
        ctx.peeked = 0;
        ctx.receive("<root" + DECLARED + ">" + xml + "<last/></root>");
        EXPECT_EQ(soap_element_in_begin(&ctx, "root", 0, nullptr), 0);
    }
    bool at_last() { return soap_element_in_begin(&ctx, "last", 0, nullptr) == 0; }
};

template <auto Read> bool reads(soap *ctx, const char *type)
{
    return Read(ctx, "v", nullptr, type, 3) != nullptr;
}

// Each reader with the types that it takes besides its own, and one that it must refuse.
TEST_F(elements, accept_the_types_that_fit_their_reader)
{
    const std::tuple<const char *, bool (*)(soap *, const char *own), const char *, std::string> cases[] = {
        {"xsd:byte", reads<soap_byte_in>, "short", "byte"},
        {"xsd:short", reads<soap_short_in>, "int", "short byte"},
        {"xsd:int", reads<soap_int_in>, "long", "int"},
        {"xsd:long", reads<soap_long_in>, "integer", "long int short byte"},
        {"xsd:long", reads<soap_long64_in>, "unsignedLong",
         "integer positiveInteger negativeInteger nonPositiveInteger nonNegativeInteger long int short byte"},
        {"xsd:unsignedByte", reads<soap_ubyte_in>, "unsignedShort", "unsignedByte"},
        {"xsd:unsignedShort", reads<soap_ushort_in>, "unsignedInt", "unsignedShort unsignedByte"},
        {"xsd:unsignedInt", reads<soap_uint_in>, "int", "unsignedInt"},
        {"xsd:unsignedLong", reads<soap_ulong_in>, "positiveInteger",
         "unsignedLong unsignedInt unsignedShort unsignedByte"},
        {"xsd:unsignedLong", reads<soap_ulong64_in>, "integer",
         "positiveInteger nonNegativeInteger unsignedLong unsignedInt unsignedShort unsignedByte"},
        {"xsd:float", reads<soap_float_in>, "string",
         "float double decimal integer positiveInteger negativeInteger nonPositiveInteger nonNegativeInteger "
         "long int short byte unsignedLong unsignedInt unsignedShort unsignedByte"},
        {"xsd:double", reads<soap_double_in>, "boolean", "float double decimal unsignedByte"},
    };
    for (const auto &[own, read, refused, also] : cases) {
        std::istringstream names(also);
        for (std::string name; names >> name;) {
            receive("<v xsi:type=\"s:" + name + "\">12</v>");
            EXPECT_TRUE(read(&ctx, own) && at_last()) << own << " from " << name;
        }
        receive("<v xsi:type=\"s:" + std::string(refused) + "\">12</v>");
        EXPECT_FALSE(read(&ctx, own)) << own << " from " << refused;
        EXPECT_EQ(ctx.error, SOAP_TYPE_MISMATCH);
        EXPECT_TRUE(read(&ctx, nullptr) && at_last())
            << "the element was given back, and no type accepts any";
    }
    receive("<v xsi:type=\"s:dateTime\">2009-02-13T23:31:30Z</v>");
    const std::time_t *seconds = soap_datetime_in(&ctx, "v", nullptr, "a:when", 15);
    ASSERT_NE(seconds, nullptr);
    EXPECT_EQ(*seconds, 1234567890);
}

TEST_F(elements, values_come_with_their_end_tag_and_errors_without)
{
    receive("<v> 12 <x>dropped</x></v>");
    std::int32_t value = 0;
    EXPECT_EQ(soap_int_in(&ctx, "v", &value, "xsd:int", 1), &value);
    EXPECT_EQ(value, 12);
    EXPECT_TRUE(at_last());
    receive("<v>twelve</v>");
    EXPECT_EQ(soap_int_in(&ctx, "v", &value, "xsd:int", 1), nullptr);
    EXPECT_EQ(ctx.error, SOAP_TYPE_MISMATCH);
    receive("<v/>");
    EXPECT_EQ(soap_int_in(&ctx, "v", &value, "xsd:int", 1), nullptr) << "an empty element is no number";
    receive("<w>1</w>");
    EXPECT_EQ(soap_int_in(&ctx, "v", &value, "xsd:int", 1), nullptr);
    EXPECT_EQ(ctx.error, SOAP_TAG_MISMATCH);
    ctx.error = SOAP_TAG_MISMATCH; // as a member loop leaves it
    EXPECT_EQ(soap_int_in(&ctx, "w", &value, "xsd:int", 1), &value);
}

// Texts beyond the bounds are refused by the parsers: number_test.cpp.
template <class T>
void expect_bounds(int (*write)(soap *, const char *, int, const T *, const char *, int),
                   T *(*read)(soap *, const char *, T *, const char *, int))
{
    using bounds = std::numeric_limits<T>;
    T got = T{1};
    for (const T value : {bounds::lowest(), bounds::max(), bounds::min(), T{0}}) {
        memory_wire out, in;
        out.namespace_state = 1;
        ASSERT_EQ(write(&out, "v", -1, &value, "", 3), 0);
        in.receive(out.sent());
        ASSERT_NE(read(&in, "v", &got, nullptr, 3), nullptr) << out.sent();
        EXPECT_EQ(got, value) << out.sent();
    }
}

TEST(numbers, are_written_and_read_up_to_their_bounds)
{
    expect_bounds(soap_byte_out, soap_byte_in);
    expect_bounds(soap_short_out, soap_short_in);
    expect_bounds(soap_int_out, soap_int_in);
    expect_bounds(soap_long_out, soap_long_in);
    expect_bounds(soap_ubyte_out, soap_ubyte_in);
    expect_bounds(soap_ushort_out, soap_ushort_in);
    expect_bounds(soap_uint_out, soap_uint_in);
    expect_bounds(soap_ulong_out, soap_ulong_in);
    expect_bounds(soap_float_out, soap_float_in);
    expect_bounds(soap_double_out, soap_double_in);
}

TEST_F(elements, references_are_filled_at_the_end)
{
    receive("<n href=\"#n\"/><d href=\"#d\"></d><n id=\"n\">7</n><d id=\"d\">2.5</d><n href=\"#d\"/>");
    std::int32_t number = 0, other = 0;
    double value = 0;
    EXPECT_EQ(soap_int_in(&ctx, "n", &number, "xsd:int", 1), &number);
    EXPECT_EQ(soap_double_in(&ctx, "d", &value, "xsd:double", 14), &value);
    EXPECT_NE(soap_int_in(&ctx, "n", nullptr, "xsd:int", 1), nullptr);
    EXPECT_NE(soap_double_in(&ctx, "d", nullptr, "xsd:double", 14), nullptr);
    EXPECT_EQ(soap_int_in(&ctx, "n", &other, "xsd:int", 1), nullptr);
    EXPECT_EQ(ctx.error, SOAP_ID_CONFLICT);
    EXPECT_EQ(soap_forward_resolve(&ctx), 0);
    EXPECT_EQ(number, 7);
    EXPECT_EQ(value, 2.5);
}

TEST_F(elements, are_written_with_type_and_text)
{
    ctx.namespace_state = 1;
    const std::int8_t byte = -1;
    const std::uint64_t large = UINT64_MAX;
    const double real = 0.5;
    const std::time_t when = 1234567890;
    EXPECT_EQ(soap_byte_out(&ctx, "a:v", -1, &byte, "xsd:byte", 3), 0);
    EXPECT_EQ(soap_ulong_out(&ctx, "a:v", -1, &large, "", 3), 0);
    EXPECT_EQ(soap_double_out(&ctx, "a:v", 0, &real, nullptr, 3), 0);
    EXPECT_EQ(soap_datetime_out(&ctx, "a:v", 0, &when, "", 15), 0);
    EXPECT_EQ(ctx.sent(), "<a:v xsi:type=\"xsd:byte\">-1</a:v><a:v>18446744073709551615</a:v><a:v>0.5</a:v>"
                          "<a:v>2009-02-13T23:31:30Z</a:v>");
    ctx.send_limit = ctx.sends.size();
    EXPECT_NE(soap_byte_out(&ctx, "a:v", -1, &byte, "", 3), 0);
}

TEST_F(elements, array_types_may_be_any_type)
{
    receive("");
    for (const std::string type : {"", "s:int", "s:anyType", "s:ur-type", "s:string"}) {
        std::snprintf(ctx.array_type, sizeof ctx.array_type, "%s", type.c_str());
        EXPECT_EQ(soap_array_type_check(&ctx, "xsd:int"), type == "s:string" ? SOAP_TAG_MISMATCH : 0) << type;
    }
}

TEST_F(elements, q_names_are_mapped_to_the_table)
{
    const std::tuple<const char *, const char *, const char *> cases[] = {
        {"the table's prefix", "p:x", "a:x"},
        {"a row for other names of a namespace", "q:x", "\"urn:b\":x"},
        {"not in the table", "u:x", "\"urn:u\":x"},
        {"no prefix and no default namespace, last", "x", "\"\":x"},
        {"unknown prefixes: a word that others follow stays", "n:x n:y", "n:x \"\":y"},
        {"the predefined prefix", "xml:lang", "xml:lang"},
        {"a list, whatever parts it", " p:x\t\n u:y  p:z ", "a:x \"urn:u\":y a:z"},
        {"nothing", " ", ""},
        {"a prefix of Latin-1", "\xE9:\xE9 u\xE9:x", "a:\xE9 \"urn:\xE9\":x"},
    };
    const std::string declared =
        " xmlns:p=\"urn:a\" xmlns:q=\"urn:b\" xmlns:u=\"urn:u\" xmlns:\xC3\xA9=\"urn:a\""
        " xmlns:u\xC3\xA9=\"urn:\xC3\xA9\" xmlns:\xD0\xB6=\"urn:a\"";
    for (const auto &[rule, text, expected] : cases) {
        receive("<e" + declared + "></e>");
        ASSERT_EQ(soap_element_in_begin(&ctx, "e", 0, nullptr), 0);
        char *mapped = nullptr;
        EXPECT_EQ(soap_qname_read_map(&ctx, text, &mapped, -1, -1), 0);
        EXPECT_STREQ(mapped, expected) << rule;
    }
    // Of a message, whatever its prefixes: the rest of a word is a string like any other.
    receive("<e" + declared + ">\xC3\xA9:\xC3\xA9 \xD0\xB6:\xD0\xB6 u\xC3\xA9:x</e>");
    char **text = soap_string_element_in(&ctx, "e", nullptr, nullptr, 5, 2, -1, -1);
    ASSERT_NE(text, nullptr);
    EXPECT_STREQ(*text, "a:\xE9 a:? \"urn:\xE9\":x");
    EXPECT_TRUE(at_last());
    receive("<e xmlns=\"urn:a\"></e>");
    ASSERT_EQ(soap_element_in_begin(&ctx, "e", 0, nullptr), 0);
    char *mapped = nullptr;
    EXPECT_EQ(soap_qname_read_map(&ctx, "x", &mapped, 1, 1), 0);
    EXPECT_STREQ(mapped, "a:x");
    EXPECT_EQ(soap_qname_read_map(&ctx, "x", &mapped, 2, -1), SOAP_LENGTH);
    EXPECT_EQ(soap_qname_read_map(&ctx, "xy", &mapped, -1, 1), SOAP_LENGTH);
    ctx.error = 0;
    EXPECT_EQ(soap_qname_read_map(&ctx, nullptr, &mapped, 2, -1), 0);
    soap_reset_call(&ctx);
    EXPECT_EQ(soap_qname_read_map(&ctx, "p:x y", &mapped, -1, -1), 0);
    EXPECT_STREQ(mapped, "p:x y") << "without declarations nothing is mapped";
    int result = 0;
    {
        const failing_malloc::scope armed(1, failing_malloc::refuse::all_from);
        result = soap_qname_read_map(&ctx, "p:x", &mapped, -1, -1);
    }
    EXPECT_EQ(result, SOAP_OUT_OF_MEMORY);
    EXPECT_EQ(ctx.error, SOAP_OUT_OF_MEMORY);
    ctx.mode = MODE_CANONICAL;
    EXPECT_EQ(soap_prefix_use(&ctx, "q:x"), 0);
    EXPECT_EQ(soap_qname_read_map(&ctx, "q:x", &mapped, -1, -1), SOAP_NAMESPACE_ERROR)
        << "used, not declared";
    EXPECT_EQ(ctx.error, SOAP_NAMESPACE_ERROR);
}

TEST_F(elements, q_names_go_out_under_the_prefixes_of_the_table)
{
    receive("");
    soap_attr_table_reset(&ctx);
    ctx.namespace_state = 1;
    EXPECT_STREQ(soap_qname_write_map(&ctx, "a:x plain"), "a:x plain");
    EXPECT_STREQ(soap_qname_write_map(&ctx, "\"urn:a\":x  \"urn:a-2\":y \"broken"), "a:x a:y \"broken");
    ctx.next_id = 8;
    EXPECT_STREQ(soap_qname_write_map(&ctx, "\"urn:u\":x a:y \"urn:w\":z"), "_9:x a:y _10:z");
    EXPECT_EQ(soap_element_out_begin(&ctx, "a:e", 0, ""), 0);
    EXPECT_EQ(ctx.sent(), "<a:e xmlns:_10=\"urn:w\" xmlns:_9=\"urn:u\">");
    EXPECT_EQ(soap_qname_write_map(&ctx, nullptr), nullptr);
    ctx.mode = MODE_CANONICAL;
    ctx.next_id = 8;
    EXPECT_STREQ(soap_qname_write_map(&ctx, "a:x plain \"urn:u\":y"), "a:x plain _9:y");
}

TEST_F(elements, tables_of_names_are_searched_exactly)
{
    const soap_code_row table[] = {{1, "one"}, {2, "two"}, {4, "four"}, {6, "both"}, {0, nullptr}};
    EXPECT_EQ(soap_name_to_code(table, "two", -1), 2);
    EXPECT_EQ(soap_name_to_code(table, "Two", -1), -1);
    EXPECT_EQ(soap_name_to_code(table, nullptr, -1), -1);
    EXPECT_STREQ(soap_code_to_name(table, 4), "four");
    EXPECT_EQ(soap_code_to_name(table, 5), nullptr);
    EXPECT_EQ(soap_name_to_row(table, "one"), &table[0]);
    EXPECT_EQ(soap_names_to_flags(table, " one\tfour "), 5);
    EXPECT_EQ(soap_names_to_flags(table, "one three"), 0);
    EXPECT_EQ(soap_names_to_flags(table, ""), 0);
    EXPECT_STREQ(soap_flags_to_names(&ctx, table, 5), "one four");
    EXPECT_STREQ(soap_flags_to_names(&ctx, table, 6), "two four both");
    EXPECT_STREQ(soap_flags_to_names(&ctx, table, 0), "");
    const std::string lengthy(600, 'n');
    const soap_code_row wide[] = {{1, lengthy.c_str()}, {2, lengthy.c_str()}, {0, nullptr}};
    EXPECT_EQ(soap_flags_to_names(&ctx, wide, 3), (lengthy + " " + lengthy).substr(0, SOAP_TEXT_SIZE - 1));
}

TEST_F(elements, array_sizes_multiply_within_their_bound)
{
    const std::tuple<const char *, int, int, int, int> cases[] = {
        {"[5]", 1, 5, 5, 99},
        {"[2,3]", 2, 6, 2, 3},
        {"2 3", 2, 6, 2, 3},
        {"[7]", 2, 7, 99, 7},
        {"[2,3]", 1, 3, 3, 99},
        {"[]", 1, 0, 0, 99},
        {"", 1, -1, 99, 99},
        {nullptr, 1, -1, 99, 99},
        {"[-1]", 1, -1, 99, 99},
        {"[1000000]", 1, 1000000, 1000000, 99},
        {"[1000001]", 1, -1, 99, 99},
        {"[1001,1000]", 2, -1, 99, 1000},
        {"[99999999999999999999]", 1, -1, 99, 99},
    };
    // first: 99 where no size was stored
    for (const auto &[text, dimensions, product, first, second] : cases) {
        int sizes[2] = {99, 99};
        EXPECT_EQ(soap_array_dims_parse(text, sizes, dimensions), product) << text_of(text);
        EXPECT_EQ(sizes[0], first) << text_of(text);
        EXPECT_EQ(sizes[1], second) << text_of(text);
    }
}

TEST_F(elements, offsets_count_from_the_start_of_the_array)
{
    const std::tuple<const char *, const char *, int, int> cases[] = {
        {"[5]", "", 5, 0},         {"[5]", "[2]", 3, 2},
        {"[2,3]", "[1,1]", 2, 4},  {"2 3", "", 6, 0},
        {"[5]", nullptr, 5, 0},    {"[x]", "", -1, 99},
        {"[5]", "[-1]", -1, 99},   {"[2,]", "", -1, 99},
        {"[1000001]", "", -1, 99}, {"[5]", "[99999999999]", -1, 99},
    };
    for (const auto &[text, offset_text, expected_rest, expected_offset] : cases) {
        int offset = 99;
        EXPECT_EQ(soap_array_dims_offset_parse(text, offset_text, &offset), expected_rest) << text;
        EXPECT_EQ(offset, expected_offset) << text;
    }
    const struct {
        const char *text;
        std::vector<int> sizes;
        int offset;
    } alone[] = {
        {"[1,2,3]", {4, 5, 6}, (1 * 5 + 2) * 6 + 3},
        {"", {4, 5, 6}, 0},
        {"[-1]", {4}, -1},
        {"[2147483647]", {1}, INT_MAX},
        {"[2147483648]", {1}, -1},
        {"[65535,32767]", {0, 1 << 15}, INT_MAX},
        {"[65535,32768]", {0, 1 << 15}, -1},
        {"[999999,999999,999999]", {1000000, 1000000, 1000000}, -1},
    };
    int offsets[3] = {};
    for (const auto &row : alone)
        for (int *target : {offsets, static_cast<int *>(nullptr)})
            EXPECT_EQ(soap_array_offset_parse(row.text, row.sizes.data(), target,
                                              static_cast<int>(row.sizes.size())),
                      row.offset)
                << row.text;
    soap_array_offset_parse("[1,2,3]", alone[0].sizes.data(), offsets, 3);
    EXPECT_EQ(offsets[2], 3);
}

TEST_F(elements, positions_are_read_up_to_their_limit)
{
    std::string many = "[0";
    for (int i = 1; i < 40; i++)
        many += "," + std::to_string(i);
    const std::tuple<std::string, int, int> cases[] = {
        {"[3,-4]", 2, -4},
        {"3", 0, 0},
        {"[]", 0, 0},
        {"[99999999999]", 0, 0},
        {"[2147483647,-2147483648,2147483648]", 2, INT_MIN},
        {"[2147483647]", 1, INT_MAX},
        {many, SOAP_POSITIONS_MAX, SOAP_POSITIONS_MAX - 1},
    };
    for (const auto &[text, count, last] : cases) {
        int numbers[SOAP_POSITIONS_MAX] = {};
        EXPECT_EQ(soap_position_parse(text.c_str(), numbers), count) << text;
        EXPECT_EQ(count == 0 ? 0 : numbers[count - 1], last) << text;
    }
}

} // namespace

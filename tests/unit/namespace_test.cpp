// The namespace table's working copy and the prefixes in scope.

#include "support/writer_fixture.h"
#include "xml/namespace.h"

using writer_fixture::table;
using writer_fixture::writer;

namespace {

constexpr const char *SOAP12_ENVELOPE = "http://www.w3.org/2003/05/soap-envelope";
constexpr const char *SOAP12_ENCODING = "http://www.w3.org/2003/05/soap-encoding";

int declare(soap *ctx, const char *prefix, const char *uri)
{
    const soap_prefix *record = soap_prefix_push_in(ctx, prefix, uri);
    EXPECT_TRUE(record);
    return record ? record->index : -2;
}

std::string uri_of(soap *ctx, const char *name)
{
    const char *uri = soap_namespace_of(ctx, name);
    return uri ? uri : "(none)";
}

class namespaces : public testing::Test {
protected:
    writer w;
    soap *const ctx = w.ctx.get();
};

} // namespace

TEST(namespace_table, the_copy_is_made_once_and_sets_the_version)
{
    static const soap_namespace soap12[] = {{"SOAP-ENV", SOAP12_ENVELOPE, nullptr, nullptr},
                                            {nullptr, nullptr, nullptr, nullptr}};
    soap ctx, other;
    ASSERT_EQ(soap_set_namespaces(&ctx, table()), 0);
    EXPECT_EQ(ctx.soap_version, 1);
    const soap_namespace *copy = ctx.local_namespaces;
    EXPECT_NE(copy, table());
    ctx.soap_version = 0;
    ASSERT_EQ(soap_namespace_table_copy(&ctx), 0);
    EXPECT_EQ(ctx.local_namespaces, copy);
    EXPECT_EQ(ctx.soap_version, 0);

    ASSERT_EQ(declare(&ctx, "e", SOAP12_ENVELOPE), 0);
    ASSERT_EQ(soap_set_namespaces(&other, table()), 0);
    ASSERT_EQ(soap_set_namespaces(&other, ctx.local_namespaces), 0);
    soap_namespace_table_drop(&ctx);
    EXPECT_STREQ(other.local_namespaces[0].received, SOAP12_ENVELOPE) << "what was received goes along";
    other.namespaces = table();

    ASSERT_EQ(soap_set_namespaces(&ctx, soap12), 0);
    EXPECT_EQ(ctx.soap_version, 2);
    ASSERT_EQ(soap_set_namespaces(&ctx, ctx.local_namespaces), 0);
    EXPECT_EQ(ctx.namespaces, soap12);
    for (const soap_namespace *none : {soap12 + 1, static_cast<const soap_namespace *>(nullptr)}) {
        ASSERT_EQ(soap_set_namespaces(&ctx, none), 0);
        EXPECT_EQ(ctx.local_namespaces == nullptr, none == nullptr);
        EXPECT_EQ(declare(&ctx, "p", "urn:p"), -1);
    }
    EXPECT_EQ(ctx.soap_version, 2);
}

TEST(namespace_table, an_encoding_style_from_the_table_does_not_outlive_it)
{
    for (const bool received : {false, true}) {
        writer w;
        soap *ctx = w.ctx.get();
        if (received) {
            ASSERT_EQ(declare(ctx, "c", SOAP12_ENCODING), 1);
        }
        ctx->mode = MODE_COUNTING;
        ctx->namespace_state = 1;
        ctx->encoding_flag = 1;
        ctx->encoding_style = "";
        ASSERT_EQ(soap_element_out_begin(ctx, "e", 0, nullptr), 0);
        EXPECT_STREQ(ctx->encoding_style, received ? SOAP12_ENCODING : table()[1].uri);
        soap_namespace_table_drop(ctx);
        EXPECT_STREQ(ctx->encoding_style, "");
    }
}

TEST_F(namespaces, a_declaration_is_bound_by_uri_pattern_or_what_was_received)
{
    static const std::tuple<const char *, const char *, int, const char *> steps[] = {
        {"own", "http://schemas.xmlsoap.org/soap/envelope/", 0, nullptr},
        {"pattern", SOAP12_ENVELOPE, 0, SOAP12_ENVELOPE},
        {"received again", SOAP12_ENVELOPE, 0, SOAP12_ENVELOPE},
        {"another of the pattern", "http://www.w3.org/1/soap-envelope", -1, SOAP12_ENVELOPE},
        {"own drops what was received", "http://schemas.xmlsoap.org/soap/envelope/", 0, nullptr},
        {"another is now free", "http://www.w3.org/1/soap-envelope", 0, "http://www.w3.org/1/soap-envelope"},
        {"no pattern", "urn:a", 4, "http://www.w3.org/1/soap-envelope"},
        {"longer than a row", "urn:ab", -1, "http://www.w3.org/1/soap-envelope"},
        {"empty", "", -1, "http://www.w3.org/1/soap-envelope"},
    };
    for (const auto &[rule, uri, row, then_received] : steps) {
        SCOPED_TRACE(rule);
        EXPECT_EQ(declare(ctx, "p", uri), row);
        EXPECT_EQ(uri_of(ctx, "p:x"), uri);
        const char *received = ctx->local_namespaces[0].received;
        EXPECT_EQ(received ? std::string(received) : "", then_received ? then_received : "");
    }
}

TEST_F(namespaces, a_uri_received_over_and_over_is_kept_once)
{
    ASSERT_EQ(declare(ctx, "e", SOAP12_ENVELOPE), 0);
    const char *kept = ctx->local_namespaces[0].received;
    const std::size_t allocations = failing_malloc::allocations();
    std::set<const soap_prefix *> records;
    for (int i = 0; i < 1000; ++i) {
        ctx->nesting_level = 1;
        ASSERT_EQ(declare(ctx, "e", SOAP12_ENVELOPE), 0);
        ASSERT_EQ(declare(ctx, "other", "urn:other"), -1);
        records.insert(ctx->prefix_list);
        soap_prefix_pop(ctx);
    }
    EXPECT_EQ(ctx->local_namespaces[0].received, kept);
    EXPECT_LE(records.size(), 2U);
    EXPECT_LE(failing_malloc::allocations() - allocations, 10U + 2 * records.size());
}

TEST_F(namespaces, inner_declarations_hide_outer_ones_until_their_element_ends)
{
    const auto expect = [this](const char *named, const char *unnamed) {
        EXPECT_EQ(uri_of(ctx, "p:x"), named);
        EXPECT_EQ(uri_of(ctx, "x"), unnamed);
    };
    ctx->nesting_level = 1;
    declare(ctx, "p", "urn:a");
    declare(ctx, "", "urn:outer");
    ctx->nesting_level = 2;
    declare(ctx, "p", "urn:b");
    ctx->nesting_level = 3;
    declare(ctx, "p", "urn:unknown");
    declare(ctx, "", "urn:inner");
    expect("urn:unknown", "urn:inner");
    ctx->nesting_level = 2;
    soap_prefix_pop(ctx);
    expect("urn:a", "urn:outer");
    soap_prefix_stack_reset(ctx);
    EXPECT_EQ(uri_of(ctx, "x"), "(none)");
    EXPECT_EQ(uri_of(ctx, "xml:lang"), "http://www.w3.org/XML/1998/namespace");
    EXPECT_EQ(ctx->error, 0);
    EXPECT_EQ(uri_of(ctx, "p:x"), "(none)");
    EXPECT_EQ(ctx->error, SOAP_NAMESPACE_ERROR);
}

TEST_F(namespaces, many_prefixes_in_scope_are_found_fast_and_bounded)
{
    for (std::uint32_t i = 0; i < SOAP_PREFIXES_MAX; ++i)
        ASSERT_EQ(declare(ctx, ("p" + std::to_string(i)).c_str(), ("urn:" + std::to_string(i)).c_str()), -1);
    EXPECT_EQ(soap_prefix_push_in(ctx, "more", "urn:more"), nullptr);
    EXPECT_EQ(ctx->error, SOAP_LENGTH);
    const double begin = cpu_time();
    for (int i = 0; i < 100000; ++i)
        ASSERT_TRUE(xml_prefix_find(ctx, "p0"));
    // A walk over all of them would take a hundred times as long.
    EXPECT_LT(cpu_time() - begin, 2.0);
    EXPECT_EQ(uri_of(ctx, "p777:x"), "urn:777");
    soap_prefix_pop(ctx);
    EXPECT_EQ(xml_prefix_find(ctx, "p777"), nullptr);
}

TEST_F(namespaces, texts_of_any_length_are_kept)
{
    for (const std::size_t length : {1U, 100U, 60000U, 126U, 127U, 128U, 1U, 60000U}) {
        ctx->nesting_level = 1;
        const std::string prefix(length, 'p');
        const std::string uri(3 * length, 'u');
        ASSERT_EQ(declare(ctx, prefix.c_str(), uri.c_str()), -1);
        EXPECT_EQ(uri_of(ctx, (prefix + ":x").c_str()), uri);
        soap_prefix_pop(ctx);
    }
    EXPECT_EQ(soap_prefix_push_in(ctx, std::string(70000, 'p').c_str(), ""), nullptr);
    EXPECT_EQ(ctx->error, SOAP_LENGTH);
}

TEST(namespace_table, a_prefix_that_waits_for_its_declaration_is_forgotten_with_the_message)
{
    writer w(MODE_CANONICAL);
    soap *ctx = w.ctx.get();
    ctx->mode = MODE_CANONICAL;
    EXPECT_EQ(soap_prefix_use(ctx, "q:x"), 0);
    EXPECT_EQ(xml_prefixes_waiting(ctx), 0U);
    for (int times = 0; times < 2; ++times) {
        EXPECT_EQ(soap_prefix_push_out(ctx, "q", "urn:q", 0), 0);
        EXPECT_EQ(xml_prefixes_waiting(ctx), 1U);
    }
    soap_prefix_stack_reset(ctx);
    EXPECT_EQ(xml_prefixes_waiting(ctx), 0U);
}

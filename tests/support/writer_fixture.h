// writer_fixture.h - a context that writes to a string, and one helper that writes the same thing every way.
//
// Elsewhere: what is written. Always: a check runs the calls in a counting pass, buffered, unbuffered and
// through a filter, and demands the same bytes of all.
#pragma once

#include "support/testing.h"

namespace writer_fixture {

// Rows 4 and 5 are those of the test's own data.
inline const soap_namespace *table()
{
    static const soap_namespace rows[] = {
        {"SOAP-ENV", "http://schemas.xmlsoap.org/soap/envelope/", "http://www.w3.org/*/soap-envelope",
         nullptr},
        {"SOAP-ENC", "http://schemas.xmlsoap.org/soap/encoding/", "http://www.w3.org/*/soap-encoding",
         nullptr},
        {"xsi", "http://www.w3.org/2001/XMLSchema-instance", "http://www.w3.org/*/XMLSchema-instance",
         nullptr},
        {"xsd", "http://www.w3.org/2001/XMLSchema", "http://www.w3.org/*/XMLSchema", nullptr},
        {"a", "urn:a", nullptr, nullptr},
        {"b", "urn:b", nullptr, nullptr},
        {nullptr, nullptr, nullptr, nullptr}};
    return rows;
}

inline int collect(soap *ctx, const char *data, std::size_t length)
{
    static_cast<std::string *>(ctx->user)->append(data, length);
    return 0;
}

inline int pass_on(soap *, const char **, std::size_t *)
{
    return 0;
}

enum class start { document, inside }; // before the first start tag of a message, or past it

using calls = std::function<void(soap *)>;

struct writer {
    std::unique_ptr<soap> ctx = std::make_unique<soap>();
    std::string sent;

    explicit writer(std::uint32_t mode = 0, std::int16_t version = 1)
    {
        soap_log_set_sent(ctx.get(), nullptr);
        EXPECT_EQ(soap_set_namespaces(ctx.get(), table()), 0);
        ctx->soap_version = version;
        ctx->on_send = collect;
        ctx->user = &sent;
        ctx->output_mode = mode;
    }

    // One pass over the calls, from a fresh state.
    std::string pass(std::uint32_t io, start where, const calls &write)
    {
        soap_prefix_stack_reset(ctx.get());
        ctx->mode = ctx->output_mode | io;
        ctx->namespace_state = where == start::document ? 0 : 1;
        ctx->nesting_level = 0;
        ctx->has_body = 0;
        ctx->buffer_index = 0;
        ctx->message_part = 0;
        ctx->message_count = 0;
        sent.clear();
        write(ctx.get());
        if (!(io & MODE_COUNTING)) {
            EXPECT_EQ(soap_send_flush(ctx.get()), 0);
        }
        return sent;
    }
};

// The bytes that the calls write, the same in all passes.
inline std::string written(writer &w, start where, const calls &write)
{
    w.pass(MODE_BUFFERED | MODE_COUNTING, where, write);
    const std::uint64_t counted = w.ctx->message_count;
    const std::string buffered = w.pass(MODE_BUFFERED, where, write);
    const std::string direct = w.pass(MODE_DIRECT, where, write);
    w.ctx->on_send_filter = pass_on;
    const std::string filtered = w.pass(MODE_BUFFERED, where, write);
    w.ctx->on_send_filter = nullptr;
    EXPECT_EQ(counted, buffered.size());
    EXPECT_EQ(buffered, direct);
    EXPECT_EQ(buffered, filtered);
    return buffered;
}

} // namespace writer_fixture

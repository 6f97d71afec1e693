// writer_fixture.h - a context that writes to a string, and one helper that writes the same thing every way.
// Elsewhere: what is written. Always: a check runs the calls in a counting pass, buffered, unbuffered and
// through a filter, and demands the same bytes of all; and with sends that are refused, wherever that begins.
#pragma once

#include <gtest/gtest-spi.h>

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

inline int pass_on(soap *, const char **, std::size_t *)
{
    return 0;
}

enum class start { document, inside }; // before the first start tag of a message, or past it

using calls = std::function<void(soap *)>;

struct writer {
    std::unique_ptr<soap> ctx = std::make_unique<soap>();
    std::string sent;
    std::size_t sends = 0, sends_left = SIZE_MAX; // of a pass; further ones are refused

    explicit writer(std::uint32_t mode = 0, std::int16_t version = 1)
    {
        soap_log_set_sent(ctx.get(), nullptr);
        EXPECT_EQ(soap_set_namespaces(ctx.get(), table()), 0);
        ctx->soap_version = version;
        ctx->user = this;
        ctx->on_send = [](soap *c, const char *data, std::size_t length) {
            writer &own = *static_cast<writer *>(c->user);
            if (own.sends++ >= own.sends_left)
                return static_cast<int>(SOAP_EOF);
            own.sent.append(data, length);
            return 0;
        };
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
        sends = 0;
        write(ctx.get());
        if (sends_left == SIZE_MAX && !(io & MODE_COUNTING)) {
            EXPECT_EQ(soap_send_flush(ctx.get()), 0);
        }
        return sent;
    }
};

// Once a send is refused, the calls report it, and what went out is how they begin. Not of long messages.
inline void expect_an_error_wherever_sends_end(writer &w, start where, const calls &write)
{
    const std::string whole = w.pass(MODE_DIRECT, where, write);
    const std::size_t sends = w.sends < 100 ? w.sends : 0;
    for (w.sends_left = 0; w.sends_left < sends; ++w.sends_left) {
        testing::TestPartResultArray unmet; // of the calls' own expectations
        {
            const testing::ScopedFakeTestPartResultReporter reporter(&unmet);
            w.pass(MODE_DIRECT, where, write);
        }
        EXPECT_EQ(w.ctx->error, SOAP_EOF) << w.sends_left << " of " << whole;
        EXPECT_TRUE(whole.starts_with(w.sent)) << w.sent << "\n" << whole;
        soap_attr_table_reset(w.ctx.get());
        w.ctx->error = w.ctx->encoding_flag = 0;
    }
    w.sends_left = SIZE_MAX;
}

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
    expect_an_error_wherever_sends_end(w, where, write);
    return buffered;
}

} // namespace writer_fixture

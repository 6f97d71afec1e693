// attachment_checks.h - what holds of every message with attachments, however it is framed.
#pragma once

#include "support/attachment_exchange.h"
#include "support/testing.h"

namespace attachment_exchange {

inline void expect_same_at_every_split(const std::string &bytes, const std::string &expected,
                                       std::uint32_t mode = 0)
{
    EXPECT_EQ(reception(bytes, mode).summary(), expected);
    for (std::size_t split = 1; split < bytes.size(); ++split)
        ASSERT_EQ(reception(bytes, mode, split).summary(), expected) << "split at " << split;
    EXPECT_EQ(reception(bytes, mode, 1, 1).summary(), expected) << "byte by byte";
}

inline void expect_error_at_every_cut(const std::string &bytes, std::uint32_t mode = 0)
{
    for (std::size_t length = 0; length < bytes.size(); ++length)
        ASSERT_EQ(reception(bytes.substr(0, length), mode).summary().substr(0, 1), "!")
            << "cut at " << length;
}

// Any byte may become any other: the outcome is free, its kind is not.
inline void expect_survival_of_every_change(const std::string &bytes, std::uint32_t mode = 0)
{
    for (std::size_t at = 0; at < bytes.size(); ++at) {
        for (const int byte : {0x00, 0x01, 0x0D, 0x2D, 0x7F, 0x80, 0xFF, bytes[at] ^ 1, bytes[at] ^ 0x20}) {
            std::string changed = bytes;
            changed[at] = static_cast<char>(byte);
            reception read(changed, mode);
            EXPECT_EQ(read.run(), read.wire->error);
        }
    }
}

inline void expect_survival_of_every_refused_allocation(const std::string &bytes)
{
    expect_out_of_memory_at_each_allocation(
        11, [&] { return std::make_unique<reception>(bytes); }, [](reception &read) { return read.run(); });
}

} // namespace attachment_exchange

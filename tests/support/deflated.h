// deflated.h - texts compressed by zlib itself, for tests of what the engine makes of them.
#pragma once

#include <zlib.h>

#include "support/testing.h"

// `window_bits` as zlib takes them: 15 with its own head, -15 raw, 31 gzip.
inline std::string deflated(const std::string &text, int window_bits, const std::string &dictionary = {})
{
    z_stream stream{};
    EXPECT_EQ(deflateInit2(&stream, 6, Z_DEFLATED, window_bits, 8, Z_DEFAULT_STRATEGY), Z_OK);
    if (!dictionary.empty()) {
        deflateSetDictionary(&stream, reinterpret_cast<const Bytef *>(dictionary.data()),
                             static_cast<uInt>(dictionary.size()));
    }
    std::string out(deflateBound(&stream, text.size()) + 32, '\0');
    stream.next_in = reinterpret_cast<Bytef *>(const_cast<char *>(text.data()));
    stream.avail_in = static_cast<uInt>(text.size());
    stream.next_out = reinterpret_cast<Bytef *>(out.data());
    stream.avail_out = static_cast<uInt>(out.size());
    EXPECT_EQ(deflate(&stream, Z_FINISH), Z_STREAM_END);
    out.resize(stream.total_out);
    deflateEnd(&stream);
    return out;
}

inline std::string gzipped(const std::string &text)
{
    return deflated(text, 31);
}

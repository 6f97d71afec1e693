// dime_bytes.h - DIME records put together from their fields.
#pragma once

#include "support/attachment_exchange.h"

namespace dime_bytes {

constexpr unsigned MB = 4, ME = 2, CF = 1;
constexpr unsigned UNCHANGED = 0, MEDIA = 1, URI = 2;

inline std::string number(std::size_t value, int bytes)
{
    std::string text;
    for (int i = bytes; i-- > 0;)
        text += static_cast<char>(value >> (8 * i) & 0xFF);
    return text;
}

inline std::string padded(std::string bytes)
{
    bytes.append((4 - bytes.size() % 4) % 4, '\0');
    return bytes;
}

inline std::string header(unsigned flags, unsigned format, std::size_t options, std::size_t id,
                          std::size_t type, std::size_t size)
{
    return number(0x08 | flags, 1) + number(format << 4, 1) + number(options, 2) + number(id, 2) +
           number(type, 2) + number(size, 4);
}

inline std::string record(unsigned flags, unsigned format, const std::string &id, const std::string &type,
                          const std::string &data, const std::string &options = "")
{
    return header(flags, format, options.size(), id.size(), type.size(), data.size()) + padded(options) +
           padded(id) + padded(type) + padded(data);
}

inline std::string message_record(unsigned flags, const std::string &body)
{
    return record(MB | flags, URI, "cid:id0", attachment_exchange::ENVELOPE_URI,
                  attachment_exchange::envelope(body));
}

} // namespace dime_bytes

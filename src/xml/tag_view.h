// tag_view.h - the held start tag as the binding sees it: local name, namespace row, hash.
//
// Here: the view and the hash that compile-time tables of names share with it. Elsewhere: comparison by text
// (soap_tag_compare in soap_xml.h).
#pragma once

#include <cstddef>
#include <cstdint>

#include <zuv_client_pro/soap_xml.h>

constexpr int TAG_ROW_UNBOUND = -1; // the prefix is declared for a namespace that the table doesn't know
constexpr int TAG_ROW_UNDECLARED =
    -2;                               // the prefix isn't declared: SOAP_SYNTAX_ERROR once the local name fits
constexpr int TAG_ROW_NO_PREFIX = -3; // no prefix, and no default namespace is declared

struct tag_view {
    const char *local;          // in soap::tag, terminated; until the next tag is read
    std::uint32_t local_length; // bytes
    int row;                    // of the namespace table, or TAG_ROW_...
};

// The tag in soap::tag. The row is looked up at most once for a tag. With MODE_IGNORE_NAMESPACES the row is
// told as ever: the caller leaves it out of account.
tag_view soap_held_tag(soap *ctx);

// Namespace row of a prefix by the stack of declarations now in force, or TAG_ROW_... The prefix "xml", which
// needs no declaration, counts as unbound.
int xml_prefix_row(soap *ctx, const char *prefix, std::size_t length);

// The held tag has no prefix, and the innermost default namespace is that of the row: both are known from here on.
// The context must have its namespace scope.
void xml_tag_has_default(soap *ctx, std::int16_t row);

// For the prefix stack: whenever a declaration is pushed or popped, remembered rows are forgotten.
inline void xml_prefix_rows_forget(soap *ctx)
{
    ctx->prefix_cache_valid = 0;
    ctx->tag_resolved = false;
}

// The row's prefix fits the one asked for: equal, or with a "_" after it.
bool xml_row_has_prefix(const soap *ctx, int row, const char *prefix, std::size_t length);

namespace tag_hash_detail {

constexpr std::uint64_t bytes4(const char *p)
{
    return static_cast<std::uint64_t>(static_cast<unsigned char>(p[0])) |
           static_cast<std::uint64_t>(static_cast<unsigned char>(p[1])) << 8 |
           static_cast<std::uint64_t>(static_cast<unsigned char>(p[2])) << 16 |
           static_cast<std::uint64_t>(static_cast<unsigned char>(p[3])) << 24;
}

constexpr std::uint64_t bytes8(const char *p)
{
    return bytes4(p) | bytes4(p + 4) << 32;
}

constexpr std::uint64_t mix(std::uint64_t state, std::uint64_t value)
{
    state = (state ^ value) * 0x9E3779B97F4A7C15u;
    return state ^ (state >> 32);
}

// Up to seven bytes: two overlapping halves, or first, middle and last byte.
constexpr std::uint64_t short_value(const char *p, std::size_t length)
{
    if (length >= 4)
        return bytes4(p) | bytes4(p + length - 4) << 32;
    if (length == 0)
        return 0;
    return static_cast<std::uint64_t>(static_cast<unsigned char>(p[0])) |
           static_cast<std::uint64_t>(static_cast<unsigned char>(p[length / 2])) << 8 |
           static_cast<std::uint64_t>(static_cast<unsigned char>(p[length - 1])) << 16;
}

} // namespace tag_hash_detail

// Hash of a local name, the same at compile time and at run time; eight bytes a step.
constexpr std::uint32_t tag_local_hash(const char *text, std::size_t length)
{
    namespace detail = tag_hash_detail;
    std::uint64_t state = length;
    if (length < 8)
        return static_cast<std::uint32_t>(detail::mix(state, detail::short_value(text, length)));
    std::size_t done = 0;
    for (; length - done > 8; done += 8)
        state = detail::mix(state, detail::bytes8(text + done));
    return static_cast<std::uint32_t>(detail::mix(state, detail::bytes8(text + length - 8)));
}

// namespace_scope.h - what the prefix stack, the namespace table and the attribute table keep from call to
// call.
//
// Always: made at first use by namespace_scope_of, freed by soap_namespace_scope_free. The table part
// describes the rows whose addresses it remembers and is made anew when it meets other rows.
#pragma once

#include <cstddef>
#include <cstdint>
#include <cstring>
#include <string_view>

#include <zuv_client_pro/soap.h>

#include "xml/tag_view.h"
#include "xml/xml_scan.h"

constexpr std::size_t PREFIX_CHAINS = 256;      // power of two
constexpr std::size_t SPARE_PREFIXES_MAX = 256; // records kept for reuse
constexpr std::size_t SPARE_PREFIX_SIZE = 1024; // bytes of text; larger records are freed at once
constexpr std::size_t ATTRIBUTE_CHAINS = 128;   // power of two
constexpr std::size_t SPARE_ATTRIBUTES_MAX = 64;
constexpr std::size_t SPARE_ATTRIBUTE_SIZE =
    1024; // bytes of value; a record with a larger one is freed at once

constexpr std::size_t URI_SLOTS = 64;          // power of two
constexpr std::size_t ROOT_BYTES_MAX = 4096;   // for a remembered root element
constexpr std::size_t DEFAULT_HEADS = 8;       // power of two
constexpr std::size_t DEFAULT_HEAD_SIZE = 124; // bytes; longer ones are not remembered
constexpr std::size_t RECEIVED_SIZE = 128;     // bytes; longer received URIs have blocks of their own
constexpr std::size_t RECEIVED_KEPT = 4;       // blocks for received URIs that stay from call to call
constexpr unsigned TAG_GUESS_BITS = 6;         // of the number of a tag_guess
constexpr std::size_t TAG_GUESS_PROBES = 4;    // places that one may be in, from its number on
constexpr std::size_t ROOT_RECEIVED_MAX = 8;   // rows that took a URI in it

// Bytes in a row's own texts.
struct namespace_lengths {
    std::size_t prefix, uri;
    std::size_t pattern_head; // of the pattern, before its first "*" or "-"
};

// The start tag that came after another in the last messages, with what was found out about it: a guess at the
// next one. Who guesses says what it follows.
struct tag_guess {
    static constexpr std::size_t SIZE = 32;

    std::uint64_t after;       // what it follows; 0: no guess
    std::uint8_t next;         // what it was found to be
    bool doubtful;             // it was wrong the last time
    std::uint8_t prefix_place; // in soap::prefix_cache
    std::uint8_t local;        // offset of the local name in the tag's name
    std::uint8_t length;       // bytes of `text`
    char text[SIZE];           // "<", the name in bytes below 128, ">"
    std::uint64_t changes;     // soap_namespace_scope::prefix_changes when that place held its prefix
    const char *row_prefix;    // of the row that the binding asks for; where it asks for another: of none
};

// The declarations of the last message's root element, with what became of them; see root_head.h.
struct remembered_root {
    // From after the tag's name up to and with its ">"; after that the URIs received, terminated.
    char bytes[ROOT_BYTES_MAX];
    std::size_t length; // 0: nothing is remembered
    bool empty_tag;     // the tag ends in "/>"
    soap_prefix *first; // the innermost of its records; null without any
    std::uint32_t count;
    std::size_t received_count;
    struct {
        std::int16_t row;
        const char *uri; // in `bytes`
    } received[ROOT_RECEIVED_MAX];
};

// What followed the name of a tag that declares its default namespace; see default_head.h.
struct default_head {
    std::uint8_t length;           // 0: nothing is remembered
    bool empty_tag;                // the tag ends in "/>"
    std::int16_t row;              // of the namespace table
    char bytes[DEFAULT_HEAD_SIZE]; // from after the name up to and with the ">"
};

struct soap_namespace_scope {
    soap_prefix *chains[PREFIX_CHAINS]; // innermost first
    std::uint32_t in_scope;             // records in the chains, which are those of soap::prefix_list
    std::uint32_t waiting;              // those of index 1 with a URI
    std::uint32_t hash_factor;          // odd, not known to a peer
    soap_prefix *spare;                 // linked by next
    std::size_t spare_count;
    soap_attribute *attribute_chains[ATTRIBUTE_CHAINS]; // the attribute table, by name
    std::size_t attribute_count;                        // records in the chains
    std::size_t attributes_visible;                     // of these, those in soap::attribute_list
    std::size_t attribute_reuse;      // chain where an idle record to rename is looked for next
    soap_attribute *spare_attributes; // linked by next
    std::size_t spare_attribute_count;
    soap_namespace *spare_table; // has row_count rows and their end; null while it is the working copy
    const soap_namespace *copy;  // the working copy: row_count rows and their end; null for none
    bool copy_received;          // a row of it has or had a received URI
    remembered_root root;
    default_head default_heads[DEFAULT_HEADS];
    char *received[RECEIVED_KEPT];   // blocks of RECEIVED_SIZE for received URIs; owned; null until first use
    unsigned received_used;          // bit n: a row has received[n]
    std::uint8_t tag_prefix;         // the reader's last tag: place of its prefix in soap::prefix_cache
    std::uint64_t prefix_changes[8]; // how often each place of soap::prefix_cache took another prefix
    tag_guess guesses[(1U << TAG_GUESS_BITS) + TAG_GUESS_PROBES - 1];

    const soap_namespace *rows;       // copy of the rows described, without received URIs; owned with lengths
    const namespace_lengths *lengths; // of each row
    std::size_t row_count;
    std::int16_t version; // of SOAP, by the first row
    // Index + 1 of the row that a URI is bound to whatever was received before, by hash of the URI; 0 for an
    // empty slot. Open addressing.
    std::uint8_t uri_slots[URI_SLOTS];
    char *declarations;            // the rows as attributes, in table order; null until first use
    std::size_t *declaration_ends; // bytes of `declarations` up to and with each row; in the same allocation
    bool declarations_plain;       // no URI needs an escape
};

// The context's record, made now if need be. Null if memory runs out, with SOAP_OUT_OF_MEMORY.
soap_namespace_scope *namespace_scope_of(soap *ctx);

// True if the row has a prefix of this length; false too when that isn't known.
inline bool namespace_prefix_has_length(const soap_namespace_scope *scope, const soap_namespace &row,
                                        std::size_t index, std::size_t length)
{
    return scope != nullptr && index < scope->row_count && scope->rows[index].prefix == row.prefix &&
           scope->lengths[index].prefix == length;
}

// xml_row_has_prefix with its usual case, a row of the working copy that was measured, decided in place.
inline bool namespace_row_has_prefix(const soap *ctx, int row, const char *prefix, std::size_t length)
{
    const soap_namespace *table = ctx->local_namespaces;
    if (table != nullptr &&
        namespace_prefix_has_length(ctx->namespace_scope, table[row], static_cast<std::size_t>(row), length))
        return same_name(table[row].prefix, prefix, length);
    return xml_row_has_prefix(ctx, row, prefix, length);
}

// True if no row of the working copy has received a URI, as far as that is known without a look at them.
inline bool namespace_copy_is_clean(const soap *ctx)
{
    const soap_namespace_scope *scope = ctx->namespace_scope;
    return scope != nullptr && scope->copy == ctx->local_namespaces && !scope->copy_received;
}

// The lengths of a row's texts, or null where the row isn't one of those described.
inline const namespace_lengths *namespace_row_lengths(const soap *ctx, std::size_t row)
{
    const soap_namespace_scope *scope = ctx->namespace_scope;
    const bool known = scope != nullptr && row < scope->row_count &&
                       scope->rows[row].uri == ctx->local_namespaces[row].uri &&
                       scope->rows[row].pattern == ctx->local_namespaces[row].pattern;
    return known ? &scope->lengths[row] : nullptr;
}

namespace scope_hash_detail {

template <class Word> std::uint64_t load(const char *bytes)
{
    Word word;
    std::memcpy(&word, bytes, sizeof word);
    return word;
}

// The last bytes of a name, all of it if it is short, as a number; where it takes two, they may overlap.
inline std::uint64_t tail_of(std::string_view name)
{
    const char *const end = name.data() + name.size();
    if (name.size() >= sizeof(std::uint64_t))
        return load<std::uint64_t>(end - sizeof(std::uint64_t));
    if (name.size() >= sizeof(std::uint32_t))
        return load<std::uint32_t>(name.data()) << 32 | load<std::uint32_t>(end - sizeof(std::uint32_t));
    std::uint64_t tail = 0;
    for (const char c : name)
        tail = tail << 8 | static_cast<unsigned char>(c);
    return tail;
}

} // namespace scope_hash_detail

// Hash of a name. The factor keeps a peer from choosing names that fall into one chain.
inline std::uint32_t scope_hash(const soap_namespace_scope *scope, std::string_view name)
{
    namespace detail = scope_hash_detail;
    const std::uint64_t factor = scope->hash_factor * UINT64_C(0x9E3779B97F4A7C15);
    std::uint64_t hash = name.size();
    for (std::size_t done = sizeof(std::uint64_t); done < name.size(); done += sizeof(std::uint64_t)) {
        hash = (hash ^ detail::load<std::uint64_t>(name.data() + done - sizeof(std::uint64_t))) * factor;
        hash ^= hash >> 32;
    }
    hash = (hash ^ detail::tail_of(name)) * factor;
    return static_cast<std::uint32_t>(hash ^ hash >> 32);
}

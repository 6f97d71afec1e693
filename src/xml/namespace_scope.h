// namespace_scope.h - what the prefix stack, the namespace table and the attribute table keep from call to
// call.
//
// Always: made at first use by namespace_scope_of, freed by soap_namespace_scope_free. The table part
// describes the rows whose addresses it remembers and is made anew when it meets other rows.
#pragma once

#include <cstddef>
#include <cstdint>

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

// Bytes in a row's own texts.
struct namespace_lengths {
    std::size_t prefix, uri;
    std::size_t pattern_head; // of the pattern, before its first "*" or "-"
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
    soap_namespace *spare_table; // room for row_count rows and their end; null while it is the working copy
    std::uint8_t tag_prefix;     // the reader's last tag: place of its prefix in soap::prefix_cache

    const soap_namespace *rows;       // copy of the rows described, without received URIs; owned with lengths
    const namespace_lengths *lengths; // of each row
    std::size_t row_count;
    char *declarations;            // the rows as attributes, in table order; null until first use
    std::size_t *declaration_ends; // bytes of `declarations` up to and with each row; in the same allocation
    bool declarations_plain;       // no URI needs an escape
};

// The context's record, made now if need be. Null if memory runs out, with error 20.
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

// The lengths of a row's texts, or null where the row isn't one of those described.
inline const namespace_lengths *namespace_row_lengths(const soap *ctx, std::size_t row)
{
    const soap_namespace_scope *scope = ctx->namespace_scope;
    const bool known = scope != nullptr && row < scope->row_count &&
                       scope->rows[row].uri == ctx->local_namespaces[row].uri &&
                       scope->rows[row].pattern == ctx->local_namespaces[row].pattern;
    return known ? &scope->lengths[row] : nullptr;
}

// namespace_scope.h - what the prefix stack and the namespace table keep from call to call.
//
// Always: made at first use by namespace_scope_of, freed by soap_namespace_scope_free. The table part
// describes the rows whose addresses it remembers and is made anew when it meets other rows.
#pragma once

#include <cstddef>
#include <cstdint>

#include <zuv_client_pro/soap.h>

constexpr std::size_t PREFIX_CHAINS = 256;      // power of two
constexpr std::size_t SPARE_PREFIXES_MAX = 256; // records kept for reuse
constexpr std::size_t SPARE_PREFIX_SIZE = 1024; // bytes of text; larger records are freed at once

struct soap_namespace_scope {
    soap_prefix *chains[PREFIX_CHAINS]; // innermost first
    std::uint32_t in_scope;             // records in the chains, which are those of soap::prefix_list
    std::uint32_t waiting;              // those of index 1 with a URI
    std::uint32_t hash_factor;          // odd, not known to a peer
    soap_prefix *spare;                 // linked by next
    std::size_t spare_count;

    const soap_namespace *rows; // copy of the rows described, without received URIs; owned with uri_lengths
    const std::size_t *uri_lengths; // bytes in each row's URI
    std::size_t row_count;
    char *declarations;            // the rows as attributes, in table order; null until first use
    std::size_t *declaration_ends; // bytes of `declarations` up to and with each row; in the same allocation
    bool declarations_plain;       // no URI needs an escape
};

// The context's record, made now if need be. Null if memory runs out, with error 20.
soap_namespace_scope *namespace_scope_of(soap *ctx);

// Bytes in a row's own URI.
std::size_t namespace_uri_length(const soap *ctx, std::size_t row);

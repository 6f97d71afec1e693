// namespace.h - the namespace table in use and the prefixes in scope, as the reader and the writer see them.
//
// Here: look-ups that the writer and the reader share. Elsewhere: the operations themselves (soap_xml.h).
#pragma once

#include <cstddef>
#include <string_view>

#include <zuv_client_pro/soap_xml.h>

constexpr const char *XML_NAMESPACE_URI = "http://www.w3.org/XML/1998/namespace";

// The innermost record of a prefix in scope, or null: as written, or where strings are Latin-1 in that too.
// Cost does not depend on how many are in scope.
soap_prefix *xml_prefix_find(const soap *ctx, std::string_view prefix);

// soap_prefix_push_in, with a terminated URI whose length is known.
soap_prefix *xml_prefix_declare(soap *ctx, std::string_view prefix, std::string_view uri);

// The element whose tag is read declares its default namespace to be that of a row that it is sure of: declarations
// of elements that have ended leave the stack, this one is on it, and the held tag, which has no prefix, is resolved.
// False, with the error set: no memory, or too many are in scope.
bool xml_default_redeclare(soap *ctx, std::int16_t row);

// The row takes declarations of its own URI whatever was received before; no other row does.
bool xml_row_is_sure(const soap *ctx, std::int16_t row);

// Row of a table's first `row` ones whose pattern takes the URI of the next, or the same URI: true if the row
// isn't the first that a declaration of its URI could be bound to.
bool xml_row_is_shadowed(const soap_namespace *rows, const struct namespace_lengths *lengths,
                         std::size_t row);

// Keeps a copy of `uri` as the one received for a row of the working copy; "" of encoding_style is renewed
// with it. An equal URI is not copied again. SOAP_OK or SOAP_OUT_OF_MEMORY.
int xml_received_set(soap *ctx, soap_namespace &row, const char *uri);
void xml_received_drop(soap *ctx, soap_namespace &row);

// The URI that a row stands for in the message under way: the one received, else its own; may be null.
inline const char *xml_row_uri(const soap_namespace &row)
{
    return row.received != nullptr ? row.received : row.uri;
}

// The declarations of the table's first rows as one stretch of attributes, ready to send after a root
// element's name.
//   rows_max  rows to look at
//   length    out, bytes
//   Owned by the context, valid until the table changes. Null if they cannot be had as one stretch: no table,
//   a URI was received in place of a row's own, a URI needs escapes, or memory ran out.
const char *xml_root_declarations(soap *ctx, std::size_t rows_max, std::size_t *length);

// Drops the records that are kept for the next message's root element; those in scope become ordinary ones.
void xml_root_forget(soap *ctx);

// Prefixes that wait to be declared by the element now being opened (records of index 1 with a URI).
std::size_t xml_prefixes_waiting(const soap *ctx);
// Marks a waiting record as declared by the current element, with whose end it goes out of scope.
void xml_prefix_declared(soap *ctx, soap_prefix *record);

// True if the blank-separated list names the prefix: by itself, or followed by a colon.
bool xml_list_names(const char *list, std::string_view prefix);

// Prefix of a QName, empty without a colon.
inline std::string_view xml_prefix_of(std::string_view name)
{
    const auto colon = name.find(':');
    return colon == std::string_view::npos ? std::string_view() : name.substr(0, colon);
}

// The rest of a QName, or all of it without a colon.
constexpr std::string_view xml_local_part(std::string_view name)
{
    const auto colon = name.find(':');
    return colon == std::string_view::npos ? name : name.substr(colon + 1);
}

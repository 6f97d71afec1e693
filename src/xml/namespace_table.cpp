// namespace_table.cpp - the context's working copy of the namespace table and the URIs received for its rows.
//
// Here: making, installing and dropping the copy, received URIs, the declarations of a root element.
// Elsewhere: prefixes in scope (namespace_prefix.cpp), what binds them (the same), the table's rows (the
// host).
//
// Always: a copy's prefix, URI and pattern texts are those of the host's table; its received URIs are its
// own.
#include <algorithm>
#include <cstring>
#include <utility>

#include <zuv_client_pro/soap_error.h>
#include <zuv_client_pro/soap_memory.h>

#include "core/failure.h"
#include "xml/attributes.h"
#include "xml/namespace.h"
#include "xml/namespace_scope.h"
#include "xml/xml_read.h"

namespace {

constexpr const char *SOAP_11_ENVELOPE = "http://schemas.xmlsoap.org/soap/envelope/";

std::size_t count_rows(const soap_namespace *table)
{
    std::size_t count = 0;
    while (table[count].prefix != nullptr)
        ++count;
    return count;
}

bool same_texts(const soap_namespace &one, const soap_namespace &other)
{
    return one.prefix == other.prefix && one.uri == other.uri && one.pattern == other.pattern;
}

// True if the table holds just the rows measured last time, none with a received URI. Of the working copy the
// size is known.
bool is_measured(const soap_namespace_scope *scope, const soap_namespace *table)
{
    if (scope == nullptr || scope->rows == nullptr)
        return false;
    const std::size_t count = scope->row_count;
    const bool as_long = table == scope->copy ? table[count].prefix == nullptr : count_rows(table) == count;
    return as_long && std::memcmp(scope->rows, table, count * sizeof *table) == 0;
}

void forget_rows(soap *ctx, soap_namespace_scope *scope)
{
    xml_root_forget(ctx);
    std::memset(scope->guesses, 0, sizeof scope->guesses); // they know prefixes of rows
    std::memset(scope->default_heads, 0, sizeof scope->default_heads);
    SOAP_FREE(ctx, scope->spare_table);
    scope->spare_table = nullptr;
    SOAP_FREE(ctx, scope->declarations);
    SOAP_FREE(ctx, const_cast<soap_namespace *>(scope->rows));
    scope->rows = nullptr;
    scope->lengths = nullptr;
    scope->row_count = 0;
    scope->declarations = nullptr;
}

// Enters the rows that no earlier one can take a declaration from. Those that don't fit are looked for in the
// table.
void index_uris(soap_namespace_scope *scope)
{
    std::memset(scope->uri_slots, 0, sizeof scope->uri_slots);
    for (std::size_t i = 0; i < std::min(scope->row_count, URI_SLOTS / 2); ++i) {
        if (scope->rows[i].uri == nullptr || xml_row_is_shadowed(scope->rows, scope->lengths, i))
            continue;
        std::uint32_t slot = scope_hash(scope, {scope->rows[i].uri, scope->lengths[i].uri}) % URI_SLOTS;
        while (scope->uri_slots[slot] != 0)
            slot = (slot + 1) % URI_SLOTS;
        scope->uri_slots[slot] = static_cast<std::uint8_t>(i + 1);
    }
}

// Measures the table's texts unless they are the ones measured last time.
int describe_rows(soap *ctx, const soap_namespace *table, std::size_t count)
{
    soap_namespace_scope *scope = namespace_scope_of(ctx);
    if (scope == nullptr)
        return ctx->error;
    if (scope->rows != nullptr && scope->row_count == count &&
        std::equal(table, table + count, scope->rows, same_texts))
        return SOAP_OK;
    forget_rows(ctx, scope);
    void *place = SOAP_MALLOC(ctx, (count + 1) * (sizeof(soap_namespace) + sizeof(namespace_lengths)));
    if (place == nullptr)
        return fail(ctx, SOAP_OUT_OF_MEMORY);
    auto *rows = static_cast<soap_namespace *>(place);
    auto *lengths = reinterpret_cast<namespace_lengths *>(rows + count + 1);
    for (std::size_t i = 0; i < count; ++i) {
        rows[i] = table[i];
        rows[i].received = nullptr;
        lengths[i] = {std::strlen(table[i].prefix), table[i].uri != nullptr ? std::strlen(table[i].uri) : 0,
                      table[i].pattern != nullptr ? std::strcspn(table[i].pattern, "*-") : 0};
    }
    scope->rows = rows;
    scope->lengths = lengths;
    scope->row_count = count;
    scope->version =
        count > 0 && rows[0].uri != nullptr && std::strcmp(rows[0].uri, SOAP_11_ENVELOPE) == 0 ? 1 : 2;
    index_uris(scope);
    return SOAP_OK;
}

bool is_declared(const soap_namespace &row)
{
    return row.prefix[0] != '\0' && row.uri != nullptr;
}

char *append(char *target, const char *text, std::size_t length)
{
    return std::copy_n(text, length, target);
}

// Composes the declarations of all rows; false if memory runs out.
bool compose_declarations(soap *ctx, soap_namespace_scope *scope)
{
    constexpr std::size_t FRAME = sizeof(" xmlns:=\"\"") - 1;
    std::size_t size = scope->row_count * sizeof(std::size_t);
    for (std::size_t i = 0; i < scope->row_count; ++i) {
        if (is_declared(scope->rows[i]))
            size += FRAME + std::strlen(scope->rows[i].prefix) + scope->lengths[i].uri;
    }
    auto *ends = static_cast<std::size_t *>(SOAP_MALLOC(ctx, size + 1));
    if (ends == nullptr)
        return false;
    scope->declaration_ends = ends;
    scope->declarations = reinterpret_cast<char *>(ends);
    scope->declarations_plain = true;
    char *const begin = reinterpret_cast<char *>(ends + scope->row_count);
    char *end = begin;
    for (std::size_t i = 0; i < scope->row_count; ++i) {
        const soap_namespace &row = scope->rows[i];
        if (is_declared(row)) {
            end = append(end, " xmlns:", 7);
            end = append(end, row.prefix, std::strlen(row.prefix));
            end = append(end, "=\"", 2);
            end = append(end, row.uri, scope->lengths[i].uri);
            end = append(end, "\"", 1);
            const auto is_plain = [](char c) { return c > ' ' && (std::strchr("\"&<", c) == nullptr); };
            if (!std::all_of(row.uri, row.uri + scope->lengths[i].uri, is_plain))
                scope->declarations_plain = false;
        }
        ends[i] = static_cast<std::size_t>(end - begin);
    }
    return true;
}

// Memory for a received URI of so many bytes. Null if memory runs out.
char *take_received(soap *ctx, std::size_t size)
{
    soap_namespace_scope *scope = ctx->namespace_scope;
    for (unsigned i = 0; scope != nullptr && size <= RECEIVED_SIZE && i < RECEIVED_KEPT; ++i) {
        if ((scope->received_used & 1U << i) != 0)
            continue;
        if (scope->received[i] == nullptr)
            scope->received[i] = static_cast<char *>(SOAP_MALLOC(ctx, RECEIVED_SIZE));
        if (scope->received[i] != nullptr)
            scope->received_used |= 1U << i;
        return scope->received[i];
    }
    return static_cast<char *>(SOAP_MALLOC(ctx, size));
}

void give_received(soap *ctx, char *received)
{
    soap_namespace_scope *scope = ctx->namespace_scope;
    for (unsigned i = 0; scope != nullptr && i < RECEIVED_KEPT; ++i) {
        if (scope->received[i] == received) {
            scope->received_used &= ~(1U << i);
            return;
        }
    }
    SOAP_FREE(ctx, received);
}

// Gives the rows of a new copy the URIs that the host's rows have received. 0 or 20.
int copy_received(soap *ctx, soap_namespace *rows, std::size_t count)
{
    std::for_each(rows, rows + count, [](soap_namespace &row) { row.received = nullptr; });
    for (std::size_t i = 0; i < count; ++i) {
        const char *received = ctx->namespaces[i].received;
        if (received != nullptr && xml_received_set(ctx, rows[i], received))
            return ctx->error;
    }
    return SOAP_OK;
}

// A row is about to get another URI: declarations of the held element that are bound to it become
// attributes while their URI is still known. 0 or 20.
int keep_declared(soap *ctx, const soap_namespace &row, const char *uri)
{
    const char *const before = xml_row_uri(row);
    if (before != nullptr && uri != nullptr && std::strcmp(before, uri) == 0)
        return SOAP_OK;
    const soap_prefix *record = ctx->prefix_list;
    for (std::uint32_t left = ctx->bare_declarations; left > 0 && record != nullptr; --left) {
        if (record->index >= 0 && &ctx->local_namespaces[record->index] == &row)
            return xml_attributes_complete(ctx);
        record = record->next;
    }
    return SOAP_OK;
}

} // namespace

soap_namespace_scope *namespace_scope_of(soap *ctx)
{
    if (ctx->namespace_scope != nullptr)
        return ctx->namespace_scope;
    void *place = SOAP_MALLOC(ctx, sizeof(soap_namespace_scope));
    if (place == nullptr)
        return fail_null(ctx, SOAP_OUT_OF_MEMORY);
    std::memset(place, 0, sizeof(soap_namespace_scope));
    ctx->namespace_scope = static_cast<soap_namespace_scope *>(place);
    // Addresses differ from process to process, which is enough to keep prefixes from being chosen to
    // collide.
    const auto address = reinterpret_cast<std::uintptr_t>(place);
    ctx->namespace_scope->hash_factor = static_cast<std::uint32_t>((address >> 4) * 2654435761U) | 1U;
    return ctx->namespace_scope;
}

void soap_namespace_scope_free(soap *ctx)
{
    soap_namespace_scope *scope = ctx->namespace_scope;
    if (scope == nullptr)
        return;
    soap_prefix_stack_reset(ctx);
    xml_root_forget(ctx);
    while (scope->spare != nullptr) {
        soap_prefix *next = scope->spare->next;
        SOAP_FREE(ctx, scope->spare);
        scope->spare = next;
    }
    xml_attributes_drop(ctx);
    while (scope->spare_attributes != nullptr) {
        soap_attribute *next = scope->spare_attributes->next;
        xml_attribute_free(ctx, scope->spare_attributes);
        scope->spare_attributes = next;
    }
    forget_rows(ctx, scope);
    for (char *block : scope->received)
        SOAP_FREE(ctx, block);
    SOAP_FREE(ctx, scope);
    ctx->namespace_scope = nullptr;
}

int soap_namespace_table_copy(soap *ctx)
{
    if (ctx->local_namespaces != nullptr || ctx->namespaces == nullptr)
        return SOAP_OK;
    const bool measured = is_measured(ctx->namespace_scope, ctx->namespaces);
    const std::size_t count = measured ? ctx->namespace_scope->row_count : count_rows(ctx->namespaces);
    if (!measured && describe_rows(ctx, ctx->namespaces, count))
        return ctx->error;
    soap_namespace *rows = std::exchange(ctx->namespace_scope->spare_table, nullptr);
    if (rows == nullptr)
        rows = static_cast<soap_namespace *>(SOAP_MALLOC(ctx, (count + 1) * sizeof(soap_namespace)));
    if (rows == nullptr)
        return fail(ctx, SOAP_OUT_OF_MEMORY);
    std::copy_n(ctx->namespaces, count + 1, rows);
    ctx->local_namespaces = rows;
    ctx->namespace_scope->copy = rows;
    ctx->namespace_scope->copy_received = false;
    rows[count].received = nullptr;
    if (!measured && copy_received(ctx, rows, count)) {
        soap_namespace_table_drop(ctx);
        return ctx->error;
    }
    if (count > 0)
        ctx->soap_version = ctx->namespace_scope->version;
    return SOAP_OK;
}

void soap_namespace_table_drop(soap *ctx)
{
    if (ctx->local_namespaces == nullptr)
        return;
    soap_namespace *row = ctx->local_namespaces;
    if (ctx->encoding_style == nullptr && namespace_copy_is_clean(ctx))
        row += ctx->namespace_scope->row_count; // nothing to do for any of them
    for (; row->prefix != nullptr; ++row) {
        // The style was taken from the table in place of "" and may be another one in the next message.
        if (ctx->encoding_style != nullptr && ctx->encoding_style == row->uri)
            ctx->encoding_style = "";
        xml_received_drop(ctx, *row);
    }
    soap_namespace_scope *scope = ctx->namespace_scope;
    if (scope != nullptr)
        scope->copy = nullptr;
    if (scope != nullptr && scope->spare_table == nullptr &&
        scope->row_count == static_cast<std::size_t>(row - ctx->local_namespaces))
        scope->spare_table = ctx->local_namespaces;
    else
        SOAP_FREE(ctx, ctx->local_namespaces);
    ctx->local_namespaces = nullptr;
}

int soap_set_namespaces(soap *ctx, const soap_namespace *table)
{
    // A working copy can't serve as the table that it is copied from.
    if (table == nullptr || table != ctx->local_namespaces) {
        ctx->namespaces = table;
        soap_namespace_table_drop(ctx);
    }
    return soap_namespace_table_copy(ctx);
}

int xml_received_set(soap *ctx, soap_namespace &row, const char *uri)
{
    if (row.received != nullptr && std::strcmp(row.received, uri) == 0)
        return SOAP_OK;
    if (keep_declared(ctx, row, uri) != 0)
        return ctx->error;
    const std::size_t size = std::strlen(uri) + 1;
    char *copy = take_received(ctx, size);
    if (copy == nullptr)
        return fail(ctx, SOAP_OUT_OF_MEMORY);
    std::memcpy(copy, uri, size);
    xml_received_drop(ctx, row);
    row.received = copy;
    if (ctx->namespace_scope != nullptr)
        ctx->namespace_scope->copy_received = true;
    return SOAP_OK;
}

void xml_received_drop(soap *ctx, soap_namespace &row)
{
    if (row.received == nullptr)
        return;
    keep_declared(ctx, row, row.uri); // without memory the attribute shows the row's next URI
    if (ctx->encoding_style == row.received)
        ctx->encoding_style = "";
    give_received(ctx, row.received);
    row.received = nullptr;
}

const char *xml_root_declarations(soap *ctx, std::size_t rows_max, std::size_t *length)
{
    soap_namespace_scope *scope = ctx->namespace_scope;
    const soap_namespace *table = ctx->local_namespaces;
    if (scope == nullptr || table == nullptr)
        return nullptr;
    if (!is_measured(scope, table))
        return nullptr;
    if (scope->declarations == nullptr && !compose_declarations(ctx, scope))
        return nullptr;
    if (!scope->declarations_plain)
        return nullptr;
    const std::size_t rows = std::min(rows_max, scope->row_count);
    *length = rows > 0 ? scope->declaration_ends[rows - 1] : 0;
    return reinterpret_cast<const char *>(scope->declaration_ends + scope->row_count);
}

// namespace_prefix.cpp - the prefixes in scope, for the writer and the reader alike.
//
// Here: pushing, finding and popping, and the binding of declared URIs to rows of the namespace table.
// Elsewhere: the table (namespace_table.cpp), which element declares what (xml_write.cpp, xml_read.cpp).
//
// Always: soap::prefix_list and the hash chains hold the same records in the same order, so that the head of
// the list is the head of its chain. Records own their texts and are recycled.
#include <algorithm>
#include <cstring>
#include <limits>

#include <zuv_client_pro/soap_error.h>
#include <zuv_client_pro/soap_memory.h>

#include "core/failure.h"
#include "xml/namespace.h"
#include "xml/namespace_scope.h"
#include "xml/tag_view.h"
#include "xml/utf8.h"

namespace {

constexpr std::int16_t DECLARED = 0;   // in scope, not written yet in canonical output
constexpr std::int16_t TO_DECLARE = 1; // the element being opened declares it
constexpr std::int16_t WRITTEN = 2;
constexpr std::int16_t UNBOUND = -1;
constexpr std::size_t USUAL_TEXTS = 128; // bytes of text in a new record

std::uint16_t chain_of(const soap_namespace_scope *scope, std::string_view prefix)
{
    return static_cast<std::uint16_t>(scope_hash(scope, prefix) % PREFIX_CHAINS);
}

bool waits(const soap_prefix *record)
{
    return record->index == TO_DECLARE && record->uri != nullptr;
}

soap_prefix *take_spare(soap_namespace_scope *scope, std::size_t texts)
{
    soap_prefix *record = scope->spare;
    if (record == nullptr || record->capacity < texts)
        return nullptr;
    scope->spare = record->next;
    --scope->spare_count;
    return record;
}

soap_prefix *make_record(soap *ctx, std::size_t texts)
{
    texts = std::max(texts, USUAL_TEXTS);
    if (texts > std::numeric_limits<std::uint32_t>::max())
        return fail_null(ctx, SOAP_LENGTH);
    auto *record = static_cast<soap_prefix *>(SOAP_MALLOC(ctx, offsetof(soap_prefix, prefix) + texts));
    if (record == nullptr)
        return fail_null(ctx, SOAP_OUT_OF_MEMORY);
    record->capacity = static_cast<std::uint32_t>(texts);
    return record;
}

void drop_record(soap *ctx, soap_namespace_scope *scope, soap_prefix *record)
{
    if (scope->spare_count >= SPARE_PREFIXES_MAX || record->capacity > SPARE_PREFIX_SIZE) {
        SOAP_FREE(ctx, record);
        return;
    }
    record->next = scope->spare;
    scope->spare = record;
    ++scope->spare_count;
}

// The remembered records that no message has in scope leave the chains.
void drop_remembered(soap *ctx, soap_namespace_scope *scope)
{
    while (soap_prefix *record = scope->root.first) {
        scope->root.first = scope->root.count > 1 ? record->next : nullptr;
        --scope->root.count;
        scope->chains[record->hash] = nullptr;
        drop_record(ctx, scope, record);
    }
    scope->root.length = 0;
    xml_prefix_rows_forget(ctx);
}

// Puts a prefix on the stack at the current depth. `uri` may be null; it is terminated.
soap_prefix *push(soap *ctx, std::string_view prefix, const char *uri, std::size_t uri_length,
                  std::int16_t index)
{
    soap_namespace_scope *scope = namespace_scope_of(ctx);
    if (scope == nullptr)
        return nullptr;
    if (scope->in_scope >= SOAP_PREFIXES_MAX || prefix.size() > std::numeric_limits<std::uint16_t>::max())
        return fail_null(ctx, SOAP_LENGTH);
    if (ctx->prefix_list == nullptr && scope->root.first != nullptr)
        drop_remembered(ctx, scope);
    const std::size_t uri_size = uri != nullptr ? uri_length + 1 : 0;
    const std::size_t texts = prefix.size() + 1 + uri_size;
    soap_prefix *record = take_spare(scope, texts);
    if (record == nullptr && (record = make_record(ctx, texts)) == nullptr)
        return nullptr;
    char *place = record->prefix;
    place = std::copy(prefix.begin(), prefix.end(), place);
    *place++ = '\0';
    record->uri = uri != nullptr ? static_cast<const char *>(std::memcpy(place, uri, uri_size)) : nullptr;
    record->prefix_length = static_cast<std::uint16_t>(prefix.size());
    record->level = ctx->nesting_level;
    record->index = index;
    record->hash = chain_of(scope, prefix);
    record->chain = scope->chains[record->hash];
    scope->chains[record->hash] = record;
    record->next = ctx->prefix_list;
    ctx->prefix_list = record;
    ++scope->in_scope;
    xml_prefix_rows_forget(ctx);
    if (uri != nullptr && index == TO_DECLARE)
        ++scope->waiting;
    return record;
}

void pop_head(soap *ctx)
{
    soap_namespace_scope *scope = ctx->namespace_scope;
    soap_prefix *record = ctx->prefix_list;
    if (record == scope->root.first) { // the remembered ones stay together in their chains
        ctx->prefix_list = nullptr;
        scope->in_scope = 0;
        ctx->tag_resolved = false;
        return;
    }
    ctx->prefix_list = record->next;
    scope->chains[record->hash] = record->chain;
    --scope->in_scope;
    xml_prefix_rows_forget(ctx);
    if (scope->waiting > 0 && waits(record))
        --scope->waiting;
    drop_record(ctx, scope, record);
}

// The record, which may be null, is of an element that has ended.
bool ends(const soap *ctx, const soap_prefix *record)
{
    return record != nullptr && record->level >= ctx->nesting_level;
}

bool is_canonical(const soap *ctx)
{
    return (ctx->mode & MODE_CANONICAL) != 0;
}

bool same_uri(const char *one, const char *other)
{
    return one != nullptr && other != nullptr && std::strcmp(one, other) == 0;
}

bool is_row_uri(const soap_namespace &row, const namespace_lengths *lengths, std::string_view uri)
{
    return row.uri != nullptr && (lengths == nullptr || lengths->uri == uri.size()) && uri == row.uri;
}

// The patterns of a table share long prefixes: the last letter before the mark differs in most.
bool fits_pattern(const soap_namespace &row, const namespace_lengths *lengths, std::string_view uri)
{
    if (row.pattern == nullptr)
        return false;
    if (lengths != nullptr && lengths->pattern_head > 0) {
        constexpr char CASE = 'a' - 'A';
        const std::size_t last = lengths->pattern_head - 1;
        if (last >= uri.size() || (uri[last] | CASE) != (row.pattern[last] | CASE))
            return false;
    }
    return soap_tag_match(uri.data(), row.pattern) == 0;
}

// Row that a URI is bound to in any case, or UNBOUND if that depends on what was received.
std::int16_t sure_row(const soap *ctx, std::string_view uri)
{
    const soap_namespace_scope *scope = ctx->namespace_scope;
    if (scope == nullptr || scope->row_count == 0)
        return UNBOUND;
    std::uint32_t slot = scope_hash(scope, uri) % URI_SLOTS;
    for (; scope->uri_slots[slot] != 0; slot = (slot + 1) % URI_SLOTS) {
        const std::size_t row = scope->uri_slots[slot] - 1U;
        const namespace_lengths *lengths = namespace_row_lengths(ctx, row);
        if (lengths != nullptr && lengths->uri == uri.size() &&
            same_name(scope->rows[row].uri, uri.data(), uri.size()))
            return static_cast<std::int16_t>(row);
    }
    return UNBOUND;
}

// Row of the working copy that a declared URI belongs to, or UNBOUND. False if memory runs out.
bool bind_uri(soap *ctx, std::string_view text, std::int16_t *index)
{
    *index = UNBOUND;
    if (ctx->local_namespaces == nullptr)
        return true;
    *index = sure_row(ctx, text);
    if (*index != UNBOUND) {
        xml_received_drop(ctx, ctx->local_namespaces[*index]);
        return true;
    }
    for (std::size_t i = 0; ctx->local_namespaces[i].prefix != nullptr; ++i) {
        soap_namespace &row = ctx->local_namespaces[i];
        const namespace_lengths *lengths = namespace_row_lengths(ctx, i);
        if (is_row_uri(row, lengths, text)) {
            xml_received_drop(ctx, row);
        } else if (row.received != nullptr) {
            if (text != row.received)
                continue;
        } else {
            if (!fits_pattern(row, lengths, text))
                continue;
            if (xml_received_set(ctx, row, text.data()))
                return false;
        }
        *index = static_cast<std::int16_t>(i);
        return true;
    }
    return true;
}

soap_prefix *find(const soap *ctx, std::string_view prefix)
{
    soap_prefix *record = ctx->namespace_scope->chains[chain_of(ctx->namespace_scope, prefix)];
    while (record != nullptr && (record->prefix_length != prefix.size() ||
                                 !same_name(record->prefix, prefix.data(), prefix.size())))
        record = record->chain;
    return record;
}

// The record of a prefix out of a text of Latin-1; declared ones are UTF-8.
soap_prefix *find_latin1(const soap *ctx, std::string_view prefix)
{
    char text[SOAP_TEXT_SIZE];
    std::size_t length = 0;
    bool is_ascii = true;
    for (const char c : prefix) {
        char bytes[6];
        const std::size_t size = utf8_encode(static_cast<unsigned char>(c), bytes);
        if (size > sizeof text - length)
            return nullptr;
        std::memcpy(text + length, bytes, size);
        length += size;
        is_ascii = is_ascii && size == 1;
    }
    return is_ascii ? nullptr : find(ctx, {text, length});
}

} // namespace

bool xml_list_names(const char *list, std::string_view prefix)
{
    std::string_view rest(list);
    while (!rest.empty()) {
        const std::size_t end = std::min(rest.find_first_of(" \t\r\n"), rest.size());
        std::string_view word = rest.substr(0, end);
        if (word.ends_with(':'))
            word.remove_suffix(1);
        if (end > 0 && word == prefix)
            return true;
        rest.remove_prefix(std::min(end + 1, rest.size()));
    }
    return false;
}

soap_prefix *xml_prefix_find(const soap *ctx, std::string_view prefix)
{
    if (ctx->prefix_list == nullptr)
        return nullptr;
    soap_prefix *const record = find(ctx, prefix);
    return record != nullptr || (ctx->mode & MODE_UTF_STRINGS) ? record : find_latin1(ctx, prefix);
}

std::size_t xml_prefixes_waiting(const soap *ctx)
{
    return ctx->namespace_scope != nullptr ? ctx->namespace_scope->waiting : 0;
}

void xml_prefix_declared(soap *ctx, soap_prefix *record)
{
    record->index = WRITTEN;
    record->level = ctx->nesting_level;
    --ctx->namespace_scope->waiting;
}

int soap_prefix_push_out(soap *ctx, const char *prefix, const char *uri, int state)
{
    if (is_canonical(ctx) && ctx->canonical_exclude != nullptr &&
        xml_list_names(ctx->canonical_exclude, prefix))
        return SOAP_OK;
    if (state == DECLARED) {
        const soap_prefix *known = xml_prefix_find(ctx, prefix);
        if (known != nullptr && (known->uri == nullptr || same_uri(known->uri, uri))) {
            const bool declared_here = known->uri != nullptr && known->level >= ctx->nesting_level;
            if (declared_here || known->index != TO_DECLARE)
                return SOAP_OK;
        }
        // Known without a URI: the element has used it and now says what it stands for. Known with another
        // URI: the element gives the prefix a new meaning, which must be written here to hold.
        if (known != nullptr)
            state = TO_DECLARE;
    }
    const std::size_t length = uri != nullptr ? std::strlen(uri) : 0;
    return push(ctx, prefix, uri, length, static_cast<std::int16_t>(state)) != nullptr ? 0 : ctx->error;
}

int soap_prefix_use(soap *ctx, const char *name)
{
    const std::string_view prefix = xml_prefix_of(name);
    const soap_prefix *known = xml_prefix_find(ctx, prefix);
    if (known != nullptr ? known->index != DECLARED : prefix.starts_with("xml"))
        return SOAP_OK;
    if (is_canonical(ctx) && ctx->canonical_exclude != nullptr && !prefix.empty() &&
        xml_list_names(ctx->canonical_exclude, prefix))
        return SOAP_OK;
    const char *uri = known != nullptr ? known->uri : nullptr;
    const std::size_t length = uri != nullptr ? std::strlen(uri) : 0;
    return push(ctx, prefix, uri, length, TO_DECLARE) != nullptr ? 0 : ctx->error;
}

soap_prefix *xml_prefix_declare(soap *ctx, std::string_view prefix, std::string_view uri)
{
    std::int16_t index = UNBOUND;
    if (!bind_uri(ctx, uri, &index))
        return nullptr;
    return push(ctx, prefix, index == UNBOUND ? uri.data() : nullptr, uri.size(), index);
}

bool xml_row_is_sure(const soap *ctx, std::int16_t row)
{
    const namespace_lengths *lengths =
        row >= 0 ? namespace_row_lengths(ctx, static_cast<std::size_t>(row)) : nullptr;
    return lengths != nullptr && sure_row(ctx, {ctx->local_namespaces[row].uri, lengths->uri}) == row;
}

bool xml_default_redeclare(soap *ctx, std::int16_t row)
{
    const soap_namespace_scope *scope = ctx->namespace_scope;
    while (ends(ctx, ctx->prefix_list) && ends(ctx, ctx->prefix_list->next))
        pop_head(ctx);
    soap_prefix *head = ctx->prefix_list;
    const bool stays = ends(ctx, head) && head != scope->root.first && head->prefix_length == 0 &&
                       head->index == row && head->uri == nullptr;
    if (stays) { // of the element before, which declared the same
        head->level = ctx->nesting_level;
    } else {
        if (ends(ctx, head))
            pop_head(ctx);
        if (push(ctx, {}, nullptr, 0, row) == nullptr)
            return false;
    }
    ctx->bare_declarations = 1;
    xml_tag_has_default(ctx, row);
    return true;
}

soap_prefix *soap_prefix_push_in(soap *ctx, const char *prefix, const char *uri)
{
    return xml_prefix_declare(ctx, prefix, uri);
}

void xml_root_forget(soap *ctx)
{
    soap_namespace_scope *scope = ctx->namespace_scope;
    if (scope == nullptr)
        return;
    if (ctx->prefix_list == nullptr)
        drop_remembered(ctx, scope);
    scope->root.first = nullptr; // in scope: ordinary records from now on
    scope->root.count = 0;
    scope->root.length = 0;
}

bool xml_row_is_shadowed(const soap_namespace *rows, const namespace_lengths *lengths, std::size_t row)
{
    const std::string_view uri = rows[row].uri;
    for (std::size_t i = 0; i < row; ++i) {
        if (is_row_uri(rows[i], &lengths[i], uri) || fits_pattern(rows[i], &lengths[i], uri))
            return true;
    }
    return false;
}

void soap_prefix_pop(soap *ctx)
{
    ctx->bare_declarations = 0;
    while (ends(ctx, ctx->prefix_list))
        pop_head(ctx);
}

void soap_prefix_stack_reset(soap *ctx)
{
    ctx->bare_declarations = 0;
    while (ctx->prefix_list != nullptr)
        pop_head(ctx);
}

const char *soap_namespace_of(soap *ctx, const char *name)
{
    const std::string_view prefix = xml_prefix_of(name);
    const soap_prefix *record = xml_prefix_find(ctx, prefix);
    if (record != nullptr && record->uri != nullptr)
        return record->uri;
    if (record != nullptr && record->index >= 0 && ctx->local_namespaces != nullptr)
        return xml_row_uri(ctx->local_namespaces[record->index]);
    if (prefix == "xml")
        return XML_NAMESPACE_URI;
    return prefix.empty() ? nullptr : fail_null(ctx, SOAP_NAMESPACE_ERROR);
}

// attributes.cpp - the attribute table: attributes that wait for the start tag they belong to.
//
// Here: records, setting, resetting. Elsewhere: writing them out (xml_write.cpp), reading them from a start
// tag (xml_read.cpp).
//
// Always: soap::attributes_set counts the records that the writer has made visible, so that a start tag
// without attributes does not look at the table.
#include <algorithm>
#include <cstring>
#include <limits>

#include <zuv_client_pro/soap_error.h>
#include <zuv_client_pro/soap_memory.h>
#include <zuv_client_pro/soap_xml.h>

#include "core/failure.h"
#include "xml/attributes.h"
#include "xml/namespace_scope.h"

namespace {

// Names of attributes are few, but generated prefixes (xmlns:_1, xmlns:_2, ...) and what a peer may send are
// without end: past this number of records one that is idle takes another name.
constexpr std::size_t RECORDS_BEFORE_RENAMING = 256;
constexpr std::size_t USUAL_VALUE = 64; // bytes of a first value buffer
constexpr std::size_t USUAL_NAME = 64;  // bytes for the name in a new record

soap_attribute *&chain_of(soap_namespace_scope *scope, std::uint32_t hash)
{
    return scope->attribute_chains[hash % ATTRIBUTE_CHAINS];
}

soap_attribute *find(soap_attribute *chain, std::uint32_t hash, std::string_view name)
{
    while (chain != nullptr && (chain->hash != hash || chain->name_length != name.size() ||
                                !same_name(chain->name, name.data(), name.size())))
        chain = chain->chain;
    return chain;
}

// A plug-in that signs the element finds its id here.
void announce_wsu_id(soap *ctx, const char *value)
{
    ctx->wsu_id_flag = 1;
    const std::size_t length = std::min(std::strlen(value), SOAP_TEXT_SIZE - 1);
    std::memcpy(ctx->element_id, value, length);
    ctx->element_id[length] = '\0';
}

soap_attribute *take_spare(soap_namespace_scope *scope, std::size_t name_size)
{
    if (scope->spare_attributes == nullptr || name_size > USUAL_NAME)
        return nullptr;
    soap_attribute *record = scope->spare_attributes;
    scope->spare_attributes = record->next;
    --scope->spare_attribute_count;
    return record;
}

soap_attribute *allocate(soap *ctx, std::size_t name_size)
{
    name_size = std::max(name_size, USUAL_NAME);
    if (name_size > std::numeric_limits<std::uint32_t>::max())
        return nullptr;
    auto *record =
        static_cast<soap_attribute *>(SOAP_MALLOC(ctx, offsetof(soap_attribute, name) + name_size));
    if (record != nullptr) {
        record->name_size = static_cast<std::uint32_t>(name_size);
        record->value = nullptr;
        record->size = 0;
    }
    return record;
}

// Keeps the record for reuse or frees it.
void drop(soap *ctx, soap_namespace_scope *scope, soap_attribute *record)
{
    if (scope->spare_attribute_count >= SPARE_ATTRIBUTES_MAX || record->name_size != USUAL_NAME ||
        record->size > SPARE_ATTRIBUTE_SIZE) {
        xml_attribute_free(ctx, record);
        return;
    }
    record->next = scope->spare_attributes;
    scope->spare_attributes = record;
    ++scope->spare_attribute_count;
}

// Takes the next idle record out of its chain. There must be one.
soap_attribute *take_idle(soap_namespace_scope *scope)
{
    for (;; scope->attribute_reuse = (scope->attribute_reuse + 1) % ATTRIBUTE_CHAINS) {
        soap_attribute **link = &scope->attribute_chains[scope->attribute_reuse];
        while (*link != nullptr && (*link)->visible != 0)
            link = &(*link)->chain;
        if (soap_attribute *record = *link) {
            *link = record->chain;
            --scope->attribute_count;
            return record;
        }
    }
}

// A record outside the chains for a name of this size, its terminator included. Null if memory runs out.
soap_attribute *make_record(soap *ctx, soap_namespace_scope *scope, std::size_t name_size)
{
    if (scope->attribute_count >= RECORDS_BEFORE_RENAMING &&
        scope->attribute_count > scope->attributes_visible) {
        soap_attribute *idle = take_idle(scope);
        if (idle->name_size >= name_size)
            return idle;
        xml_attribute_free(ctx, idle);
    }
    soap_attribute *spare = take_spare(scope, name_size);
    return spare != nullptr ? spare : allocate(ctx, name_size);
}

} // namespace

soap_attribute *xml_attribute_record(soap *ctx, std::string_view name)
{
    soap_namespace_scope *scope = namespace_scope_of(ctx);
    if (scope == nullptr)
        return nullptr;
    const std::uint32_t hash = scope_hash(scope, name);
    if (soap_attribute *known = find(chain_of(scope, hash), hash, name))
        return known;
    soap_attribute *record = make_record(ctx, scope, name.size() + 1);
    if (record == nullptr)
        return fail_null(ctx, SOAP_OUT_OF_MEMORY);
    record->escape = 0;
    record->uri = nullptr;
    record->visible = 0;
    record->hash = hash;
    *std::copy(name.begin(), name.end(), record->name) = '\0';
    record->name_length = static_cast<std::uint32_t>(name.size());
    record->chain = chain_of(scope, hash);
    chain_of(scope, hash) = record;
    ++scope->attribute_count;
    return record;
}

void xml_attribute_show(soap *ctx, soap_attribute **link, soap_attribute *record, int visible)
{
    record->visible = static_cast<std::int16_t>(visible);
    record->next = *link;
    *link = record;
    ++ctx->namespace_scope->attributes_visible;
}

void xml_attributes_hide(soap *ctx)
{
    for (soap_attribute *record = ctx->attribute_list; record != nullptr; record = record->next)
        record->visible = 0;
    ctx->attribute_list = nullptr;
    ctx->attributes_set = 0;
    if (ctx->namespace_scope != nullptr)
        ctx->namespace_scope->attributes_visible = 0;
}

int xml_attribute_reserve(soap *ctx, soap_attribute *record, std::size_t size)
{
    if (record->size >= size)
        return SOAP_OK;
    size = std::max(size, USUAL_VALUE);
    SOAP_FREE(ctx, record->value);
    record->size = 0;
    record->value = static_cast<char *>(SOAP_MALLOC(ctx, size));
    if (record->value == nullptr)
        return fail(ctx, SOAP_OUT_OF_MEMORY);
    record->size = size;
    return SOAP_OK;
}

int xml_attribute_store(soap *ctx, soap_attribute *record, std::string_view value)
{
    if (xml_attribute_reserve(ctx, record, value.size() + 1))
        return ctx->error;
    *std::copy(value.begin(), value.end(), record->value) = '\0';
    return SOAP_OK;
}

void xml_attribute_free(soap *ctx, soap_attribute *record)
{
    SOAP_FREE(ctx, record->value);
    SOAP_FREE(ctx, record);
}

void xml_attributes_drop(soap *ctx)
{
    xml_attributes_hide(ctx);
    soap_namespace_scope *scope = ctx->namespace_scope;
    if (scope == nullptr || scope->attribute_count == 0)
        return;
    for (soap_attribute *&chain : scope->attribute_chains) {
        while (soap_attribute *record = chain) {
            chain = record->chain;
            drop(ctx, scope, record);
        }
    }
    scope->attribute_count = 0;
}

int soap_attr_set(soap *ctx, const char *name, const char *value, int escape)
{
    if (*name == '-')
        return SOAP_OK;
    soap_attribute *record = xml_attribute_record(ctx, name);
    if (record != nullptr && record->visible != 0)
        return SOAP_OK;
    if (ctx->attributes_set == std::numeric_limits<std::int16_t>::max())
        return fail(ctx, SOAP_LENGTH);
    if (record == nullptr || (value != nullptr && xml_attribute_store(ctx, record, value)))
        return ctx->error;
    record->escape = static_cast<std::int16_t>(escape);
    xml_attribute_show(ctx, &ctx->attribute_list, record, value != nullptr ? 2 : 1);
    ++ctx->attributes_set;
    if (value != nullptr && std::strcmp(name, "wsu:Id") == 0)
        announce_wsu_id(ctx, value);
    return SOAP_OK;
}

void soap_attr_table_reset(soap *ctx)
{
    if (ctx->mode & MODE_CANONICAL)
        xml_attributes_drop(ctx);
    else
        xml_attributes_hide(ctx);
}

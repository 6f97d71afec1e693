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

#include "codec/attributes.h"
#include "codec/namespace_scope.h"

namespace {

// Names of attributes are few, but generated prefixes (xmlns:_1, xmlns:_2, ...) are without end: past this
// number of records one that is idle takes another name.
constexpr std::size_t RECORDS_BEFORE_RENAMING = 64;
constexpr std::size_t USUAL_VALUE = 64; // bytes of a first value buffer
constexpr std::size_t USUAL_NAME = 64;  // room for a name in a new record, bytes

// What a search of the table found: links that lead to the records.
struct place_of_name {
    soap_attribute **named = nullptr;     // the record of this name
    soap_attribute **renamable = nullptr; // an idle one with room for the name
    std::size_t records = 0;
};

place_of_name search(soap *ctx, std::string_view name)
{
    place_of_name found;
    for (soap_attribute **link = &ctx->attribute_list; *link; link = &(*link)->next) {
        ++found.records;
        if (xml_attribute_name(*link) == name) {
            found.named = link;
            return found;
        }
        if ((*link)->visible == 0 && (*link)->name_size > name.size())
            found.renamable = link;
    }
    return found;
}

void move_to_front(soap *ctx, soap_attribute **link)
{
    soap_attribute *record = *link;
    *link = record->next;
    record->next = ctx->attribute_list;
    ctx->attribute_list = record;
}

void rename(soap_attribute *record, std::string_view name)
{
    *std::copy(name.begin(), name.end(), record->name) = '\0';
    record->name_length = static_cast<std::uint32_t>(name.size());
}

// The idle record that is to hold the attribute, at the front of the table.
soap_attribute *idle_record(soap *ctx, const place_of_name &found, std::string_view name)
{
    if (found.named) {
        move_to_front(ctx, found.named);
        return ctx->attribute_list;
    }
    if (found.renamable && found.records >= RECORDS_BEFORE_RENAMING) {
        move_to_front(ctx, found.renamable);
        rename(ctx->attribute_list, name);
        return ctx->attribute_list;
    }
    return xml_attribute_make(ctx, name);
}

// A plug-in that signs the element finds its id here.
void announce_wsu_id(soap *ctx, const char *value)
{
    ctx->wsu_id_flag = 1;
    const std::size_t length = std::min(std::strlen(value), SOAP_TEXT_SIZE - 1);
    std::memcpy(ctx->element_id, value, length);
    ctx->element_id[length] = '\0';
}

soap_attribute *take_spare(soap *ctx, std::size_t name_size)
{
    soap_namespace_scope *scope = ctx->namespace_scope;
    if (!scope || !scope->spare_attributes || name_size > USUAL_NAME)
        return nullptr;
    soap_attribute *record = scope->spare_attributes;
    scope->spare_attributes = record->next;
    --scope->spare_attribute_count;
    return record;
}

// A record without a value. Null if memory runs out.
soap_attribute *allocate(soap *ctx, std::size_t name_size)
{
    name_size = std::max(name_size, USUAL_NAME);
    if (name_size > std::numeric_limits<std::uint32_t>::max())
        return nullptr;
    auto *record =
        static_cast<soap_attribute *>(SOAP_MALLOC(ctx, offsetof(soap_attribute, name) + name_size));
    if (record) {
        record->name_size = static_cast<std::uint32_t>(name_size);
        record->value = nullptr;
        record->size = 0;
    }
    return record;
}

} // namespace

soap_attribute *xml_attribute_make(soap *ctx, std::string_view name)
{
    soap_attribute *record = take_spare(ctx, name.size() + 1);
    if (!record && !(record = allocate(ctx, name.size() + 1))) {
        ctx->error = SOAP_OUT_OF_MEMORY;
        return nullptr;
    }
    record->escape = 0;
    record->uri = nullptr;
    record->visible = 0;
    rename(record, name);
    record->next = ctx->attribute_list;
    ctx->attribute_list = record;
    return record;
}

int xml_attribute_room(soap *ctx, soap_attribute *record, std::size_t size)
{
    if (record->size >= size)
        return 0;
    size = std::max(size, USUAL_VALUE);
    SOAP_FREE(ctx, record->value);
    record->size = 0;
    record->value = static_cast<char *>(SOAP_MALLOC(ctx, size));
    if (!record->value)
        return ctx->error = SOAP_OUT_OF_MEMORY;
    record->size = size;
    return 0;
}

int xml_attribute_store(soap *ctx, soap_attribute *record, std::string_view value)
{
    if (xml_attribute_room(ctx, record, value.size() + 1))
        return ctx->error;
    *std::copy(value.begin(), value.end(), record->value) = '\0';
    return 0;
}

void xml_attribute_free(soap *ctx, soap_attribute *record)
{
    SOAP_FREE(ctx, record->value);
    SOAP_FREE(ctx, record);
}

void xml_attribute_drop(soap *ctx, soap_attribute *record)
{
    soap_namespace_scope *scope = ctx->namespace_scope;
    if (!scope || scope->spare_attribute_count >= SPARE_ATTRIBUTES_MAX || record->name_size != USUAL_NAME ||
        record->size > SPARE_ATTRIBUTE_SIZE) {
        xml_attribute_free(ctx, record);
        return;
    }
    record->next = scope->spare_attributes;
    scope->spare_attributes = record;
    ++scope->spare_attribute_count;
}

void xml_attributes_drop(soap *ctx)
{
    while (ctx->attribute_list) {
        soap_attribute *record = ctx->attribute_list;
        ctx->attribute_list = record->next;
        xml_attribute_drop(ctx, record);
    }
    ctx->attributes_set = 0;
}

int soap_attr_set(soap *ctx, const char *name, const char *value, int escape)
{
    if (*name == '-')
        return 0;
    const place_of_name found = search(ctx, name);
    if (found.named && (*found.named)->visible != 0)
        return 0;
    if (ctx->attributes_set == std::numeric_limits<std::int16_t>::max())
        return ctx->error = SOAP_LENGTH;
    soap_attribute *record = idle_record(ctx, found, name);
    if (!record || (value && xml_attribute_store(ctx, record, value)))
        return ctx->error;
    record->escape = static_cast<std::int16_t>(escape);
    record->visible = value ? 2 : 1;
    ++ctx->attributes_set;
    if (value && std::strcmp(name, "wsu:Id") == 0)
        announce_wsu_id(ctx, value);
    return 0;
}

void soap_attr_table_reset(soap *ctx)
{
    if (ctx->mode & MODE_CANONICAL)
        xml_attributes_drop(ctx);
    for (soap_attribute *record = ctx->attribute_list; record; record = record->next)
        record->visible = 0;
    ctx->attributes_set = 0;
}

// dispatch.cpp - reading, writing and marking an object whose type is known by id or name only.
//
// Elsewhere: making and destroying by id (registry.cpp), the classes' own rules (class_ops.cpp).
#include <cstring>

#include <zuv_client_pro/soap_error.h>
#include <zuv_client_pro/soap_identity.h>
#include <zuv_client_pro/soap_memory.h>
#include <zuv_client_pro/soap_primitive.h>
#include <zuv_client_pro/soap_registry.h>
#include <zuv_client_pro/soap_xml.h>

#include "binding/envelope.h"
#include "binding/member_read.h"
#include "binding/member_write.h"
#include "binding/registry.h"
#include "core/failure.h"
#include "core/limits.h"
#include "xml/namespace.h"

namespace binding {

namespace {

constexpr int CHARS_ID = 4;
constexpr int TEXT_ID = 8;

const type_entry *dispatched(int type_id)
{
    return type_id <= DISPATCH_ID_MAX ? type_entry_of(type_id) : nullptr;
}

// --- reading ---

void *read_chars(soap *ctx, const type_entry &entry, int type)
{
    char **place =
        soap_string_element_in(ctx, nullptr, nullptr, entry.xml_name, type, type == CHARS_ID ? 1 : 2, -1, -1);
    return place != nullptr ? *place : nullptr;
}

// The object itself is what a reference fills late: no pointer to it may be waiting when this returns.
void *read_text(soap *ctx)
{
    auto *text = static_cast<std::string *>(soap_instantiate(ctx, TEXT_ID, nullptr, nullptr, nullptr));
    return text != nullptr && read_text_object(ctx, nullptr, text) ? text : nullptr;
}

void *read_vector(soap *ctx, const type_entry &entry, int type)
{
    void *vector = soap_instantiate(ctx, type, nullptr, nullptr, nullptr);
    int item_type = entry.item;
    void *item = vector != nullptr ? read_by_type(ctx, item_type) : nullptr;
    if (item == nullptr)
        return nullptr;
    memory_charge(ctx, SMALLEST_ALLOCATION);
    if (!entry.vector->append(vector, item)) {
        out_of_memory(ctx);
        return nullptr;
    }
    return vector;
}

void *read_wrapper(soap *ctx, const type_entry &entry, int type)
{
    void *record = soap_instantiate(ctx, type, nullptr, nullptr, nullptr);
    if (record == nullptr ||
        !class_pointer_in(ctx, *type_entries[entry.item].ops, entry.element, static_cast<void **>(record)))
        return nullptr;
    return record;
}

void *read_pointer(soap *ctx, const type_entry &entry)
{
    auto **place = static_cast<void **>(soap_block_alloc(ctx, sizeof(void *)));
    if (place == nullptr || !class_pointer_in(ctx, *type_entries[entry.item].ops, nullptr, place))
        return nullptr;
    return place;
}

void *read_code(soap *ctx, const type_entry &entry, int type)
{
    auto *code = static_cast<std::int32_t *>(soap_instantiate(ctx, type, nullptr, nullptr, nullptr));
    return code != nullptr && read_code_value(ctx, nullptr, code, *entry.names) ? code : nullptr;
}

} // namespace

void *read_by_type(soap *ctx, int type)
{
    const type_entry *entry = dispatched(type);
    if (entry == nullptr)
        return nullptr;
    switch (entry->kind) {
    case type_kind::chars:
        return read_chars(ctx, *entry, type);
    case type_kind::text:
        return read_text(ctx);
    case type_kind::simple:
        return entry->simple->in(ctx, nullptr, nullptr, entry->xml_name);
    case type_kind::enumeration:
        return read_code(ctx, *entry, type);
    case type_kind::object:
        return class_in(ctx, *entry->ops, nullptr, nullptr);
    case type_kind::text_vector:
    case type_kind::code_vector:
    case type_kind::object_vector:
        return read_vector(ctx, *entry, type);
    case type_kind::envelope:
        return envelope_in(ctx, type, nullptr, nullptr);
    case type_kind::request:
    case type_kind::response:
        return read_wrapper(ctx, *entry, type);
    case type_kind::pointer:
        return read_pointer(ctx, *entry);
    case type_kind::none:
        break;
    }
    return nullptr;
}

namespace {

int type_by_identity(soap *ctx)
{
    int type = ctx->element_id[0] ? soap_id_type(ctx, ctx->element_id) : 0;
    return type ? type : soap_id_type(ctx, ctx->element_href);
}

int type_of_element(soap *ctx)
{
    const char *name = ctx->element_type[0] ? ctx->element_type : ctx->tag;
    if (const int type = type_by_qname(ctx, type_index, name))
        return type == TEXT_ID ? CHARS_ID : type; // a text that wasn't asked for is read as plain characters
    return type_by_qname(ctx, element_index, ctx->tag);
}

// --- writing ---

int write_chars(soap *ctx, const type_entry &entry, const char *tag, int id, char *const *text, int type)
{
    return soap_string_element_out(ctx, tag, id, text, entry.xml_name, type);
}

// Items that are held by pointer may be null or shared, as those of a member.
int write_vector(soap *ctx, const type_entry &entry, const char *tag, int id, const void *vector)
{
    const type_entry &item_entry = type_entries[entry.item];
    const std::size_t length = entry.vector->length(vector);
    for (std::size_t i = 0; i < length; ++i) {
        void *item = const_cast<void *>(entry.vector->item(vector, i));
        if (entry.kind == type_kind::object_vector
                ? class_pointer_out(ctx, *item_entry.ops, tag, id, item, item_entry.xml_name)
                : soap_write_element(ctx, item, tag, id, entry.item))
            return ctx->error;
    }
    return SOAP_OK;
}

int write_wrapper(soap *ctx, const type_entry &entry, const void *record)
{
    const void *object = *static_cast<void *const *>(record);
    return class_pointer_out(ctx, *type_entries[entry.item].ops, entry.element, -1, object, "");
}

int write_pointer(soap *ctx, const type_entry &entry, const char *tag, int id, const void *place)
{
    const void *object = *static_cast<void *const *>(place);
    const type_entry &target = type_entries[entry.item];
    return class_pointer_out(ctx, *target.ops, tag, id, object, target.xml_name);
}

} // namespace

} // namespace binding

using namespace binding;

void *soap_read_element(soap *ctx, int *type)
{
    *type = 0;
    if (soap_element_head_read(ctx))
        return nullptr;
    *type = type_by_identity(ctx);
    if (*type < 1 || *type > DISPATCH_ID_MAX)
        *type = type_of_element(ctx);
    if (*type == 0)
        return fail_null(ctx, SOAP_TAG_MISMATCH);
    return read_by_type(ctx, *type);
}

int soap_write_element(soap *ctx, void *object, const char *tag, int id, int type)
{
    const type_entry *entry = dispatched(type);
    if (entry == nullptr)
        return SOAP_OK;
    const char *name = tag != nullptr ? tag : entry->xml_name;
    switch (entry->kind) {
    case type_kind::chars:
        return write_chars(ctx, *entry, name, id, reinterpret_cast<char *const *>(&object), type);
    case type_kind::text:
        return write_text_element(ctx, name, soap_element_id(ctx, id, object, type),
                                  *static_cast<const std::string *>(object), entry->xml_name);
    case type_kind::simple:
        return entry->simple->out(ctx, name, id, object, entry->xml_name);
    case type_kind::enumeration:
        return write_code(ctx, name, soap_element_id(ctx, id, object, type),
                          *static_cast<std::int32_t *>(object), *entry->names, entry->xml_name);
    case type_kind::object:
        return entry->ops->out(object, ctx, name, id, entry->xml_name);
    case type_kind::text_vector:
    case type_kind::code_vector:
    case type_kind::object_vector:
        return write_vector(ctx, *entry, name, id, object);
    case type_kind::envelope:
        return envelope_out(ctx, type, name, id, object, entry->xml_name);
    case type_kind::request:
    case type_kind::response:
        return write_wrapper(ctx, *entry, object);
    case type_kind::pointer:
        return write_pointer(ctx, *entry, name, id, object);
    case type_kind::none:
        break;
    }
    return SOAP_OK;
}

void soap_mark_object(soap *ctx, void *object, int type)
{
    const type_entry *entry = dispatched(type);
    if (entry == nullptr || object == nullptr)
        return;
    switch (entry->kind) {
    case type_kind::object:
        return entry->ops->mark(object, ctx);
    case type_kind::object_vector:
        for (std::size_t i = 0; i < entry->vector->length(object); ++i)
            class_pointer_mark(ctx, *type_entries[entry->item].ops, entry->vector->item(object, i));
        return;
    case type_kind::request:
    case type_kind::response:
    case type_kind::pointer:
        return class_pointer_mark(ctx, *type_entries[entry->item].ops, *static_cast<void **>(object));
    case type_kind::envelope:
        return envelope_mark(ctx, type, object);
    case type_kind::chars:
    case type_kind::text:
    case type_kind::simple:
    case type_kind::enumeration:
        mark_plain(ctx, object, type);
        return;
    case type_kind::text_vector:
    case type_kind::code_vector:
    case type_kind::none:
        return;
    }
}

int soap_read_independents(soap *ctx)
{
    if (ctx->soap_version == 1) {
        for (;;) {
            int type = 0;
            if (soap_read_element(ctx, &type) != nullptr)
                continue;
            if (ctx->error || soap_element_skip(ctx))
                break;
        }
    }
    if (ctx->error == SOAP_NO_TAG || ctx->error < 0)
        ctx->error = 0;
    return ctx->error;
}

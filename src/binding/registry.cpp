// registry.cpp - dispatch by type id: make, destroy, find by name, fill vectors.
//
// Elsewhere: reading and writing by type id (dispatch.cpp), the tables (registry_tables.cpp, generated).
#include "binding/registry.h"

#include <cstring>
#include <new>

#include <zuv_client_pro/soap_envelope.h>
#include <zuv_client_pro/soap_error.h>
#include <zuv_client_pro/soap_memory.h>
#include <zuv_client_pro/soap_registry.h>
#include <zuv_client_pro/soap_xml.h>

#include "binding/envelope.h"
#include "binding/member_release.h"
#include "core/failure.h"
#include "core/instance_pool.h"
#include "core/limits.h"
#include "xml/namespace.h"
#include "xml/tag_view.h"

namespace binding {

const type_entry *type_entry_of(int type_id)
{
    if (type_id < 1 || type_id > TYPE_ID_MAX || type_entries[type_id].kind == type_kind::none)
        return nullptr;
    return &type_entries[type_id];
}

int type_by_qname(soap *ctx, const name_index &index, const char *qname)
{
    const std::string_view local = xml_local_part(qname);
    std::uint32_t slot = tag_local_hash(local.data(), local.size()) & index.slot_mask;
    for (; index.slots[slot] != 0; slot = (slot + 1) & index.slot_mask) {
        std::size_t row = index.slots[slot] - 1U;
        if (xml_local_part(index.names[row].name) != local)
            continue;
        for (;;) {
            const int error = ctx->error;
            const bool found = soap_tag_compare(ctx, qname, index.names[row].name.data()) == 0;
            ctx->error = error;
            if (found)
                return index.names[row].type_id;
            if (index.next_same[row] == 0)
                return 0;
            row = index.next_same[row] - 1U;
        }
    }
    return 0;
}

const class_ops *class_by_xsi_type(soap *ctx, const char *xsi_type)
{
    const type_entry *entry = type_entry_of(type_by_qname(ctx, type_index, xsi_type));
    return entry != nullptr ? entry->ops : nullptr;
}

namespace {

// The wrapper records and pointer forms all look like this.
struct one_pointer {
    void *pointer;
};

template <class V> void *new_or_array(int count)
{
    return count < 0 ? static_cast<void *>(new (std::nothrow) V())
                     : static_cast<void *>(new (std::nothrow) V[static_cast<std::size_t>(count)]());
}

template <class V> void delete_or_array(void *object, int count)
{
    if (count < 0)
        delete static_cast<V *>(object);
    else
        delete[] static_cast<V *>(object);
}

std::size_t plain_size(const type_entry &entry)
{
    switch (entry.kind) {
    case type_kind::simple:
        return entry.simple->size;
    case type_kind::enumeration:
        return sizeof(std::int32_t);
    case type_kind::chars:
    case type_kind::pointer:
        return sizeof(void *);
    case type_kind::text:
        return sizeof(std::string);
    case type_kind::request:
    case type_kind::response:
        return sizeof(one_pointer);
    case type_kind::envelope:
        return envelope_size(entry.item);
    case type_kind::text_vector:
    case type_kind::code_vector:
    case type_kind::object_vector:
        return entry.vector->size;
    case type_kind::object:
        return entry.ops->size;
    case type_kind::none:
        break;
    }
    return 0;
}

void *make(const type_entry &entry, int count)
{
    switch (entry.kind) {
    case type_kind::text:
        return new_or_array<std::string>(count);
    case type_kind::request:
    case type_kind::response:
        return new_or_array<one_pointer>(count);
    case type_kind::envelope:
        return envelope_create(entry.item, count);
    case type_kind::text_vector:
    case type_kind::code_vector:
    case type_kind::object_vector:
        return count < 0 ? entry.vector->create() : nullptr;
    case type_kind::none:
    case type_kind::chars:
    case type_kind::simple:
    case type_kind::enumeration:
    case type_kind::object:
    case type_kind::pointer:
        break;
    }
    return nullptr;
}

// True if the kind's objects are instances of the managed list, false for plain blocks.
bool is_instance(type_kind kind)
{
    switch (kind) {
    case type_kind::text:
    case type_kind::object:
    case type_kind::text_vector:
    case type_kind::code_vector:
    case type_kind::object_vector:
    case type_kind::envelope:
    case type_kind::request:
    case type_kind::response:
        return true;
    case type_kind::none:
    case type_kind::chars:
    case type_kind::simple:
    case type_kind::enumeration:
    case type_kind::pointer:
        break;
    }
    return false;
}

void *make_block(soap *ctx, std::size_t size, int count)
{
    const std::size_t bytes = size * static_cast<std::size_t>(count < 0 ? 1 : count);
    void *block = soap_block_alloc(ctx, bytes);
    if (block != nullptr && bytes)
        std::memset(block, 0, bytes);
    return block;
}

void *make_instance(soap *ctx, const type_entry &entry, int type, int count)
{
    soap_instance *instance =
        count < 0 && entry.kind == type_kind::text ? instance_reuse(ctx, idle_texts(0)) : nullptr;
    if (instance == nullptr)
        instance = soap_instance_register(ctx, nullptr, type, count, soap_delete_object);
    if (instance == nullptr)
        return nullptr;
    if (instance->object == nullptr)
        instance->object = make(entry, count);
    if (instance->object == nullptr)
        fail(ctx, SOAP_OUT_OF_MEMORY);
    memory_charge(ctx, plain_size(entry) * static_cast<std::size_t>(count < 0 ? 1 : count));
    return instance->object;
}

void unmake(const type_entry &entry, void *object, int count)
{
    switch (entry.kind) {
    case type_kind::text:
        if (count < 0 && object != nullptr)
            release_text(*static_cast<std::string *>(object)); // which may be a password
        return delete_or_array<std::string>(object, count);
    case type_kind::object:
        return entry.ops->destroy(object, count);
    case type_kind::request:
    case type_kind::response:
        return delete_or_array<one_pointer>(object, count);
    case type_kind::envelope:
        return envelope_destroy(entry.item, object, count);
    case type_kind::text_vector:
    case type_kind::code_vector:
    case type_kind::object_vector:
        return entry.vector->destroy(object);
    case type_kind::none:
    case type_kind::chars:
    case type_kind::simple:
    case type_kind::enumeration:
    case type_kind::pointer:
        break;
    }
}

} // namespace

} // namespace binding

using namespace binding;

void *soap_instantiate_array(soap *ctx, int type, int count, const char *xsi_type, const char *,
                             std::size_t *size)
{
    const type_entry *entry = type_entry_of(type);
    if (entry == nullptr)
        return nullptr;
    if (entry->kind == type_kind::object)
        return class_instantiate(ctx, *entry->ops, count, xsi_type, size, nullptr);
    if (size != nullptr)
        *size = plain_size(*entry) * static_cast<std::size_t>(count < 0 ? 1 : count);
    return is_instance(entry->kind) ? make_instance(ctx, *entry, type, count)
                                    : make_block(ctx, plain_size(*entry), count);
}

void *soap_instantiate(soap *ctx, int type, const char *xsi_type, const char *array_type, std::size_t *size)
{
    return soap_instantiate_array(ctx, type, -1, xsi_type, array_type, size);
}

int soap_delete_object(soap_instance *instance)
{
    if (instance->type_id < INSTANCE_ID_MIN || instance->type_id > TYPE_ID_MAX)
        return -1;
    const type_entry &entry = type_entries[instance->type_id];
    if (!is_instance(entry.kind))
        return -1;
    if (instance->object != nullptr)
        unmake(entry, instance->object, instance->array_size);
    return 0;
}

void soap_insert_into_vector(soap *ctx, int, int place_type, void *vector, std::size_t index,
                             const void *source, std::size_t)
{
    const type_entry *entry = type_entry_of(place_type);
    if (entry == nullptr || entry->vector == nullptr)
        return;
    if (entry->kind == type_kind::text_vector) {
        const std::size_t length = static_cast<const std::string *>(source)->size();
        if (copy_charge(ctx, length) != SOAP_OK)
            return;
        memory_charge(ctx, length);
    }
    try {
        entry->vector->store(vector, index, source);
    } catch (const std::bad_alloc &) {
        fail(ctx, SOAP_OUT_OF_MEMORY);
    }
}

const char *soap_type_name(int type)
{
    const type_entry *entry = type_entry_of(type);
    return entry != nullptr ? entry->xml_name : nullptr;
}

int soap_type_by_name(const char *name)
{
    const std::string_view local = xml_local_part(name);
    std::uint32_t slot = tag_local_hash(local.data(), local.size()) & type_index.slot_mask;
    for (; type_index.slots[slot] != 0; slot = (slot + 1) & type_index.slot_mask) {
        for (std::size_t row = type_index.slots[slot]; row != 0; row = type_index.next_same[row - 1]) {
            if (type_index.names[row - 1].name == name)
                return type_index.names[row - 1].type_id;
        }
    }
    return 0;
}

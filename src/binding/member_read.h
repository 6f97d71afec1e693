// member_read.h - one member in: each form's reading.
//
// Here: overloads by the member's C++ type, thin over the shared leaf operations of member_read.cpp.
// Elsewhere: writing (member_write.h), which member an element belongs to (class_ops.cpp).
//
// Always: a reader that finds another element leaves it held and gives false with SOAP_TAG_MISMATCH (or 6 at the end).
#pragma once

#include <algorithm>
#include <new>
#include <string>
#include <type_traits>
#include <vector>

#include <zuv_client_pro/soap_identity.h>
#include <zuv_client_pro/soap_memory.h>

#include "binding/class_ops.h"
#include "binding/traits.h"
#include "binding/vector_forms.h"
#include "core/limits.h"

namespace binding {

// --- leaves ---

bool read_text_content(soap *ctx, std::string &text); // of the element whose start tag was consumed
bool read_text_pointer(soap *ctx, const char *tag, void **place);
bool read_text_object(soap *ctx, const char *tag, std::string *text); // by value; nil gives the empty text
bool read_code_value(soap *ctx, const char *tag, std::int32_t *place, const enum_table &names);
bool read_code_pointer(soap *ctx, const char *tag, void **place, const enum_table &names);
bool read_boolean_value(soap *ctx, const char *tag, bool *place);
bool read_number_pointer(soap *ctx, const char *tag, void **place, int type_id); // booleans too
bool read_number_value(soap *ctx, const char *tag, void *place, int type_id);
bool read_code_attribute(soap *ctx, const char *name, bool required, const enum_table &names,
                         std::int32_t *code, bool *present);
// One more item of a vector. Where the element is a reference, index `index` of the vector is filled at the
// end of the message, and an empty item takes its place until then.
bool read_vector_item_text(soap *ctx, const char *tag, std::vector<std::string> &vector, int vector_type);
bool read_vector_item_object(soap *ctx, const class_ops &ops, const char *tag, void *vector,
                             std::size_t index, int vector_type, void **object);
// `present` is set to false for a nil item, for which there is no code: the vector goes without it.
bool read_vector_item_code(soap *ctx, const char *tag, std::int32_t *code, bool *present,
                           const enum_table &names, void *vector, std::size_t index, int vector_type);
bool copy_text(soap *ctx, std::string &target,
               const std::string &source); // false with SOAP_OUT_OF_MEMORY or SOAP_LENGTH
bool out_of_memory(soap *ctx);             // SOAP_OUT_OF_MEMORY; false

// What the next item makes a vector grow by counts in max_memory, and what a released one has kept with its
// first item.
template <class V> void vector_charge(soap *ctx, const std::vector<V> &vector)
{
    if (vector.empty() || vector.size() == vector.capacity())
        memory_charge(ctx, std::max(vector.capacity() * sizeof(V), SMALLEST_ALLOCATION));
}

// One more item, a copy of what `item` points to, or empty. False with SOAP_OUT_OF_MEMORY.
template <class V> bool append_item(soap *ctx, std::vector<V> &vector, const void *item)
{
    vector_charge(ctx, vector);
    return vector_append<V>(&vector, item) || out_of_memory(ctx);
}

// --- by member type ---

template <class V> bool read_value(soap *ctx, const char *tag, V *&member, int item_type, int)
{
    // Places that wait for a late reference are pointer-sized cells of any type (built without strict
    // aliasing).
    void **place = reinterpret_cast<void **>(&member);
    if constexpr (std::is_same_v<V, std::string>)
        return read_text_pointer(ctx, tag, place);
    else if constexpr (std::is_class_v<V>)
        return class_pointer_in(ctx, ops_of<V>, tag, place);
    else if constexpr (std::is_enum_v<V>)
        return read_code_pointer(ctx, tag, place, enum_of<V>);
    else
        return read_number_pointer(ctx, tag, place, item_type);
}

template <class V>
requires(std::is_arithmetic_v<V> || std::is_enum_v<V> ||
         std::is_same_v<V, std::string>) bool read_value(soap *ctx, const char *tag, V &member, int item_type,
                                                         int)
{
    if constexpr (std::is_same_v<V, std::string>)
        return read_text_object(ctx, tag, &member);
    else if constexpr (std::is_same_v<V, bool>)
        return read_boolean_value(ctx, tag, &member);
    else if constexpr (std::is_enum_v<V>)
        return read_code_value(ctx, tag, reinterpret_cast<std::int32_t *>(&member), enum_of<V>);
    else
        return read_number_value(ctx, tag, &member, item_type);
}

template <class V> bool read_value(soap *ctx, const char *tag, std::vector<V> &member, int, int vector_type)
{
    if constexpr (std::is_same_v<V, std::string>) {
        return read_vector_item_text(ctx, tag, member, vector_type);
    } else if constexpr (std::is_pointer_v<V>) {
        void *object = nullptr;
        if (!read_vector_item_object(ctx, ops_of<std::remove_pointer_t<V>>, tag, &member, member.size(),
                                     vector_type, &object))
            return false;
        return append_item<V>(ctx, member, object);
    } else {
        std::int32_t code = 0;
        bool present = true;
        if (!read_vector_item_code(ctx, tag, &code, &present, enum_of<V>, &member, member.size(),
                                   vector_type))
            return false;
        if (!present)
            return true;
        const V item = static_cast<V>(code);
        return append_item<V>(ctx, member, &item);
    }
}

template <class V> bool read_attribute(soap *ctx, const char *name, V &member, bool required)
{
    using target = std::remove_pointer_t<V>;
    std::int32_t code = 0;
    bool present = false;
    if (!read_code_attribute(ctx, name, required, enum_of<target>, &code, &present))
        return false;
    if (!present)
        return true;
    if constexpr (std::is_pointer_v<V>) {
        member = static_cast<V>(soap_block_alloc(ctx, sizeof(target)));
        if (!member)
            return false;
        *member = static_cast<target>(code);
    } else {
        member = static_cast<V>(code);
    }
    return true;
}

} // namespace binding

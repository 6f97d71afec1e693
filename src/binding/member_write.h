// member_write.h - one member out: each form's defaulting, marking and writing.
//
// Here: overloads by the member's C++ type, thin over the shared leaf operations of member_write.cpp.
// Elsewhere: reading (member_read.h), the order of members (class_rules.h).
#pragma once

#include <string>
#include <string_view>
#include <type_traits>
#include <vector>

#include "binding/class_ops.h"
#include "binding/traits.h"
#include "binding/traits_binary.h"

namespace binding {

// --- leaves; `tag` is terminated, `type` is the xsi:type or empty ---

int write_text_element(soap *ctx, std::string_view tag, int id, const std::string &text,
                       const char *type = "");
int write_text_pointer(soap *ctx, std::string_view tag, const std::string *text); // not null
int write_text(soap *ctx, const std::string &text); // character data, no element
int write_code(soap *ctx, std::string_view tag, int id, std::int32_t code, const enum_table &names,
               const char *type = "");
int write_boolean(soap *ctx, std::string_view tag, int id, const bool *value, const char *type = "");
int write_nil(soap *ctx, std::string_view tag, occurs how); // a null member that shows itself
int write_code_attribute(soap *ctx, const char *name, std::int32_t code, const enum_table &names);
// Id for a value held by pointer; -1 when a reference to it was written.
int write_reference(soap *ctx, std::string_view tag, const void *address, int type_id);
void mark_text(soap *ctx, const std::string *text);
void mark_plain(soap *ctx, const void *value, int type_id);

// A null member. Most members of an object are null and write nothing, which is settled without a call.
inline int write_absent(soap *ctx, std::string_view tag, occurs how)
{
    const bool shows = how == occurs::required || (ctx->mode & MODE_NIL) != 0 ||
                       ctx->attributes_set != 0; // attributes need an element
    return shows ? write_nil(ctx, tag, how) : 0;
}

// --- defaulting ---

template <class V> void reset_value(V *&member, int)
{
    member = nullptr;
}
template <class V> void reset_value(std::vector<V> &member, int)
{
    member.clear();
}
inline void reset_value(std::string &member, int)
{
    member.clear();
}
template <class V, class D>
requires(std::is_arithmetic_v<V> || std::is_enum_v<V>) void reset_value(V &member, D initial)
{
    member = static_cast<V>(initial);
}
template <class V> void reset_attribute(V &member)
{
    member = V{};
}

// --- marking ---

template <class V> void mark_value(soap *ctx, const V &member, int item_type)
{
    if constexpr (std::is_pointer_v<V>) {
        using target = std::remove_cv_t<std::remove_pointer_t<V>>;
        if (member == nullptr) [[likely]]
            return;
        if constexpr (std::is_same_v<target, std::string>)
            mark_text(ctx, member);
        else if constexpr (std::is_class_v<target>)
            class_pointer_mark(ctx, ops_of<target>, member);
        else
            mark_plain(ctx, member, item_type);
    }
}
template <class V> void mark_value(soap *ctx, const std::vector<V> &member, int item_type)
{
    if constexpr (std::is_pointer_v<V>) {
        for (const V &item : member)
            mark_value(ctx, item, item_type);
    }
}

// --- writing ---

// A simple value, by value.
template <class V> int write_simple(soap *ctx, std::string_view tag, int id, const V &value, int item_type)
{
    if constexpr (std::is_enum_v<V>)
        return write_code(ctx, tag, id, static_cast<std::int32_t>(value), enum_of<V>);
    else if constexpr (std::is_same_v<V, bool>)
        return write_boolean(ctx, tag, id, &value);
    else if constexpr (std::is_same_v<V, std::string>)
        return write_text_element(ctx, tag, id, value);
    else if constexpr (std::is_same_v<V, int>)
        return soap_int_out(ctx, tag.data(), id, &value, "", item_type);
    else
        return soap_double_out(ctx, tag.data(), id, &value, "", item_type);
}

template <class V>
inline int write_value(soap *ctx, std::string_view tag, const V &member, occurs how, int item_type)
{
    if constexpr (std::is_pointer_v<V>) {
        using target = std::remove_cv_t<std::remove_pointer_t<V>>;
        if (member == nullptr) [[likely]]
            return write_absent(ctx, tag, how);
        if constexpr (std::is_same_v<target, std::string>) {
            return write_text_pointer(ctx, tag, member);
        } else if constexpr (std::is_class_v<target>) {
            return class_pointer_out(ctx, ops_of<target>, tag.data(), -1, member, "");
        } else {
            const int id = write_reference(ctx, tag, member, item_type);
            return id < 0 ? ctx->error : write_simple(ctx, tag, id, *member, item_type);
        }
    } else {
        return write_simple(ctx, tag, -1, member, item_type);
    }
}

template <class V>
int write_value(soap *ctx, std::string_view tag, const std::vector<V> &member, occurs, int item_type)
{
    for (const V &item : member) {
        if (write_value(ctx, tag, item, occurs::optional, item_type))
            return ctx->error;
    }
    return 0;
}

template <class V> int write_attribute(soap *ctx, const char *name, const V &member)
{
    if constexpr (std::is_pointer_v<V>) {
        using target = std::remove_pointer_t<V>;
        return member ? write_code_attribute(ctx, name, static_cast<std::int32_t>(*member), enum_of<target>)
                      : 0;
    } else {
        return write_code_attribute(ctx, name, static_cast<std::int32_t>(member), enum_of<V>);
    }
}

} // namespace binding

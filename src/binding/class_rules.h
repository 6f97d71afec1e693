// class_rules.h - the rules of a data class, unrolled from its member list.
//
// Here: templates that turn traits<T> into a class_ops record: defaulting, marking, writing, reading of each
// member in order. Elsewhere: whole objects (class_ops.cpp), leaves (member_write.h, member_read.h).
//
// Always: inherited members come first and are handled by the base's own functions, so that a class that adds
// nothing costs nothing.
#pragma once

#include <memory>
#include <new>
#include <utility>

#include "binding/class_ops.h"
#include "binding/member_read.h"
#include "binding/member_release.h"
#include "binding/member_write.h"
#include "binding/traits.h"
#include "core/failure.h"
#include "xml/namespace.h"
#include "xml/tag_view.h"

namespace binding {

template <class T> inline constexpr std::size_t own_count = std::tuple_size_v<decltype(traits<T>::elements)>;

template <class T> constexpr std::size_t total_count()
{
    if constexpr (std::is_void_v<T>)
        return 0;
    else
        return total_count<typename traits<T>::base>() + own_count<T>;
}

// The nearest class of the chain that has members of its own: its functions serve for T.
template <class T> constexpr auto member_class_tag()
{
    using base = typename traits<T>::base;
    if constexpr (own_count < T >> 0 || std::is_void_v<base>)
        return static_cast<T *>(nullptr);
    else
        return member_class_tag<base>();
}
template <class T> using member_class = std::remove_pointer_t<decltype(member_class_tag<T>())>;

// Calls `visit` with each own element of T as a constant, in order. Constants, and not references into the
// tuple, so that a member costs no more than its own code.
template <class T, class Visit> constexpr void each_element(Visit visit)
{
    [&]<std::size_t... I>(std::index_sequence<I...>)
    {
        (visit(std::integral_constant<std::size_t, I>{}), ...);
    }
    (std::make_index_sequence<own_count<T>>{});
}

// The same until `visit` gives true: the result says whether it did.
template <class T, class Visit> constexpr bool any_element(Visit visit)
{
    return [&]<std::size_t... I>(std::index_sequence<I...>)
    {
        return (... || visit(std::integral_constant<std::size_t, I>{}));
    }
    (std::make_index_sequence<own_count<T>>{});
}

// Whether T or one of its bases has attributes; vectors that can hold too few items.
template <class T> constexpr bool has_attributes()
{
    if constexpr (std::is_void_v<T>)
        return false;
    else
        return std::tuple_size_v<decltype(traits<T>::attributes)> > 0 ||
               has_attributes<typename traits<T>::base>();
}

template <class T> constexpr bool has_minima()
{
    if constexpr (std::is_void_v<T>) {
        return false;
    } else {
        return has_minima<typename traits<T>::base>() ||
               std::apply(
                   [](const auto &...row) { return (... || (row.how == occurs::many && row.minimum > 0)); },
                   traits<T>::elements);
    }
}

// --- defaulting ---

template <class T> void reset_members(T &object)
{
    if constexpr (!std::is_void_v<typename traits<T>::base>)
        reset_members<typename traits<T>::base>(object);
    std::apply([&](const auto &...row) { (reset_attribute(object.*row.member), ...); },
               traits<T>::attributes);
    if constexpr (traits<T>::text != nullptr)
        (object.*traits<T>::text).clear();
    each_element<T>([&](auto index) {
        constexpr const auto &row = std::get<index>(traits<T>::elements);
        reset_value(object.*row.member, row.initial);
    });
}

// --- marking ---

template <class T> void mark_members(soap *ctx, const T &object)
{
    if constexpr (!std::is_void_v<typename traits<T>::base>)
        mark_members<typename traits<T>::base>(ctx, object);
    each_element<T>([&](auto index) {
        constexpr const auto &row = std::get<index>(traits<T>::elements);
        mark_value(ctx, object.*row.member, row.item_type);
    });
}

// --- writing ---

template <class T> int write_members(soap *ctx, const T &object)
{
    if constexpr (!std::is_void_v<typename traits<T>::base>) {
        if (write_members<member_class<typename traits<T>::base>>(ctx, object))
            return ctx->error;
    }
    const bool failed = any_element<T>([&](auto index) {
        constexpr const auto &row = std::get<index>(traits<T>::elements);
        return write_value(ctx, row.tag, object.*row.member, row.how, row.item_type) != 0;
    });
    return failed ? ctx->error : 0;
}

template <class T> int write_content(soap *ctx, const void *object, const char *)
{
    return write_members<member_class<T>>(ctx, *static_cast<const T *>(object));
}

template <class T> int write_attributes(soap *ctx, const void *object)
{
    const T &self = *static_cast<const T *>(object);
    if constexpr (has_attributes<typename traits<T>::base>()) {
        if (write_attributes<typename traits<T>::base>(ctx,
                                                       static_cast<const typename traits<T>::base *>(&self)))
            return ctx->error;
    }
    const bool failed = std::apply(
        [&](const auto &...row) { return (... || (write_attribute(ctx, row.name, self.*row.member) != 0)); },
        traits<T>::attributes);
    return failed ? ctx->error : 0;
}

// --- reading ---

template <class T> bool read_attributes(soap *ctx, void *object)
{
    T &self = *static_cast<T *>(object);
    if constexpr (has_attributes<typename traits<T>::base>()) {
        if (!read_attributes<typename traits<T>::base>(ctx, static_cast<typename traits<T>::base *>(&self)))
            return false;
    }
    return std::apply(
        [&](const auto &...row) {
            return (... && read_attribute(ctx, row.name, self.*row.member, row.required));
        },
        traits<T>::attributes);
}

template <class T, std::size_t I> bool read_member(soap *ctx, const char *tag, void *object)
{
    constexpr const auto &row = std::get<I>(traits<T>::elements);
    return read_value(ctx, tag, static_cast<T *>(object)->*row.member, row.item_type, row.vector_type);
}

template <class T> bool holds_minima(const void *object)
{
    const T &self = *static_cast<const T *>(object);
    if constexpr (has_minima<typename traits<T>::base>()) {
        if (!holds_minima<typename traits<T>::base>(static_cast<const typename traits<T>::base *>(&self)))
            return false;
    }
    bool held = true;
    each_element<T>([&](auto index) {
        constexpr const auto &row = std::get<index>(traits<T>::elements);
        if constexpr (row.how == occurs::many && row.minimum > 0)
            held &= (self.*row.member).size() >= row.minimum;
    });
    return held;
}

// --- the table of members ---

template <class T, std::size_t N, std::size_t... I>
constexpr void add_own_entries(std::array<member_entry, N> &entries, std::size_t first,
                               std::index_sequence<I...>)
{
    ((entries[first + I] = {std::get<I>(traits<T>::elements).tag,
                            xml_local_part(std::get<I>(traits<T>::elements).tag), &read_member<T, I>,
                            std::get<I>(traits<T>::elements).how != occurs::many,
                            std::get<I>(traits<T>::elements).how == occurs::required}),
     ...);
}

template <class T, std::size_t N> constexpr void add_entries(std::array<member_entry, N> &entries)
{
    if constexpr (!std::is_void_v<T>) {
        add_entries<typename traits<T>::base>(entries);
        add_own_entries<T>(entries, total_count<typename traits<T>::base>(),
                           std::make_index_sequence<own_count<T>>{});
    }
}

constexpr std::size_t slots_for(std::size_t members)
{
    std::size_t slots = 4;
    while (slots < 2 * members + 1)
        slots *= 2;
    return slots;
}

template <std::size_t N> struct member_storage {
    std::array<member_entry, N> entries{};
    std::array<std::uint8_t, slots_for(N)> slots{};
    std::array<std::uint8_t, N> next_same{};
    std::uint64_t required = 0;
};

template <std::size_t N> constexpr void index_names(member_storage<N> &storage)
{
    for (std::size_t i = 0; i < N; ++i) {
        const std::string_view local = storage.entries[i].local;
        std::size_t slot = tag_local_hash(local.data(), local.size()) & (slots_for(N) - 1);
        while (storage.slots[slot] != 0 && storage.entries[storage.slots[slot] - 1U].local != local)
            slot = (slot + 1) & (slots_for(N) - 1);
        if (storage.slots[slot] == 0) {
            storage.slots[slot] = static_cast<std::uint8_t>(i + 1);
        } else {
            std::size_t last = storage.slots[slot] - 1U;
            while (storage.next_same[last] != 0)
                last = storage.next_same[last] - 1U;
            storage.next_same[last] = static_cast<std::uint8_t>(i + 1);
        }
        if (storage.entries[i].single && storage.entries[i].required)
            storage.required |= std::uint64_t{1} << i;
    }
}

template <class T> constexpr auto make_members()
{
    constexpr std::size_t count = total_count<T>();
    static_assert(count < MEMBERS_MAX, "more members than a mask has bits");
    member_storage<count> storage;
    add_entries<T>(storage.entries);
    index_names(storage);
    return storage;
}

template <class T> inline constexpr auto members_storage = make_members<T>();
template <class T>
inline constexpr member_table members_table = {members_storage<T>.entries.data(),
                                               total_count<T>(),
                                               members_storage<T>.slots.data(),
                                               members_storage<T>.slots.size() - 1,
                                               members_storage<T>.next_same.data(),
                                               members_storage<T>.required,
                                               has_minima<T>()};

// --- the record ---

template <class T> void *create(soap *owner, int count)
{
    try {
        if (count < 0) {
            T *object = new T;
            object->soap = owner;
            return object;
        }
        T *objects = new T[static_cast<std::size_t>(count)];
        for (int i = 0; i < count; ++i)
            objects[i].soap = owner;
        return objects;
    } catch (const std::bad_alloc &) {
        return nullptr;
    }
}

template <class T> void destroy(void *object, int count)
{
    if (count < 0)
        delete static_cast<T *>(object);
    else
        delete[] static_cast<T *>(object);
}

template <class T> void assign(void *target, const void *source)
{
    *static_cast<T *>(target) = *static_cast<const T *>(source);
}

// Bytes that a copy of a member takes besides its place in the object.
template <class V> std::size_t content_of(const V &)
{
    return 0;
}
inline std::size_t content_of(const std::string &text)
{
    return text.size();
}
template <class V> std::size_t content_of(const std::vector<V> &items)
{
    std::size_t bytes = items.size() * sizeof(V);
    if constexpr (std::is_same_v<V, std::string>) {
        for (const std::string &text : items)
            bytes += text.size();
    }
    return bytes;
}

template <class T> std::size_t content_bytes(const T &object)
{
    std::size_t bytes = 0;
    if constexpr (!std::is_void_v<typename traits<T>::base>)
        bytes += content_bytes<member_class<typename traits<T>::base>>(object);
    if constexpr (traits<T>::text != nullptr)
        bytes += content_of(object.*traits<T>::text);
    each_element<T>(
        [&](auto index) { bytes += content_of(object.*std::get<index>(traits<T>::elements).member); });
    return bytes;
}

template <class T>
void copy_hook(soap *ctx, int, int, void *place, std::size_t, const void *source, std::size_t)
{
    if (!object_copy_allowed(ctx, sizeof(T), content_bytes<member_class<T>>(*static_cast<const T *>(source))))
        return;
    try {
        assign<T>(place, source);
    } catch (const std::bad_alloc &) {
        fail(ctx, SOAP_OUT_OF_MEMORY);
    }
}

template <class T> std::size_t release_members(soap *owner, T &object)
{
    std::size_t bytes = 0;
    if constexpr (!std::is_void_v<typename traits<T>::base>)
        bytes += release_members<member_class<typename traits<T>::base>>(owner, object);
    if constexpr (traits<T>::text != nullptr)
        bytes += release_value(owner, object.*traits<T>::text);
    each_element<T>([&](auto index) {
        bytes += release_value(owner, object.*std::get<index>(traits<T>::elements).member);
    });
    return bytes;
}

template <class T> std::size_t recycle(void *object, soap *owner)
{
    T &self = *static_cast<T *>(object);
    const std::size_t bytes = sizeof(T) + release_members<member_class<T>>(owner, self);
    self.T::soap_default(owner);
    return bytes;
}

template <class T> int type_of_object(const void *object)
{
    return static_cast<const T *>(object)->soap_type();
}

template <class T> const std::type_info *type_info_of(const void *object)
{
    return &typeid(*static_cast<const T *>(object));
}

template <class T> void mark_object(const void *object, soap *ctx)
{
    static_cast<const T *>(object)->soap_serialize(ctx);
}

template <class T> int out_object(const void *object, soap *ctx, const char *tag, int id, const char *type)
{
    return static_cast<const T *>(object)->soap_out(ctx, tag, id, type);
}

template <class T> std::string *text_of(void *object)
{
    if constexpr (traits<T>::text != nullptr)
        return &(static_cast<T *>(object)->*traits<T>::text);
    else
        return nullptr;
}

template <class T> int write_text_content(soap *ctx, const void *object, const char *)
{
    return write_text(ctx, static_cast<const T *>(object)->*traits<T>::text);
}

template <class T> constexpr const class_ops *base_ops()
{
    if constexpr (std::is_void_v<typename traits<T>::base>)
        return nullptr;
    else
        return &ops_of<typename traits<T>::base>;
}

template <class T> constexpr auto content_writer()
{
    if constexpr (traits<T>::text != nullptr)
        return &write_text_content<T>;
    else
        return &write_content<member_class<T>>;
}

template <class T> constexpr content_reader reader_of()
{
    return traits<T>::text != nullptr ? &read_simple_content : &read_members;
}

template <class T> constexpr class_ops make_ops()
{
    return {traits<T>::type_id,
            traits<T>::xml_type,
            base_ops<T>(),
            sizeof(T),
            traits<T>::global_element,
            traits<T>::text != nullptr,
            &members_table<member_class<T>>,
            &create<T>,
            &destroy<T>,
            &assign<T>,
            &type_of_object<T>,
            &type_info_of<T>,
            &typeid(T),
            &mark_object<T>,
            &out_object<T>,
            content_writer<T>(),
            has_attributes<T>() ? &write_attributes<T> : nullptr,
            reader_of<T>(),
            has_attributes<T>() ? &read_attributes<T> : nullptr,
            has_minima<T>() ? &holds_minima<T> : nullptr,
            &text_of<T>,
            &copy_hook<T>,
            &recycle<T>};
}

} // namespace binding

// Defines everything that a generated class declares, from its traits. The arguments' names can't be those of
// members.
#define BINDING_DEFINE_CLASS(T)                                                                              \
    constinit const binding::class_ops binding::traits<T>::ops = binding::make_ops<T>();                     \
    T::T()                                                                                                   \
    {                                                                                                        \
        T::soap_default(nullptr);                                                                            \
    }                                                                                                        \
    T::~T() = default;                                                                                       \
    int T::soap_type() const                                                                                 \
    {                                                                                                        \
        return binding::traits<T>::type_id;                                                                  \
    }                                                                                                        \
    void T::soap_default(struct soap *ctx_)                                                                  \
    {                                                                                                        \
        this->soap = ctx_;                                                                                   \
        binding::reset_members<T>(*this);                                                                    \
    }                                                                                                        \
    void T::soap_serialize(struct soap *ctx_) const                                                          \
    {                                                                                                        \
        binding::mark_members<binding::member_class<T>>(ctx_, *this);                                        \
    }                                                                                                        \
    int T::soap_put(struct soap *ctx_, const char *tag_, const char *type_) const                            \
    {                                                                                                        \
        return binding::class_put(ctx_, binding::ops_of<T>, this, tag_, type_);                              \
    }                                                                                                        \
    int T::soap_out(struct soap *ctx_, const char *tag_, int id_, const char *type_) const                   \
    {                                                                                                        \
        return binding::class_out(ctx_, binding::ops_of<T>, this, tag_, id_, type_);                         \
    }                                                                                                        \
    void *T::soap_get(struct soap *ctx_, const char *tag_, const char *)                                     \
    {                                                                                                        \
        return binding::class_get(ctx_, binding::ops_of<T>, tag_, this);                                     \
    }                                                                                                        \
    void *T::soap_in(struct soap *ctx_, const char *tag_, const char *)                                      \
    {                                                                                                        \
        return binding::class_in(ctx_, binding::ops_of<T>, tag_, this);                                      \
    }

// vector_forms.h - the three forms of vectors as dispatch by type id sees them.
#pragma once

#include <new>
#include <string>
#include <type_traits>
#include <vector>

#include "binding/registry.h"

namespace binding {

template <class V> void *vector_create()
{
    return new (std::nothrow) std::vector<V>;
}
template <class V> void vector_destroy(void *vector)
{
    delete static_cast<std::vector<V> *>(vector);
}
template <class V> std::size_t vector_length(const void *vector)
{
    return static_cast<const std::vector<V> *>(vector)->size();
}
template <class V> const void *vector_item(const void *vector, std::size_t index)
{
    const auto &items = *static_cast<const std::vector<V> *>(vector);
    if constexpr (std::is_pointer_v<V>)
        return items[index];
    else
        return &items[index];
}
// Bytes that an allocation takes at least: a vector's first items may as well have them all.
constexpr std::size_t SMALLEST_ALLOCATION = 24;

template <class V> bool vector_append(void *vector, const void *item)
{
    auto &items = *static_cast<std::vector<V> *>(vector);
    try {
        if (items.capacity() == 0 && sizeof(V) < SMALLEST_ALLOCATION)
            items.reserve(SMALLEST_ALLOCATION / sizeof(V));
        if constexpr (std::is_pointer_v<V>)
            items.push_back(static_cast<V>(const_cast<void *>(item)));
        else if (item)
            items.push_back(*static_cast<const V *>(item));
        else
            items.emplace_back();
    } catch (const std::bad_alloc &) {
        return false;
    }
    return true;
}
template <class V> void vector_store(void *vector, std::size_t index, const void *item)
{
    auto &items = *static_cast<std::vector<V> *>(vector);
    if (index < items.size())
        items[index] = *static_cast<const V *>(item);
}

// V: std::string, an enumeration, or a pointer to a class.
template <class V>
inline constexpr vector_ops vector_of = {&vector_create<V>,     &vector_destroy<V>, &vector_length<V>,
                                         &vector_item<V>,       &vector_append<V>,  &vector_store<V>,
                                         sizeof(std::vector<V>)};

} // namespace binding

// name_index.h - builds the index of a table of XML names while compiling.
//
// Here: templates for registry_tables.cpp, which is generated. Elsewhere: the look-up (registry.cpp).
#pragma once

#include <array>

#include "binding/registry.h"
#include "xml/namespace.h"
#include "xml/tag_view.h"

namespace binding {

constexpr std::size_t name_slots(std::size_t names)
{
    std::size_t slots = 16;
    while (slots < 2 * names)
        slots *= 2;
    return slots;
}

template <std::size_t N> struct name_storage {
    std::array<type_name, N> names{};
    std::array<std::uint16_t, name_slots(N)> slots{};
    std::array<std::uint16_t, N> next_same{};
};

template <std::size_t N> constexpr name_storage<N> index_of_names(const std::array<type_name, N> &names)
{
    name_storage<N> storage;
    storage.names = names;
    for (std::size_t i = 0; i < N; ++i) {
        const std::string_view local = xml_local_part(names[i].name);
        std::size_t slot = tag_local_hash(local.data(), local.size()) & (name_slots(N) - 1);
        while (storage.slots[slot] != 0 && xml_local_part(names[storage.slots[slot] - 1U].name) != local)
            slot = (slot + 1) & (name_slots(N) - 1);
        if (storage.slots[slot] == 0) {
            storage.slots[slot] = static_cast<std::uint16_t>(i + 1);
        } else {
            std::size_t last = storage.slots[slot] - 1U;
            while (storage.next_same[last] != 0)
                last = storage.next_same[last] - 1U;
            storage.next_same[last] = static_cast<std::uint16_t>(i + 1);
        }
    }
    return storage;
}

template <std::size_t N> constexpr name_index view_of(const name_storage<N> &storage)
{
    return {storage.names.data(), storage.slots.data(), static_cast<std::uint32_t>(name_slots(N) - 1),
            storage.next_same.data()};
}

} // namespace binding

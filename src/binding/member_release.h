// member_release.h - one member of an object that waits for its next use: emptied, with what it has allocated.
//
// Elsewhere: which objects wait, and how long (core/instance_pool.h).
#pragma once

#include <cstddef>
#include <string>
#include <type_traits>
#include <vector>

#include <zuv_client_pro/soap.h>

namespace binding {

// Wipes and empties a text. The bytes that it has allocated.
std::size_t release_text(std::string &text);

// The same for texts in a vector: their memory waits for texts of the context.
void release_texts(soap *owner, std::vector<std::string> &texts);

// soap_upcalls::recycle: objects of classes and texts can be used again.
bool instance_recycle(soap *ctx, soap_instance *instance);

template <class V> std::size_t release_value(soap *, V &)
{
    return 0;
}
inline std::size_t release_value(soap *, std::string &text)
{
    return release_text(text);
}
template <class V> std::size_t release_value(soap *owner, std::vector<V> &items)
{
    if constexpr (std::is_same_v<V, std::string>)
        release_texts(owner, items);
    items.clear();
    return items.capacity() * sizeof(V);
}

} // namespace binding

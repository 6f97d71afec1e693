// make.h - managed values for answers: objects, texts, codes.
//
// Always: what is made belongs to the context and is freed with the exchange's objects; lack of memory throws
// std::bad_alloc, which becomes a fault of the server.
#pragma once

#include <new>
#include <string>
#include <type_traits>
#include <utility>

#include <zuv_client_pro/soap_memory.h>
#include <zuv_client_pro/soap_registry.h>
#include <zuv_client_pro/type_ids.h>

namespace service {

// An object of a data class.
template <class T> T *make(soap *ctx)
{
    static const int type = T().soap_type();
    void *const object = soap_instantiate(ctx, type, nullptr, nullptr, nullptr);
    if (object == nullptr)
        throw std::bad_alloc();
    return static_cast<T *>(object);
}

// A text for an optional member.
inline std::string *make_text(soap *ctx, std::string text)
{
    void *const object = soap_instantiate(ctx, SOAP_TYPE_xsd__string, nullptr, nullptr, nullptr);
    if (object == nullptr)
        throw std::bad_alloc();
    auto *const made = static_cast<std::string *>(object);
    *made = std::move(text);
    return made;
}

// A code, number or truth value for an optional member.
template <class T> T *make_value(soap *ctx, T value)
{
    static_assert(std::is_trivially_copyable_v<T>);
    void *const block = soap_block_alloc(ctx, sizeof(T));
    if (block == nullptr)
        throw std::bad_alloc();
    return new (block) T(value);
}

// What an optional text member holds; empty if it is absent.
inline const std::string &text_of(const std::string *member)
{
    static const std::string none;
    return member == nullptr ? none : *member;
}

} // namespace service

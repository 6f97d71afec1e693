// document.h - documents as XML and as objects, and where they are kept.
//
// Here: the codec, which writes and reads plain XML with the library's own writer and reader, and the
// repository of one port. Elsewhere: rows (store.h), what operations do with documents (the ports).
#pragma once

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <stdexcept>
#include <string>
#include <string_view>

#include <zuv_client_pro/soap.h>

#include "make.h"
#include "store.h"

namespace service {

// A document that can't be written or read again; `error` is the engine's code, 0 if the document exceeds a
// limit of the service: `limit`, in bytes.
struct document_error : std::runtime_error {
    document_error(const std::string &text, int code, std::uint64_t bytes = 0)
        : std::runtime_error(text), error(code), limit(bytes)
    {}
    int error;
    std::uint64_t limit;
};

// Several objects may refer to one object, which is then written as many times. So many
// bytes may result from so many that arrived: space for what the service adds, and for other names and
// prefixes.
constexpr std::uint64_t grown(std::uint64_t bytes)
{
    return (1ULL << 20) + 8 * bytes;
}

// Has a context of its own, since the exchange uses its context's only buffer. For one thread at a time.
class document_codec {
public:
    // Documents of more bytes, or of more open elements, are refused, and so are further ones once the
    // objects read hold more than `memory_limit` bytes; 0: any number.
    document_codec(std::uint64_t byte_limit, std::uint32_t depth_limit, std::uint64_t memory_limit = 0);
    document_codec(const document_codec &) = delete;
    document_codec &operator=(const document_codec &) = delete;

    // XML of an object under its type's name; at most grown(bytes).
    template <class T> std::string write(const T &object, std::uint64_t bytes)
    {
        write_limit_ = std::min(byte_limit_, grown(bytes));
        return write_with(
            [](soap *ctx, const void *o) { return static_cast<const T *>(o)->soap_put(ctx, nullptr, ""); },
            &object);
    }

    // The object, which lives until `reset`.
    template <class T> T *read(std::string_view xml)
    {
        T *const object = make<T>(&context_);
        read_with([](soap *ctx,
                     void *o) { return static_cast<T *>(o)->soap_get(ctx, nullptr, nullptr) != nullptr; },
                  object, xml);
        return object;
    }

    // Frees all objects read, for the next exchange.
    void reset();
    std::uint64_t held() const { return held_; } // bytes that they take

private:
    std::string write_with(int (*put)(soap *ctx, const void *object), const void *object);
    void read_with(bool (*get)(soap *ctx, void *object), void *object, std::string_view xml);
    bool refers_to_attachment();
    static int take_output(soap *ctx, const char *data, std::size_t length);
    static std::size_t give_input(soap *ctx, char *buffer, std::size_t length);

    soap context_;
    std::uint64_t byte_limit_, memory_limit_, write_limit_ = 0;
    std::uint64_t held_ = 0;
    std::string output_;
    std::string_view input_;
    bool too_large_ = false;
};

} // namespace service

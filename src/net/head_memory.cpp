// head_memory.cpp - see head_memory.h.
#include "net/head_memory.h"

#include <charconv>
#include <cstring>
#include <string_view>

#include <zuv_client_pro/soap_io.h>
#include <zuv_client_pro/soap_memory.h>

#include "core/failure.h"

struct soap_head_memory {
    static constexpr std::size_t SIZE = 4000; // bytes of texts and head together

    int port;
    std::uint32_t flags;
    std::uint16_t texts[head_source::TEXTS]; // where each begins, plus 1; 0 for null
    // Where the head, the body's length in it and what follows that begin, and where it ends: 0 if none is
    // remembered.
    std::uint16_t head, number, rest, end;
    char bytes[SIZE];         // the texts, terminated, and the head
    endpoint_memory endpoint; // with an empty text if none is remembered
};

namespace {

using memory = soap_head_memory;

constexpr std::string_view LENGTH_LINE = "\r\nContent-Length: ";

bool is_same_text(const memory &kept, std::size_t place, const char *text)
{
    if (place == 0)
        return text == nullptr;
    return text != nullptr && std::strcmp(kept.bytes + place - 1, text) == 0;
}

bool is_same(const memory &kept, const head_source &source)
{
    if (kept.end == 0 || kept.port != source.port || kept.flags != source.flags)
        return false;
    for (std::size_t i = 0; i < head_source::TEXTS; ++i) {
        if (!is_same_text(kept, kept.texts[i], source.texts[i]))
            return false;
    }
    return true;
}

void forget(memory &kept)
{
    explicit_bzero(kept.bytes, kept.end); // an endpoint may hold credentials
    kept.end = 0;
}

// False if it doesn't fit.
bool append(memory &kept, std::size_t &used, const char *text, std::size_t length)
{
    if (length > memory::SIZE - used)
        return false;
    std::memcpy(kept.bytes + used, text, length);
    used += length;
    return true;
}

bool keep_texts(memory &kept, std::size_t &used, const head_source &source)
{
    for (std::size_t i = 0; i < head_source::TEXTS; ++i) {
        const char *const text = source.texts[i];
        kept.texts[i] = static_cast<std::uint16_t>(text == nullptr ? 0 : used + 1);
        if (text != nullptr && !append(kept, used, text, std::strlen(text) + 1))
            return false;
    }
    return true;
}

// The context's memory, made now if need be; null if memory runs out.
memory *memory_of(soap *ctx)
{
    if (ctx->head_memory != nullptr)
        return ctx->head_memory;
    ctx->head_memory = static_cast<memory *>(SOAP_MALLOC(ctx, sizeof(memory)));
    if (ctx->head_memory != nullptr)
        *ctx->head_memory = {};
    return ctx->head_memory;
}

// The body's length as written in a head, after LENGTH_LINE.
std::size_t write_number(char *text, std::uint64_t count)
{
    return static_cast<std::size_t>(std::to_chars(text, text + SOAP_TEXT_SIZE, count).ptr - text);
}

} // namespace

bool head_memory_send(soap *ctx, const head_source &source, std::uint64_t count, int *result)
{
    const memory *const kept = ctx->head_memory;
    if (kept == nullptr || !is_same(*kept, source))
        return false;
    *result = soap_send_bytes(ctx, kept->bytes + kept->head, kept->number - kept->head);
    if (*result == 0 && kept->rest != kept->number)
        *result = soap_send_bytes(ctx, ctx->scratch_text, write_number(ctx->scratch_text, count));
    if (*result == 0)
        *result = soap_send_bytes(ctx, kept->bytes + kept->rest, kept->end - kept->rest);
    return true;
}

void head_memory_keep(soap *ctx, const head_source &source, std::uint64_t count, const char *head,
                      std::size_t length)
{
    if (memory_of(ctx) == nullptr)
        return;
    memory &kept = *ctx->head_memory;
    forget(kept);
    std::size_t used = 0;
    if (!keep_texts(kept, used, source))
        return explicit_bzero(kept.bytes, memory::SIZE);
    const std::string_view whole(head, length);
    std::size_t number = whole.find(LENGTH_LINE), digits = 0;
    if (number != std::string_view::npos) { // no text of a head holds a line's end
        char text[SOAP_TEXT_SIZE];
        number += LENGTH_LINE.size();
        digits = write_number(text, count);
    } else {
        number = length;
    }
    const auto start = static_cast<std::uint16_t>(used);
    if (!append(kept, used, head, length))
        return explicit_bzero(kept.bytes, memory::SIZE);
    kept.head = start;
    kept.number = static_cast<std::uint16_t>(start + number);
    kept.rest = static_cast<std::uint16_t>(kept.number + digits);
    kept.end = static_cast<std::uint16_t>(used);
    kept.port = source.port;
    kept.flags = source.flags;
}

endpoint_memory *endpoint_memory_find(soap *ctx, const char *text)
{
    memory *const kept = ctx->head_memory;
    return kept != nullptr && *text != '\0' && std::strcmp(kept->endpoint.text, text) == 0 ? &kept->endpoint
                                                                                           : nullptr;
}

endpoint_memory *endpoint_memory_keep(soap *ctx, const char *text)
{
    if (endpoint_memory *const found = endpoint_memory_find(ctx, text))
        return found;
    const std::size_t length = std::strlen(text);
    if (length == 0 || length >= endpoint_memory::SIZE || memory_of(ctx) == nullptr)
        return nullptr;
    endpoint_memory &kept = ctx->head_memory->endpoint;
    explicit_bzero(kept.text, sizeof kept.text);
    std::memcpy(kept.text, text, length); // the end is there
    kept.accepted = kept.split = false;
    return &kept;
}

void head_memory_free(soap *ctx)
{
    if (ctx->head_memory == nullptr)
        return;
    forget(*ctx->head_memory);
    explicit_bzero(ctx->head_memory->endpoint.text, sizeof ctx->head_memory->endpoint.text);
    SOAP_FREE(ctx, ctx->head_memory);
    ctx->head_memory = nullptr;
}

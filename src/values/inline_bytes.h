// inline_bytes.h - binary content of an element, as base64.cpp and hex.cpp read it: stretches and characters
// in, a block out.
//
// Always: characters come as soap_char_next has them, but without a call for each; the input must be inside
// an element with content.
#pragma once

#include <climits>
#include <cstring>

#include <zuv_client_pro/soap_error.h>
#include <zuv_client_pro/soap_memory.h>

#include "core/failure.h"
#include "xml/xml_token.h"

// Bytes of the input buffer that may be taken unchanged as long as they are no markup; they die at the
// next read.
struct inline_stretch {
    const char *start, *end;
    std::size_t length() const { return static_cast<std::size_t>(end - start); }
};

inline inline_stretch inline_stretch_next(soap *ctx)
{
    if (ctx->look_ahead != 0 || ctx->in_cdata == CDATA_BRACKET_DUE || !input_ready(ctx))
        return {ctx->buffer, ctx->buffer};
    return {input_here(ctx), input_end(ctx)};
}

// Everything of the stretch before `position` has been used.
inline void inline_stretch_consume(soap *ctx, const char *position)
{
    if (position != ctx->buffer)
        input_consume(ctx, position);
}

// The next character, one from a reference like any other; below 0 for markup and the end of input.
inline std::int32_t inline_character_next(soap *ctx)
{
    const std::int32_t token = soap_char_next(ctx);
    return is_reference(token) ? static_cast<std::int32_t>(token_code(token)) : token;
}

// From `token` on, drops the rest of the text and leaves a start tag, an end tag or the end of input to be
// read.
inline void inline_rest_skip(soap *ctx, std::int32_t token)
{
    while (token != XML_EOF && token != XML_START && token != XML_END)
        token = soap_char_next(ctx);
    ctx->look_ahead = token;
}

// The growing text as a managed block with a terminator after it; null on failure.
inline unsigned char *inline_block_save(soap *ctx, int *length)
{
    const std::size_t count = ctx->label_index;
    if (count > INT_MAX)
        return fail_null(ctx, SOAP_LENGTH);
    auto *block = static_cast<unsigned char *>(soap_block_alloc(ctx, count + 1));
    if (block == nullptr)
        return nullptr;
    if (count > 0)
        std::memcpy(block, ctx->label_buffer, count);
    block[count] = '\0';
    if (length != nullptr)
        *length = static_cast<int>(count);
    return block;
}

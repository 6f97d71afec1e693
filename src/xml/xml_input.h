// xml_input.h - the reader's view of the input buffer: unread stretches, and giving a byte back.
//
// Elsewhere: filling the buffer (soap_io.h), what the bytes mean (xml_token.cpp, xml_read.cpp, xml_text.cpp).
// Always: a pointer into the buffer dies at the next refill; once the input has ended it stays ended.
#pragma once

#include <zuv_client_pro/soap_io.h>
#include <zuv_client_pro/soap_xml.h>

// Refills when nothing is unread. Call only with no token pushed back. False at the end of input.
inline bool input_ready(soap *ctx)
{
    if (ctx->look_ahead == 0 && ctx->buffer_index < ctx->buffer_length)
        return true;
    if (ctx->look_ahead == XML_EOF)
        return false;
    if (soap_recv_byte(ctx) == XML_EOF) {
        ctx->look_ahead = XML_EOF;
        return false;
    }
    ctx->buffer_index--;
    return true;
}

inline const char *input_here(const soap *ctx)
{
    return ctx->buffer + ctx->buffer_index;
}
inline const char *input_end(const soap *ctx)
{
    return ctx->buffer + ctx->buffer_length;
}

// Everything before `position`, a place in the unread stretch, has been used.
inline void input_consume(soap *ctx, const char *position)
{
    ctx->buffer_index = static_cast<std::size_t>(position - ctx->buffer);
}

// Gives back `byte`, the result of the last soap_recv_byte; only directly after it, with nothing pushed back.
inline void input_unread(soap *ctx, std::int32_t byte)
{
    if (byte == XML_EOF)
        ctx->look_ahead = XML_EOF;
    else
        ctx->buffer_index--;
}

inline bool is_blank(std::int32_t byte)
{
    return byte >= 0 && byte <= ' ';
}

// Drops bytes up to 32. The next byte, not yet consumed, or -1.
inline std::int32_t input_skip_blanks(soap *ctx)
{
    while (input_ready(ctx)) {
        const char *end = input_end(ctx);
        for (const char *p = input_here(ctx); p != end; ++p) {
            if (static_cast<unsigned char>(*p) > ' ') {
                input_consume(ctx, p);
                return static_cast<unsigned char>(*p);
            }
        }
        input_consume(ctx, end);
    }
    return XML_EOF;
}

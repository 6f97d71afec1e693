// recv_line.cpp - one header line of HTTP or MIME out of the input buffer, folded lines joined.
//
// Elsewhere: what the lines mean (net/http_read.cpp, attachments/mime.cpp), filling the buffer.
// Always: what is stored is terminated and shorter than the size given, whatever arrives.
#include <algorithm>
#include <cstring>

#if defined(__SSE2__)
#include <emmintrin.h>
#endif

#include <zuv_client_pro/soap_error.h>
#include <zuv_client_pro/soap_io.h>

#include "core/failure.h"

namespace {

// A blank or a tab at the head of the next line folds it onto the one just read.
bool next_line_is_folded(soap *ctx)
{
    if (ctx->look_ahead != 0)
        return false;
    if (ctx->buffer_index >= ctx->buffer_length && soap_recv_more(ctx) != 0)
        return false;
    const char next = ctx->buffer[ctx->buffer_index];
    return next == ' ' || next == '\t';
}

int end_of_input(soap *ctx)
{
    if (ctx->error == SOAP_OK)
        fail(ctx, SOAP_EOF);
    return ctx->error;
}

// The first CR or LF, or `stop`.
const char *stretch_end(const char *p, const char *stop)
{
#if defined(__SSE2__)
    const __m128i cr = _mm_set1_epi8('\r'), lf = _mm_set1_epi8('\n');
    for (; stop - p >= 16; p += 16) {
        const __m128i bytes = _mm_loadu_si128(reinterpret_cast<const __m128i *>(p));
        const int hits =
            _mm_movemask_epi8(_mm_or_si128(_mm_cmpeq_epi8(bytes, cr), _mm_cmpeq_epi8(bytes, lf)));
        if (hits != 0)
            return p + __builtin_ctz(static_cast<unsigned>(hits));
    }
#endif
    return std::find_if(p, stop, [](char c) { return c == '\r' || c == '\n'; });
}

// Moves what is in the buffer up to a CR or LF, but no more than `left` bytes, to `end`, as far as that
// fits before `limit`. The bytes moved or dropped.
std::size_t take_stretch(soap *ctx, char *&end, const char *limit, std::size_t left)
{
    if (ctx->look_ahead != 0)
        return 0;
    const char *const here = ctx->buffer + ctx->buffer_index;
    const char *const stop = here + std::min(left, ctx->buffer_length - ctx->buffer_index);
    const auto length = static_cast<std::size_t>(stretch_end(here, stop) - here);
    const std::size_t kept = std::min(length, static_cast<std::size_t>(limit - end));
    std::memcpy(end, here, kept);
    end += kept;
    ctx->buffer_index += length;
    return length;
}

// A line that is whole in the buffer, with the byte that shows whether the next one is folded onto it, and
// fits. False: nothing was consumed.
bool take_whole_line(soap *ctx, char *text, std::size_t size)
{
    if (ctx->look_ahead != 0)
        return false;
    const char *const here = ctx->buffer + ctx->buffer_index, *const end = ctx->buffer + ctx->buffer_length;
    const char *const stop = here + std::min(size, static_cast<std::size_t>(end - here));
    const char *const line_end = stretch_end(here, stop);
    if (stop - line_end <= 2)
        return false;
    const char *const next = line_end + (*line_end == '\r' ? 2 : 1);
    const auto length = static_cast<std::size_t>(line_end - here);
    if (next[-1] != '\n' || (length != 0 && (*next == ' ' || *next == '\t')))
        return false;
    std::memcpy(text, here, length);
    text[length] = '\0';
    ctx->buffer_index = static_cast<std::size_t>(next - ctx->buffer);
    return true;
}

} // namespace

int soap_recv_line(soap *ctx, char *text, std::size_t size)
{
    if (take_whole_line(ctx, text, size))
        return SOAP_OK;
    std::size_t left = size; // bytes that the line may still have, its CR included
    char *end = text;
    char *const limit = text + size - 1;
    for (;;) {
        std::int32_t byte = 0;
        while (left > 0) {
            left -= take_stretch(ctx, end, limit, left);
            if (left == 0)
                break;
            byte = soap_recv_byte(ctx);
            if (byte < 0)
                return *end = '\0', end_of_input(ctx);
            --left;
            if (byte == '\r' || byte == '\n')
                break;
            if (end < limit)
                *end++ = static_cast<char>(byte);
        }
        if (byte != '\n') {
            byte = soap_recv_byte(ctx);
            if (byte < 0)
                return *end = '\0', end_of_input(ctx);
        }
        if (byte == '\n') {
            *end = '\0';
            if (end == text || !next_line_is_folded(ctx))
                return SOAP_OK;
        } else if (left == 0) {
            *end = '\0';
            return fail(ctx, SOAP_HEADER_LINE);
        }
    }
}

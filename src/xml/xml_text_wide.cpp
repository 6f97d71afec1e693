// xml_text_wide.cpp - text of elements as strings of 32-bit characters.
//
// Always: gathered in a block stack, 256 characters a block, and copied once to one managed array.
#include <zuv_client_pro/soap_error.h>

#include "core/failure.h"
#include "core/memory.h"
#include "xml/xml_read.h"
#include "xml/xml_text.h"

namespace {

constexpr std::size_t BLOCK_CHARACTERS = 256;

struct wide_sink {
    soap *ctx;
    std::uint64_t maximum;
    char32_t *block = nullptr;
    std::size_t used = BLOCK_CHARACTERS; // of the newest block
    std::uint64_t count = 0;

    int put(char32_t character)
    {
        if (used == BLOCK_CHARACTERS) {
            block = static_cast<char32_t *>(
                soap_block_stack_grow(ctx, nullptr, BLOCK_CHARACTERS * sizeof(char32_t)));
            if (block == nullptr)
                return fail(ctx, SOAP_OUT_OF_MEMORY);
            used = 0;
        }
        block[used++] = character;
        return 0;
    }

    int put_counted(char32_t character)
    {
        if (count == maximum)
            return fail(ctx, SOAP_LENGTH);
        ++count;
        return put(character);
    }

    // A string of the mode.
    int put_text(const char *text, std::size_t length)
    {
        const bool is_utf8 = (ctx->mode & MODE_UTF_STRINGS) != 0;
        for (const char *p = text; p < text + length;) {
            const std::uint32_t code = is_utf8 ? utf8_decode(p) : static_cast<unsigned char>(*p++);
            if (put_counted(static_cast<char32_t>(code)) != 0)
                return ctx->error;
        }
        return 0;
    }
};

// In raw XML a character that isn't markup must not read as markup later.
const char *escape(std::uint32_t code)
{
    switch (code) {
    case '"':
        return "&quot;";
    case '&':
        return "&amp;";
    case '<':
        return "&lt;";
    case '>':
        return "&gt;";
    default:
        return nullptr;
    }
}

int put_token(wide_sink &sink, std::int32_t token, bool raw)
{
    if (token == XML_START)
        return sink.put_text("<", 1);
    if (token == XML_END)
        return sink.put_text("</", 2);
    const std::uint32_t code = token_code(token);
    const bool markup = token < 0 && !is_reference(token);
    const char *escaped = raw && !markup ? escape(code) : nullptr;
    if (escaped != nullptr)
        return sink.put_text(escaped, code == '"' ? 6 : code == '&' ? 5 : 4);
    return sink.put_counted(static_cast<char32_t>(code));
}

int gather_wide(soap *ctx, wide_sink &sink, bool raw)
{
    std::size_t length;
    if (ctx->peeked != 0 && xml_attributes_complete(ctx) != 0)
        return ctx->error;
    text_depth depth = text_take_held_tag(ctx, &length);
    if (sink.put_text(ctx->scratch_text, length) != 0)
        return ctx->error;
    for (;;) {
        const std::int32_t token = text_token(ctx);
        if (depth.ends_at(token)) {
            ctx->look_ahead = token;
            return xml_is_refused(ctx) ? ctx->error : 0;
        }
        if (put_token(sink, token, raw) != 0)
            return ctx->error;
    }
}

} // namespace

char32_t *soap_wide_string_read(soap *ctx, int form, long minimum, long maximum)
{
    if (soap_block_stack_push(ctx) == nullptr)
        return nullptr;
    wide_sink sink{ctx, maximum < 0 ? UINT64_MAX : static_cast<std::uint64_t>(maximum)};
    int error = gather_wide(ctx, sink, form == 0);
    if (error == 0 && minimum > 0 && sink.count < static_cast<std::uint64_t>(minimum))
        error = fail(ctx, SOAP_LENGTH);
    if (error == 0)
        error = sink.put(U'\0');
    if (error != 0) {
        soap_block_stack_drop(ctx, nullptr);
        return nullptr;
    }
    soap_block_stack_trim(ctx, nullptr, sink.used * sizeof(char32_t));
    return static_cast<char32_t *>(block_stack_gather(ctx, nullptr, nullptr, nullptr));
}

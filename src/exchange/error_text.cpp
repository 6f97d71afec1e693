// error_text.cpp - texts of the error codes: the fixed ones from the list of codes, and those composed from
// the context's state.
//
// Elsewhere: the fault record that takes a text (fault.cpp), socket errors and timeouts (net/tcp_error.cpp).
// Always: a composed text is in message_text, cut to its size.
#include "exchange/fault.h"

#include <algorithm>
#include <cstdio>
#include <cstring>
#include <initializer_list>
#include <string_view>

#include <zlib.h>

#include <zuv_client_pro/soap_error.h>
#include <zuv_client_pro/soap_http.h>
#include <zuv_client_pro/soap_tcp.h>

namespace {

const char *listed_text(int error)
{
    switch (error) {
#define SOAP_ERROR_TEXT(name, value, text)                                                                   \
    case value:                                                                                              \
        return text;
        SOAP_ERRORS(SOAP_ERROR_TEXT) // NOLINT(bugprone-branch-clone): codes may share a text
#undef SOAP_ERROR_TEXT
    default:
        return "";
    }
}

// Puts the pieces together in message_text, cut to its size. No piece may lie there itself.
const char *compose(soap *ctx, std::initializer_list<std::string_view> pieces)
{
    std::size_t length = 0;
    for (const std::string_view piece : pieces)
        length += piece.copy(ctx->message_text + length, sizeof ctx->message_text - 1 - length);
    ctx->message_text[length] = '\0';
    return ctx->message_text;
}

// A listed text whose one "%s" takes an argument.
const char *text_with(soap *ctx, const char *argument)
{
    const std::string_view format = listed_text(ctx->error);
    const std::size_t mark = format.find("%s");
    return compose(ctx, {format.substr(0, mark), argument, format.substr(mark + 2)});
}

} // namespace

const char *soap_constraint_text(soap *ctx, const char *text, const char *argument)
{
    constexpr std::string_view violation = "Validation constraint violation: ";
    if (argument == nullptr)
        argument = "";
    if (ctx->tag[0] == '\0')
        return compose(ctx, {violation, text, argument});
    return compose(ctx, {violation, text, argument, " in element '", ctx->tag, "'"});
}

namespace {

constexpr std::string_view TYPE_LETTERS =
    "abcdefghijklmnopqrstuvwxyzABCDEFGHIJKLMNOPQRSTUVWXYZ0123456789/+-._";

// The end-of-input text after its prefix, or alone if both together are too long.
const char *prefixed_eof_text(soap *ctx)
{
    const std::string_view prefix = listed_text(SOAP_EOF);
    const std::size_t size = std::strlen(soap_eof_text(ctx)) + 1;
    if (size <= sizeof ctx->message_text - prefix.size()) {
        std::memmove(ctx->message_text + prefix.size(), ctx->message_text, size);
        std::memcpy(ctx->message_text, prefix.data(), prefix.size());
    }
    return ctx->message_text;
}

// "HTTP status 200, but the answer is not a SOAP message: it is of type text/html".
const char *strange_answer_text(soap *ctx)
{
    constexpr std::size_t TYPE_MAX = 100; // bytes shown of a media type
    constexpr std::string_view text = "HTTP status 200, but the answer is not a SOAP message";
    std::string_view type = ctx->http_content != nullptr ? ctx->http_content : "";
    type = type.substr(0, std::min(type.find_first_of("; \t"), TYPE_MAX));
    const bool shown = !type.empty() && type.find_first_not_of(TYPE_LETTERS) == std::string_view::npos;
    return compose(ctx, {text, shown ? ": it is of type " : "", shown ? type : ""});
}

const char *unlisted_text(soap *ctx)
{
    if (ctx->error == 200)
        return strange_answer_text(ctx);
    if (ctx->error >= 201 && ctx->error <= 599)
        std::snprintf(ctx->message_text, sizeof ctx->message_text, "HTTP Error: %d %s", ctx->error,
                      http_reason(ctx->error));
    else
        std::snprintf(ctx->message_text, sizeof ctx->message_text, "Error %d", ctx->error);
    return ctx->message_text;
}

// "max_memory: more than 1000 bytes".
const char *limit_text(soap *ctx)
{
    std::snprintf(ctx->message_text, sizeof ctx->message_text, "%s: more than %llu bytes", ctx->exceeded,
                  static_cast<unsigned long long>(ctx->exceeded_value));
    return ctx->message_text;
}

} // namespace

const char *error_text(soap *ctx)
{
    const char *text = listed_text(ctx->error);
    switch (ctx->error) {
    case SOAP_EOF:
        return prefixed_eof_text(ctx);
    case SOAP_TAG_MISMATCH:
    case SOAP_NAMESPACE_ERROR:
    case SOAP_NIL:
    case SOAP_REQUIRED:
    case SOAP_PROHIBITED:
    case SOAP_OCCURS:
        return soap_constraint_text(ctx, text, nullptr);
    case SOAP_LENGTH:
        return ctx->exceeded != nullptr ? limit_text(ctx) : soap_constraint_text(ctx, text, nullptr);
    case SOAP_TYPE_MISMATCH:
        return soap_constraint_text(ctx, text, ctx->element_type);
    case SOAP_DUPLICATE_ID:
    case SOAP_MISSING_ID:
    case SOAP_ID_CONFLICT:
        return soap_constraint_text(ctx, text, ctx->element_id);
    case SOAP_MUST_UNDERSTAND:
    case SOAP_NO_METHOD:
        return text_with(ctx, ctx->tag);
    case SOAP_TCP_ERROR:
        return tcp_error_text(ctx);
    case SOAP_ZLIB_ERROR: {
        const char *reason = ctx->zlib_stream == nullptr ? nullptr : ctx->zlib_stream->msg;
        return text_with(ctx, reason == nullptr ? "" : reason);
    }
    default:
        return text[0] != '\0' ? text : unlisted_text(ctx);
    }
}

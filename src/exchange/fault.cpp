// fault.cpp - faults made from error codes, and their printed forms.
//
// Elsewhere: the fault record (soap_envelope.h), the texts of codes (error_text.cpp).
// Always: a fault is made only when it is asked for.
#include <cstdio>
#include <cstring>
#include <ostream>

#include <zuv_client_pro/soap_envelope.h>
#include <zuv_client_pro/soap_error.h>
#include <zuv_client_pro/soap_memory.h>

#include "binding/member_release.h"
#include "core/context_state.h"
#include "core/failure.h"
#include "exchange/fault.h"

namespace {

const char *sender_code(const soap *ctx)
{
    return ctx->soap_version == 2 ? "SOAP-ENV:Sender" : "SOAP-ENV:Client";
}

const char *receiver_code(const soap *ctx)
{
    return ctx->soap_version == 2 ? "SOAP-ENV:Receiver" : "SOAP-ENV:Server";
}

// The code that the envelope's own rules give an error, or null.
const char *code_of_error(int error)
{
    switch (error) {
    case SOAP_MUST_UNDERSTAND:
        return "SOAP-ENV:MustUnderstand";
    case SOAP_VERSION_MISMATCH:
        return "SOAP-ENV:VersionMismatch";
    case SOAP_DATA_ENCODING:
        return "SOAP-ENV:DataEncodingUnknown";
    default:
        return nullptr;
    }
}

const char *subcode_of_error(int error)
{
    if (error == SOAP_DUPLICATE_ID)
        return "SOAP-ENC:DuplicateID";
    return error == SOAP_MISSING_ID ? "SOAP-ENC:MissingID" : nullptr;
}

// SOAP 1.1 has no subcodes.
void store_subcode(soap *ctx, const char *subcode)
{
    if (subcode != nullptr && ctx->soap_version == 2)
        *soap_fault_subcode_field(ctx) = subcode;
}

} // namespace

void soap_fault_text_fill(soap *ctx)
{
    const char **code = soap_fault_code_field(ctx);
    const char **text = soap_fault_string_field(ctx);
    if (ctx->on_error_text != nullptr)
        ctx->on_error_text(ctx, code, text);
    if (*code == nullptr)
        *code = sender_code(ctx);
    if (*text != nullptr || ctx->error == SOAP_FAULT)
        return;
    *text = error_text(ctx);
    if (code_of_error(ctx->error) != nullptr)
        *code = code_of_error(ctx->error);
    store_subcode(ctx, subcode_of_error(ctx->error));
}

int soap_fault_set(soap *ctx, const char *code, const char *subcode, const char *text, const char *detail,
                   int error)
{
    *soap_fault_code_field(ctx) = code;
    store_subcode(ctx, subcode);
    *soap_fault_string_field(ctx) = text;
    if (detail != nullptr && detail[0] != '\0')
        *soap_fault_detail_field(ctx) = detail;
    return fail(ctx, error);
}

namespace {

// True unless memory ran out for the copy.
bool copy_text(soap *ctx, const char *text, const char **copy)
{
    *copy = soap_string_dup(ctx, text);
    return text == nullptr || *copy != nullptr;
}

} // namespace

int soap_fault_set_copied(soap *ctx, const char *code, const char *subcode, const char *text,
                          const char *detail)
{
    const char *own_code, *own_subcode, *own_text, *own_detail;
    if (!copy_text(ctx, code, &own_code) || !copy_text(ctx, subcode, &own_subcode) ||
        !copy_text(ctx, text, &own_text) || !copy_text(ctx, detail, &own_detail))
        return fail(ctx, SOAP_OUT_OF_MEMORY);
    return soap_fault_set(ctx, own_code, own_subcode, own_text, own_detail, SOAP_FAULT);
}

int soap_fault_sender(soap *ctx, const char *text, const char *detail, int error)
{
    return soap_fault_set(ctx, sender_code(ctx), nullptr, text, detail, error);
}

int soap_fault_receiver(soap *ctx, const char *text, const char *detail, int error)
{
    return soap_fault_set(ctx, receiver_code(ctx), nullptr, text, detail, error);
}

int soap_fault_sender_copied(soap *ctx, const char *subcode, const char *text, const char *detail)
{
    return soap_fault_set_copied(ctx, sender_code(ctx), subcode, text, detail);
}

int soap_fault_receiver_copied(soap *ctx, const char *subcode, const char *text, const char *detail)
{
    return soap_fault_set_copied(ctx, receiver_code(ctx), subcode, text, detail);
}

// ---------------------------------------------------------------------------------------------
// For lower layers.

namespace {

int make_fault(soap *ctx, fault_side side, const char *text, const char *detail, int error)
{
    return side == fault_side::sender ? soap_fault_sender(ctx, text, detail, error)
                                      : soap_fault_receiver(ctx, text, detail, error);
}

fault_texts read_fault(soap *ctx)
{
    return {*soap_fault_code_field(ctx), *soap_fault_string_field(ctx), soap_fault_detail_value(ctx)};
}

} // namespace

const soap_upcalls fault_upcalls = {make_fault, read_fault, binding::instance_recycle};

// ---------------------------------------------------------------------------------------------
// Printing.

namespace {

const char *text_or(const char *text, const char *otherwise)
{
    return text == nullptr ? otherwise : text;
}

// Hands the printed form to `put`, piece by piece; nothing for SOAP_OK.
template <class Put> void print_fault(soap *ctx, Put put)
{
    if (ctx->error == SOAP_OK)
        return;
    const char **code = soap_fault_code_field(ctx);
    if (*code == nullptr)
        soap_fault_text_fill(ctx);
    char origin[32];
    if (ctx->soap_version != 0)
        std::snprintf(origin, sizeof origin, "SOAP 1.%d", ctx->soap_version);
    else
        std::snprintf(origin, sizeof origin, "Error %d", ctx->error);
    const char *subcode = ctx->soap_version == 2 ? soap_fault_subcode_value(ctx) : nullptr;
    put(origin);
    put(" fault: ");
    put(text_or(*code, sender_code(ctx))); // null only where memory ran out for the record
    put(" [");
    put(text_or(subcode, "no subcode"));
    put("]\n\"");
    put(text_or(*soap_fault_string_field(ctx), "[no reason]"));
    put("\"\nDetail: ");
    put(text_or(soap_fault_detail_value(ctx), "[no detail]"));
    put("\n");
}

} // namespace

char *soap_fault_print_text(soap *ctx, char *buffer, std::size_t length)
{
    std::size_t used = 0;
    const auto put = [&](const char *text) {
        if (used + 1 >= length)
            return;
        const std::size_t size = std::strlen(text), space = length - used - 1;
        const std::size_t taken = size < space ? size : space;
        std::memcpy(buffer + used, text, taken);
        used += taken;
        buffer[used] = '\0';
    };
    if (length == 1)
        buffer[0] = '\0';
    if (context_is_alive(ctx))
        print_fault(ctx, put);
    else
        put("Error: soap struct not initialized");
    return buffer;
}

std::ostream &soap_fault_print_stream(soap *ctx, std::ostream &stream)
{
    const auto put = [&](const char *text) { stream << text; };
    if (context_is_alive(ctx))
        print_fault(ctx, put);
    else
        put("Error: soap struct state not initialized\n");
    return stream;
}

void soap_fault_print_file(soap *ctx, std::FILE *file)
{
    const auto put = [&](const char *text) { std::fputs(text, file); };
    if (context_is_alive(ctx))
        print_fault(ctx, put);
    else
        put("Error: soap struct state not initialized\n");
}

void soap_fault_location_print(soap *ctx, std::FILE *file)
{
    constexpr std::size_t EXCERPT_MAX = 1023; // bytes after the place
    const std::size_t position = ctx->buffer_index, fill = ctx->buffer_length;
    if (ctx->error == SOAP_OK || ctx->error == SOAP_STOP)
        return;
    if (position > fill || fill == 0 || fill > SOAP_BUFFER_SIZE)
        return;
    const std::size_t last_read = position == 0 ? 0 : position - 1;
    const std::size_t end = fill - last_read > EXCERPT_MAX + 1 ? last_read + EXCERPT_MAX : fill - 1;
    std::fprintf(file, "%.*s%c\n<!-- ** HERE ** -->\n", static_cast<int>(last_read), ctx->buffer,
                 ctx->buffer[last_read]);
    if (position < fill)
        std::fprintf(file, "%.*s\n", static_cast<int>(end - position), ctx->buffer + position);
}

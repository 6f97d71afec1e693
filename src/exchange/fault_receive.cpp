// fault_receive.cpp - the end of a call whose response did not read as expected: a fault, or no message at
// all.
#include <cstring>

#include <zuv_client_pro/soap_envelope.h>
#include <zuv_client_pro/soap_error.h>
#include <zuv_client_pro/soap_identity.h>
#include <zuv_client_pro/soap_io.h>
#include <zuv_client_pro/soap_registry.h>
#include <zuv_client_pro/soap_tcp.h>
#include <zuv_client_pro/soap_xml.h>

#include "binding/envelope.h"
#include "core/failure.h"

namespace {

struct code_row {
    const char *code;
    int error;
};
constexpr code_row CODES[] = {{"SOAP-ENV:Server", SOAP_SERVER_FAULT},
                              {"SOAP-ENV:Receiver", SOAP_SERVER_FAULT},
                              {"SOAP-ENV:Client", SOAP_CLIENT_FAULT},
                              {"SOAP-ENV:Sender", SOAP_CLIENT_FAULT},
                              {"SOAP-ENV:MustUnderstand", SOAP_MUST_UNDERSTAND},
                              {"SOAP-ENV:VersionMismatch", SOAP_VERSION_MISMATCH}};

// The code before the first dot of its local name, in `buffer`: what follows is detail (SOAP 1.1, 4.4.1).
const char *general_code(const char *code, char (&buffer)[SOAP_TEXT_SIZE])
{
    const char *const colon = std::strchr(code, ':');
    const char *const dot = std::strchr(colon != nullptr ? colon : code, '.');
    const std::size_t length = dot != nullptr ? static_cast<std::size_t>(dot - code) : sizeof buffer;
    if (length >= sizeof buffer)
        return code;
    std::memcpy(buffer, code, length);
    buffer[length] = '\0';
    return buffer;
}

// The reader has put the table's prefix in the place of the peer's, where it knew it.
bool is_code(soap *ctx, const char *code, const char *asked)
{
    return std::strcmp(code, asked) == 0 || soap_tag_compare(ctx, code, asked) == 0;
}

int error_of_fault(soap *ctx)
{
    const char *const received = *soap_fault_code_field(ctx);
    if (received == nullptr)
        return SOAP_FAULT;
    char buffer[SOAP_TEXT_SIZE];
    const char *const code = general_code(received, buffer);
    for (const code_row &row : CODES) {
        if (is_code(ctx, code, row.code))
            return row.error;
    }
    return SOAP_FAULT;
}

bool may_be_fault(const soap *ctx)
{
    return ctx->error == SOAP_NO_TAG || (ctx->error == SOAP_TAG_MISMATCH && ctx->nesting_level == 2);
}

// No fault could be read: the error of the response remains, as a fault of the sender. Only lack of
// memory says nothing of what was there.
int keep_error(soap *ctx, int error)
{
    if (ctx->error == SOAP_OUT_OF_MEMORY)
        error = SOAP_OUT_OF_MEMORY;
    *soap_fault_code_field(ctx) = ctx->soap_version == 2 ? "SOAP-ENV:Sender" : "SOAP-ENV:Client";
    ctx->error = error;
    soap_fault_text_fill(ctx);
    return error;
}

// What follows the fault: the fault may refer to it.
void read_rest_of_body(soap *ctx)
{
    const std::uint32_t level = ctx->nesting_level;
    do {
        int type = 0;
        if (soap_read_element(ctx, &type) == nullptr && ctx->error == 0)
            fail(ctx, SOAP_TAG_MISMATCH); // nothing that could be read
    } while (ctx->error == 0 || binding::drop_bad_value(ctx, level));
}

} // namespace

int soap_fault_receive(soap *ctx, int check)
{
    int result = ctx->error;
    if (!check && !may_be_fault(ctx))
        return soap_socket_release(ctx); // what broke off or went beyond a limit ends the connection now
    ctx->error = 0;
    if (soap_fault_read(ctx)) {
        if (ctx->exceeded != nullptr) {
            fail(ctx, SOAP_LENGTH);
            return soap_socket_release(ctx);
        }
        if (check && ctx->error == SOAP_TAG_MISMATCH && ctx->nesting_level == 2)
            return ctx->error = 0;
        result = keep_error(ctx, result);
    } else {
        read_rest_of_body(ctx);
        soap_forward_resolve(ctx); // the code may be a reference, and its prefix is known up to the end
        result = error_of_fault(ctx);
        ctx->error = 0;
        if (soap_body_in_end(ctx) == 0)
            soap_envelope_in_end(ctx);
    }
    soap_receive_finish(ctx);
    ctx->error = result;
    return soap_socket_release(ctx);
}

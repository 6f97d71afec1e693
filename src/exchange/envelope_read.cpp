// envelope_read.cpp - the frame of a received SOAP message: Envelope, Body, the version, the result name.
//
// Elsewhere: Header and Fault records (the binding), HTTP and framing (soap_receive_begin).
#include <cstring>

#include <zuv_client_pro/soap_attachment.h>
#include <zuv_client_pro/soap_error.h>
#include <zuv_client_pro/soap_http.h>
#include <zuv_client_pro/soap_xml.h>

#include "core/text_encoding.h"
#include "xml/namespace.h"

namespace {

struct soap_version_row {
    std::int16_t version;
    const char *envelope;
    const char *encoding;
};

constexpr soap_version_row versions[] = {
    {1, "http://schemas.xmlsoap.org/soap/envelope/", "http://schemas.xmlsoap.org/soap/encoding/"},
    {2, "http://www.w3.org/2003/05/soap-envelope", "http://www.w3.org/2003/05/soap-encoding"},
};

// Input was there, but no Envelope.
bool is_something_else(int error)
{
    return error == SOAP_TAG_MISMATCH || error == SOAP_SYNTAX_ERROR || error == SOAP_NO_TAG;
}

int failed_envelope(soap *ctx)
{
    if (ctx->error == SOAP_TAG_MISMATCH && soap_tag_compare(ctx, ctx->tag, "Envelope") == 0)
        return ctx->error = SOAP_VERSION_MISMATCH;
    // A success has nothing to say about input that broke off or could not be unpacked.
    const bool success = ctx->status >= 200 && ctx->status < 300;
    if (ctx->status != 0 && (!success || is_something_else(ctx->error)))
        ctx->error = ctx->status;
    return ctx->error;
}

// The version follows from the namespace that the envelope row was bound to; the encoding row follows the
// version.
int settle_version(soap *ctx)
{
    soap_namespace *rows = ctx->local_namespaces;
    if (rows == nullptr || rows[0].prefix == nullptr)
        return 0;
    const char *uri = xml_row_uri(rows[0]);
    for (const soap_version_row &row : versions) {
        if (uri == nullptr || std::strcmp(uri, row.envelope) != 0)
            continue;
        ctx->soap_version = row.version;
        if (rows[1].prefix == nullptr)
            return 0;
        return xml_received_set(ctx, rows[1], row.encoding);
    }
    return 0;
}

// A head names an encoding that isn't read, and no declaration has said better.
int refuse_charset(soap *ctx)
{
    const soap_attachment *const root = ctx->mime.root;
    const char *const type = root != nullptr && (ctx->mode & MODE_MIME) != 0 ? root->type : ctx->http_content;
    const char *const name = soap_attr_value(ctx, type, "charset");
    return text_encoding_refuse(ctx, name != nullptr ? name : "");
}

} // namespace

int soap_envelope_in_begin(soap *ctx)
{
    ctx->message_part = PART_ENVELOPE;
    if (soap_element_in_begin(ctx, "SOAP-ENV:Envelope", 0, nullptr) != 0)
        return failed_envelope(ctx);
    if ((ctx->mode & MODE_UNREAD_ENCODING) != 0)
        return refuse_charset(ctx);
    return settle_version(ctx);
}

int soap_envelope_in_end(soap *ctx)
{
    ctx->message_part = PART_AFTER_ENVELOPE;
    return soap_element_in_end(ctx, "SOAP-ENV:Envelope");
}

int soap_body_in_begin(soap *ctx)
{
    ctx->message_part = PART_BODY;
    if (soap_element_in_begin(ctx, "SOAP-ENV:Body", 0, nullptr) != 0)
        return ctx->error;
    if (ctx->has_body == 0)
        ctx->message_part = PART_EMPTY_BODY;
    return 0;
}

int soap_body_in_end(soap *ctx)
{
    if (ctx->message_part == PART_EMPTY_BODY)
        return ctx->error = 0;
    ctx->message_part = PART_AFTER_BODY;
    return soap_element_in_end(ctx, "SOAP-ENV:Body");
}

int soap_result_check(soap *ctx)
{
    if (ctx->soap_version != 2 || ctx->encoding_style == nullptr)
        return 0;
    char *name = nullptr;
    if (soap_string_element_in(ctx, ":result", &name, nullptr, 0, 2, -1, -1) == nullptr)
        return ctx->error;
    return 0;
}

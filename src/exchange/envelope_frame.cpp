// envelope_frame.cpp - the frame of a SOAP message, out and in: Envelope, Body, the version, the result name.
//
// Elsewhere: Header and Fault records (binding/envelope.cpp), HTTP and framing (receive.cpp, send.cpp).
#include <cstdio>
#include <cstring>

#include <zuv_client_pro/soap_attachment.h>
#include <zuv_client_pro/soap_error.h>
#include <zuv_client_pro/soap_http.h>
#include <zuv_client_pro/soap_memory.h>
#include <zuv_client_pro/soap_xml.h>

#include "attachments/attachment_list.h"
#include "core/failure.h"
#include "core/text_encoding.h"
#include "xml/namespace.h"
#include "xml/xml_write.h"

namespace {

constexpr std::size_t MIME_NAMES_MAX =
    944; // bytes of boundary and start id together, which a part head may take
constexpr std::uint8_t DIME_FIRST = 0x24;           // message begins; the type is an absolute URI
constexpr std::uint8_t DIME_ONLY = 0x26;            // message begins and ends
constexpr std::size_t DIME_HEADER = 12;             // bytes
constexpr std::uint64_t DIME_DATA_MAX = 0xFFFFFFFF; // bytes of a record, also where std::size_t holds no more

bool has_modes(const soap *ctx, std::uint32_t set, std::uint32_t clear)
{
    return (ctx->mode & (set | clear)) == set;
}

std::size_t padding_of(std::size_t size)
{
    return (4 - (size & 3)) & 3;
}

std::string_view part_type(const soap *ctx)
{
    if (has_modes(ctx, MODE_DIME, MODE_MTOM))
        return "application/dime";
    const bool is_soap12 = ctx->soap_version == 2;
    if (ctx->mode & MODE_MTOM)
        return is_soap12 ? "application/xop+xml; charset=utf-8; type=\"application/soap+xml\""
                         : "application/xop+xml; charset=utf-8; type=\"text/xml\"";
    return is_soap12 ? "application/soap+xml; charset=utf-8" : "text/xml; charset=utf-8";
}

bool begins_mime_part(const soap *ctx)
{
    return ((ctx->mode & MODE_MIME) != 0u) && ctx->mime.boundary != nullptr && (ctx->mime.start != nullptr) &&
           std::strlen(ctx->mime.boundary) + std::strlen(ctx->mime.start) < MIME_NAMES_MAX;
}

int put_mime_part_head(soap *ctx)
{
    if (!begins_mime_part(ctx))
        return SOAP_OK;
    const std::string_view boundary(ctx->mime.boundary);
    const std::string_view start(ctx->mime.start);
    if (xml_put(ctx, "--") || xml_put(ctx, boundary) || xml_put(ctx, "\r\nContent-Type: ") ||
        xml_put(ctx, part_type(ctx)) ||
        xml_put(ctx, "\r\nContent-Transfer-Encoding: binary\r\nContent-ID: ") || xml_put(ctx, start))
        return ctx->error;
    return xml_put(ctx, "\r\n\r\n");
}

const char *envelope_uri(const soap *ctx)
{
    const soap_namespace *table = ctx->local_namespaces;
    return table != nullptr && table->prefix != nullptr ? xml_row_uri(*table) : nullptr;
}

// Makes the header of the SOAP record from what the counting pass found, and counts it.
int prepare_dime_record(soap *ctx)
{
    const std::uint64_t length = ctx->message_count - ctx->dime.size;
    if (length > DIME_DATA_MAX)
        return fail(ctx, SOAP_DIME_ERROR);
    ctx->dime.size = static_cast<std::size_t>(length);
    char id[SOAP_TEXT_SIZE];
    std::snprintf(id, sizeof id, ctx->dime_id_format, 0);
    const char *type = envelope_uri(ctx);
    ctx->dime.id = soap_string_dup(ctx, id);
    ctx->dime.type = soap_string_dup(ctx, type != nullptr ? type : "");
    if (ctx->dime.id == nullptr || ctx->dime.type == nullptr)
        return ctx->error;
    ctx->dime.options = nullptr;
    ctx->dime.flags = ctx->dime.first != nullptr ? DIME_FIRST : DIME_ONLY;
    const std::size_t id_length = std::strlen(ctx->dime.id);
    const std::size_t type_length = std::strlen(ctx->dime.type);
    ctx->message_count +=
        DIME_HEADER + id_length + padding_of(id_length) + type_length + padding_of(type_length);
    return SOAP_OK;
}

int finish_dime_record(soap *ctx)
{
    if (!has_modes(ctx, MODE_DIME, MODE_MTOM))
        return SOAP_OK;
    if ((ctx->mode & MODE_COUNTING) && prepare_dime_record(ctx))
        return ctx->error;
    return soap_send_bytes(ctx, "\0\0\0", padding_of(ctx->dime.size));
}

} // namespace

int soap_envelope_out_begin(soap *ctx)
{
    if (put_mime_part_head(ctx))
        return ctx->error;
    if (ctx->mode & MODE_COUNTING)
        ctx->dime.size = static_cast<std::size_t>(ctx->message_count);
    else if ((ctx->mode & MODE_DIME) && soap_dime_header_write(ctx))
        return ctx->error;
    ctx->message_part = PART_ENVELOPE;
    return soap_element_out_begin(ctx, "SOAP-ENV:Envelope", 0, nullptr);
}

int soap_envelope_out_end(soap *ctx)
{
    if (soap_element_out_end(ctx, "SOAP-ENV:Envelope") || xml_put(ctx, "\r\n") || finish_dime_record(ctx))
        return ctx->error;
    ctx->message_part = PART_AFTER_ENVELOPE;
    // All attachments are known: what is wrong with them is reported before anything is sent, where that can be.
    return (ctx->mode & MODE_COUNTING) ? attachment_ids_check_out(ctx) : 0;
}

int soap_body_out_begin(soap *ctx)
{
    ctx->message_part = PART_BODY;
    if (ctx->soap_version == 1)
        ctx->encoding_flag = 1;
    if ((ctx->mode & MODE_WSU_ID) && soap_attr_set(ctx, "wsu:Id", "Body", 1))
        return ctx->error;
    return soap_element_out_begin(ctx, "SOAP-ENV:Body", 0, nullptr);
}

int soap_body_out_end(soap *ctx)
{
    if (soap_element_out_end(ctx, "SOAP-ENV:Body"))
        return ctx->error;
    ctx->message_part = PART_AFTER_BODY;
    return SOAP_OK;
}

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
        return fail(ctx, SOAP_VERSION_MISMATCH);
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
        return SOAP_OK;
    const char *uri = xml_row_uri(rows[0]);
    for (const soap_version_row &row : versions) {
        if (uri == nullptr || std::strcmp(uri, row.envelope) != 0)
            continue;
        ctx->soap_version = row.version;
        if (rows[1].prefix == nullptr)
            return SOAP_OK;
        return xml_received_set(ctx, rows[1], row.encoding);
    }
    return SOAP_OK;
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
    return SOAP_OK;
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
        return SOAP_OK;
    char *name = nullptr;
    if (soap_string_element_in(ctx, ":result", &name, nullptr, 0, 2, -1, -1) == nullptr)
        return ctx->error;
    return SOAP_OK;
}

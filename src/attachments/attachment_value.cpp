// attachment_value.cpp - a binary value outside the XML of the message: its reference, out and in.
//
// Elsewhere: the value's class (binding), inline base64 (the primitives), how references find their
// attachments (attachment_refs.cpp).
#include <cstdio>
#include <cstring>
#include <string_view>

#include <zuv_client_pro/soap_attachment.h>
#include <zuv_client_pro/soap_error.h>
#include <zuv_client_pro/soap_identity.h>
#include <zuv_client_pro/soap_memory.h>
#include <zuv_client_pro/soap_xml.h>

#include "attachments/attachment_list.h"
#include "attachments/dime.h"
#include "core/failure.h"
#include "core/message_store.h"
#include "identity/multiref.h"
#include "xml/xml_input.h"

namespace {

constexpr int ALL_WRITTEN = -1;  // result: the element is written, or ctx->error says why not
constexpr int AS_ATTACHMENT = 3; // mark of a value that goes out as an attachment
constexpr int ATTACHMENT_TYPE =
    -1; // type of such a value in the pointer table: none of an object's, nor that of bytes in place
#define XOP_URI "http://www.w3.org/2004/08/xop/include"
constexpr const char *XOP_TAG = "xop:Include";
// One attribute carries both: the writer sends a name unchanged.
constexpr const char *XOP_HREF = "xmlns:xop=\"" XOP_URI "\" href";
constexpr const char *XOP_DEFAULT_HREF = "xmlns=\"" XOP_URI "\" href";

// What a holder of bytes begins with.
struct byte_holder {
    unsigned char *content;
    std::int32_t size;
};

// What makes an attachment of its own: not the bytes alone, but also under which id and as what they go out.
struct outgoing_value {
    byte_holder bytes;
    const char *id_text, *type, *options; // of the first value that goes out as this attachment
    const char *href;                     // null until it is written
};

bool same_text(const char *one, const char *other)
{
    return one == other || (one != nullptr && other != nullptr && std::strcmp(one, other) == 0);
}

// MIME has no place for options.
bool same_options(const soap *ctx, const char *one, const char *other)
{
    if (one == other || (ctx->output_mode & MODE_MTOM) != 0)
        return true;
    const std::size_t length = dime_options_length(one);
    return length == dime_options_length(other) && (length == 0 || std::memcmp(one, other, length) == 0);
}

bool same_value(soap *ctx, const void *one, const void *other)
{
    const auto &a = *static_cast<const outgoing_value *>(one),
               &b = *static_cast<const outgoing_value *>(other);
    return a.bytes.content == b.bytes.content && a.bytes.size == b.bytes.size &&
           same_text(a.id_text, b.id_text) && same_text(a.type, b.type) &&
           same_options(ctx, a.options, b.options);
}

std::uint32_t hash_of(const outgoing_value &value)
{
    std::uint64_t hash = reinterpret_cast<std::uintptr_t>(value.bytes.content) ^
                         static_cast<std::uint64_t>(value.bytes.size) << 32;
    for (const char *text : {value.id_text, value.type})
        for (const char c : std::string_view(text == nullptr ? "" : text))
            hash = (hash ^ static_cast<unsigned char>(c)) * 0x9E3779B97F4A7C15;
    return static_cast<std::uint32_t>(hash >> 32 ^ hash);
}

// The entry of the attachment that a value goes out as. Null with SOAP_OUT_OF_MEMORY.
soap_pointer_record *find_or_add(soap *ctx, const outgoing_value &value)
{
    const std::uint32_t hash = hash_of(value);
    if (soap_pointer_record *const found =
            soap_pointer_find_value(ctx, hash, ATTACHMENT_TYPE, same_value, &value))
        return found;
    auto *const entered = static_cast<outgoing_value *>(soap_block_alloc(ctx, sizeof(outgoing_value)));
    if (entered == nullptr)
        return nullptr;
    *entered = value;
    return soap_pointer_add_value(ctx, hash, ATTACHMENT_TYPE, entered);
}

// An empty reference would be none to the reader.
const char *given_id(const char *id_text)
{
    return id_text != nullptr && *id_text != '\0' ? id_text : nullptr;
}

outgoing_value value_of(const void *holder, const char *id_text, const char *type, const char *options)
{
    return {*static_cast<const byte_holder *>(holder), id_text, type, options, nullptr};
}

// The id given, or one made of the first element's or the table's number, which then stays.
const char *reference_text(soap *ctx, int id, const soap_pointer_record *record, outgoing_value &value)
{
    if (value.id_text != nullptr || value.href != nullptr)
        return value.id_text != nullptr ? value.id_text : value.href;
    char text[SOAP_TEXT_SIZE];
    std::snprintf(text, sizeof text, ctx->dime_id_format, id > 0 ? id : record->id);
    return value.href = soap_string_dup(ctx, text);
}

// The prefix is in no row of the table, so where prefixes follow rules of their own it is declared by them.
int write_include(soap *ctx, const char *href)
{
    if ((ctx->mode & MODE_CANONICAL) != 0)
        return soap_prefix_push_out(ctx, "xop", XOP_URI, 0) != SOAP_OK
                   ? ctx->error
                   : soap_element_empty_attr(ctx, XOP_TAG, 0, "href", href);
    if ((ctx->mode & MODE_DEFAULT_NAMESPACE) != 0)
        return soap_element_empty_attr(ctx, "Include", 0, XOP_DEFAULT_HREF, href);
    return soap_element_empty_attr(ctx, XOP_TAG, 0, XOP_HREF, href);
}

int write_reference(soap *ctx, const char *tag, const char *href, const char *type_text)
{
    if ((ctx->mode & MODE_MTOM) == 0 || std::strcmp(tag, XOP_TAG) == 0)
        return soap_element_empty_attr(ctx, tag, 0, "href", href);
    if (soap_element_out_begin(ctx, tag, 0, type_text) != SOAP_OK || write_include(ctx, href) != SOAP_OK)
        return ctx->error;
    return soap_element_out_end(ctx, tag);
}

// The id under which the attachment goes out: without the scheme, and in brackets for MIME.
const char *attachment_id(soap *ctx, const char *href, bool bracketed)
{
    if (std::strncmp(href, "cid:", 4) != 0)
        return href;
    if (!bracketed)
        return href + 4;
    const std::size_t length = std::strlen(href + 4);
    auto *id = static_cast<char *>(soap_block_alloc(ctx, length + 3));
    if (id == nullptr)
        return nullptr;
    id[0] = '<';
    std::memcpy(id + 1, href + 4, length);
    std::memcpy(id + 1 + length, ">", 2);
    return id;
}

int add_attachment(soap *ctx, const outgoing_value &value, const char *href)
{
    const byte_holder &bytes = value.bytes;
    const bool mtom = (ctx->mode & MODE_MTOM) != 0;
    const char *const id = attachment_id(ctx, href, mtom);
    if (id == nullptr)
        return ctx->error;
    soap_attachment *const record = soap_attachment_add(
        ctx, mtom ? &ctx->mime.first : &ctx->dime.first, mtom ? &ctx->mime.last : &ctx->dime.last,
        reinterpret_cast<char *>(bytes.content), bytes.size > 0 ? static_cast<std::size_t>(bytes.size) : 0);
    if (record == nullptr)
        return ctx->error;
    record->id = id;
    record->type = value.type;
    record->options = value.options;
    record->encoding = MIME_BINARY;
    return SOAP_OK;
}

} // namespace

bool attachment_value_mark(soap *ctx, const void *holder, const char *id_text, const char *type,
                           const char *options)
{
    id_text = given_id(id_text);
    if (static_cast<const byte_holder *>(holder)->content == nullptr ||
        (id_text == nullptr && type == nullptr))
        return false;
    ctx->mode |= MODE_DIME;
    find_or_add(ctx, value_of(holder, id_text, type, options));
    return true;
}

int soap_attachment_ref_out(soap *ctx, const char *tag, int id, const void *address, const void *holder,
                            const char *id_text, const char *type, const char *options, int dimensions,
                            const char *type_text, int type_id)
{
    const auto *bytes = static_cast<const byte_holder *>(holder);
    id_text = given_id(id_text);
    if (address == nullptr || bytes == nullptr || bytes->content == nullptr ||
        (id_text == nullptr && type == nullptr))
        return soap_element_ref(ctx, tag, id, address, holder, dimensions, type_text, type_id);
    if (marks_require(ctx) != SOAP_OK) // they switch attachments on
        return ALL_WRITTEN;
    soap_pointer_record *const record = find_or_add(ctx, value_of(holder, id_text, type, options));
    if (record == nullptr)
        return ALL_WRITTEN;
    auto &value = *static_cast<outgoing_value *>(const_cast<void *>(record->ptr));
    const char *const href = reference_text(ctx, id, record, value);
    if (href == nullptr || write_reference(ctx, tag, href, type_text) != SOAP_OK)
        return ALL_WRITTEN;
    if ((ctx->mode & MODE_COUNTING) == 0)
        record->send_mark = AS_ATTACHMENT;
    // A message that was not counted adds its attachments as it goes out.
    if (record->count_mark != AS_ATTACHMENT) {
        record->count_mark = AS_ATTACHMENT;
        add_attachment(ctx, value, href);
    }
    return ALL_WRITTEN;
}

int soap_attachment_ref_in(soap *ctx, unsigned char **content, int *size, char **id, char **type,
                           char **options)
{
    *content = nullptr;
    *size = 0;
    *type = nullptr;
    *options = nullptr;
    *id = soap_string_dup(ctx, ctx->element_href);
    if (*id == nullptr)
        return ctx->error;
    soap_attachment_ref wanted = {};
    wanted.content = content;
    wanted.size = size;
    wanted.type = type;
    wanted.options = options;
    wanted.id = *id;
    return attachment_ref_queue(ctx, wanted);
}

int soap_xop_include_in(soap *ctx, unsigned char **content, int *size, char **id, char **type, char **options)
{
    if (ctx->peeked == 0 && ctx->look_ahead == 0 && input_skip_blanks(ctx) != '<')
        return SOAP_NO_TAG; // bytes are in the element itself
    // The prefix is bound by the element, in no row of the table; so only the local name is compared.
    const int result = soap_element_in_begin(ctx, ":Include", 0, nullptr);
    if (result == SOAP_NO_TAG || result == SOAP_TAG_MISMATCH) {
        ctx->error = SOAP_OK;
        return result;
    }
    if (result != SOAP_OK)
        return result;
    const bool has_body = ctx->has_body != 0;
    if (ctx->element_href[0] == '\0')
        return fail(ctx, SOAP_MIME_HREF);
    if (soap_attachment_ref_in(ctx, content, size, id, type, options) != SOAP_OK)
        return ctx->error;
    return has_body ? soap_element_in_end(ctx, ":Include") : SOAP_OK;
}

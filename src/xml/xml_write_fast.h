// xml_write_fast.h - the writer's short ways: bytes straight into the buffer, tags that need no thought.
//
// Here: inline forms for callers that know a tag's length, such as generated code. Elsewhere: every case that
// needs more than "<tag>" (xml_write.cpp), framing and hooks (soap_io.h), to which each short way falls back.
//
// Always: the bytes, the counts and the state afterwards are those of the general path.
#pragma once

#include <cstddef>

#include <zuv_client_pro/soap_error.h>
#include <zuv_client_pro/soap_io.h>
#include <zuv_client_pro/soap_xml.h>

#include "core/copy_short.h"
#include "core/failure.h"
#include "core/message_store.h"

// Modes in which a start or end tag is more than its name in brackets.
constexpr std::uint32_t XML_SPECIAL_TAGS = MODE_INDENT | MODE_DEFAULT_NAMESPACE | MODE_CANONICAL;

// True in a counting pass without hooks or trace: bytes need only be added up.
inline bool xml_only_counts(const soap *ctx)
{
    return ((ctx->mode & MODE_COUNTING) != 0u) && ctx->on_send_filter == nullptr &&
           (ctx->on_send_prepare == nullptr);
}

// Reserves `length` bytes in the send buffer or, while a message is counted, in the store, which count as sent;
// the caller fills all of it at once. Null if the bytes must go through soap_send_bytes: counted alone,
// unbuffered, filtered, or too little space.
inline char *xml_reserve(soap *ctx, std::size_t length)
{
    if ((ctx->mode & MODE_COUNTING) != 0)
        return store_reserve(ctx, length);
    if ((ctx->mode & MODE_IO_MASK) == MODE_DIRECT || ctx->on_send_filter != nullptr ||
        length >= SOAP_BUFFER_SIZE - ctx->buffer_index)
        return nullptr;
    char *place = ctx->buffer + ctx->buffer_index;
    ctx->buffer_index += length;
    return place;
}

// Raises the element depth for a start tag. SOAP_OK or SOAP_LENGTH past ctx->max_depth open elements.
inline int xml_enter(soap *ctx)
{
    ++ctx->nesting_level;
    // A limit of 0 wraps around to the largest number and so never holds.
    if (ctx->nesting_level - 1U > ctx->max_depth - 1U)
        return fail(ctx, SOAP_LENGTH);
    return 0;
}

inline void xml_leave(soap *ctx)
{
    if (ctx->nesting_level > 0)
        --ctx->nesting_level;
}

// True if the next start tag without id and type is its name in brackets and nothing else.
inline bool xml_tag_is_plain(const soap *ctx)
{
    return ((ctx->mode & XML_SPECIAL_TAGS) == 0u) && ctx->namespace_state != 0 &&
           (ctx->attributes_set | ctx->encoding_flag | ctx->must_understand | ctx->null_flag) == 0;
}

// The long ways: soap_element_out_begin and soap_element_out_end for a tag that does not begin with "-".
int xml_open_long(soap *ctx, const char *tag, int id, const char *type);
int xml_close_long(soap *ctx, const char *tag);

// Start tag without id and type.
//   tag  terminated, `length` bytes; must not begin with "-"
//   0, or an error as soap_element_out_begin
inline int xml_open_plain(soap *ctx, const char *tag, std::size_t length)
{
    if (!xml_tag_is_plain(ctx))
        return xml_open_long(ctx, tag, 0, nullptr);
    char *place = xml_reserve(ctx, length + 2);
    if (place != nullptr) {
        *place = '<';
        copy_short(place + 1, tag, length);
        place[length + 1] = '>';
    } else if (xml_only_counts(ctx)) {
        ctx->message_count += length + 2;
    } else {
        return xml_open_long(ctx, tag, 0, nullptr);
    }
    ctx->position_count = 0;
    ctx->wsu_id_flag = 0;
    return xml_enter(ctx);
}

// End tag of the same.
inline int xml_close_plain(soap *ctx, const char *tag, std::size_t length)
{
    if (ctx->mode & XML_SPECIAL_TAGS)
        return xml_close_long(ctx, tag);
    char *place = xml_reserve(ctx, length + 3);
    if (place != nullptr) {
        place[0] = '<';
        place[1] = '/';
        copy_short(place + 2, tag, length);
        place[length + 2] = '>';
    } else if (xml_only_counts(ctx)) {
        ctx->message_count += length + 3;
    } else {
        return xml_close_long(ctx, tag);
    }
    xml_leave(ctx);
    return 0;
}

// An element that holds text alone: start tag without id and type, escaped text, end tag.
//   text  `text_length` bytes, as soap_text_write_n with flag 0
inline int xml_text_element_plain(soap *ctx, const char *tag, std::size_t length, const char *text,
                                  std::size_t text_length)
{
    if (xml_open_plain(ctx, tag, length) || soap_text_write_n(ctx, text, text_length, 0))
        return ctx->error;
    return xml_close_plain(ctx, tag, length);
}

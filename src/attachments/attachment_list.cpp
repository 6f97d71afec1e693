// attachment_list.cpp - the attachments of a message: hosts add them, their total length is known in advance.
//
// Elsewhere: how they go out and come in (dime.cpp, mime.cpp), values that refer to one (attachment_refs.cpp,
// attachment_value.cpp).
#include <algorithm>
#include <cstdarg>
#include <cstdio>

#include <zuv_client_pro/soap_attachment.h>
#include <zuv_client_pro/soap_error.h>
#include <zuv_client_pro/soap_memory.h>

#include "attachments/attachment_id.h"
#include "attachments/attachment_list.h"
#include "attachments/dime.h"
#include "attachments/mime.h"
#include "core/failure.h"

namespace {

// In the spelling that counts; long ids are compared where their hashes are the same.
struct hashed_id {
    std::uint64_t hash;
    const char *id;

    static hashed_id of(const char *id) { return {id_hash(bare_id(id, true), 0), id}; }
    int order(const hashed_id &other) const
    {
        if (hash != other.hash)
            return hash < other.hash ? -1 : 1;
        return id_compare(bare_id(id, true), bare_id(other.id, true));
    }
};

} // namespace

soap_attachment *soap_attachment_add(soap *ctx, soap_attachment **first, soap_attachment **last,
                                     char *content, std::uint64_t size)
{
    auto *record = static_cast<soap_attachment *>(soap_block_alloc(ctx, sizeof(soap_attachment)));
    if (record == nullptr)
        return nullptr;
    *record = {};
    record->content = content;
    record->size = size;
    if (*first == nullptr) // `last` may still name a record of another message then
        *first = record;
    else
        (*last)->next = record;
    *last = record;
    return record;
}

int soap_dime_attach(soap *ctx, char *content, std::uint64_t size, const char *type, const char *id,
                     unsigned short option_type, const char *option_text)
{
    char *options = nullptr;
    if (option_text != nullptr) {
        options = soap_dime_options_make(ctx, option_type, option_text);
        if (options == nullptr)
            return ctx->error;
    }
    soap_attachment *record = soap_attachment_add(ctx, &ctx->dime.first, &ctx->dime.last, content, size);
    if (record == nullptr)
        return fail(ctx, SOAP_OUT_OF_MEMORY);
    record->id = id;
    record->type = type;
    record->options = options;
    return SOAP_OK;
}

int soap_mime_attach(soap *ctx, char *content, std::uint64_t size, int encoding, const char *type,
                     const char *id, const char *location, const char *description)
{
    soap_attachment *record = soap_attachment_add(ctx, &ctx->mime.first, &ctx->mime.last, content, size);
    if (record == nullptr)
        return fail(ctx, SOAP_OUT_OF_MEMORY);
    record->encoding = encoding;
    record->type = type;
    record->id = id;
    record->location = location;
    record->description = description;
    return SOAP_OK;
}

int attachment_ids_check(soap *ctx, const soap_attachment *list, const char *message_id, int error)
{
    std::size_t count = static_cast<std::size_t>(message_id != nullptr);
    for (const soap_attachment *record = list; record != nullptr; record = record->next)
        count += static_cast<std::size_t>(record->id != nullptr);
    if (count < 2)
        return SOAP_OK;
    auto *const ids = static_cast<hashed_id *>(SOAP_MALLOC(ctx, count * sizeof(hashed_id)));
    if (ids == nullptr)
        return fail(ctx, SOAP_OUT_OF_MEMORY);
    hashed_id *end = ids;
    if (message_id != nullptr)
        *end++ = hashed_id::of(message_id);
    for (const soap_attachment *record = list; record != nullptr; record = record->next) {
        if (record->id != nullptr)
            *end++ = hashed_id::of(record->id);
    }
    std::sort(ids, end, [](const hashed_id &a, const hashed_id &b) { return a.order(b) < 0; });
    const hashed_id *const twice =
        std::adjacent_find(ids, end, [](const hashed_id &a, const hashed_id &b) { return a.order(b) == 0; });
    if (twice != end)
        attachment_fail(ctx, error, "Two attachments have the id \"%.400s\"", twice->id);
    SOAP_FREE(ctx, ids);
    return ctx->error;
}

int attachment_ids_check_out(soap *ctx)
{
    if (dime_is_written(ctx) &&
        attachment_ids_check(ctx, ctx->dime.first, nullptr, SOAP_DIME_ERROR) != SOAP_OK)
        return ctx->error;
    return mime_is_written(ctx) ? attachment_ids_check(ctx, ctx->mime.first, ctx->mime.start, SOAP_MIME_ERROR)
                                : static_cast<int>(SOAP_OK);
}

int attachment_fail(soap *ctx, int error, const char *format, ...)
{
    char text[SOAP_TEXT_SIZE];
    std::va_list values;
    va_start(values, format);
    std::vsnprintf(text, sizeof text, format, values);
    va_end(values);
    return fail_as_sender(ctx, soap_string_dup(ctx, text), nullptr, error);
}

std::uint64_t soap_attachments_length(soap *ctx)
{
    std::uint64_t length = 0;
    if (dime_is_written(ctx)) {
        for (const soap_attachment *record = ctx->dime.first; record != nullptr; record = record->next)
            length += dime_record_length(*record);
    }
    if (mime_is_written(ctx)) {
        for (const soap_attachment *part = ctx->mime.first; part != nullptr; part = part->next)
            length += mime_part_length(ctx, *part);
        length += mime_end_length(ctx);
    }
    return length;
}

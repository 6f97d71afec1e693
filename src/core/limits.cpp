// limits.cpp - see limits.h.
#include "core/limits.h"

#include <algorithm>
#include <limits>

#include <zuv_client_pro/soap_error.h>

#include "core/failure.h"
#include "core/raw_in.h"

namespace {

// Bytes at hand that belong to no XML: those after the length given in the head, and where attachments may
// follow, those that haven't been looked at yet.
std::uint64_t beside_xml(const soap *ctx)
{
    const std::uint64_t unread = ctx->buffer_length - ctx->buffer_index;
    const bool attachments =
        (ctx->mode & (MODE_DIME | MODE_MIME)) != 0 || ctx->dime.list != nullptr || ctx->mime.list != nullptr;
    return attachments ? unread : std::min(unread, soap_raw_surplus(ctx));
}

std::uint64_t xml_received(const soap *ctx)
{
    return ctx->plain_received - std::min(ctx->plain_received, ctx->attached_received);
}

std::uint64_t bounded_sum(std::uint64_t one, std::uint64_t other)
{
    return one > std::numeric_limits<std::uint64_t>::max() - other ? std::numeric_limits<std::uint64_t>::max()
                                                                   : one + other;
}

std::uint64_t allowed_for(std::uint64_t bytes)
{
    return EXTRA_BYTES + EXTRA_FACTOR * bytes;
}

bool counting(const soap *ctx)
{
    return (ctx->mode & MODE_COUNTING) != 0;
}

// Bytes of the message before the present place.
std::uint64_t output_place(const soap *ctx)
{
    if (counting(ctx))
        return ctx->message_count;
    const bool direct = (ctx->mode & MODE_IO_MASK) == MODE_DIRECT;
    return ctx->plain_sent + (direct ? 0 : ctx->buffer_index);
}

int memory_check(soap *ctx)
{
    const bool within = ctx->max_memory == 0 || ctx->memory_held < 0 ||
                        static_cast<std::uint64_t>(ctx->memory_held) <= ctx->max_memory;
    return within ? static_cast<int>(SOAP_OK) : limit_exceeded(ctx, "max_memory", ctx->max_memory);
}

} // namespace

void limits_reset(soap *ctx)
{
    ctx->plain_received = 0;
    ctx->attached_received = 0;
    ctx->bytes_copied = 0;
    ctx->memory_held = 0;
    ctx->exceeded = nullptr;
}

int limit_exceeded(soap *ctx, const char *name, std::uint64_t value)
{
    ctx->exceeded = name;
    ctx->exceeded_value = value;
    ctx->response_unfinished = true;
    return fail(ctx, SOAP_LENGTH);
}

int input_limits_check(soap *ctx)
{
    if (ctx->exceeded != nullptr)
        return fail(ctx, SOAP_LENGTH);
    const std::uint64_t received = xml_received(ctx);
    if (ctx->max_message != 0 && received > ctx->max_message && received - beside_xml(ctx) > ctx->max_message)
        return limit_exceeded(ctx, "max_message", ctx->max_message);
    return memory_check(ctx);
}

bool copy_allowed(const soap *ctx, std::uint64_t length)
{
    return length <=
           allowed_for(xml_received(ctx)) - std::min(allowed_for(xml_received(ctx)), ctx->bytes_copied);
}

int copy_charge(soap *ctx, std::size_t length)
{
    if (!copy_allowed(ctx, length))
        return limit_exceeded(ctx, "copies by references and QNames", allowed_for(xml_received(ctx)));
    ctx->bytes_copied += length;
    return memory_check(ctx);
}

int raw_bytes_check(soap *ctx)
{
    const std::uint64_t allowed = allowed_for(ctx->plain_received);
    return ctx->body_received <= allowed ? static_cast<int>(SOAP_OK)
                                         : limit_exceeded(ctx, "framing without contents", allowed);
}

int output_limit_check(soap *ctx, std::size_t length)
{
    ctx->plain_sent += length;
    if (ctx->xml_end_max != 0 && ctx->plain_sent > ctx->xml_end_max)
        return limit_exceeded(ctx, "max_message", ctx->max_message);
    return SOAP_OK;
}

void output_xml_begin(soap *ctx)
{
    ctx->xml_end_max = ctx->max_message == 0 ? 0 : bounded_sum(output_place(ctx), ctx->max_message);
}

int output_xml_end(soap *ctx)
{
    const bool within = ctx->xml_end_max == 0 || output_place(ctx) <= ctx->xml_end_max;
    ctx->xml_end_max = 0;
    return within ? static_cast<int>(SOAP_OK) : limit_exceeded(ctx, "max_message", ctx->max_message);
}

// attachment_stream.cpp - see attachment_stream.h.
#include "attachments/attachment_stream.h"

#include <algorithm>
#include <cstdio>

#include <zuv_client_pro/soap_error.h>
#include <zuv_client_pro/soap_io.h>

#include "attachments/attachment_list.h"

namespace {

const char *name_of(const char *id)
{
    return id == nullptr ? "" : id;
}

// True if the message needs no length in advance, so that a stream may be as long as it turns out to be.
bool length_is_open(const soap *ctx)
{
    const std::uint32_t framing = ctx->mode & MODE_IO_MASK;
    return framing == MODE_CHUNKED || framing == MODE_STORE;
}

} // namespace

int attachment_take_handle(soap *ctx, const char *id, attachment_close close, void *&handle)
{
    const bool refused = ctx->error != SOAP_OK;
    if (handle == soap_attachment_in_memory(ctx))
        handle = nullptr;
    else if (handle == nullptr && !refused)
        return attachment_fail(
            ctx, SOAP_USER_ERROR,
            "The open callback gave null for \"%.400s\", neither a handle nor soap_attachment_in_memory()",
            name_of(id));
    if (refused && handle != nullptr && close != nullptr)
        close(ctx, handle);
    return ctx->error;
}

attachment_stream::~attachment_stream()
{
    if (handle_ != nullptr && close_ != nullptr)
        close_(ctx_, handle_);
}

int attachment_stream::open(open_callback ask, const char *about)
{
    const bool has_bytes = record_.content != nullptr || record_.size != 0;
    if (ask != nullptr) {
        void *handle = ask(ctx_, record_.content, record_.id, record_.type, about);
        if (handle == nullptr && !has_bytes)
            return ctx_->error;
        if (attachment_take_handle(ctx_, record_.id, close_, handle) != SOAP_OK)
            return ctx_->error;
        handle_ = handle;
    }
    if (!is_open() && record_.content == nullptr && has_bytes)
        return attachment_fail(ctx_, SOAP_USER_ERROR, "Attachment \"%.400s\" has a length and no content",
                               name_of(record_.id));
    if (is_endless() && !length_is_open(ctx_))
        return attachment_fail(
            ctx_, SOAP_USER_ERROR,
            "Stream \"%.400s\" was attached without its length, which a message needs that "
            "is neither chunked nor stored",
            name_of(record_.id));
    return SOAP_OK;
}

std::size_t attachment_stream::next(char *data, std::size_t most)
{
    const std::size_t length = read_ == nullptr ? 0 : read_(ctx_, handle_, data, most);
    if (ctx_->error != SOAP_OK)
        return 0;
    if (length > most) {
        attachment_fail(ctx_, SOAP_CORRUPTION,
                        "The read callback of attachment \"%.400s\" gave %zu bytes where %zu were asked for",
                        name_of(record_.id), length, most);
        return 0;
    }
    given_ += length;
    return length;
}

int attachment_stream::read_full(char (&data)[ATTACHMENT_PIECE], std::size_t &length)
{
    length = 0;
    while (length < sizeof data) {
        const std::size_t part = next(data + length, sizeof data - length);
        if (part == 0)
            break;
        length += part;
    }
    return ctx_->error;
}

int attachment_stream::copy(std::uint64_t size)
{
    char data[ATTACHMENT_PIECE];
    while (size > 0) {
        const std::size_t part =
            next(data, size < sizeof data ? static_cast<std::size_t>(size) : sizeof data);
        if (part == 0)
            return ctx_->error != SOAP_OK
                       ? ctx_->error
                       : attachment_fail(ctx_, SOAP_EOF,
                                         "The stream of attachment \"%.400s\" ended after %llu of %llu bytes",
                                         name_of(record_.id), static_cast<unsigned long long>(given_),
                                         static_cast<unsigned long long>(record_.size));
        if (soap_send_bytes(ctx_, data, part) != SOAP_OK)
            return ctx_->error;
        size -= part;
    }
    return SOAP_OK;
}

int attachment_stream::copy_to_end()
{
    char data[ATTACHMENT_PIECE];
    for (;;) {
        const std::size_t part = next(data, sizeof data);
        if (part == 0 || soap_send_bytes(ctx_, data, part) != SOAP_OK)
            return ctx_->error;
    }
}

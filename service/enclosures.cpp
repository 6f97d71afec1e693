// enclosures.cpp - see enclosures.h.
#include "enclosures.h"

#include <algorithm>
#include <cstdio>
#include <exception>
#include <utility>

#include <zuv_client_pro/soap_attachment.h>
#include <zuv_client_pro/soap_error.h>
#include <zuv_client_pro/soap_memory.h>

namespace service {

namespace {

constexpr int TOO_LARGE = 413, INTERNAL_ERROR = 500;
constexpr std::size_t ATTACHMENTS_MAX = 1000; // of one request
constexpr std::size_t ENCLOSED_MAX = 100;     // of one answer: each is an open file until it is sent
constexpr std::size_t VALUES_MAX =
    64; // elements that wait for their bytes; with more, all attachments are kept in memory
constexpr char MEDIA_TYPE[] = "application/octet-stream";

// True if an element of the message waits for the attachment's bytes: then they are a part of the document.
bool is_value(soap *ctx, const char *id)
{
    std::size_t left = VALUES_MAX;
    for (const soap_attachment_ref *wanted = ctx->mtom_list; wanted != nullptr; wanted = wanted->next)
        if (left-- == 0 || soap_cid_compare(ctx, wanted->id, id) == 0)
            return true;
    return false;
}

// The message has been read, so what waits for attachments is known.
bool message_is_known(const soap *ctx)
{
    return (ctx->mode & MODE_MIME) == 0 || ctx->mime.root != nullptr;
}

int failed(const std::exception &failure)
{
    std::fprintf(stderr, "zuv-service: %s\n", failure.what());
    return INTERNAL_ERROR;
}

int refuse_encoding(soap *ctx, const transfer_decoder &decoder)
{
    const std::string text =
        std::string("An attachment is not the ") + decoder.name() + " that its head announces.";
    return soap_fault_sender(ctx, soap_string_dup(ctx, text.c_str()), nullptr, SOAP_MIME_ERROR);
}

} // namespace

void enclosures::reset()
{
    form_ = 0;
    arrived_bytes_ = 0;
    arrived_ = 0;
    too_large_ = false;
    arrived_parts_.clear();
    kept_.clear();
    outgoing_.clear();
}

void enclosures::discard_arrived()
{
    arrived_parts_.clear();
    for (const std::string &name : std::exchange(kept_, {}))
        remove_data(directory_, name);
}

// ---------------------------------------------------------------------------------------------
// Receiving. The library calls these; they must not throw.

void *enclosures::open(soap *ctx, const char *id, int encoding)
{
    if (++arrived_ > ATTACHMENTS_MAX) {
        too_large_ = true;
        ctx->error = TOO_LARGE;
        return nullptr;
    }
    try {
        const bool to_memory = !message_is_known(ctx) || is_value(ctx, id);
        std::unique_ptr<transfer_decoder> decoder = transfer_decoder::of(encoding);
        if (to_memory && decoder == nullptr)
            return soap_attachment_in_memory(ctx);
        arriving_part &part = arrived_parts_.emplace_back();
        part.decoder = std::move(decoder);
        if (!to_memory)
            part.file.emplace(directory_);
        return &part;
    } catch (const std::exception &failure) {
        ctx->error = failed(failure);
        return nullptr;
    }
}

int enclosures::write(soap *ctx, void *handle, const char *data, std::size_t length)
{
    arriving_part &part = *static_cast<arriving_part *>(handle);
    arrived_bytes_ += part.file ? length : 0; // what is in memory counts as the message does
    too_large_ = arrived_bytes_ > config_.attachment_limit;
    if (too_large_)
        return TOO_LARGE;
    try {
        if (part.decoder == nullptr) {
            part.file->write(data, length);
            return SOAP_OK;
        }
        if (!part.decoder->decode(data, length, part.memory))
            return refuse_encoding(ctx, *part.decoder);
        if (part.file) {
            part.file->write(part.memory.data(), part.memory.size());
            part.memory.clear();
        }
        return SOAP_OK;
    } catch (const std::exception &failure) {
        return failed(failure);
    }
}

void enclosures::close(soap *ctx, void *handle)
{
    arriving_part &part = *static_cast<arriving_part *>(handle);
    try {
        if (part.decoder != nullptr && ctx->error == SOAP_OK)
            end_decoding(ctx, part);
        if (part.file)
            part.file->flush(); // now, since no other connection waits for it
    } catch (const std::exception &failure) {
        const int error = failed(failure);
        ctx->error = ctx->error == SOAP_OK ? error : ctx->error;
    }
}

// The library has given the part what came; it gets what that means.
void enclosures::end_decoding(soap *ctx, arriving_part &part)
{
    if (!part.decoder->finish(part.memory)) {
        refuse_encoding(ctx, *part.decoder);
        return;
    }
    soap_attachment &attachment = *ctx->mime.last;
    attachment.encoding = MIME_BINARY;
    if (part.file) {
        part.file->write(part.memory.data(), part.memory.size());
        attachment.size = part.file->size();
        return;
    }
    attachment.size = part.memory.size();
    attachment.content =
        soap_string_dup_n(ctx, part.memory.data(), part.memory.size()); // null: out of memory
    part.memory = std::string();
}

bool enclosures::find(soap *ctx, const std::string &reference, enclosed_data &found)
{
    for (const soap_attachment *list : {ctx->dime.list, ctx->mime.list}) {
        for (const soap_attachment *a = list; a != nullptr; a = a->next) {
            if (a == ctx->mime.root || a->content == nullptr ||
                soap_cid_compare(ctx, reference.c_str(), a->id) != 0)
                continue;
            const auto part =
                std::find_if(arrived_parts_.begin(), arrived_parts_.end(), [a](const arriving_part &p) {
                    return static_cast<const void *>(&p) == a->content;
                });
            found = {part == arrived_parts_.end() ? nullptr : &*part->file, a->content, a->size};
            return true;
        }
    }
    return false;
}

void enclosures::keep(const enclosed_data &data, std::string_view name)
{
    kept_.emplace_back(name);
    if (data.file != nullptr) {
        data.file->keep_as(name);
        return;
    }
    arriving_file copy(directory_);
    copy.write(data.content, static_cast<std::size_t>(data.size));
    copy.keep_as(name);
}

// ---------------------------------------------------------------------------------------------
// Sending.

bool enclosures::enclose(const std::string &name)
{
    const auto has_name = [&](const outgoing &o) { return o.id == name; };
    if (std::any_of(outgoing_.begin(), outgoing_.end(), has_name))
        return true;
    if (!has_form() || outgoing_.size() == ENCLOSED_MAX)
        return false;
    outgoing_.emplace_back(directory_, name);
    return true;
}

void *enclosures::reopen(soap *ctx, void *handle)
{
    const bool is_file = std::any_of(outgoing_.begin(), outgoing_.end(),
                                     [handle](const outgoing &o) { return &o.file == handle; });
    return is_file ? handle : soap_attachment_in_memory(ctx);
}

std::size_t enclosures::read(void *handle, char *buffer, std::size_t length)
{
    return static_cast<kept_file *>(handle)->read(buffer, length);
}

int enclosures::attach_all(soap *ctx)
{
    for (outgoing &o : outgoing_) {
        const std::uint64_t size = o.file.size();
        char *const handle =
            size == 0 ? nullptr : reinterpret_cast<char *>(&o.file); // 0 is an unknown length
        const int result = (form_ & MODE_MIME) != 0
                               ? soap_mime_attach(ctx, handle, size, MIME_BINARY, MEDIA_TYPE,
                                                  o.bracketed_id.c_str(), nullptr, nullptr)
                               : soap_dime_attach(ctx, handle, size, MEDIA_TYPE, o.id.c_str(), 0, nullptr);
        if (result != SOAP_OK)
            return result;
    }
    return SOAP_OK;
}

} // namespace service

// document.cpp - see document.h.
#include "document.h"

#include <algorithm>
#include <cstring>
#include <utility>

#include <zuv_client_pro/soap_error.h>
#include <zuv_client_pro/soap_io.h>

namespace service {

namespace {

constexpr std::uint32_t CODEC_MODE = MODE_BARE_XML | MODE_BUFFERED | MODE_UTF_STRINGS;
constexpr std::size_t ERROR_TEXT_SIZE = 512; // bytes of an error's text that are kept

[[noreturn]] void fail(soap &context)
{
    if (context.error == SOAP_OUT_OF_MEMORY)
        throw std::bad_alloc();
    char text[ERROR_TEXT_SIZE] = "";
    const int error = context.error;
    throw document_error(soap_fault_print_text(&context, text, sizeof text), error);
}

} // namespace

document_codec::document_codec(std::uint64_t byte_limit, std::uint32_t depth_limit,
                               std::uint64_t memory_limit)
    : context_(CODEC_MODE), byte_limit_(byte_limit), memory_limit_(memory_limit)
{
    context_.max_depth = depth_limit;
    context_.max_memory = memory_limit;
    context_.user = this;
    context_.on_send = take_output;
    context_.on_recv = give_input;
}

int document_codec::take_output(soap *ctx, const char *data, std::size_t length)
{
    auto *const self = static_cast<document_codec *>(ctx->user);
    self->too_large_ = self->output_.size() + length > self->write_limit_;
    if (self->too_large_)
        return SOAP_LENGTH;
    try {
        self->output_.append(data, length);
    } catch (const std::bad_alloc &) {
        return SOAP_OUT_OF_MEMORY;
    }
    return SOAP_OK;
}

std::size_t document_codec::give_input(soap *ctx, char *buffer, std::size_t length)
{
    auto *const self = static_cast<document_codec *>(ctx->user);
    const std::size_t given = std::min(length, self->input_.size());
    std::memcpy(buffer, self->input_.data(), given);
    self->input_.remove_prefix(given);
    return given;
}

// A binary value that came with its message as an attachment is written as a reference again, which here
// leads to nothing.
bool document_codec::refers_to_attachment()
{
    if (context_.dime.first == nullptr && context_.mime.first == nullptr)
        return false;
    context_.dime.first = context_.dime.last = nullptr;
    context_.mime.first = context_.mime.last = nullptr;
    context_.error = SOAP_DIME_HREF;
    return true;
}

std::string document_codec::write_with(int (*put)(soap *ctx, const void *object), const void *object)
{
    context_.encoding_style = nullptr;
    context_.error = SOAP_OK;
    output_.clear();
    too_large_ = false;
    if (soap_count_begin(&context_) != SOAP_OK || soap_count_end(&context_) != SOAP_OK ||
        soap_send_begin(&context_) != SOAP_OK || put(&context_, object) != SOAP_OK ||
        refers_to_attachment() || soap_send_finish(&context_) != SOAP_OK) {
        if (too_large_)
            throw document_error("The document is larger than the service keeps.", 0, write_limit_);
        fail(context_);
    }
    return std::exchange(output_, {});
}

void document_codec::read_with(bool (*get)(soap *ctx, void *object), void *object, std::string_view xml)
{
    input_ = xml;
    const bool read = soap_receive_begin(&context_) == SOAP_OK && get(&context_, object) &&
                      soap_receive_finish(&context_) == SOAP_OK;
    soap_call_scratch_free(&context_); // what is left are the objects
    held_ += static_cast<std::uint64_t>(std::max<std::int64_t>(context_.memory_held, 0));
    if (memory_limit_ != 0 && held_ > memory_limit_)
        throw document_error("The documents take more memory than the service gives.", 0, memory_limit_);
    if (!read)
        fail(context_);
}

void document_codec::reset()
{
    soap_discard_objects(&context_, nullptr);
    soap_discard_all(&context_);
    held_ = 0;
}

} // namespace service

// attachment_sink.cpp - see attachment_sink.h.
#include "attachments/attachment_sink.h"

#include <algorithm>
#include <cstring>

#include <zuv_client_pro/soap_error.h>
#include <zuv_client_pro/soap_memory.h>

namespace {

constexpr std::size_t FIRST_PIECE = 1024;                   // bytes
constexpr std::size_t PIECE_MAX = std::size_t{1024} * 1024; // bytes; pieces double up to here

} // namespace

attachment_sink::~attachment_sink()
{
    if (stack_ != nullptr)
        soap_block_stack_drop(ctx_, stack_);
}

int attachment_sink::add_piece(std::size_t wanted)
{
    if (stack_ == nullptr)
        stack_ = soap_block_stack_push(ctx_);
    if (stack_ == nullptr)
        return ctx_->error = SOAP_OUT_OF_MEMORY;
    const auto grown = static_cast<std::size_t>(std::clamp<std::uint64_t>(size_, FIRST_PIECE, PIECE_MAX));
    const std::size_t capacity = std::max(grown, std::min(wanted, PIECE_MAX));
    piece_ = static_cast<char *>(soap_block_stack_grow(ctx_, stack_, capacity));
    filled_ = 0;
    capacity_ = piece_ == nullptr ? 0 : capacity;
    return piece_ == nullptr ? ctx_->error = SOAP_OUT_OF_MEMORY : SOAP_OK;
}

int attachment_sink::put(const char *data, std::size_t length)
{
    if (length == 0)
        return SOAP_OK;
    ctx_->attached_received += length;
    if (write_ != nullptr) {
        size_ += length;
        ctx_->error = write_(ctx_, handle_, data, length);
        return ctx_->error;
    }
    while (length > 0) {
        if (filled_ == capacity_ && add_piece(length) != SOAP_OK)
            return ctx_->error;
        const std::size_t part = std::min(length, capacity_ - filled_);
        std::memcpy(piece_ + filled_, data, part);
        filled_ += part;
        size_ += part;
        data += part;
        length -= part;
    }
    return SOAP_OK;
}

int attachment_sink::finish(soap_attachment *record)
{
    if (write_ != nullptr) {
        record->content = static_cast<char *>(handle_);
        record->size = size_;
        return SOAP_OK;
    }
    const std::uint64_t size = size_;
    if (put("", 1) != SOAP_OK)
        return ctx_->error;
    soap_block_stack_trim(ctx_, stack_, filled_);
    char *const content = static_cast<char *>(soap_block_stack_save(ctx_, stack_, nullptr, 0));
    stack_ = nullptr; // saving drops it, also when it fails
    if (content == nullptr)
        return ctx_->error;
    record->content = content;
    record->size = size;
    return SOAP_OK;
}

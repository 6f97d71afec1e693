// attachment_sink.h - where the bytes of an attachment go while they arrive: memory, or a write callback of
// the host.
//
// Elsewhere: records (attachment_list.cpp), where the bytes come from (dime.cpp, mime.cpp).
// Always: memory grows with what has arrived and never with what the peer announces.
#pragma once

#include <zuv_client_pro/soap_attachment.h>

class attachment_sink {
public:
    using write_callback = int (*)(soap *ctx, void *handle, const char *data, std::size_t length);

    // Gathers in memory.
    explicit attachment_sink(soap *ctx) : ctx_(ctx) {}
    // Hands on to `write`, which gets the handle.
    attachment_sink(soap *ctx, void *handle, write_callback write) : ctx_(ctx), handle_(handle), write_(write)
    {}
    attachment_sink(const attachment_sink &) = delete;
    attachment_sink &operator=(const attachment_sink &) = delete;
    ~attachment_sink(); // forgets what was gathered and not taken

    // 0, 20, or the result of the callback, also in ctx->error.
    int put(const char *data, std::size_t length);
    // Stores content and size in the record: a managed block with a zero byte after it, or the handle. 0
    // or 20.
    int finish(soap_attachment *record);

private:
    int add_piece(std::size_t wanted);

    soap *ctx_;
    void *handle_ = nullptr;
    write_callback write_ = nullptr;
    soap_block_stack *stack_ = nullptr;
    char *piece_ = nullptr;
    std::size_t filled_ = 0;   // bytes used of the newest piece
    std::size_t capacity_ = 0; // bytes of the newest piece
    std::uint64_t size_ = 0;   // bytes put in all
};

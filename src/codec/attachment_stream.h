// attachment_stream.h - an attachment that the host gives piece by piece through its read callbacks.
#pragma once

#include <zuv_client_pro/soap_attachment.h>

constexpr std::size_t ATTACHMENT_PIECE = 1024; // bytes asked of a read callback at a time

struct attachment_stream {
    void *handle;
    std::size_t (*read)(soap *ctx, void *handle, char *buffer, std::size_t length); // 0 at the end
    void (*close)(soap *ctx, void *handle);

    // Reads until `data` is full or the stream ends; `length` takes the number of bytes. 0 or the callback's
    // error.
    int read_full(soap *ctx, char (&data)[ATTACHMENT_PIECE], std::size_t &length) const;
    // Sends exactly `size` bytes. -1 if the stream ends earlier.
    int copy(soap *ctx, std::size_t size) const;
    // Sends all that the stream has.
    int copy_to_end(soap *ctx) const;
    void end(soap *ctx) const;

private:
    // One call of the callback; 0 bytes at the end and on an error, which ctx->error tells.
    std::size_t next(soap *ctx, char *data, std::size_t most) const;
};

// True if the message needs no length ahead, so that a stream may be as long as it turns out to be.
inline bool output_length_is_open(const soap *ctx)
{
    const std::uint32_t framing = ctx->mode & MODE_IO_MASK;
    return framing == MODE_CHUNKED || framing == MODE_STORE;
}

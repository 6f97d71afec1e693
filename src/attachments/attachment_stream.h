// attachment_stream.h - attachments that the host gives and takes piece by piece through its callbacks.
//
// Here: what an open callback may answer, and the stream of one that is sent. Elsewhere: where the bytes of
// one that is received go (attachment_sink.h).
#pragma once

#include <zuv_client_pro/soap_attachment.h>

constexpr std::size_t ATTACHMENT_PIECE = 1024; // bytes asked of a read callback at a time

using attachment_close = void (*)(soap *ctx, void *handle);

// What an open callback gave for the attachment with this id: 0, and `handle` is null if the library is to
// hold the bytes itself. Otherwise the error that the callback has set, after `close` for a handle that it
// gave all the same; 10 for null without an error.
int attachment_take_handle(soap *ctx, const char *id, attachment_close close, void *&handle);

class attachment_stream {
public:
    using open_callback = void *(*)(soap *ctx, void *handle, const char *id, const char *type,
                                    const char *about);
    using read_callback = std::size_t (*)(soap *ctx, void *handle, char *buffer, std::size_t length);

    attachment_stream(soap *ctx, const soap_attachment &record, read_callback read, attachment_close close)
        : ctx_(ctx), record_(record), read_(read), close_(close)
    {}
    attachment_stream(const attachment_stream &) = delete;
    attachment_stream &operator=(const attachment_stream &) = delete;
    ~attachment_stream(); // closes it

    // Asks the host for the stream, if it has such a callback. 0, 10 for a stream without the length that the
    // message needs, or a result of attachment_take_handle.
    int open(open_callback ask, const char *about);

    bool is_open() const { return handle_ != nullptr; }                // false: `content` is memory
    bool is_endless() const { return is_open() && record_.size == 0; } // it goes out up to its end

    // The results of all: 0, the error that a callback has set, that of sending, or 21 for more bytes than
    // were asked for.

    // Reads until `data` is full or the stream ends; `length` takes the number of bytes.
    int read_full(char (&data)[ATTACHMENT_PIECE], std::size_t &length);
    // Sends exactly `size` bytes. -1 if the stream ends earlier.
    int copy(std::uint64_t size);
    // Sends all that the stream has.
    int copy_to_end();

private:
    // One call of the callback; 0 bytes at the end and on an error, which ctx->error gives.
    std::size_t next(char *data, std::size_t most);

    soap *ctx_;
    const soap_attachment &record_;
    read_callback read_;
    attachment_close close_;
    void *handle_ = nullptr;
    std::uint64_t given_ = 0; // bytes that the stream gave
};

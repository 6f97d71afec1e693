// attachment_fuzz.h - what the readers of DIME and MIME are held against for any bytes.
#pragma once

#include "support/attachment_exchange.h"
#include "support/host_streams.h"

namespace attachment_exchange {

// What one way of reading made of a message: the outcome, and ids and bytes of all attachments.
struct reading {
    int error = 0;
    std::string attachments;

    bool operator==(const reading &) const = default;
};

// How much of a broken compressed stream came at once settles whether it is noticed before what is wrong
// with the bytes in front of the break. That something is wrong shows either way.
inline int outcome(const soap *ctx, int error)
{
    return error != 0 && (ctx->mode & MODE_DEFLATE) != 0 ? static_cast<int>(SOAP_ZLIB_ERROR) : error;
}

// In pieces of this size at most; into memory, or through callbacks.
inline reading read_message(const std::string &bytes, std::size_t piece, bool streams = false)
{
    reception read(bytes, 0, piece, piece);
    stream_host host;
    if (streams)
        host.serve(*read.wire);
    const soap *const ctx = read.wire.get();
    const int error = read.run();
    reading result = {outcome(ctx, error), {}};
    if (result.error == SOAP_ZLIB_ERROR)
        return result; // what came before the break may differ as well
    for (const soap_attachment *list : {ctx->dime.list, ctx->mime.list})
        for (const soap_attachment *a = list; a != nullptr; a = a->next) {
            if (a == ctx->mime.root || a->content == nullptr)
                continue;
            const auto *const stream = host.find(a->content);
            result.attachments +=
                text_of(a->id) + "=" + (stream ? stream->data : std::string(a->content, a->size)) + ";";
        }
    return result;
}

// Reads part by part. The last thing that went wrong counts.
inline reading read_lazily(const std::string &bytes)
{
    reception read(bytes, MODE_MIME_AFTER);
    reading result = {read.run(), {}};
    soap *const ctx = read.wire.get();
    while (ctx->error == 0 && soap_mime_next_part(ctx) != nullptr) {
    }
    result.error = ctx->error;
    return result;
}

inline void demand(bool holds, const char *what)
{
    if (holds)
        return;
    std::fprintf(stderr, "%s\n", what);
    std::abort();
}

// Memory, streams, lazy parts and any size of pieces give the same outcome; what was read goes out again and
// comes back.
inline void check_any_bytes(const std::string &bytes)
{
    const reading whole = read_message(bytes, SOAP_BUFFER_SIZE);
    demand(whole == read_message(bytes, 1), "byte by byte is different");
    demand(whole == read_message(bytes, 1 + bytes.size() % 61), "in pieces is different");
    const reading streamed = read_message(bytes, 1000, true);
    demand(whole.error == streamed.error, "the callbacks give another outcome");
    demand(whole.error != 0 || whole.attachments == streamed.attachments, "the callbacks got other bytes");
    read_lazily(bytes);
    if (whole.error != 0)
        return;
    reception read(bytes);
    read.run();
    for (const std::uint32_t form : {std::uint32_t{0}, MODE_MTOM}) {
        memory_wire wire(0, MODE_BUFFERED | MODE_BARE_XML | form);
        const int sent = send(wire, read.values);
        demand(sent != LENGTH_DIFFERS, "the length was counted wrongly");
    }
}

} // namespace attachment_exchange

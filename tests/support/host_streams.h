// host_streams.h - a host that gives and takes attachments through its callbacks, for DIME and MIME alike.
#pragma once

#include "support/library.h"

// A stream with its bytes. Its address is the handle of an attachment to send.
struct host_stream {
    std::string data;
    std::size_t at = 0;
    std::size_t step = 777; // bytes that one call gives at most
    int closed = 0;
};

// Gives streams, and takes attachments into streams by their ids; ids with "memory" in them are left to the
// library. Must outlive the context's use of it.
struct stream_host {
    std::deque<std::pair<std::string, host_stream>> taken; // with their ids
    int refusal = 0;                                       // result of the write callback

    void serve(soap &ctx)
    {
        ctx.user = this;
        ctx.dime_read_open = open_read;
        ctx.mime_read_open = open_read;
        ctx.dime_read = ctx.mime_read = read;
        ctx.dime_read_close = ctx.mime_read_close = close;
        ctx.dime_write_open = [](soap *c, const char *id, const char *, const char *) { return take(c, id); };
        ctx.mime_write_open = [](soap *c, void *, const char *id, const char *, const char *, int) {
            return take(c, id);
        };
        ctx.dime_write = ctx.mime_write = write;
        ctx.dime_write_close = ctx.mime_write_close = close;
    }

    // The newest stream of an id; std::out_of_range if there is none.
    const host_stream &of(const std::string &id) const
    {
        const auto found =
            std::find_if(taken.rbegin(), taken.rend(), [&](const auto &entry) { return entry.first == id; });
        return found != taken.rend() ? found->second : taken.at(taken.size()).second;
    }

    // The stream whose handle this is, or null.
    const host_stream *find(const void *handle) const
    {
        for (const auto &entry : taken)
            if (&entry.second == handle)
                return &entry.second;
        return nullptr;
    }

    static std::size_t read(soap *, void *handle, char *buffer, std::size_t length)
    {
        auto &source = *static_cast<host_stream *>(handle);
        const std::size_t part = std::min({length, source.step, source.data.size() - source.at});
        std::memcpy(buffer, source.data.data() + source.at, part);
        source.at += part;
        return part;
    }

private:
    static bool is_for_memory(const char *id)
    {
        return id != nullptr && std::strstr(id, "memory") != nullptr;
    }
    static void *open_read(soap *ctx, void *handle, const char *id, const char *, const char *)
    {
        return is_for_memory(id) ? soap_attachment_in_memory(ctx) : handle;
    }
    static void *take(soap *ctx, const char *id)
    {
        auto &taken = static_cast<stream_host *>(ctx->user)->taken;
        return is_for_memory(id) ? soap_attachment_in_memory(ctx)
                                 : &taken.emplace_back(id == nullptr ? "" : id, host_stream{}).second;
    }
    static int write(soap *ctx, void *handle, const char *data, std::size_t length)
    {
        static_cast<host_stream *>(handle)->data.append(data, length);
        return static_cast<stream_host *>(ctx->user)->refusal;
    }
    static void close(soap *, void *handle) { static_cast<host_stream *>(handle)->closed++; }
};

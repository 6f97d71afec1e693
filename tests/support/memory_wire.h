// memory_wire.h - a context whose peer is memory: what it sends is kept, what it receives is given in pieces.
// For tests of framing. Nothing is written to a trace file, no socket is opened.
#pragma once

#include "support/library.h"

class memory_wire : public soap {
public:
    explicit memory_wire(std::uint32_t input = 0, std::uint32_t output = 0) : soap(input, output)
    {
        on_send = take;
        on_recv = give;
        soap_log_set_received(this, nullptr);
        soap_log_set_sent(this, nullptr);
    }

    std::vector<std::string> sends;                                   // one entry for each call of on_send
    std::size_t send_limit = std::numeric_limits<std::size_t>::max(); // calls of on_send that succeed
    std::string incoming;                                             // what the peer sends; then it closes
    std::size_t given = 0;                                            // bytes of it that were received
    std::size_t receives = 0;                                         // calls of on_recv
    std::function<std::size_t(std::size_t)> piece; // size of the next piece; all at once without it

    std::string sent() const
    {
        std::string all;
        for (const std::string &part : sends)
            all += part;
        return all;
    }

    void receive(std::string bytes)
    {
        incoming = std::move(bytes);
        given = 0;
        receives = 0;
    }
    // The same in pieces: the first has so many bytes, each later one at most `later`.
    void receive(std::string bytes, std::size_t first, std::size_t later)
    {
        receive(std::move(bytes));
        piece = [first, later](std::size_t before) { return before == 0 ? first : later; };
    }

    // Reads on to the end of input; more than `limit` bytes are a fault of the reader.
    std::string read_all(std::size_t limit = 64U << 20)
    {
        std::string bytes;
        for (std::int32_t c = soap_recv_byte(this); c != -1 && bytes.size() < limit; c = soap_recv_byte(this))
            bytes += static_cast<char>(c);
        return bytes;
    }

private:
    static memory_wire &of(soap *ctx) { return *static_cast<memory_wire *>(ctx); }

    static int take(soap *ctx, const char *data, std::size_t length)
    {
        memory_wire &wire = of(ctx);
        if (wire.sends.size() >= wire.send_limit)
            return -1;
        wire.sends.emplace_back(data, length);
        return 0;
    }

    static std::size_t give(soap *ctx, char *buffer, std::size_t length)
    {
        memory_wire &wire = of(ctx);
        ++wire.receives;
        const std::size_t rest = wire.incoming.size() - wire.given;
        std::size_t part = std::min(rest, length);
        if (wire.piece && part != 0)
            part = std::clamp<std::size_t>(wire.piece(wire.given), 1, part);
        if (part != 0)
            std::memcpy(buffer, wire.incoming.data() + wire.given, part);
        wire.given += part;
        return part;
    }
};

// A wire that has begun to receive a message by the time it is there.
struct read_wire : memory_wire {
    explicit read_wire(const std::string &bytes, std::uint32_t modes = 0, std::size_t piece_size = 65536)
        : memory_wire(modes, modes)
    {
        receive(bytes, piece_size, piece_size);
        keep_alive = (modes & MODE_KEEP_ALIVE) != 0 ? 1 : 0;
        result = soap_receive_begin(this);
    }
    int result;
};

// The program's namespaces, those of the envelope and of encodings as a version of SOAP has them.
inline const soap_namespace *namespaces_of(int version)
{
    static const std::vector<soap_namespace> rows = [] {
        const soap_namespace *const first = soap_program_namespaces, *last = first;
        while (last->prefix)
            ++last;
        std::vector<soap_namespace> copy(first, last + 1);
        copy[0].uri = "http://www.w3.org/2003/05/soap-envelope";
        copy[1].uri = "http://www.w3.org/2003/05/soap-encoding";
        return copy;
    }();
    return version == 1 ? soap_program_namespaces : rows.data();
}

// Value of a line of an HTTP head, or "(none)".
inline std::string line_of(const std::string &head, const std::string &key)
{
    const std::size_t at = head.find("\r\n" + key + ": ");
    if (at == std::string::npos)
        return "(none)";
    const std::size_t start = at + key.size() + 4;
    return head.substr(start, head.find("\r\n", start) - start);
}

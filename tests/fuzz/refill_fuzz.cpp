// refill_fuzz.cpp - chunks and compression: bytes through every framing, and any bytes as a framed body. An
// even first byte sends the rest through a framing and reads it back, which must give the same bytes. An odd
// one takes the rest for what a peer sent after a head that announces chunks or compression.

#include "support/memory_wire.h"

namespace {

std::string head_of(bool chunked, bool compressed, bool gzip)
{
    std::string head = "HTTP/1.1 200 OK\r\nContent-Type: text/plain\r\n";
    if (chunked)
        head += "Transfer-Encoding: chunked\r\n";
    if (compressed)
        head += gzip ? "Content-Encoding: gzip\r\n" : "Content-Encoding: deflate\r\n";
    return head + "\r\n";
}

void read_hostile(unsigned choice, const std::string &body)
{
    memory_wire wire;
    const std::size_t piece = 1U + choice * 7;
    wire.receive(head_of(choice & 1, choice & 2, choice & 4) + body, piece, piece);
    soap_reset_call(&wire);
    if (soap_receive_begin(&wire) == 0) {
        wire.read_all();
        soap_receive_finish(&wire);
    }
}

void round_trip(unsigned choice, const std::string &body)
{
    static const std::uint32_t framings[] = {MODE_BUFFERED, MODE_STORE, MODE_CHUNKED, MODE_DIRECT};
    memory_wire wire(0, framings[choice & 3] | MODE_BARE_XML | (choice & 4 ? MODE_DEFLATE : 0));
    wire.zlib_out = choice & 8 ? 2 : 1;
    soap_reset_call(&wire);
    if (soap_send_begin(&wire) || soap_send_bytes(&wire, body.data(), body.size()) || soap_send_finish(&wire))
        std::abort();
    memory_wire back;
    back.receive(head_of((choice & 3) == 2, choice & 4, choice & 8) + wire.sent());
    soap_reset_call(&back);
    const int begun = soap_receive_begin(&back);
    if (body.empty())
        return;
    if (begun != 0 || back.read_all() != body || soap_receive_finish(&back) != 0)
        std::abort();
}

} // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t *data, std::size_t size)
{
    if (size < 1)
        return 0;
    const std::string body(reinterpret_cast<const char *>(data + 1), size - 1);
    if (data[0] & 1)
        read_hostile(data[0] >> 1, body);
    else
        round_trip(data[0] >> 1, body);
    return 0;
}

// http_head_fuzz.cpp - heads of requests and responses, read by the default callbacks. With ZUV_FUZZ_FAULT it
// has a fault on purpose, for fault_is_found.sh to see that one is found.

#include "support/memory_wire.h"

#ifdef ZUV_FUZZ_FAULT
char *kept; // the last refused head's start line

// One byte too few, for statuses that no seed has.
static void keep_start_line(const soap &ctx)
{
    if (ctx.error < 402 || ctx.error > 499)
        return;
    delete[] kept;
    kept = new char[std::strlen(ctx.message_text)];
    std::strcpy(kept, ctx.message_text);
}
#else
static void keep_start_line(const soap &) {}
#endif

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t *data, std::size_t size)
{
    if (size < 2)
        return 0;
    memory_wire wire(data[0] & 1 ? MODE_KEEP_ALIVE : 0, data[0] & 2 ? MODE_CHUNKED : MODE_BUFFERED);
    wire.keep_alive = data[0] & 1;
    const std::size_t piece = 1U + (data[0] >> 2);
    wire.receive(std::string(reinterpret_cast<const char *>(data + 1), size - 1), piece, piece);
    soap_reset_call(&wire);
    if (soap_receive_begin(&wire) == 0)
        soap_receive_finish(&wire);
    keep_start_line(wire);
    return 0;
}

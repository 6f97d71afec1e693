// mime_fuzz.cpp - MIME messages of any bytes, with an HTTP head or without.

#include "support/attachment_fuzz.h"

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t *data, std::size_t size)
{
    attachment_exchange::check_any_bytes(std::string(reinterpret_cast<const char *>(data), size));
    return 0;
}

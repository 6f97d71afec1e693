// dime_fuzz.cpp - DIME messages of any bytes. Seeds are annotated samples, which begin with "#"; their
// mutations are those of the bytes that they describe.

#include "support/annotated_bytes.h"
#include "support/attachment_fuzz.h"

namespace {

bool is_annotated(const std::uint8_t *data, std::size_t size)
{
    return size != 0 && *data == '#';
}

std::string bytes_of(const std::uint8_t *data, std::size_t size)
{
    const std::string bytes(reinterpret_cast<const char *>(data), size);
    return is_annotated(data, size) ? annotated_bytes(bytes) : bytes;
}

} // namespace

extern "C" std::size_t LLVMFuzzerMutate(std::uint8_t *data, std::size_t size, std::size_t most);

extern "C" std::size_t LLVMFuzzerCustomMutator(std::uint8_t *data, std::size_t size, std::size_t most,
                                               unsigned)
{
    if (is_annotated(data, size)) {
        const std::string bytes = bytes_of(data, size); // shorter than its description
        size = bytes.size();
        std::memcpy(data, bytes.data(), size);
    }
    return LLVMFuzzerMutate(data, size, most);
}

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t *data, std::size_t size)
{
    attachment_exchange::check_any_bytes(bytes_of(data, size));
    return 0;
}

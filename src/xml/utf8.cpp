// utf8.cpp - see utf8.h.
#include "xml/utf8.h"

namespace {

unsigned char byte_at(const char *p)
{
    return static_cast<unsigned char>(*p);
}

bool continues(const char *p)
{
    return (byte_at(p) & 0xC0) == 0x80;
}

// By the lead byte; 1 also for bytes that lead nothing.
std::size_t length_by_lead(unsigned char lead)
{
    return lead < 0xC0 ? 1 : lead < 0xE0 ? 2 : lead < 0xF0 ? 3 : 4;
}

} // namespace

std::size_t utf8_character_length(const char *p, const char *end)
{
    static constexpr std::uint32_t least[] = {0, 0, 0x80, 0x800, 0x10000};
    const unsigned char lead = byte_at(p);
    if (lead < 0x80)
        return 1;
    const std::size_t length = length_by_lead(lead);
    if (length == 1 || lead > 0xF4 || static_cast<std::size_t>(end - p) < length)
        return 0;
    for (std::size_t i = 1; i < length; ++i) {
        if (!continues(p + i))
            return 0;
    }
    const std::uint32_t code = utf8_decode(p);
    return code >= least[length] && xml_carries(code) ? length : 0;
}

std::size_t utf8_whole(const char *text, std::size_t length)
{
    std::size_t last = length; // place of the last lead byte
    while (last != 0 && length - last < 3 && continues(text + last - 1))
        --last;
    if (last == 0)
        return length;
    --last;
    return length - last < length_by_lead(byte_at(text + last)) ? last : length;
}

std::size_t utf8_encode(std::uint32_t code, char target[6])
{
    if (code < 0x80) {
        target[0] = static_cast<char>(code);
        return 1;
    }
    const std::size_t size = code < 0x800       ? 2
                             : code < 0x10000   ? 3
                             : code < 0x200000  ? 4
                             : code < 0x4000000 ? 5
                                                : 6;
    for (std::size_t i = size - 1; i != 0; --i, code >>= 6)
        target[i] = static_cast<char>(0x80 | (code & 0x3F));
    target[0] = static_cast<char>((0xFF00u >> size) | code);
    return size;
}

std::uint32_t utf8_decode(const char *&p)
{
    const unsigned char lead = byte_at(p);
    const std::size_t length = length_by_lead(lead);
    std::uint32_t code = length == 1 ? lead : lead & (0x7FU >> length);
    const char *const end = p + length;
    while (++p != end)
        code = code << 6 | (byte_at(p) & 0x3F);
    return code;
}

std::size_t utf8_to_latin1(char *text, std::size_t length)
{
    char *out = text;
    for (const char *p = text; p < text + length;) {
        const std::uint32_t code = utf8_decode(p);
        *out++ = code < 0x100 ? static_cast<char>(code) : '?';
    }
    return static_cast<std::size_t>(out - text);
}

// annotated_bytes.h - bytes written down for people: hexadecimal pairs and 'texts', with comments after "#".
#pragma once

#include <algorithm>
#include <cctype>
#include <string>
#include <string_view>

// The bytes of such a text. What is none of the above is left out.
inline std::string annotated_bytes(std::string_view text)
{
    const auto digit = [](char c) { return c <= '9' ? c - '0' : (c | 0x20) - 'a' + 10; };
    std::string bytes;
    while (!text.empty()) {
        const char c = text.front();
        std::size_t used = 1;
        if (c == '#') {
            used = std::min(text.find('\n'), text.size());
        } else if (c == '\'') {
            const std::size_t end = std::min(text.find('\'', 1), text.size());
            bytes.append(text.substr(1, end - 1));
            used = std::min(end + 1, text.size());
        } else if (text.size() > 1 && std::isxdigit(static_cast<unsigned char>(c)) &&
                   std::isxdigit(static_cast<unsigned char>(text[1]))) {
            bytes += static_cast<char>(digit(c) << 4 | digit(text[1]));
            used = 2;
        }
        text.remove_prefix(used);
    }
    return bytes;
}

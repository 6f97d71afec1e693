// http_head.h - looks into HTTP heads.
#pragma once

#include <string>

inline std::string text_of(const char *text)
{
    return text != nullptr ? text : "(null)";
}

// Value of a header line, or "(none)".
inline std::string line_of(const std::string &head, const std::string &key)
{
    const std::size_t at = head.find("\r\n" + key + ": ");
    if (at == std::string::npos)
        return "(none)";
    const std::size_t start = at + key.size() + 4;
    return head.substr(start, head.find("\r\n", start) - start);
}

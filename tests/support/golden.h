// golden.h - requests as a person can read them, and as they go over the wire.
//
// request.txt holds what all requests have in common, members.txt what is a request's own. The head's lines end
// with CR LF on the wire. The body's line breaks and the blanks before each line are for the reader alone; "\n"
// and "\r" stand for the bytes, "~" at the start of a line for a blank. A line that begins with "#" is a remark.
#pragma once

#include <stdexcept>

#include "support/library.h"

namespace golden {

inline std::ifstream open(const std::string &name)
{
    std::ifstream file(std::string(ZUV_GOLDEN_DIR) + "/" + name + ".txt");
    if (!file)
        throw std::runtime_error("no golden file " + name);
    return file;
}

inline std::string replaced(std::string text, const std::string &from, const std::string &to)
{
    for (std::size_t at = 0; (at = text.find(from, at)) != text.npos; at += to.size())
        text.replace(at, from.size(), to);
    return text;
}

inline std::string body_bytes(const std::string &line)
{
    const std::string text = line.substr(std::min(line.find_first_not_of(' '), line.size()));
    if (text.starts_with('#'))
        return {};
    return replaced(replaced(text.starts_with('~') ? " " + text.substr(1) : text, "\\n", "\n"), "\\r", "\r");
}

// What is an operation's own: its section begins with "== ", the names of ports and operations, and traits.
struct section {
    section(const std::string &port, const std::string &operation)
    {
        std::ifstream file = open("members");
        bool own = false;
        for (std::string line; std::getline(file, line);) {
            if (line.starts_with("== ")) {
                own =
                    line.find(" " + port + " ") != line.npos && line.find(" " + operation + " ") != line.npos;
                heading += own ? line : "";
            } else if (own) {
                members += body_bytes(line);
            }
        }
        if (heading.empty())
            throw std::runtime_error("no golden request " + port + " " + operation);
    }
    // Without its trait, if it begins with one; empty if the request doesn't have it.
    std::string line_of(const std::string &line) const
    {
        const std::size_t start = line.find('['), end = line.find("] ");
        if (start != line.find_first_not_of(' ') || end == line.npos)
            return line;
        return heading.find(line.substr(start, end - start + 1)) == heading.npos ? "" : line.substr(end + 2);
    }
    std::string heading, members;
};

struct message {
    std::string head; // with its empty line
    std::string body;
    std::string whole() const { return head + body; }
};

// The request of an operation. A Content-Length of "*" takes the body's length.
inline message read(const std::string &port, const std::string &operation)
{
    const section own(port, operation);
    std::string low = port;
    std::transform(low.begin(), low.end(), low.begin(), [](char c) { return c < 'a' ? c + 32 : c; });
    const auto named = [&](const std::string &text) {
        return replaced(replaced(replaced(text, "@Port", port), "@port", low), "@operation", operation);
    };
    std::stringstream common;
    common << open("request").rdbuf();
    std::istringstream lines(named(common.str()));
    message result;
    std::string line;
    while (std::getline(lines, line) && !line.empty()) {
        line = line[0] == '#' ? "" : own.line_of(line);
        result.head += line.empty() ? "" : line + "\r\n";
    }
    while (std::getline(lines, line))
        result.body += body_bytes(own.line_of(line));
    result.body = replaced(result.body, "@members", named(own.members));
    result.head = replaced(result.head, "*", std::to_string(result.body.size())) + "\r\n";
    return result;
}

} // namespace golden

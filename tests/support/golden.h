// golden.h - messages as a person can read them, and as they go over the wire.
//
// A golden file is a head, an empty line, a body. The head's lines end with CR LF on the wire. The body's
// line breaks and the blanks ahead of each line are for the reader alone; "\n" and "\r" stand for the bytes.
// A line that begins with "#" is a remark.
// "~" at the start of a line is a blank. "@declarations" stands for the namespace declarations that the root
// element of every message carries, which declarations.txt holds once.
#pragma once

#include <fstream>
#include <sstream>
#include <stdexcept>
#include <string>

namespace golden {

inline std::string unescape(const std::string &text)
{
    std::string bytes;
    for (std::size_t i = 0; i < text.size(); ++i) {
        if (text[i] == '\\' && i + 1 < text.size() && (text[i + 1] == 'n' || text[i + 1] == 'r'))
            bytes += text[++i] == 'n' ? '\n' : '\r';
        else
            bytes += text[i];
    }
    return bytes;
}

inline std::ifstream open(const std::string &name)
{
    std::ifstream file(std::string(ZUV_GOLDEN_DIR) + "/" + name);
    if (!file)
        throw std::runtime_error("no golden file " + name);
    return file;
}

inline std::string body(std::istream &file)
{
    std::string bytes, line;
    while (std::getline(file, line)) {
        const std::size_t start = line.find_first_not_of(' ');
        if (start == std::string::npos || line[start] == '#')
            continue;
        if (line.substr(start) == "@declarations") {
            std::ifstream declarations = open("declarations.txt");
            bytes += body(declarations);
        } else {
            bytes += unescape(line[start] == '~' ? " " + line.substr(start + 1) : line.substr(start));
        }
    }
    return bytes;
}

struct message {
    std::string head; // with its empty line
    std::string body;
    std::string whole() const { return head + body; }
};

// The message of a file. A Content-Length of "*" takes the body's length.
inline message read(const std::string &name)
{
    std::ifstream file = open(name);
    message result;
    std::string line, head;
    while (std::getline(file, line) && !line.empty()) {
        if (line[0] != '#')
            head += line + "\r\n";
    }
    result.body = body(file);
    const std::size_t star = head.find("Content-Length: *");
    if (star != std::string::npos)
        head.replace(star + 16, 1, std::to_string(result.body.size()));
    result.head = head + "\r\n";
    return result;
}

} // namespace golden

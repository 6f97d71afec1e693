// text_files.cpp - see text_files.h.
#include "text_files.h"

#include <algorithm>
#include <cerrno>
#include <cstdint>
#include <cstdio>
#include <cstring>
#include <optional>
#include <system_error>

#include "failure.h"
#include "replaced_file.h"

namespace cli {

namespace {

constexpr std::size_t STRETCH = 65536; // bytes

std::string read_all(std::FILE *file, const std::string &path)
{
    std::string bytes;
    char stretch[STRETCH];
    errno = 0;
    while (const std::size_t got = std::fread(stretch, 1, sizeof stretch, file))
        bytes.append(stretch, got);
    if (std::ferror(file) != 0)
        fail_file(path, "can't be read");
    return bytes;
}

// Bytes of the UTF-8 character at the beginning of a text, and its code; 0 if there is none.
std::size_t decode(std::string_view text, std::uint32_t &code)
{
    const auto byte = [&](std::size_t i) { return static_cast<unsigned char>(text[i]); };
    const unsigned first = byte(0);
    const std::size_t length = first < 0x80   ? 1
                               : first < 0xC2 ? 0
                               : first < 0xE0 ? 2
                               : first < 0xF0 ? 3
                               : first < 0xF5 ? 4
                                              : 0;
    if (length == 0 || length > text.size())
        return 0;
    code = length == 1 ? first : first & (0xFFU >> (length + 1));
    for (std::size_t i = 1; i < length; ++i) {
        if ((byte(i) & 0xC0U) != 0x80)
            return 0;
        code = code << 6 | (byte(i) & 0x3FU);
    }
    static constexpr std::uint32_t LEAST[] = {0, 0, 0x80, 0x800, 0x10000};
    const bool surrogate = code >= 0xD800 && code < 0xE000;
    return code < LEAST[length] || surrogate || code > 0x10FFFF ? 0 : length;
}

// Characters that hide or reverse text count as control characters too.
bool steers(std::uint32_t code)
{
    return code < 0x20 || (code >= 0x7F && code < 0xA0) || (code >= 0x202A && code <= 0x202E) ||
           (code >= 0x2066 && code <= 0x2069) || code == 0x2028 || code == 0x2029;
}

} // namespace

void fail_file(const std::string &path, const char *what)
{
    const int reason = errno;
    throw failure(EXIT_FILE, (path == "-" ? "standard input" : path) + ": " + what + ": " +
                                 std::generic_category().message(reason));
}

file_handle open_to_read(const std::string &path)
{
    file_handle file(std::fopen(path.c_str(), "rb"));
    if (!file)
        fail_file(path, "can't be opened");
    return file;
}

std::string read_file(const std::string &path)
{
    return path == "-" ? read_all(stdin, path) : read_all(open_to_read(path).get(), path);
}

std::string read_secret(const std::string &path)
{
    const std::string text = read_file(path);
    return text.substr(0, text.find_first_of("\r\n"));
}

void write_file(const std::string &path, std::string_view bytes)
{
    write_file(path, [bytes](std::FILE *file) { std::fwrite(bytes.data(), 1, bytes.size(), file); });
}

void write_file(const std::string &path, const std::function<void(std::FILE *)> &write)
{
    std::optional<replaced_file> replaced;
    if (path != "-")
        replaced.emplace(path);
    std::FILE *const file = replaced ? replaced->stream() : stdout;
    write(file);
    if (std::fflush(file) != 0 || std::ferror(file) != 0)
        fail_file(replaced ? path : "standard output", "can't be written");
    if (replaced)
        replaced->commit();
}

std::string printable(std::string_view text, bool lines)
{
    std::string clean;
    clean.reserve(text.size());
    while (!text.empty()) {
        const auto plain = std::find_if(text.begin(), text.end(), [](char c) { return c < ' ' || c > '~'; });
        clean.append(text.begin(), plain);
        text.remove_prefix(static_cast<std::size_t>(plain - text.begin()));
        if (text.empty())
            break;
        std::uint32_t code = 0;
        const std::size_t length = decode(text, code);
        const bool blank = code == '\n' || code == '\t' || code == '\r';
        if (length == 1 && blank)
            clean += lines && code != '\r' ? text[0] : ' ';
        else if (length == 0 || steers(code))
            clean += '?';
        else
            clean.append(text.substr(0, length));
        text.remove_prefix(length == 0 ? 1 : length);
    }
    return clean;
}

std::string lower(std::string text)
{
    std::transform(text.begin(), text.end(), text.begin(),
                   [](char c) { return c >= 'A' && c <= 'Z' ? static_cast<char>(c + ('a' - 'A')) : c; });
    return text;
}

std::string size_words(unsigned long long bytes)
{
    static constexpr const char *UNITS[] = {"kB", "MB", "GB", "TB"};
    if (bytes < 1000)
        return std::to_string(bytes) + " B";
    double size = static_cast<double>(bytes) / 1000;
    std::size_t unit = 0;
    for (; size >= 999.95 && unit + 1 < std::size(UNITS); ++unit)
        size /= 1000;
    char text[32];
    std::snprintf(text, sizeof text, "%.1f %s", size, UNITS[unit]);
    return text;
}

} // namespace cli

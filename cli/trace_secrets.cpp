// trace_secrets.cpp - see trace_secrets.h.
#include "trace_secrets.h"

#include <algorithm>
#include <cctype>

#include "contract.h"
#include "trace_reader.h"

namespace cli {

namespace {

constexpr std::string_view SECRET_WORDS[] = {"password",      "passwd",     "passphrase",
                                             "secret",        "token",      "certificate",
                                             "credentialkey", "privatekey", "signature"};
constexpr std::string_view SECRET_HEADERS[] = {"Authorization", "Proxy-Authorization", "Cookie",
                                               "Set-Cookie"};

} // namespace

bool is_secret_name(std::string_view qname)
{
    std::string name(contract::local_name(qname));
    std::transform(name.begin(), name.end(), name.begin(),
                   [](unsigned char c) { return static_cast<char>(std::tolower(c)); });
    return name == "key" ||
           std::any_of(std::begin(SECRET_WORDS), std::end(SECRET_WORDS),
                       [&](std::string_view word) { return name.find(word) != std::string::npos; });
}

std::string shown_header(std::string_view name, std::string_view value, bool show_secrets)
{
    const bool secret = std::any_of(std::begin(SECRET_HEADERS), std::end(SECRET_HEADERS),
                                    [&](std::string_view one) { return same_name(name, one); });
    if (show_secrets)
        return std::string(value);
    if (secret) { // the scheme stays: "Basic"
        const std::size_t blank = value.find(' ');
        return (blank == std::string_view::npos ? "" : std::string(value.substr(0, blank)) + " ") +
               std::string(BLANKED);
    }
    return same_name(name, "Location") || same_name(name, "Referer") ? shown_start_line(value, false)
                                                                     : std::string(value);
}

std::string shown_start_line(std::string_view line, bool show_secrets)
{
    const std::size_t query = line.find('?');
    if (show_secrets || query == std::string_view::npos)
        return std::string(line);
    const std::size_t end = std::min(line.find(' ', query), line.size());
    return std::string(line.substr(0, query + 1)) + std::string(BLANKED) + std::string(line.substr(end));
}

} // namespace cli

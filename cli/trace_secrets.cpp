// trace_secrets.cpp - see trace_secrets.h.
#include "trace_secrets.h"

#include <algorithm>
#include <span>

#include "contract.h"
#include "text_files.h"
#include "trace_reader.h"

namespace cli {

namespace {

constexpr std::string_view SECRET_WORDS[] = {"password",      "passwd",     "passphrase",
                                             "secret",        "token",      "certificate",
                                             "credentialkey", "privatekey", "signature"};
constexpr std::string_view SECRET_HEADERS[] = {"authorization", "cookie",     "api-key",
                                               "apikey",        "credential", "session"};
constexpr std::string_view SECRET_PARAMETERS[] = {"sig",     "auth",       "apikey", "api_key",
                                                  "api-key", "credential", "code",   "session"};

bool has_any(const std::string &name, std::span<const std::string_view> words)
{
    return std::any_of(words.begin(), words.end(),
                       [&](std::string_view word) { return name.find(word) != std::string::npos; });
}

// Where what begins in a text at `at` with a secret ends, and from where on it is secret; `at` if there is none.
struct secret_place {
    std::size_t begin, end;
};

secret_place pem_block(std::string_view text, std::size_t at)
{
    constexpr std::string_view BEGIN = "-----BEGIN ", END = "-----END ";
    if (!text.substr(at).starts_with(BEGIN))
        return {at, at};
    const std::size_t end = text.find(END, at);
    const std::size_t dashes =
        end == std::string_view::npos ? std::string_view::npos : text.find("-----", end + END.size());
    return {at, dashes == std::string_view::npos ? text.size() : dashes + 5};
}

// "user:password" of "://user:password@host".
secret_place user_of_url(std::string_view text, std::size_t at)
{
    constexpr std::string_view AUTHORITY = "://";
    if (!text.substr(at).starts_with(AUTHORITY))
        return {at, at};
    const std::size_t begin = at + AUTHORITY.size();
    const std::string_view authority =
        text.substr(begin, text.find_first_of("/?# \t\r\n\"'<>", begin) - begin);
    const std::size_t user_end = authority.rfind('@');
    return user_end == std::string_view::npos ? secret_place{at, at} : secret_place{begin, begin + user_end};
}

// The value of "?token=..." or "&token=...", also where the "&" is written as "&amp;".
secret_place url_parameter(std::string_view text, std::size_t at)
{
    if (text[at] != '?' && text[at] != '&' && text[at] != ';')
        return {at, at};
    const std::size_t end = text.find_first_of("=&;? \t\r\n\"'<>", at + 1);
    if (end == std::string_view::npos || text[end] != '=')
        return {at, at};
    const std::string_view name = text.substr(at + 1, end - at - 1);
    if (!is_secret_name(name) && !has_any(lower(std::string(name)), SECRET_PARAMETERS))
        return {at, at};
    return {end + 1, std::min(text.find_first_of("&;# \t\r\n\"'<>", end + 1), text.size())};
}

} // namespace

std::string without_secrets(std::string_view text)
{
    std::string shown;
    std::size_t done = 0;
    for (std::size_t at = 0; (at = text.find_first_of("-:?&;", at)) != std::string_view::npos;) {
        secret_place secret{at, at};
        for (const auto find : {pem_block, user_of_url, url_parameter})
            if (secret.end <= at)
                secret = find(text, at);
        if (secret.end > secret.begin) {
            shown.append(text.substr(done, secret.begin - done)).append(BLANKED);
            done = secret.end;
        }
        at = std::max(secret.end, at + 1);
    }
    return shown.append(text.substr(done));
}

bool is_secret_name(std::string_view qname)
{
    const std::string name = lower(std::string(contract::local_name(qname)));
    return name == "key" || has_any(name, SECRET_WORDS);
}

std::string shown_header(std::string_view name, std::string_view value, bool show_secrets)
{
    const bool secret = is_secret_name(name) || has_any(lower(std::string(name)), SECRET_HEADERS);
    if (show_secrets)
        return std::string(value);
    if (secret) { // the scheme stays: "Basic"
        const std::size_t blank = value.find(' ');
        return (blank == std::string_view::npos ? "" : std::string(value.substr(0, blank)) + " ") +
               std::string(BLANKED);
    }
    return same_name(name, "Location") || same_name(name, "Referer") ? shown_start_line(value, false)
                                                                     : without_secrets(value);
}

std::string shown_start_line(std::string_view line, bool show_secrets)
{
    const std::size_t query = line.find('?');
    if (show_secrets)
        return std::string(line);
    if (query == std::string_view::npos)
        return without_secrets(line);
    const std::size_t end = std::min(line.find(' ', query), line.size());
    return without_secrets(line.substr(0, query + 1)) + std::string(BLANKED) + std::string(line.substr(end));
}

} // namespace cli

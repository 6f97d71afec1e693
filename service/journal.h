// journal.h - what happened lately: the access log, and the last exchanges for the front page.
//
// Elsewhere: what is noted of an exchange (reception.cpp), who may read it (local_resources.cpp).
//
// Always: neither the log nor the texts handed out hold Authorization headers, queries of URLs, the names that
// lead to data, or the content of elements named as passwords and tokens are.
#pragma once

#include <chrono>
#include <cstdint>
#include <cstdio>
#include <deque>
#include <mutex>
#include <string>
#include <string_view>

namespace service {

constexpr std::size_t NOTED_BYTES = 16384; // of a request, and of an answer, that are kept to be shown
constexpr std::size_t NOTED_EXCHANGES = 50;

struct exchange_note {
    std::chrono::system_clock::time_point begun;
    std::chrono::steady_clock::duration lasted;
    std::string peer;                     // "127.0.0.1:40000"
    std::string method;                   // "POST"; empty if no head was read
    std::string target;                   // "Profile/create", or a path
    int status = 0;                       // 0: nothing was sent
    std::uint64_t received = 0, sent = 0; // bytes before encryption, heads included
    std::string request, answer;          // their first bytes: a request without its head
    bool shown = true;                    // false: only for the log
};

class journal {
public:
    // `path`: file that the access log is appended to, made for its owner alone (mode 0600); "-" is standard
    // output, empty is none. Throws std::system_error.
    explicit journal(std::string path);
    ~journal();
    journal(const journal &) = delete;
    journal &operator=(const journal &) = delete;

    // Opens the log's file by its name again, after a rotation. Without success the old one goes on.
    void reopen();

    void add(exchange_note note);

    // JSON of the last exchanges after the one with this number, the oldest first.
    std::string recent(std::uint64_t after) const;

private:
    void log(const exchange_note &note);

    const std::string path_;
    mutable std::mutex mutex_; // guards what follows
    std::FILE *log_ = nullptr;
    std::deque<exchange_note> notes_;
    std::uint64_t count_ = 0; // of exchanges shown ever; the number of the last
};

// A path as a log may hold it: what isn't printable or is a blank is encoded, the name of data and all beyond
// 200 characters are left out.
std::string loggable_path(std::string_view path);

// The text with "***" in the place of secrets; with `filler`, with this in the place of each of their bytes.
std::string without_secrets(std::string_view xml, char filler = '\0');

// Whether the value under such a name, of an element or a header, is a secret.
bool names_secret(std::string_view name);

// "2031-05-01T12:00:00.250Z", to the millisecond or, with 6 digits, the microsecond.
std::string time_text(std::chrono::system_clock::time_point moment, int digits = 3);

} // namespace service

// journal.cpp - see journal.h.
#include "journal.h"

#include <algorithm>
#include <cctype>
#include <cerrno>
#include <ctime>
#include <set>
#include <system_error>
#include <utility>

#include <fcntl.h>
#include <unistd.h>

#include <nlohmann/json.hpp>

#include "attachments.h"

namespace service {

namespace {

constexpr std::size_t PATH_MAX_SHOWN = 200; // characters
constexpr std::string_view SECRET_WORDS[] = {"password", "passwd", "passphrase",    "secret",
                                             "token",    "key",    "authorization", "cookie"};

constexpr std::string_view BLANKS = " \t\r\n";

// What a tag gives to the attribute, whatever the prefix of its name; empty for none.
std::string_view attribute_of(std::string_view tag, std::string_view wanted)
{
    for (std::size_t at = 0; (at = tag.find('=', at)) != std::string_view::npos; ++at) {
        const std::size_t quote = tag.find_first_not_of(BLANKS, at + 1);
        if (quote == std::string_view::npos || (tag[quote] != '"' && tag[quote] != '\''))
            continue;
        std::string_view name = tag.substr(0, tag.find_last_not_of(BLANKS, at - 1) + 1);
        name.remove_prefix(std::min(name.find_last_of(" \t\r\n:") + 1, name.size()));
        at = std::min(tag.find(tag[quote], quote + 1), tag.size() - 1);
        if (name == wanted)
            return tag.substr(quote + 1, at - quote - 1);
    }
    return {};
}

// The tag from its "<" at `at` on, and its name.
std::string_view tag_at(std::string_view xml, std::size_t at)
{
    return xml.substr(at, std::min(xml.find('>', at), xml.size() - 1) + 1 - at);
}
std::string_view name_of(std::string_view tag)
{
    return tag.substr(1, std::min(tag.find_first_of(" \t\r\n/>", 1), tag.size()) - 1);
}

// Of the elements that those named as secrets refer to: a value that several share stands outside of them.
std::set<std::string_view> ids_of_secrets(std::string_view xml)
{
    std::set<std::string_view> ids;
    for (std::size_t at = 0; (at = xml.find('<', at)) != std::string_view::npos; ++at) {
        const std::string_view tag = tag_at(xml, at);
        for (const std::string_view name : {"href", "ref"}) {
            const std::string_view to = attribute_of(tag, name);
            if (!to.empty() && names_secret(name_of(tag)))
                ids.insert(to.substr(to.front() == '#' ? 1 : 0));
        }
    }
    return ids;
}

// A new handle to the file, or null with errno.
std::FILE *open_log(const std::string &path)
{
    if (path == "-")
        return stdout;
    const int file = open(path.c_str(), O_WRONLY | O_CREAT | O_APPEND | O_CLOEXEC, 0600);
    if (file < 0)
        return nullptr;
    std::FILE *const stream = fdopen(file, "a");
    if (stream == nullptr)
        close(file);
    return stream;
}

void close_log(std::FILE *log)
{
    if (log != nullptr && log != stdout)
        std::fclose(log);
}

double milliseconds_of(std::chrono::steady_clock::duration lasted)
{
    return std::chrono::duration<double, std::milli>(lasted).count();
}

const char *or_dash(const std::string &text)
{
    return text.empty() ? "-" : text.c_str();
}

} // namespace

journal::journal(std::string path) : path_(std::move(path))
{
    if (path_.empty())
        return;
    log_ = open_log(path_);
    if (log_ == nullptr)
        throw std::system_error(errno, std::generic_category(), "access log " + path_);
}

journal::~journal()
{
    close_log(log_);
}

void journal::reopen()
{
    const std::lock_guard<std::mutex> lock(mutex_);
    if (log_ == nullptr)
        return;
    if (std::FILE *const fresh = open_log(path_)) {
        close_log(log_);
        log_ = fresh;
    } else {
        std::perror(("zuv-service: access log " + path_).c_str());
    }
}

void journal::log(const exchange_note &note)
{
    if (log_ == nullptr)
        return;
    std::fprintf(log_, "%s %s %s %s %d in=%llu out=%llu ms=%.3f\n", time_text(note.begun).c_str(),
                 or_dash(note.peer), or_dash(note.method), or_dash(note.target), note.status,
                 static_cast<unsigned long long>(note.received), static_cast<unsigned long long>(note.sent),
                 milliseconds_of(note.lasted));
    std::fflush(log_);
}

void journal::add(exchange_note note)
{
    const std::lock_guard<std::mutex> lock(mutex_);
    log(note);
    if (!note.shown)
        return;
    notes_.push_back(std::move(note));
    ++count_;
    if (notes_.size() > NOTED_EXCHANGES)
        notes_.pop_front();
}

std::string journal::recent(std::uint64_t after) const
{
    nlohmann::json list = nlohmann::json::array();
    const std::lock_guard<std::mutex> lock(mutex_);
    std::uint64_t number = count_ - notes_.size();
    for (const exchange_note &note : notes_) {
        if (++number <= after)
            continue;
        list.push_back({{"number", number},
                        {"time", time_text(note.begun)},
                        {"milliseconds", milliseconds_of(note.lasted)},
                        {"peer", note.peer},
                        {"method", note.method},
                        {"target", note.target},
                        {"status", note.status},
                        {"received", note.received},
                        {"sent", note.sent},
                        {"request", without_secrets(note.request)},
                        {"answer", without_secrets(note.answer)}});
    }
    const nlohmann::json all = {{"last", count_}, {"exchanges", std::move(list)}};
    return all.dump(-1, ' ', false, nlohmann::json::error_handler_t::replace);
}

std::string loggable_path(std::string_view path)
{
    if (path.starts_with(DATA_PATH))
        return std::string(DATA_PATH) + "***";
    std::string result;
    for (const char c : path.substr(0, PATH_MAX_SHOWN)) {
        char encoded[4];
        const auto code = static_cast<unsigned char>(c);
        std::snprintf(encoded, sizeof encoded, "%%%02X", code);
        if (code > ' ' && code < 127)
            result += c;
        else
            result += encoded;
    }
    return path.size() > PATH_MAX_SHOWN ? result + "..." : result;
}

std::string time_text(std::chrono::system_clock::time_point moment, int digits)
{
    using namespace std::chrono;
    const std::time_t seconds = system_clock::to_time_t(moment);
    const auto millionths = duration_cast<microseconds>(moment.time_since_epoch()).count() % 1000000;
    std::tm parts{};
    gmtime_r(&seconds, &parts);
    char date[32], text[48];
    std::strftime(date, sizeof date, "%Y-%m-%dT%H:%M:%S", &parts);
    std::snprintf(text, sizeof text, "%s.%0*dZ", date, digits,
                  static_cast<int>(digits == 6 ? millionths : millionths / 1000));
    return text;
}

bool names_secret(std::string_view tag)
{
    std::string name(tag.substr(tag.find(':') + 1)); // all of it without a colon
    std::transform(name.begin(), name.end(), name.begin(),
                   [](unsigned char c) { return static_cast<char>(std::tolower(c)); });
    return std::any_of(std::begin(SECRET_WORDS), std::end(SECRET_WORDS),
                       [&](std::string_view word) { return name.find(word) != std::string::npos; });
}

std::string without_secrets(std::string_view xml, char filler)
{
    const std::set<std::string_view> ids = ids_of_secrets(xml);
    std::string result;
    for (std::size_t at = 0; at < xml.size();) {
        const std::size_t tag = std::min(xml.find('<', at), xml.size());
        result.append(xml.substr(at, tag - at));
        if (tag == xml.size())
            break;
        const std::string_view head = tag_at(xml, tag), name = name_of(head);
        result.append(head);
        at = tag + head.size();
        if (name.empty() || head.ends_with("/>") ||
            !(names_secret(name) || (!ids.empty() && ids.count(attribute_of(head, "id")) != 0)))
            continue;
        // All forms of content: references, CDATA, elements.
        const std::size_t next = std::min(xml.find(std::string("</").append(name), at), xml.size());
        result.append(filler == '\0' ? "***" : std::string(next - at, filler));
        at = next;
    }
    return result;
}

} // namespace service

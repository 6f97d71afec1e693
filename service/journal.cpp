// journal.cpp - see journal.h.
#include "journal.h"

#include <algorithm>
#include <cctype>
#include <cerrno>
#include <ctime>
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
    std::string result;
    for (std::size_t at = 0; at < xml.size();) {
        const std::size_t tag = std::min(xml.find('<', at), xml.size());
        const std::size_t end = std::min(xml.find('>', tag), xml.size() - 1);
        result.append(xml.substr(at, tag - at));
        if (tag == xml.size())
            break;
        const std::string_view head = xml.substr(tag, end + 1 - tag);
        result.append(head);
        at = end + 1;
        const std::string_view name =
            head.substr(1, std::min(head.find_first_of(" \t\r\n/>", 1), head.size()) - 1);
        if (name.empty() || head.ends_with("/>") || !names_secret(name))
            continue;
        // All forms of content: references, CDATA, elements.
        const std::size_t next = std::min(xml.find(std::string("</").append(name), at), xml.size());
        result.append(filler == '\0' ? "***" : std::string(next - at, filler));
        at = next;
    }
    return result;
}

} // namespace service

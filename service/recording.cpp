// recording.cpp - see recording.h.
#include "recording.h"

#include <algorithm>
#include <cerrno>
#include <cstdio>
#include <cstring>
#include <fstream>
#include <memory>
#include <new>
#include <system_error>

#include <fcntl.h>
#include <openssl/evp.h>
#include <strings.h>
#include <sys/file.h>
#include <sys/stat.h>
#include <unistd.h>

#include <nlohmann/json.hpp>

#include <zuv_client_pro/soap_attachment.h>

#include "journal.h"
#include "transfer_encoding.h"

namespace service {

namespace {

using json = nlohmann::ordered_json;

constexpr std::string_view TYPE_HEADER = "Content-Type:";
constexpr std::size_t LISTED_MAX = 20; // operations that a fault lists
constexpr int DEPTH_MAX = 8;           // of JSON values within each other
constexpr int STATUS_OK = 200, STATUS_MIN = 400, STATUS_MAX = 599;

[[noreturn]] void fail(const std::string &path, const std::string &why)
{
    throw std::runtime_error("recording " + path + ": " + why);
}

// ---------------------------------------------------------------------------------------------
// Writing.

std::string base64_of(const std::string &bytes)
{
    std::string text(4 * ((bytes.size() + 2) / 3) + 1, '\0');
    const int length = EVP_EncodeBlock(reinterpret_cast<unsigned char *>(text.data()),
                                       reinterpret_cast<const unsigned char *>(bytes.data()),
                                       static_cast<int>(bytes.size()));
    text.resize(static_cast<std::size_t>(length));
    return text;
}

// All lengths stay, which DIME writes down; and so do attachments, after the end of the message proper.
std::string without_secrets_of_message(std::string_view body)
{
    const bool is_plain = body.find_first_not_of(" \t\r\n\xEF\xBB\xBF") == body.find('<');
    const std::size_t end =
        is_plain ? body.size() : std::min(body.find("Envelope>", body.find("</")), body.size());
    return without_secrets(body.substr(0, end), 'X').append(body.substr(end));
}

void put_body(json &target, const std::string &body)
{
    const std::string masked = without_secrets_of_message(body);
    json text = masked;
    try {
        text.dump(); // which refuses what isn't UTF-8
        target["body"] = std::move(text);
    } catch (const json::type_error &) {
        target["body_base64"] = base64_of(masked);
    }
}

std::vector<std::string> lines_of(std::string_view head)
{
    std::vector<std::string> lines;
    for (std::size_t end; (end = head.find("\r\n")) != std::string_view::npos && end != 0;
         head.remove_prefix(end + 2))
        lines.emplace_back(head.substr(0, end));
    return lines;
}

std::string line_of(const recorded_exchange &one)
{
    json request = {{"head", {one.start_line}}}, response;
    for (const std::string &line : one.request_head)
        request["head"].push_back(line);
    put_body(request, one.request);
    const std::vector<std::string> head = lines_of(one.answer_head);
    response["status"] = head.empty() || head[0].size() < 12 ? 0 : std::atoi(head[0].c_str() + 9);
    response["head"] = head;
    put_body(response, one.answer);
    const json line = {{"time", time_text(one.begun, 6)},
                       {"port", one.port},
                       {"operation", one.operation},
                       {"request", std::move(request)},
                       {"response", std::move(response)}};
    return line.dump(-1, ' ', false, json::error_handler_t::replace) + "\n"; // heads may hold any bytes
}

// Opens the file; nothing may be there that a new line would be joined to.
int open_to_append(const std::string &path)
{
    const int file = open(path.c_str(), O_RDWR | O_CREAT | O_APPEND | O_CLOEXEC | O_NONBLOCK, 0600);
    if (file < 0)
        fail(path, std::strerror(errno));
    struct stat found {};
    char last = '\n';
    std::string wrong;
    if (fstat(file, &found) != 0 || !S_ISREG(found.st_mode))
        wrong = "it is no regular file";
    else if (found.st_size != 0 && (pread(file, &last, 1, found.st_size - 1) != 1 || last != '\n'))
        wrong = "its last line is cut short, and nothing can be added to it";
    else if (flock(file, LOCK_EX | LOCK_NB) != 0)
        wrong = "another program records to it";
    if (wrong.empty())
        return file;
    close(file);
    fail(path, wrong);
}

// ---------------------------------------------------------------------------------------------
// Reading. What is wrong is thrown as text.

const json &member(const json &object, const char *name, json::value_t type)
{
    const auto found = object.find(name);
    if (found == object.end() || found->type() != type)
        throw std::invalid_argument(std::string("no exchange: \"") + name +
                                    "\" is missing or of another kind");
    return *found;
}

std::string text_member(const json &object, const char *name)
{
    return member(object, name, json::value_t::string).get<std::string>();
}

std::string body_of(const json &message)
{
    if (!message.contains("body_base64"))
        return text_member(message, "body");
    const std::string text = text_member(message, "body_base64");
    const std::unique_ptr<transfer_decoder> decoder = transfer_decoder::of(MIME_BASE64);
    std::string bytes;
    if (!decoder->decode(text.data(), text.size(), bytes) || !decoder->finish(bytes))
        throw std::invalid_argument("\"body_base64\" is no base64");
    return bytes;
}

std::string type_of(const json &head)
{
    for (const json &line : head) {
        const std::string text = line.is_string() ? line.get<std::string>() : "";
        if (strncasecmp(text.c_str(), TYPE_HEADER.data(), TYPE_HEADER.size()) == 0)
            return text.substr(std::min(text.find_first_not_of(' ', TYPE_HEADER.size()), text.size()));
    }
    throw std::invalid_argument("the head of the response has no Content-Type");
}

recorded_answer answer_of(const json &response)
{
    const json &status = member(response, "status", json::value_t::number_unsigned);
    if (status != STATUS_OK && (status < STATUS_MIN || status > STATUS_MAX))
        throw std::invalid_argument("the status of the response is neither 200 nor one from 400 to 599");
    return {status.get<int>(), type_of(member(response, "head", json::value_t::array)), body_of(response)};
}

json parsed(const std::string &line)
{
    const auto within_depth = [](int depth, json::parse_event_t, json &) {
        if (depth > DEPTH_MAX)
            throw std::invalid_argument("no exchange: its JSON is nested too deeply");
        return true;
    };
    json read = json::parse(line, within_depth, false);
    if (read.is_discarded())
        throw std::invalid_argument("not well-formed JSON; it may be cut short");
    return read;
}

} // namespace

recorder::recorder(const std::string &path) : path_(path)
{
    if (!path.empty())
        file_ = open_to_append(path);
}

recorder::~recorder()
{
    if (file_ >= 0)
        close(file_);
}

void recorder::leave_out(const std::string &why)
{
    if (!std::exchange(reported_, true))
        std::fprintf(stderr, "zuv-service: recording %s: %s; exchanges are missing from here on\n",
                     path_.c_str(), why.c_str());
}

void recorder::add(const recorded_exchange &exchange)
{
    std::string line, why;
    try {
        if (exchange.complete)
            line = line_of(exchange);
        else
            why = "a body is larger than 64 MiB";
    } catch (const std::exception &failure) {
        why = failure.what();
    }
    const std::lock_guard<std::mutex> lock(mutex_);
    if (!why.empty())
        return leave_out(why);
    const off_t end = lseek(file_, 0, SEEK_END);
    std::size_t written = 0;
    while (written != line.size()) {
        const ssize_t part = write(file_, line.data() + written, line.size() - written);
        if (part < 0 && errno == EINTR)
            continue;
        if (part <= 0) {
            leave_out(std::strerror(part == 0 ? ENOSPC : errno));
            if (end >= 0 && written != 0 && ftruncate(file_, end) != 0)
                leave_out(std::strerror(errno));
            return;
        }
        written += static_cast<std::size_t>(part);
    }
}

recording::recording(const std::string &path) : path_(path)
{
    if (path.empty())
        return;
    std::ifstream file(path, std::ios::binary);
    std::string line;
    std::size_t number = 0;
    while (std::getline(file, line)) {
        ++number;
        try {
            const json read = parsed(line);
            const json &request = member(read, "request", json::value_t::object);
            rows_[text_member(read, "port") + "/" + text_member(read, "operation")].push_back(
                {text_member(read, "time"), body_of(request),
                 answer_of(member(read, "response", json::value_t::object))});
        } catch (const std::invalid_argument &wrong) {
            fail(path, "line " + std::to_string(number) + ": " + wrong.what());
        }
    }
    for (auto &[name, rows] : rows_)
        std::stable_sort(rows.begin(), rows.end(),
                         [](const row &one, const row &other) { return one.time < other.time; });
    if (!file.is_open() || file.bad())
        fail(path, "it can't be read");
    if (number == 0)
        fail(path, "it holds no exchange");
}

std::string recording::explain(const std::string &call) const
{
    const auto same = rows_.find(call);
    if (same != rows_.end())
        return "The " + std::to_string(same->second.size()) + " recorded of " + call +
               " have been answered; a reset begins again.";
    std::string text = "Nothing is recorded of " + call + "; what is:";
    std::size_t listed = 0;
    for (const auto &[name, rows] : rows_) {
        if (listed++ == LISTED_MAX)
            return text + " and others.";
        text.append(listed == 1 ? " " : ", ").append(name).append(" (" + std::to_string(rows.size()) + ")");
    }
    return text + ".";
}

const recorded_answer &recording::take(std::string_view port, std::string_view operation,
                                       std::string_view request)
{
    const std::string call = std::string(port).append("/").append(operation);
    const std::string masked = without_secrets_of_message(request);
    const std::lock_guard<std::mutex> lock(mutex_);
    const auto same = rows_.find(call);
    row *first = nullptr;
    if (same != rows_.end()) {
        for (row &one : same->second) {
            if (one.used)
                continue;
            if (one.request == masked) {
                first = &one;
                break;
            }
            if (first == nullptr)
                first = &one;
        }
    }
    if (first == nullptr)
        throw no_recording(explain(call));
    first->used = true;
    return first->answer;
}

void recording::rewind()
{
    const std::lock_guard<std::mutex> lock(mutex_);
    for (auto &[name, rows] : rows_)
        for (row &one : rows)
            one.used = false;
}

} // namespace service

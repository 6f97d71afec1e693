// recording.h - exchanges kept in a file, one JSON object a line, and given back as answers.
//
// Here: the file, and which recorded answer a call gets. Elsewhere: what is noted of an exchange (reception.cpp),
// how a recorded answer is sent (answer.cpp).
//
// Always: a line is written whole or not at all, by one connection at a time. Secrets are not written: "***" in the
// place of the values of headers, "X" for each byte of the content of elements, named as those of the journal.
#pragma once

#include <chrono>
#include <cstddef>
#include <map>
#include <mutex>
#include <stdexcept>
#include <string>
#include <string_view>
#include <vector>

namespace service {

constexpr std::size_t RECORDED_MAX = std::size_t{64} << 20; // bytes of a body, framing and compression undone

struct recorded_answer {
    int status = 0;
    std::string type; // Content-Type
    std::string body;
};

struct recorded_exchange {
    std::chrono::system_clock::time_point begun;
    std::string port, operation;              // "Profile", "create"; an empty operation isn't recorded
    std::vector<std::string> request_head;    // "Name: value", after the start line
    std::string start_line;                   // "POST /zuv/v1.0/services/Profile HTTP/1.1"
    std::string request, answer_head, answer; // the bodies; a head ends with an empty line
    bool complete = true; // false: a body is larger than RECORDED_MAX, or there was no memory
};

// Appends exchanges to a file.
class recorder {
public:
    // `path`: a regular file, made for its owner alone (mode 0600); empty: nothing is recorded. Throws
    // std::runtime_error.
    explicit recorder(const std::string &path);
    ~recorder();
    recorder(const recorder &) = delete;
    recorder &operator=(const recorder &) = delete;

    bool is_on() const { return file_ >= 0; }

    // What can't be written is left out; the first time standard error says so.
    void add(const recorded_exchange &exchange);

private:
    void leave_out(const std::string &why);

    const std::string path_;
    int file_ = -1;
    std::mutex mutex_; // guards what follows, and the file's end
    bool reported_ = false;
};

// No recorded answer is left for a call; the text says what was recorded.
struct no_recording : std::runtime_error {
    using std::runtime_error::runtime_error;
};

// Answers from a file that a recorder wrote.
class recording {
public:
    // Reads all of the file; empty: there are no answers. Throws std::runtime_error that names file and line.
    explicit recording(const std::string &path);

    bool is_on() const { return !path_.empty(); }

    // The answer to a call, which is then used up: the first left of the same port and operation that has an equal
    // request body, or else the first left. Those of an operation are in the order of their times: of calls one
    // after the other on different connections, the second may be written first. Throws no_recording.
    const recorded_answer &take(std::string_view port, std::string_view operation, std::string_view request);

    void rewind(); // no answer is used up

private:
    struct row {
        std::string time, request;
        recorded_answer answer;
        bool used = false;
    };
    std::string explain(const std::string &call) const;

    const std::string path_;
    std::mutex mutex_;                             // guards `used`
    std::map<std::string, std::vector<row>> rows_; // by "Profile/create"
};

} // namespace service

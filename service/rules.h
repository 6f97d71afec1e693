// rules.h - faults and delays on request: rules that say how the next calls of an operation are answered.
//
// Here: the rules, read from JSON, and who gets which. Elsewhere: what a rule does to an answer (exchange.cpp,
// reception.cpp).
#pragma once

#include <cstddef>
#include <cstdint>
#include <list>
#include <mutex>
#include <optional>
#include <string>
#include <string_view>

namespace service {

// An empty text, a 0 or false leaves the answer as it is.
struct rule {
    std::string port, operation; // "Profile", "create"; empty: any
    std::uint32_t times = 1;     // calls that it still holds for; 0 in JSON: all to come
    std::string fault;           // of the contract, "Client.ObjectNotFound"; the call isn't carried out
    std::string text;            // of the fault
    int status = 0;              // HTTP status from 400 to 599; without a fault comes "Client" or "Server"
    int delay_ms = 0;            // before the answer; other connections are served
    std::optional<std::uint64_t> cut_after; // bytes of the answer, head included, after which it ends
    bool chunked = false;                   // answered in chunks
    bool gzip = false;                      // answered compressed, whether the client asked for it or not
    std::int64_t length_error = 0;          // added to the Content-Length
};

constexpr std::size_t RULES_MAX = 1000; // waiting at a time; protects memory

class rule_book {
public:
    // Adds the rules of a JSON text: an object, or an array of them, with the names above. Either all or none.
    // Throws std::invalid_argument that says what is wrong.
    void add(std::string_view json);
    void clear();
    std::string waiting() const; // those that wait

    // The first rule that fits a call, which is one less for it.
    std::optional<rule> take(std::string_view port, std::string_view operation);

private:
    mutable std::mutex mutex_;
    std::list<rule> rules_; // guarded by the mutex
};

} // namespace service

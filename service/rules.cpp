// rules.cpp - see rules.h.
#include "rules.h"

#include <algorithm>
#include <iterator>
#include <limits>
#include <stdexcept>

#include <nlohmann/json.hpp>

#include "faults.h"
#include "port.h"

namespace service {

namespace {

using nlohmann::json;

constexpr std::int64_t DELAY_MAX_MS = 600000;
constexpr std::int64_t MANY = std::int64_t{1} << 40; // bytes

[[noreturn]] void wrong(const std::string &name, const std::string &what)
{
    throw std::invalid_argument("rule: \"" + name + "\" " + what);
}

std::string text_of(const std::string &name, const json &value)
{
    if (!value.is_string())
        wrong(name, "is not a text");
    return value.get<std::string>();
}

bool flag_of(const std::string &name, const json &value)
{
    if (!value.is_boolean())
        wrong(name, "is neither true nor false");
    return value.get<bool>();
}

std::int64_t number_of(const std::string &name, const json &value, std::int64_t least, std::int64_t most)
{
    const bool fits =
        value.is_number_integer() &&
        (value.is_number_unsigned() ? value.get<std::uint64_t>() <= static_cast<std::uint64_t>(most)
                                    : true) &&
        value.get<std::int64_t>() >= least && value.get<std::int64_t>() <= most;
    if (!fits)
        wrong(name, "is not a number from " + std::to_string(least) + " to " + std::to_string(most));
    return value.get<std::int64_t>();
}

std::string port_of(const std::string &name, const json &value)
{
    std::string port = text_of(name, value);
    if (!port.empty() && find_port(std::string(SERVICES_PATH) + port) == nullptr)
        wrong(name, "is no port: " + port);
    return port;
}

std::string fault_of(const std::string &name, const json &value)
{
    std::string fault = text_of(name, value);
    if (!is_fault_name(fault))
        wrong(name, "is no fault of the contract: " + fault);
    return fault;
}

struct member {
    const char *name;
    void (*set)(rule &target, const std::string &name, const json &value);
};

constexpr member MEMBERS[] = {
    {"port", [](rule &r, const std::string &n, const json &v) { r.port = port_of(n, v); }},
    {"operation", [](rule &r, const std::string &n, const json &v) { r.operation = text_of(n, v); }},
    {"times", [](rule &r, const std::string &n,
                 const json &v) { r.times = static_cast<std::uint32_t>(number_of(n, v, 0, 1000000)); }},
    {"fault", [](rule &r, const std::string &n, const json &v) { r.fault = fault_of(n, v); }},
    {"text", [](rule &r, const std::string &n, const json &v) { r.text = text_of(n, v); }},
    {"status", [](rule &r, const std::string &n,
                  const json &v) { r.status = static_cast<int>(number_of(n, v, 400, 599)); }},
    {"delay_ms", [](rule &r, const std::string &n,
                    const json &v) { r.delay_ms = static_cast<int>(number_of(n, v, 0, DELAY_MAX_MS)); }},
    {"cut_after",
     [](rule &r, const std::string &n, const json &v) { r.cut_after = number_of(n, v, 0, MANY); }},
    {"chunked", [](rule &r, const std::string &n, const json &v) { r.chunked = flag_of(n, v); }},
    {"gzip", [](rule &r, const std::string &n, const json &v) { r.gzip = flag_of(n, v); }},
    {"length_error",
     [](rule &r, const std::string &n, const json &v) { r.length_error = number_of(n, v, -MANY, MANY); }},
};

rule rule_of(const json &object)
{
    if (!object.is_object())
        throw std::invalid_argument("rule: not a JSON object");
    rule result;
    for (const auto &[name, value] : object.items()) {
        const auto *const found = std::find_if(std::begin(MEMBERS), std::end(MEMBERS),
                                               [&, &n = name](const member &m) { return n == m.name; });
        if (found == std::end(MEMBERS))
            wrong(name, "is not known");
        found->set(result, name, value);
    }
    return result;
}

json json_of(const rule &r)
{
    json result = {{"times", r.times}};
    const auto put = [&result](const char *name, const auto &value) {
        if (value != std::decay_t<decltype(value)>{})
            result[name] = value;
    };
    put("port", r.port);
    put("operation", r.operation);
    put("fault", r.fault);
    put("text", r.text);
    put("status", r.status);
    put("delay_ms", r.delay_ms);
    put("chunked", r.chunked);
    put("gzip", r.gzip);
    put("length_error", r.length_error);
    if (r.cut_after)
        result["cut_after"] = *r.cut_after;
    return result;
}

bool fits(const std::string &wanted, std::string_view is)
{
    return wanted.empty() || wanted == is;
}

} // namespace

void rule_book::add(std::string_view text)
{
    const json read = json::parse(text, nullptr, false);
    if (read.is_discarded())
        throw std::invalid_argument("rules: not well-formed JSON");
    std::list<rule> added;
    if (read.is_array())
        for (const json &one : read)
            added.push_back(rule_of(one));
    else
        added.push_back(rule_of(read));
    const std::lock_guard<std::mutex> lock(mutex_);
    if (rules_.size() + added.size() > RULES_MAX)
        throw std::invalid_argument("rules: more than " + std::to_string(RULES_MAX));
    rules_.splice(rules_.end(), added);
}

void rule_book::clear()
{
    const std::lock_guard<std::mutex> lock(mutex_);
    rules_.clear();
}

std::string rule_book::waiting() const
{
    nlohmann::json list = nlohmann::json::array();
    const std::lock_guard<std::mutex> lock(mutex_);
    for (const rule &one : rules_)
        list.push_back(json_of(one));
    return list.dump();
}

std::optional<rule> rule_book::take(std::string_view port, std::string_view operation)
{
    const std::lock_guard<std::mutex> lock(mutex_);
    const auto found = std::find_if(rules_.begin(), rules_.end(), [&](const rule &one) {
        return fits(one.port, port) && fits(one.operation, operation);
    });
    if (found == rules_.end())
        return std::nullopt;
    rule taken = *found;
    if (found->times != 0 && --found->times == 0)
        rules_.erase(found);
    return taken;
}

} // namespace service

// local_resources.h - what people and scripts get beside the contract: the front page, the last exchanges and the
// waiting rules as JSON.
//
// Elsewhere: who may have them (reception.cpp), the page itself (front_page.html).
#pragma once

#include <cstdint>
#include <string>
#include <string_view>

#include "request_target.h"

namespace service {

constexpr std::string_view CONTROL_PATH = "/zuv/v1.0/control";     // GET, POST and DELETE of rules (rules.h)
constexpr std::string_view RESET_PATH = "/zuv/v1.0/control/reset"; // POST: the store as it began
constexpr std::string_view RECENT_PATH = "/zuv/v1.0/recent";       // GET, "?after=NUMBER"
constexpr char JSON_TYPE[] = "application/json";

// HTML: what is served, and the last exchanges, which the page asks for itself.
std::string front_page(const request_target &target);

// Content-Security-Policy of all that is fetched: only the page's own script and style, by their hashes, run.
const char *page_policy();

// NUMBER of the query "after=NUMBER"; 0 for another.
std::uint64_t number_after(const request_target &target);

// Whether a Content-Type, which may be null, is that of JSON.
bool is_json(const char *type);

} // namespace service

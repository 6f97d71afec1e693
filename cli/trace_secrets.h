// trace_secrets.h - what a trace must not show: certificates, keys, passwords, tokens, in headers and in XML.
#pragma once

#include <string>
#include <string_view>

namespace cli {

inline constexpr std::string_view BLANKED = "[not shown]";

// True if the content of an element, or the value of an attribute, of this name is secret.
bool is_secret_name(std::string_view qname);

// A text, without what is secret anywhere in it: PEM blocks, users with passwords in URLs, tokens and
// signatures among the parameters of URLs.
std::string without_secrets(std::string_view text);

// The value of a header, without secrets.
std::string shown_header(std::string_view name, std::string_view value, bool show_secrets);

// A start line without what follows the "?" of its URL, which may hold a token.
std::string shown_start_line(std::string_view line, bool show_secrets);

} // namespace cli

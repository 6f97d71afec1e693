// trace_text.h - messages of a trace as text: documents laid out, secrets left out, one exchange for a terminal.
//
// Elsewhere: the page (trace_page.h), what is secret (trace_secrets.h).
#pragma once

#include <cstddef>
#include <string>
#include <string_view>

#include "trace_exchange.h"

namespace cli {

enum class text_form { plain, html };

// Text that is safe in a form: "<" is "&lt;" on a page, control characters are "?" everywhere.
std::string shown(std::string_view text, text_form form, bool lines = true);

// XML, one line per element, or per element with text only. Of more than `shown_max` bytes only the size is given.
std::string xml_text(std::string_view xml, text_form form, bool show_secrets, std::size_t shown_max);

// "text/xml, <id>, 1.2 kB", with the name of what is attached before it.
std::string part_label(const body_part &part);

// All of an exchange, for a terminal.
std::string exchange_text(const exchange &one, bool show_secrets);

} // namespace cli

// xml_tokens.h - XML cut into tags and texts without asking whether it is well-formed: to show what arrived,
// broken or not.
#pragma once

#include <string_view>

namespace cli {

enum class xml_kind { start, empty, end, text, other }; // other: declarations, comments, instructions

struct xml_token {
    xml_kind kind;
    std::string_view source; // unchanged, brackets included
    std::string_view name;   // of a tag, "p:identity"
};

// One token after the other; every byte belongs to one.
class xml_tokens {
public:
    explicit xml_tokens(std::string_view xml) : rest_(xml) {}
    bool next(xml_token &token); // false at the end

private:
    xml_token take(xml_kind kind, std::size_t size, std::size_t name_at = 0);
    std::string_view rest_;
};

// The next attribute of a tag's source, which is cut to what follows it; false if there is none.
//   gap    what is before it
//   value  with its quotes; empty for none
bool next_attribute(std::string_view &tag, std::string_view &gap, std::string_view &name,
                    std::string_view &value);

} // namespace cli

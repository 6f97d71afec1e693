// xml_tokens.cpp - see xml_tokens.h.
#include "xml_tokens.h"

#include <algorithm>

namespace cli {

namespace {

constexpr std::string_view BLANKS = " \t\r\n";

// Bytes up to the end of a text; all of them if it is not there.
std::size_t through(std::string_view text, std::string_view end, std::size_t from)
{
    const std::size_t at = text.find(end, from);
    return at == std::string_view::npos ? text.size() : at + end.size();
}

// Bytes of a tag: to the ">" outside of quotes.
std::size_t tag_size(std::string_view text)
{
    char quote = 0;
    for (std::size_t i = 1; i < text.size(); ++i) {
        if (quote != 0)
            quote = text[i] == quote ? '\0' : quote;
        else if (text[i] == '"' || text[i] == '\'')
            quote = text[i];
        else if (text[i] == '>')
            return i + 1;
    }
    return text.size();
}

} // namespace

xml_token xml_tokens::take(xml_kind kind, std::size_t size, std::size_t name_at)
{
    xml_token token{kind, rest_.substr(0, size), {}};
    if (name_at != 0) {
        const std::string_view name = token.source.substr(name_at);
        token.name = name.substr(0, name.find_first_of(" \t\r\n/>"));
    }
    rest_.remove_prefix(token.source.size());
    return token;
}

bool xml_tokens::next(xml_token &token)
{
    if (rest_.empty())
        return false;
    if (rest_[0] != '<')
        token = take(xml_kind::text, std::min(rest_.find('<'), rest_.size()));
    else if (rest_.starts_with("<!--"))
        token = take(xml_kind::other, through(rest_, "-->", 4));
    else if (rest_.starts_with("<![CDATA["))
        token = take(xml_kind::text, through(rest_, "]]>", 9));
    else if (rest_.starts_with("<?"))
        token = take(xml_kind::other, through(rest_, "?>", 2));
    else if (rest_.starts_with("<!"))
        token = take(xml_kind::other, through(rest_, ">", 2));
    else if (rest_.starts_with("</"))
        token = take(xml_kind::end, through(rest_, ">", 2), 2);
    else {
        const std::size_t size = tag_size(rest_);
        const bool empty = size >= 3 && rest_.substr(size - 2, 2) == "/>";
        token = take(empty ? xml_kind::empty : xml_kind::start, size, 1);
    }
    return true;
}

bool next_attribute(std::string_view &tag, std::string_view &gap, std::string_view &name,
                    std::string_view &value)
{
    const std::size_t begin = std::min(tag.find_first_not_of(BLANKS), tag.size());
    if (begin == tag.size() || tag[begin] == '/' || tag[begin] == '>')
        return false;
    gap = tag.substr(0, begin);
    tag.remove_prefix(begin);
    name = tag.substr(0, std::max<std::size_t>(tag.find_first_of("= \t\r\n/>"), 1));
    tag.remove_prefix(name.size());
    value = {};
    if (!tag.starts_with('='))
        return true;
    const bool quoted = tag.size() > 1 && (tag[1] == '"' || tag[1] == '\'');
    const std::size_t end =
        quoted ? through(tag, tag.substr(1, 1), 2) : std::min(tag.find_first_of(" \t\r\n>", 1), tag.size());
    value = tag.substr(1, end - 1);
    tag.remove_prefix(end);
    return true;
}

} // namespace cli

// tag_match.cpp - the one pattern compare of the library: header names, URL schemes, certificate names,
// namespaces.
//
// Elsewhere: comparing qualified XML names (the reader's soap_tag_compare).
// Always: no recursion; the work is at most the product of the two lengths, whatever the pattern.
#include <zuv_client_pro/soap_xml.h>

namespace {

// ASCII only: the outcome must not depend on the host's locale.
char lower(char c)
{
    return c >= 'A' && c <= 'Z' ? static_cast<char>(c + ('a' - 'A')) : c;
}

bool same_letter(char one, char other)
{
    return one == other || lower(one) == lower(other);
}

bool at_end(const char *text)
{
    return *text == '\0' || *text == '"';
}

} // namespace

int soap_tag_match(const char *text, const char *pattern)
{
    const char *after_star = nullptr; // pattern after the last "*" met
    const char *run_end = nullptr;    // text that this "*" doesn't cover yet
    if (text == nullptr || pattern == nullptr)
        return 1;
    while (*text > '*' && *text == *pattern) { // spelled alike, up to the first that may be a mark
        ++text;
        ++pattern;
    }
    while (!at_end(text)) {
        if (*pattern == '*') {
            after_star = ++pattern;
            run_end = text;
            if (*pattern == '\0')
                return 0;
        } else if (*pattern == '-' || (*pattern != '\0' && same_letter(*text, *pattern))) {
            ++text;
            ++pattern;
        } else if (after_star != nullptr) {
            pattern = after_star;
            text = ++run_end;
        } else {
            return 1;
        }
    }
    while (*pattern == '*')
        ++pattern;
    return *pattern == '\0' ? 0 : 1;
}

// qname.cpp - qualified names as values: prefixes of a message to those of the namespace table and back.
//
// Elsewhere: names of elements and attributes (the XML reader and writer).
// Always: a value is a list of words parted by blanks; a word whose namespace the table lacks is "URI":local.

#include <charconv>
#include <cstring>
#include <string_view>

#include <zuv_client_pro/soap_error.h>
#include <zuv_client_pro/soap_memory.h>
#include <zuv_client_pro/soap_primitive.h>
#include <zuv_client_pro/soap_xml.h>

#include "core/failure.h"
#include "core/limits.h"
#include "values/values.h"
#include "xml/namespace.h"
#include "xml/utf8.h"

namespace {

bool is_blank(char byte)
{
    return static_cast<unsigned char>(byte) <= ' ';
}

// Takes the next word off a list; empty at its end.
std::string_view next_word(const char **text)
{
    while (**text != '\0' && is_blank(**text))
        ++*text;
    const char *start = *text;
    while (!is_blank(**text))
        ++*text;
    return {start, static_cast<std::size_t>(*text - start)};
}

// --- input ---

// Measures a text, or with a target writes it.
struct text_sink {
    char *target;
    std::size_t length;
    bool narrows; // words are UTF-8, and what is written is Latin-1

    void put(std::string_view text)
    {
        if (target != nullptr)
            std::memcpy(target + length, text.data(), text.size());
        length += text.size();
    }
    // A word of the message, or its local part. Measured for what it takes up until it is narrowed.
    void put_word(std::string_view text)
    {
        const std::size_t start = length;
        put(text);
        if (target != nullptr && narrows)
            length = start + utf8_to_latin1(target + start, text.size());
    }
    void put_quoted(std::string_view text)
    {
        put("\"");
        put(text);
        put("\"");
    }
};

// The table's prefix or the URI for the namespace of a prefix in scope; false if there is none.
bool put_namespace(soap *ctx, const soap_prefix *record, text_sink *out)
{
    if (record->index >= 0 && ctx->local_namespaces != nullptr) {
        const soap_namespace &row = ctx->local_namespaces[record->index];
        const std::string_view prefix = row.prefix != nullptr ? row.prefix : "";
        if (!prefix.empty() && prefix.back() != '_') {
            out->put(prefix);
            return true;
        }
        const char *uri = row.uri != nullptr ? row.uri : row.received;
        out->put_quoted(uri != nullptr ? uri : "");
        return true;
    }
    if (record->uri == nullptr)
        return false;
    out->put_quoted(record->uri);
    return true;
}

// One word with its namespace; false without one. `last`: no word follows.
bool put_mapped(soap *ctx, std::string_view word, bool last, text_sink *out)
{
    const soap_prefix *record = nullptr;
    const bool mapped = ctx->prefix_list != nullptr && word.substr(0, 4) != "xml:";
    if (mapped)
        record = xml_prefix_find(ctx, xml_prefix_of(word));
    if (!mapped || (record == nullptr && !last)) {
        out->put_word(word);
        return true;
    }
    if (record == nullptr)
        out->put_quoted("");
    else if (!put_namespace(ctx, record, out))
        return false;
    out->put(":");
    out->put_word(xml_local_part(word));
    return true;
}

// A list grows by a URI for each word; one that grows too much isn't even measured to its end.
bool put_list(soap *ctx, const char *text, text_sink *out)
{
    const bool measures = out->target == nullptr;
    for (std::string_view word = next_word(&text); !word.empty();) {
        if (measures && !copy_allowed(ctx, out->length))
            break;
        const std::string_view next = next_word(&text);
        if (!put_mapped(ctx, word, next.empty(), out))
            return false;
        if (!next.empty())
            out->put(" ");
        word = next;
    }
    return true;
}

// A managed text of the list's meaning. 0, 9, 20 or 45.
int map_list(soap *ctx, const char *text, char **target, bool narrows)
{
    text_sink measure = {nullptr, 0, narrows};
    if (!put_list(ctx, text, &measure))
        return fail(ctx, SOAP_NAMESPACE_ERROR);
    if (copy_charge(ctx, measure.length) != SOAP_OK)
        return ctx->error;
    auto *mapped = static_cast<char *>(soap_block_alloc(ctx, measure.length + 1));
    if (mapped == nullptr)
        return fail(ctx, SOAP_OUT_OF_MEMORY);
    text_sink out = {mapped, 0, narrows};
    put_list(ctx, text, &out);
    mapped[out.length] = '\0';
    *target = mapped;
    return SOAP_OK;
}

bool length_allowed(std::size_t length, long minimum, long maximum)
{
    return (minimum <= 0 || length >= static_cast<std::size_t>(minimum)) &&
           (maximum < 0 || length <= static_cast<std::size_t>(maximum));
}

// --- output ---

bool row_stands_for(const soap_namespace &row, const char *quoted, std::size_t length)
{
    const std::string_view uri(quoted, length);
    return (row.uri != nullptr && uri == row.uri) || (row.received != nullptr && uri == row.received) ||
           (row.pattern != nullptr && soap_tag_match(quoted, row.pattern) == 0);
}

const char *prefix_for(const soap *ctx, const char *quoted, std::size_t length)
{
    for (const soap_namespace *row = ctx->local_namespaces; row != nullptr && row->prefix != nullptr; row++)
        if (*row->prefix != '\0' && row_stands_for(*row, quoted, length))
            return row->prefix;
    return nullptr;
}

int put_text(soap *ctx, std::string_view text)
{
    return soap_text_buffer_put(ctx, text.data(), text.size());
}

// Declares a prefix of its own for a URI on the element to come and puts it. The URI follows the
// growing text for the time of the call, as it needs a terminator.
int put_new_prefix(soap *ctx, std::string_view uri)
{
    char name[32] = "xmlns:_";
    constexpr std::size_t fixed = sizeof "xmlns:_" - 1;
    const char *end = std::to_chars(name + fixed, name + sizeof name - 1, ++ctx->next_id).ptr;
    const std::size_t fill = ctx->label_index;
    if (put_text(ctx, uri) || soap_text_buffer_put(ctx, "", 1) ||
        soap_attr_set(ctx, name, ctx->label_buffer + fill, 1))
        return ctx->error;
    ctx->label_index = fill;
    return put_text(ctx, {name + fixed - 1, static_cast<std::size_t>(end - name) - fixed + 1});
}

int put_prefix_for(soap *ctx, std::string_view uri)
{
    const char *prefix = prefix_for(ctx, uri.data(), uri.size());
    return prefix != nullptr ? put_text(ctx, prefix) : put_new_prefix(ctx, uri);
}

// Marks for canonical output that the prefix of the word from `start` on is used.
int use_prefix_from(soap *ctx, std::size_t start)
{
    if (soap_text_buffer_put(ctx, "", 1) || soap_prefix_use(ctx, ctx->label_buffer + start))
        return ctx->error;
    ctx->label_index--;
    return SOAP_OK;
}

int put_word(soap *ctx, std::string_view word)
{
    const std::size_t start = ctx->label_index;
    const std::size_t quote = word[0] == '"' ? word.find('"', 1) : std::string_view::npos;
    if (quote != std::string_view::npos) {
        if (put_prefix_for(ctx, word.substr(1, quote - 1)))
            return ctx->error;
        word.remove_prefix(quote + 1);
    }
    if (put_text(ctx, word))
        return ctx->error;
    return (ctx->mode & MODE_CANONICAL) != 0 ? use_prefix_from(ctx, start) : SOAP_OK;
}

} // namespace

int soap_qname_read_map(soap *ctx, const char *text, char **target, long minimum, long maximum)
{
    if (text == nullptr)
        return ctx->error;
    if (!length_allowed(std::strlen(text), minimum, maximum))
        return fail(ctx, SOAP_LENGTH);
    return map_list(ctx, text, target, false);
}

int xml_qname_map_utf8(soap *ctx, const char *text, char **target)
{
    return map_list(ctx, text, target, (ctx->mode & MODE_UTF_STRINGS) == 0);
}

const char *soap_qname_write_map(soap *ctx, const char *text)
{
    if (text == nullptr)
        return nullptr;
    ctx->label_index = 0;
    for (std::string_view word = next_word(&text); !word.empty(); word = next_word(&text)) {
        if ((ctx->label_index > 0 && soap_text_buffer_put(ctx, " ", 1)) || put_word(ctx, word))
            return nullptr;
    }
    return soap_text_buffer_put(ctx, "", 1) ? nullptr : ctx->label_buffer;
}

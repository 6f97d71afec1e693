// http_headers.cpp - what each received header does to the context.
//
// Elsewhere: splitting a head into its headers (http_read.cpp), the decisions on the whole head (there too).
// Always: key and value may hold any bytes; a header that isn't in the table changes nothing.
#include <array>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <iterator>
#include <string_view>

#include <openssl/crypto.h>
#include <openssl/evp.h>

#include <zuv_client_pro/soap_error.h>
#include <zuv_client_pro/soap_http.h>
#include <zuv_client_pro/soap_memory.h>
#include <zuv_client_pro/soap_xml.h>

#include "core/text_encoding.h"
#include "core/tracking.h"

namespace {

constexpr std::size_t SCHEME_LENGTH = 6; // of "Basic ": where the parameters of a challenge are looked for

// Stores a managed copy of `text`, or null for null.
template <class Text> int store_copy(soap *ctx, const char *text, Text *&field)
{
    field = soap_string_dup(ctx, text);
    return text != nullptr && field == nullptr ? ctx->error : SOAP_OK;
}

bool has_item(soap *ctx, const char *list, const char *item)
{
    return soap_attr_value(ctx, list, item) != nullptr;
}

// An action in quotes loses the first and the last character.
int store_action(soap *ctx, const char *value)
{
    if (*value != '"')
        return store_copy(ctx, value, ctx->action);
    const std::size_t length = std::strlen(value + 1);
    ctx->action = soap_string_dup_n(ctx, value + 1, length > 0 ? length - 1 : 0);
    return ctx->action == nullptr ? ctx->error : SOAP_OK;
}

int parse_host(soap *ctx, const char *value)
{
    const std::string_view scheme = (ctx->input_mode & MODE_TLS) != 0 ? "https://" : "http://";
    const std::size_t length = scheme.copy(ctx->endpoint, scheme.size());
    ctx->endpoint[length] = '\0';
    std::strncat(ctx->endpoint, value, SOAP_TEXT_SIZE - 1 - length);
    return SOAP_OK;
}

// True if no item of the type can be one that is looked for, as with most: none begins as those do. One pass
// in place of one for each.
bool is_simple_type(const char *type)
{
    if (std::strcmp(type, "text/xml; charset=utf-8") == 0) // as nearly all say
        return true;
    for (;; ++type) {
        while (*type == ' ' || *type == '\t')
            ++type;
        if (std::strchr("aAmM%", *type) != nullptr) // finds the end too
            return *type == '\0';
        while (*type != ',' && *type != ';') {
            if (*++type == '\0')
                return true;
        }
    }
}

int parse_content_type(soap *ctx, const char *value)
{
    if (store_copy(ctx, value, ctx->http_content) != SOAP_OK)
        return ctx->error;
    if (is_simple_type(value)) {
        text_encoding_by_type(ctx, value, ctx->input_mode);
        return SOAP_OK;
    }
    const char *const type = ctx->http_content;
    if (has_item(ctx, type, "application/dime"))
        ctx->input_mode |= MODE_DIME;
    if (has_item(ctx, type, "multipart/related") || has_item(ctx, type, "multipart/form-data")) {
        if (store_copy(ctx, soap_attr_value(ctx, type, "boundary"), ctx->mime.boundary) != SOAP_OK ||
            store_copy(ctx, soap_attr_value(ctx, type, "start"), ctx->mime.start) != SOAP_OK)
            return ctx->error;
        ctx->input_mode |= MODE_MIME;
        if (soap_tag_match(soap_attr_value(ctx, type, "type"), "application/xop+xml") == 0)
            ctx->input_mode |= MODE_MTOM; // whatever the first part says of itself
    } else {                              // the parts of a multipart body have a type of their own
        text_encoding_by_type(ctx, type, ctx->input_mode);
    }
    const char *const action = soap_attr_value(ctx, type, "action");
    return action == nullptr ? SOAP_OK : store_action(ctx, action);
}

int parse_content_length(soap *ctx, const char *value)
{
    constexpr int DIGITS_MAX = 18; // of numbers that can't overflow
    std::uint64_t length = 0;
    const char *digit = value;
    for (; *digit >= '0' && *digit <= '9' && digit - value < DIGITS_MAX; ++digit)
        length = 10 * length + static_cast<std::uint64_t>(*digit - '0');
    if (digit == value || digit - value == DIGITS_MAX)
        length = std::strtoul(value, nullptr, 10);
    if (ctx->content_length_given && length != ctx->content_length)
        ctx->framing_doubtful = true; // which one holds is anybody's guess
    ctx->content_length = length;
    ctx->content_length_given = true;
    return SOAP_OK;
}

int parse_content_encoding(soap *ctx, const char *value)
{
    if (soap_tag_match(value, "deflate") == 0)
        ctx->zlib_in = 1;
    else if (soap_tag_match(value, "gzip") == 0)
        ctx->zlib_in = 2;
    return SOAP_OK;
}

// The weights of the codings are not looked at.
int parse_accept_encoding(soap *ctx, const char *value)
{
    if (std::strchr(value, '*') != nullptr || has_item(ctx, value, "gzip"))
        ctx->zlib_out = 2;
    else
        ctx->zlib_out = has_item(ctx, value, "deflate") ? 1 : 0;
    return SOAP_OK;
}

int parse_transfer_encoding(soap *ctx, const char *value)
{
    ctx->input_mode &= ~MODE_IO_MASK;
    if (soap_tag_match(value, "chunked") == 0)
        ctx->input_mode |= MODE_CHUNKED;
    return SOAP_OK;
}

// The peer's consent is pending until the version of its HTTP is known.
int parse_connection(soap *ctx, const char *value)
{
    if (std::strcmp(value, "keep-alive") == 0 || soap_tag_match(value, "keep-alive") == 0)
        ctx->keep_alive = static_cast<std::int16_t>(-ctx->keep_alive);
    else if (soap_tag_match(value, "close") == 0)
        ctx->keep_alive = 0;
    return SOAP_OK;
}

// Decodes base64 into scratch_text, at most as much as fits. False if it is none.
bool decode_to_scratch(soap *ctx, const char *text)
{
    constexpr std::size_t ENCODED_LIMIT = (SOAP_TEXT_SIZE - 1) / 3 * 4;
    std::size_t encoded = std::strlen(text);
    encoded = (encoded < ENCODED_LIMIT ? encoded : ENCODED_LIMIT) / 4 * 4;
    const int length =
        EVP_DecodeBlock(reinterpret_cast<unsigned char *>(ctx->scratch_text),
                        reinterpret_cast<const unsigned char *>(text), static_cast<int>(encoded));
    if (length < 0)
        return false;
    ctx->scratch_text[length] = '\0'; // the padding decodes to zero bytes and so ends the text earlier
    return true;
}

// Whatever comes on a connection that was opened for a call answers that call, whether it gives a status or
// not.
bool is_answer(const soap *ctx)
{
    return ctx->status != 0 || ctx->route.known;
}

int store_secret(soap *ctx, const char *text, const char *&field)
{
    if (store_copy(ctx, text, field) != SOAP_OK)
        return ctx->error;
    track_secret(ctx, field);
    return SOAP_OK;
}

int store_credentials(soap *ctx)
{
    char *const colon = std::strchr(ctx->scratch_text, ':');
    if (colon == nullptr)
        return SOAP_OK;
    *colon = '\0';
    if (store_secret(ctx, ctx->scratch_text, ctx->auth_user) != SOAP_OK)
        return ctx->error;
    return store_secret(ctx, colon + 1, ctx->auth_password);
}

// A request says who sends it. In an answer the peer would choose in whose name the next call is made.
int parse_authorization(soap *ctx, const char *value)
{
    if (is_answer(ctx) && (ctx->legacy & LEGACY_ANSWER_CREDENTIALS) == 0)
        return SOAP_OK;
    if (soap_tag_match(value, "Basic *") != 0 || !decode_to_scratch(ctx, value + SCHEME_LENGTH))
        return SOAP_OK;
    const int result = store_credentials(ctx);
    OPENSSL_cleanse(ctx->scratch_text, sizeof ctx->scratch_text);
    ctx->credentials_passed = true;
    return result;
}

int parse_challenge(soap *ctx, const char *value)
{
    if (std::strlen(value) < SCHEME_LENGTH)
        return SOAP_OK;
    const char *const realm = soap_attr_value(ctx, value + SCHEME_LENGTH, "realm");
    return realm == nullptr ? SOAP_OK : store_copy(ctx, realm, ctx->auth_realm);
}

// A client waits for leave to send its body. The answer bypasses the buffer, which holds what was received.
int parse_expect(soap *ctx, const char *value)
{
    if (ctx->status != 0 || soap_tag_match(value, "100-continue") != 0 || ctx->on_header_line == nullptr)
        return SOAP_OK;
    const std::uint32_t mode = ctx->mode;
    ctx->mode &= ~(MODE_IO_MASK | MODE_DEFLATE | MODE_COUNTING);
    int result = ctx->on_header_line(ctx, "HTTP/1.1 100 Continue", nullptr);
    if (result == SOAP_OK)
        result = ctx->on_header_line(ctx, nullptr, nullptr);
    ctx->mode = mode;
    return ctx->error = result;
}

int parse_location(soap *ctx, const char *value)
{
    std::snprintf(ctx->endpoint, SOAP_TEXT_SIZE, "%s", value);
    return SOAP_OK;
}

int parse_forwarded_for(soap *ctx, const char *value)
{
    return store_copy(ctx, value, ctx->forwarded_for);
}

struct header_row {
    std::string_view key; // pattern of soap_tag_match without a "*", terminated
    int (*parse)(soap *ctx, const char *value);
};

constexpr header_row HEADERS[] = {
    {"Host", parse_host},
    {"Content-Type", parse_content_type},
    {"Content-Length", parse_content_length},
    {"Content-Encoding", parse_content_encoding},
    {"Accept-Encoding", parse_accept_encoding},
    {"Transfer-Encoding", parse_transfer_encoding},
    {"Connection", parse_connection},
    {"Authorization", parse_authorization},
    {"WWW-Authenticate", parse_challenge},
    {"Proxy-Authenticate", parse_challenge},
    {"Expect", parse_expect},
    {"SOAPAction", store_action},
    {"Location", parse_location},
    {"X-Forwarded-For", parse_forwarded_for},
};

// By the first letter of a key, whatever its case: bit n means that HEADERS[n] begins so.
constexpr std::size_t LETTERS = 32;
constexpr std::array<std::uint32_t, LETTERS> rows_of_letter()
{
    std::array<std::uint32_t, LETTERS> rows{};
    std::uint32_t bit = 1;
    for (const header_row &row : HEADERS) {
        rows[static_cast<unsigned char>(row.key[0]) % LETTERS] |= bit;
        bit <<= 1;
    }
    return rows;
}
constexpr std::array<std::uint32_t, LETTERS> ROWS_OF_LETTER = rows_of_letter();

// A key matches up to its first quote, if it has one; most are spelled as in the table.
bool matches(const char *key, std::size_t length, std::string_view pattern)
{
    if (length < pattern.size())
        return false;
    return (length == pattern.size() && std::memcmp(key, pattern.data(), length) == 0) ||
           ((length == pattern.size() || key[pattern.size()] == '"') &&
            soap_tag_match(key, pattern.data()) == 0);
}

} // namespace

int http_parse_header(soap *ctx, const char *key, const char *value)
{
    const std::size_t length = std::strlen(key);
    std::uint32_t left = ROWS_OF_LETTER[static_cast<unsigned char>(*key) % LETTERS];
    for (; left != 0; left &= left - 1) {
        const header_row &row = HEADERS[__builtin_ctz(left)];
        if (matches(key, length, row.key))
            return row.parse(ctx, value);
    }
    return SOAP_OK;
}

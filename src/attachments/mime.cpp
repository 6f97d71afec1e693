// mime.cpp - MIME parts, out and in: delimiters, part heads, contents.
//
// Elsewhere: the head of the part that holds the message (exchange/envelope_frame.cpp), the message's own
// Content-Type (net/http_write.cpp).
//
//   message   = [preamble] first *part end [epilogue]
//   first     = "--" boundary CR LF fields CR LF content
//   part      = CR LF "--" boundary CR LF fields CR LF content
//   end       = CR LF "--" boundary "--"
//   fields    = *( name ":" value CR LF )
//
// Always: a boundary holds no line break, so a delimiter can begin at a carriage return only.
#include <cstring>

#include <sys/random.h>

#include <zuv_client_pro/soap_error.h>
#include <zuv_client_pro/soap_http.h>
#include <zuv_client_pro/soap_io.h>
#include <zuv_client_pro/soap_memory.h>
#include <zuv_client_pro/soap_xml.h>

#include "attachments/attachment_list.h"
#include "attachments/attachment_sink.h"
#include "attachments/attachment_stream.h"
#include "attachments/mime.h"
#include "core/buffered_in.h"
#include "core/failure.h"
#include "core/text_encoding.h"

namespace {

constexpr std::size_t BOUNDARY_MAX = 1020;   // characters that are compared
constexpr std::size_t BOUNDARY_RANDOM = 32;  // characters of six random bits each
constexpr unsigned FIELDS_MAX = 1024;        // fields of one part head
constexpr char BOUNDARY_PREFIX[] = "=_zuv_"; // "=_" can't come out of base64 or quoted-printable
constexpr const char *ROOT_ID = "<message@zuv_client_pro>";

// Follows a description. A value that the part answers takes the description in place of DIME options,
// and whoever takes it for such a block reads as many bytes as its third and fourth say: this is how it is
// known, and the zeros are there for descriptions of fewer characters.
constexpr char DESCRIPTION_END[] = "\0\0\0\0\0\x9DMIME description";

struct encoding_row {
    int code;
    const char *name;
};

constexpr encoding_row ENCODINGS[] = {
    {MIME_7BIT, "7bit"},       {MIME_8BIT, "8bit"},
    {MIME_BINARY, "binary"},   {MIME_QUOTED_PRINTABLE, "quoted-printable"},
    {MIME_BASE64, "base64"},   {MIME_IETF_TOKEN, "ietf-token"},
    {MIME_X_TOKEN, "x-token"},
};

const char *encoding_name(int code)
{
    for (const encoding_row &row : ENCODINGS) {
        if (row.code == code)
            return row.name;
    }
    return nullptr;
}

int encoding_code(const char *name)
{
    for (const encoding_row &row : ENCODINGS) {
        if (soap_tag_match(name, row.name) == 0)
            return row.code;
    }
    return MIME_NONE;
}

// --- out ---

// Takes the bytes of a head: sends them, or only counts them.
class head_writer {
public:
    explicit head_writer(soap *ctx, bool sends) : ctx_(ctx), sends_(sends) {}

    void put(const char *text, std::size_t length)
    {
        length_ += length;
        if (sends_ && result_ == SOAP_OK)
            result_ = soap_send_bytes(ctx_, text, length);
    }
    void put(const char *text) { put(text, std::strlen(text)); }

    // A field, unless it has no value; line breaks in the value would make fields of their own and are left
    // out.
    void put_field(const char *name, const char *value)
    {
        if (value == nullptr)
            return;
        put(name);
        while (*value != '\0') {
            const std::size_t length = std::strcspn(value, "\r\n");
            put(value, length);
            value += length + std::strspn(value + length, "\r\n");
        }
        put("\r\n");
    }

    int result() const { return result_; }
    std::size_t length() const { return length_; }

private:
    soap *ctx_;
    bool sends_;
    int result_ = SOAP_OK;
    std::size_t length_ = 0;
};

void put_delimiter(const soap *ctx, head_writer &out)
{
    out.put("\r\n--");
    out.put(ctx->mime.boundary);
}

void put_part_head(const soap *ctx, const soap_attachment &part, head_writer &out)
{
    put_delimiter(ctx, out);
    out.put("\r\n");
    out.put_field("Content-Type: ", part.type);
    out.put_field("Content-Transfer-Encoding: ", encoding_name(part.encoding));
    out.put_field("Content-ID: ", part.id);
    out.put_field("Content-Location: ", part.location);
    out.put_field("Content-Description: ", part.description);
    out.put("\r\n");
}

void put_end(const soap *ctx, head_writer &out)
{
    put_delimiter(ctx, out);
    out.put("--");
}

int send_content(soap *ctx, const soap_attachment &part)
{
    attachment_stream stream(ctx, part, ctx->mime_read, ctx->mime_read_close);
    if (stream.open(ctx->mime_read_open, part.description) != SOAP_OK)
        return ctx->error;
    if (!stream.is_open())
        return soap_send_bytes(ctx, part.content, static_cast<std::size_t>(part.size));
    return stream.is_endless() ? stream.copy_to_end() : stream.copy(part.size);
}

// Random characters for a boundary. False if the system has no randomness to give.
bool draw(char *text, std::size_t length)
{
    static const char ALPHABET[] = "ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz0123456789_-";
    unsigned char bytes[BOUNDARY_RANDOM];
    if (getrandom(bytes, length, 0) != static_cast<ssize_t>(length)) // so few bytes come whole or not at all
        return false;
    for (std::size_t i = 0; i < length; ++i)
        text[i] = ALPHABET[bytes[i] & 63];
    text[length] = '\0';
    return true;
}

// --- in: part heads ---

// The line of a delimiter, without its dashes, gives the boundary or must repeat it.
int take_boundary(soap *ctx, char *text)
{
    std::size_t length = std::strlen(text);
    while (length > 0 && static_cast<unsigned char>(text[length - 1]) <= ' ')
        --length;
    text[length] = '\0';
    if (ctx->mime.boundary == nullptr) {
        ctx->mime.boundary = soap_string_dup(ctx, text);
        return ctx->mime.boundary == nullptr ? ctx->error : SOAP_OK;
    }
    return std::strcmp(ctx->mime.boundary, text) == 0 ? SOAP_OK : fail(ctx, SOAP_MIME_ERROR);
}

int store_copy(soap *ctx, const char *text, const char *&field)
{
    field = soap_string_dup(ctx, text);
    return text != nullptr && field == nullptr ? ctx->error : SOAP_OK;
}

int store_description(soap *ctx, const char *text, const char *&field)
{
    const std::size_t length = std::strlen(text);
    auto *const copy = static_cast<char *>(soap_block_alloc(ctx, length + sizeof DESCRIPTION_END));
    if (copy == nullptr)
        return ctx->error;
    std::memcpy(copy, text, length);
    std::memcpy(copy + length, DESCRIPTION_END, sizeof DESCRIPTION_END);
    field = copy;
    return SOAP_OK;
}

int take_field(soap *ctx, soap_attachment *part, const char *name, const char *value)
{
    if (soap_tag_match(name, "Content-ID") == 0)
        return store_copy(ctx, value, part->id);
    if (soap_tag_match(name, "Content-Location") == 0)
        return store_copy(ctx, value, part->location);
    if (soap_tag_match(name, "Content-Type") == 0)
        return store_copy(ctx, value, part->type);
    if (soap_tag_match(name, "Content-Description") == 0)
        return store_description(ctx, value, part->description);
    if (soap_tag_match(name, "Content-Disposition") == 0 && part->id == nullptr)
        return store_copy(ctx, soap_attr_value(ctx, value, "name"), part->id);
    if (soap_tag_match(name, "Content-Transfer-Encoding") == 0)
        part->encoding = encoding_code(value);
    return SOAP_OK;
}

int split_field(soap *ctx, soap_attachment *part, char *line)
{
    char *const colon = std::strchr(line, ':');
    if (colon == nullptr)
        return SOAP_OK;
    *colon = '\0';
    char *value = colon + 1;
    while (*value == ' ' || *value == '\t')
        ++value;
    std::size_t length = std::strlen(value);
    while (length > 0 && static_cast<unsigned char>(value[length - 1]) <= ' ')
        --length;
    value[length] = '\0';
    return take_field(ctx, part, line, value);
}

// The fields of a new part, of which `line` (SOAP_TEXT_SIZE bytes) holds the first, up to the empty line.
int read_fields(soap *ctx, char *line)
{
    soap_attachment *part = soap_attachment_add(ctx, &ctx->mime.list, &ctx->mime.last, nullptr, 0);
    if (part == nullptr)
        return ctx->error;
    for (unsigned fields = 0; line[0] != '\0'; ++fields) {
        if (fields == FIELDS_MAX)
            return fail(ctx, SOAP_MIME_ERROR);
        if (split_field(ctx, part, line) != SOAP_OK || soap_recv_line(ctx, line, SOAP_TEXT_SIZE) != SOAP_OK)
            return ctx->error;
    }
    return SOAP_OK;
}

// The head of a part whose delimiter was read; it may be empty.
int read_next_head(soap *ctx)
{
    char line[SOAP_TEXT_SIZE];
    return soap_recv_line(ctx, line, sizeof line) == SOAP_OK ? read_fields(ctx, line) : ctx->error;
}

// --- in: contents ---

struct delimiter {
    char text[BOUNDARY_MAX + 5];
    std::size_t length;
};

delimiter delimiter_of(const soap *ctx)
{
    delimiter result = {"\r\n--", 4};
    const char *const boundary = ctx->mime.boundary == nullptr ? "" : ctx->mime.boundary;
    const std::size_t length = strnlen(boundary, BOUNDARY_MAX);
    std::memcpy(result.text + result.length, boundary, length);
    result.length += length;
    return result;
}

int put(attachment_sink *sink, const char *data, std::size_t length)
{
    return sink == nullptr ? static_cast<int>(SOAP_OK) : sink->put(data, length);
}

// Where a delimiter, or as much of one as fits, begins in the stretch; its end if none does.
const char *find_delimiter(const char *start, const char *end, const delimiter &wanted)
{
    for (const char *p = start;
         (p = static_cast<const char *>(std::memchr(p, '\r', static_cast<std::size_t>(end - p)))) != nullptr;
         ++p) {
        const std::size_t left = static_cast<std::size_t>(end - p);
        if (std::memcmp(p, wanted.text, left < wanted.length ? left : wanted.length) == 0)
            return p;
    }
    return end;
}

// Compares the unread bytes with the delimiter, of which `matched` bytes were found; uses those that go on
// with it.
std::size_t match_on(soap *ctx, const delimiter &wanted, std::size_t matched)
{
    while (matched < wanted.length && ctx->buffer_index < ctx->buffer_length &&
           ctx->buffer[ctx->buffer_index] == wanted.text[matched]) {
        ++ctx->buffer_index;
        ++matched;
    }
    return matched;
}

// Takes the content up to the delimiter, and the delimiter. `matched` bytes of one were read already.
int take_content(soap *ctx, attachment_sink *sink, const delimiter &wanted, std::size_t matched)
{
    for (;;) {
        if (ctx->buffer_index >= ctx->buffer_length && soap_recv_more(ctx) != SOAP_OK)
            return fail_at_end(ctx);
        if (matched == 0) {
            const char *const start = ctx->buffer + ctx->buffer_index;
            const char *const found = find_delimiter(start, ctx->buffer + ctx->buffer_length, wanted);
            const std::size_t length = static_cast<std::size_t>(found - start);
            if (put(sink, start, length) != SOAP_OK)
                return ctx->error;
            ctx->buffer_index += length;
        }
        matched = match_on(ctx, wanted, matched);
        if (matched == wanted.length)
            return SOAP_OK;
        if (matched > 0 && ctx->buffer_index < ctx->buffer_length) { // the bytes only looked like a delimiter
            if (put(sink, wanted.text, matched) != SOAP_OK)
                return ctx->error;
            matched = 0;
        }
    }
}

// A byte that the XML reader gave back comes before the rest of the message's part; `matched` says
// whether a delimiter may begin with it.
int take_pushed_back(soap *ctx, attachment_sink *sink, std::size_t &matched)
{
    const std::int32_t byte = ctx->look_ahead;
    matched = 0;
    if (byte == -1)
        return fail_at_end(ctx);
    ctx->look_ahead = 0;
    if (byte == '\r')
        matched = 1;
    const char c = static_cast<char>(byte);
    return byte > 0 && byte != '\r' ? put(sink, &c, 1) : static_cast<int>(SOAP_OK);
}

// What follows a boundary: dashes end the message, a line end leads to the next part.
int take_delimiter_end(soap *ctx, bool &last)
{
    std::int32_t c = soap_recv_byte(ctx);
    last = c == '-';
    if (last)
        return soap_recv_byte(ctx) == '-' ? SOAP_OK : fail(ctx, SOAP_MIME_ERROR);
    while (c == ' ' || c == '\t' || c == '\r')
        c = soap_recv_byte(ctx);
    if (c == '\n')
        return SOAP_OK;
    return ctx->error = c == -1 && ctx->error != SOAP_OK ? ctx->error : SOAP_MIME_ERROR;
}

int receive_content(soap *ctx, soap_attachment *part, attachment_sink *sink)
{
    std::size_t matched = 0;
    if (take_pushed_back(ctx, sink, matched) != SOAP_OK ||
        take_content(ctx, sink, delimiter_of(ctx), matched) != SOAP_OK)
        return ctx->error;
    return sink == nullptr ? SOAP_OK : sink->finish(part);
}

// The host is asked about all parts but the first, which is taken for the message unless the message has been
// announced under another id.
bool may_stream(const soap *ctx, const soap_attachment *part)
{
    const bool ahead_of_message = ctx->mime.root == nullptr && ctx->mime.start != nullptr;
    return ctx->mime_write_open != nullptr && ctx->mime_write != nullptr &&
           (part != ctx->mime.list || ahead_of_message);
}

// The rest of the part that holds the message is of no use to anybody; another part goes to memory or to the
// host.
int receive_part(soap *ctx, soap_attachment *part, void *handle)
{
    if (part == ctx->mime.root)
        return receive_content(ctx, part, nullptr);
    const bool streams = may_stream(ctx, part);
    if (streams) {
        handle = ctx->mime_write_open(ctx, handle, part->id, part->type, part->description, part->encoding);
        if (attachment_take_handle(ctx, part->id, ctx->mime_write_close, handle) != SOAP_OK)
            return ctx->error;
    }
    if (!streams || handle == nullptr) {
        attachment_sink sink(ctx);
        return receive_content(ctx, part, &sink);
    }
    attachment_sink sink(ctx, handle, ctx->mime_write);
    const int result = receive_content(ctx, part, &sink);
    if (ctx->mime_write_close != nullptr)
        ctx->mime_write_close(ctx, handle);
    return result != SOAP_OK ? result : ctx->error;
}

// The message had no references yet when the parts before it were read.
void bind_early_parts(soap *ctx)
{
    for (soap_attachment *part = ctx->mime.list; part != nullptr && part != ctx->mime.root; part = part->next)
        soap_attachment_bind(ctx, part);
}

// Fields of a form may have one name.
int end_of_parts(soap *ctx)
{
    const bool form = ctx->http_content != nullptr &&
                      (soap_attr_value(ctx, ctx->http_content, "multipart/form-data") != nullptr);
    ctx->mode &= ~MODE_MIME;
    ctx->mime.boundary = nullptr; // a message to be sent draws its own
    ctx->mime.start = nullptr;
    return form ? SOAP_OK : attachment_ids_check(ctx, ctx->mime.list, nullptr, SOAP_MIME_ERROR);
}

} // namespace

bool mime_is_description(const char *options, std::size_t length)
{
    const std::size_t end = strnlen(options, length);
    return length - end >= sizeof DESCRIPTION_END &&
           std::memcmp(options + end, DESCRIPTION_END, sizeof DESCRIPTION_END) == 0;
}

std::uint64_t mime_part_length(soap *ctx, const soap_attachment &part)
{
    head_writer counter(ctx, false);
    put_part_head(ctx, part, counter);
    return counter.length() + part.size;
}

std::uint64_t mime_end_length(soap *ctx)
{
    head_writer counter(ctx, false);
    put_end(ctx, counter);
    return counter.length();
}

void soap_mime_start(soap *ctx, const char *boundary, const char *start)
{
    ctx->output_mode |= MODE_MIME;
    ctx->mime.boundary = soap_string_dup(ctx, boundary);
    ctx->mime.start = soap_string_dup(ctx, start);
}

int soap_mime_boundary_make(soap *ctx)
{
    if (ctx->mime.start == nullptr) {
        ctx->mime.start = soap_string_dup(ctx, ROOT_ID);
        if (ctx->mime.start == nullptr)
            return ctx->error;
    }
    if (ctx->mime.boundary != nullptr)
        return SOAP_OK;
    char text[BOUNDARY_RANDOM + 16];
    std::memcpy(text, BOUNDARY_PREFIX, sizeof BOUNDARY_PREFIX);
    if (!draw(text + sizeof BOUNDARY_PREFIX - 1, BOUNDARY_RANDOM))
        return fail(ctx, SOAP_FATAL_ERROR);
    ctx->mime.boundary = soap_string_dup(ctx, text);
    return ctx->mime.boundary == nullptr ? ctx->error : SOAP_OK;
}

int soap_mime_part_header_write(soap *ctx, const soap_attachment *part)
{
    head_writer out(ctx, true);
    put_part_head(ctx, *part, out);
    return out.result();
}

int soap_mime_attachments_write(soap *ctx)
{
    if (!mime_is_written(ctx))
        return SOAP_OK;
    if (attachment_ids_check_out(ctx) != SOAP_OK)
        return ctx->error;
    for (const soap_attachment *part = ctx->mime.first; part != nullptr; part = part->next) {
        if (soap_mime_part_header_write(ctx, part) != SOAP_OK || send_content(ctx, *part) != SOAP_OK)
            return ctx->error;
    }
    head_writer out(ctx, true);
    put_end(ctx, out);
    return out.result();
}

int soap_mime_part_header_read(soap *ctx)
{
    char line[SOAP_TEXT_SIZE];
    do {
        if (soap_recv_line(ctx, line, sizeof line) != SOAP_OK)
            return ctx->error;
    } while (line[0] == '\0');
    if (line[0] != '-' || line[1] != '-')
        return read_fields(ctx, line);
    if (take_boundary(ctx, line + 2) != SOAP_OK)
        return ctx->error;
    return read_next_head(ctx);
}

soap_attachment *soap_mime_part_read(soap *ctx, void *handle)
{
    if ((ctx->mode & MODE_MIME) == 0)
        return nullptr;
    if (ctx->mime.last == nullptr && soap_mime_part_header_read(ctx) != SOAP_OK)
        return nullptr;
    soap_attachment *const part = ctx->mime.last;
    bool last = false;
    if (receive_part(ctx, part, handle) != SOAP_OK || take_delimiter_end(ctx, last) != SOAP_OK)
        return nullptr;
    if (part == ctx->mime.root)
        bind_early_parts(ctx);
    else
        soap_attachment_bind(ctx, part);
    if (ctx->error != SOAP_OK || (last ? end_of_parts(ctx) : read_next_head(ctx)) != SOAP_OK)
        return nullptr;
    return part;
}

int soap_mime_parts_read_all(soap *ctx)
{
    while ((ctx->mode & MODE_MIME) != 0) {
        if (soap_mime_part_read(ctx, nullptr) == nullptr)
            return ctx->error;
    }
    return SOAP_OK;
}

namespace {

// Drops what comes before the first line that begins with "--".
int skip_to_boundary(soap *ctx)
{
    bool line_start = true;
    for (;;) {
        const std::int32_t c = soap_recv_byte(ctx);
        if (c == -1)
            return fail_at_end(ctx);
        if (c == '-' && line_start && input_peek_byte(ctx) == '-') {
            ctx->look_ahead = c;
            return SOAP_OK;
        }
        line_start = c == '\n';
    }
}

} // namespace

// Reads on to the part that holds the message; the parts before it are kept.
int mime_message_begin(soap *ctx)
{
    if (skip_to_boundary(ctx) != SOAP_OK || soap_mime_part_header_read(ctx) != SOAP_OK)
        return ctx->error;
    while (ctx->mime.start != nullptr && ctx->mime.last != nullptr &&
           soap_cid_compare(ctx, ctx->mime.start, ctx->mime.last->id) != 0) {
        if (soap_mime_part_read(ctx, nullptr) == nullptr)
            break;
    }
    if (ctx->error != SOAP_OK)
        return ctx->error;
    if (ctx->mime.last == nullptr)
        return fail(ctx, SOAP_MIME_ERROR);
    ctx->mime.root = ctx->mime.last;
    const char *type = ctx->mime.root->type;
    if (type != nullptr && soap_attr_value(ctx, type, "application/dime") != nullptr)
        ctx->mode |= MODE_DIME;
    if (type != nullptr && soap_attr_value(ctx, type, "application/xop+xml") != nullptr)
        ctx->mode |= MODE_MTOM;
    text_encoding_by_type(ctx, type, ctx->mode);
    return SOAP_OK;
}

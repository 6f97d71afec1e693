// dime.cpp - DIME records, out and in: the header, and the attachments that follow the record of the message.
//
// The message itself may come as a record in several chunks: a stage of input (soap::attachment_stage) then
// makes one text of them. Elsewhere: the numbers of the message's own record (exchange/envelope_frame.cpp).
//
//   record  = header options id type data, each padded with zeros to a multiple of 4
//   header  = version and MB, ME, CF; type format; options, id, type length (16 bits); data length (32 bits)
//   options = type (16 bits) length (16 bits) text
//
// Always: numbers are big-endian; a length on the wire is never a reason to allocate that much at once.
#include <cstring>

#include <zuv_client_pro/soap_error.h>
#include <zuv_client_pro/soap_io.h>
#include <zuv_client_pro/soap_memory.h>

#include "attachments/attachment_list.h"
#include "attachments/attachment_sink.h"
#include "attachments/attachment_stream.h"
#include "attachments/dime.h"
#include "attachments/mime.h"
#include "core/buffered_in.h"
#include "core/failure.h"

namespace {

constexpr std::size_t HEADER = 12;        // bytes
constexpr std::size_t OPTIONS_HEADER = 4; // bytes before the options' text
constexpr std::size_t FIELD_MAX = 65535;  // bytes of options, id and type
constexpr std::size_t OPTIONS_TEXT_MAX = FIELD_MAX - OPTIONS_HEADER;
constexpr std::uint64_t DATA_MAX = 0xFFFFFFFF;
constexpr std::uint64_t RECORD_MAX = 0xFFFFFFFC; // bytes of data; what is longer goes out in chunks of this
constexpr unsigned VERSION_MASK = 0xF8;
constexpr unsigned VERSION = 0x08;
constexpr unsigned MESSAGE_BEGIN = 4;     // MB
constexpr unsigned MESSAGE_END = 2;       // ME
constexpr unsigned CHUNK = 1;             // CF
constexpr unsigned MARKS = 7;             // MB, ME, CF
constexpr unsigned TYPE_FORMAT = 0xF0;    // 0 in it: the type is that of the chunk before
constexpr unsigned MEDIA_TYPE = 0x18;     // flags of an attachment
constexpr unsigned UNCHANGED_TYPE = 0x08; // flags of a chunk after the first

std::size_t padding_of(std::uint64_t length)
{
    return static_cast<std::size_t>(0 - length) & 3;
}
std::uint64_t padded(std::uint64_t length)
{
    return length + padding_of(length);
}

unsigned number(const char *bytes, int count)
{
    unsigned value = 0;
    for (int i = 0; i < count; ++i)
        value = value << 8 | static_cast<unsigned char>(bytes[i]);
    return value;
}

void put_number(char *bytes, int count, std::size_t value)
{
    for (int i = count; i-- > 0; value >>= 8)
        bytes[i] = static_cast<char>(value & 0xFF);
}

std::size_t field_length(const char *text)
{
    const std::size_t length = text == nullptr ? 0 : std::strlen(text);
    return length < FIELD_MAX ? length : FIELD_MAX;
}

// --- out ---

void describe(soap *ctx, const soap_attachment &record)
{
    ctx->dime.id = const_cast<char *>(record.id);
    ctx->dime.type = const_cast<char *>(record.type);
    ctx->dime.options = const_cast<char *>(record.options);
    ctx->dime.flags = MEDIA_TYPE;
}

// A chunk's flags, in addition to its type format: more follow, or it is the last one of the message.
void mark(soap *ctx, bool more, bool last_record)
{
    const unsigned marks = more ? CHUNK : last_record ? MESSAGE_END : 0;
    ctx->dime.flags = static_cast<std::uint8_t>((ctx->dime.flags & ~(CHUNK | MESSAGE_END)) | marks);
}

// Only the first chunk says what the record is.
void describe_next_chunk(soap *ctx)
{
    ctx->dime.id = ctx->dime.type = ctx->dime.options = nullptr;
    ctx->dime.flags = UNCHANGED_TYPE;
}

int send_chunk(soap *ctx, const char *data, std::size_t length)
{
    ctx->dime.size = length;
    if (soap_dime_header_write(ctx) != SOAP_OK)
        return ctx->error;
    return soap_send_padded(ctx, data, length);
}

// A stream of unknown length goes out in chunks; one that isn't full is the last.
int send_in_chunks(soap *ctx, attachment_stream &stream, bool last_record)
{
    char data[ATTACHMENT_PIECE];
    for (;;) {
        std::size_t length = 0;
        if (stream.read_full(data, length) != SOAP_OK)
            return ctx->error;
        const bool more = length == sizeof data;
        mark(ctx, more, last_record);
        if (send_chunk(ctx, data, length) != SOAP_OK || !more)
            return ctx->error;
        describe_next_chunk(ctx);
    }
}

// Data of known length, from the stream or, if none is open, from memory. One record, unless no header can
// give the length.
int send_sized(soap *ctx, const soap_attachment &record, attachment_stream &stream)
{
    const char *data = record.content;
    for (std::uint64_t left = record.size;;) {
        const auto part = static_cast<std::size_t>(left < RECORD_MAX ? left : RECORD_MAX);
        left -= part;
        ctx->dime.size = part;
        mark(ctx, left != 0, record.next == nullptr);
        if (soap_dime_header_write(ctx) != SOAP_OK ||
            (stream.is_open() ? stream.copy(part) : soap_send_bytes(ctx, data, part)) != SOAP_OK ||
            soap_send_bytes(ctx, "\0\0\0", padding_of(part)) != SOAP_OK || left == 0)
            return ctx->error;
        if (!stream.is_open())
            data += part;
        describe_next_chunk(ctx);
    }
}

int send_record(soap *ctx, const soap_attachment &record)
{
    attachment_stream stream(ctx, record, ctx->dime_read, ctx->dime_read_close);
    describe(ctx, record);
    if (stream.open(ctx->dime_read_open, record.options) != SOAP_OK)
        return ctx->error;
    return stream.is_endless() ? send_in_chunks(ctx, stream, record.next == nullptr)
                               : send_sized(ctx, record, stream);
}

// --- in ---

int skip(soap *ctx, std::size_t length)
{
    return soap_recv_skip(ctx, length) == 0 ? SOAP_OK : fail_at_end(ctx);
}

// A length that is too short leaves data where the padding should be.
int skip_padding(soap *ctx, std::size_t length)
{
    for (; length > 0; --length) {
        const std::int32_t byte = soap_recv_byte(ctx);
        if (byte < 0)
            return fail_at_end(ctx);
        if (byte != 0)
            return fail(ctx, SOAP_DIME_ERROR);
    }
    return SOAP_OK;
}

int read_header(soap *ctx, char (&header)[HEADER])
{
    for (char &byte : header) {
        const std::int32_t c = soap_recv_byte(ctx);
        if (c < 0)
            return fail_at_end(ctx);
        byte = static_cast<char>(c);
    }
    if ((number(header, 1) & VERSION_MASK) != VERSION)
        return fail(ctx, SOAP_DIME_VERSION);
    ctx->dime.flags =
        static_cast<std::uint8_t>((number(header + 1, 1) & TYPE_FORMAT) | (number(header, 1) & MARKS));
    ctx->dime.size = number(header + 8, 4);
    if ((ctx->dime.flags & MESSAGE_END) != 0)
        ctx->mode &= ~MODE_DIME;
    return SOAP_OK;
}

// A field of the record; null for an empty one.
int read_field(soap *ctx, std::size_t length, char *&field)
{
    field = nullptr;
    if (length == 0)
        return SOAP_OK;
    field = soap_recv_bytes_block(ctx, length);
    return field == nullptr ? ctx->error : SOAP_OK;
}

// The length in the options must not exceed what came.
int check_options(soap *ctx, std::size_t length)
{
    if (length == 0 ||
        (length >= OPTIONS_HEADER && OPTIONS_HEADER + number(ctx->dime.options + 2, 2) <= length))
        return SOAP_OK;
    return fail(ctx, SOAP_DIME_ERROR);
}

// The header of a chunk after the first: what it says of itself doesn't count, but that it is one.
int read_chunk_header(soap *ctx)
{
    char header[HEADER];
    if (read_header(ctx, header) != SOAP_OK)
        return ctx->error;
    if ((ctx->dime.flags & (MESSAGE_BEGIN | TYPE_FORMAT)) != 0)
        return fail(ctx, SOAP_DIME_ERROR);
    std::uint64_t fields = 0;
    for (int i = 2; i <= 6; i += 2)
        fields += padded(number(header + i, 2));
    return skip(ctx, static_cast<std::size_t>(fields));
}

// --- in: the message's own record, in chunks ---
//
// While it is read, dime.size is the data length of the chunk under way, buffer_length ends with the chunk,
// and message_count - (buffer_length - buffer_index) bytes of its data were used.

// True if the reader has used up what it may see of a chunked record.
bool chunk_pending(const soap *ctx)
{
    return (ctx->dime.chunk_size | ctx->dime.buffer_length) != 0;
}

// The buffer is seen up to the end of the chunk, if that has arrived.
void clip_to_chunk(soap *ctx)
{
    const std::size_t available = ctx->buffer_length - ctx->buffer_index;
    if (available < ctx->dime.chunk_size) {
        ctx->dime.chunk_size -= available;
        return;
    }
    ctx->message_count -= available - ctx->dime.chunk_size;
    ctx->dime.buffer_length = ctx->buffer_length;
    ctx->buffer_length = ctx->buffer_index + ctx->dime.chunk_size;
    ctx->dime.chunk_size = 0;
}

void unclip(soap *ctx)
{
    ctx->buffer_length = ctx->dime.buffer_length;
    ctx->dime.buffer_length = 0;
}

// The stage of input: the next bytes of the record, from this chunk or the next. Results as soap_recv_more.
int more_of_message(soap *ctx);

// The header was read and the data begins at buffer_index.
void begin_message_data(soap *ctx)
{
    ctx->message_count = ctx->buffer_length - ctx->buffer_index;
    ctx->dime.chunk_size = 0;
    ctx->dime.buffer_length = 0;
    if ((ctx->dime.flags & CHUNK) == 0)
        return;
    ctx->attachment_stage = more_of_message;
    ctx->dime.chunk_size = ctx->dime.size;
    clip_to_chunk(ctx);
}

int more_of_message(soap *ctx)
{
    while (chunk_pending(ctx)) {
        if (ctx->dime.chunk_size != 0) {
            const int result = soap_recv_filtered(ctx);
            if (result == SOAP_OK)
                clip_to_chunk(ctx);
            return result;
        }
        unclip(ctx);
        if (skip_padding(ctx, padding_of(ctx->dime.size)) != SOAP_OK || read_chunk_header(ctx) != SOAP_OK)
            return ctx->error;
        begin_message_data(ctx);
        if (ctx->buffer_index != ctx->buffer_length)
            return SOAP_OK;
    }
    return soap_recv_filtered(ctx);
}

// What is left of the message's own record, further chunks included, and its padding.
int skip_message_record(soap *ctx)
{
    if (ctx->look_ahead == -1)
        return fail_at_end(ctx);
    ctx->look_ahead = 0;
    while (chunk_pending(ctx)) {
        ctx->buffer_index = ctx->buffer_length;
        const int result = more_of_message(ctx);
        const bool at_empty_end = !chunk_pending(ctx) && ctx->dime.size == 0;
        if (result != SOAP_OK && !at_empty_end)
            return result > 1 ? result : fail_at_end(ctx);
    }
    const std::uint64_t used = ctx->message_count - (ctx->buffer_length - ctx->buffer_index);
    if (used > ctx->dime.size)
        return fail(ctx, SOAP_DIME_ERROR);
    if (skip(ctx, static_cast<std::size_t>(ctx->dime.size - used)) != SOAP_OK)
        return ctx->error;
    return skip_padding(ctx, padding_of(ctx->dime.size));
}

// The data of one record or chunk in stretches of the buffer.
int take_data(soap *ctx, attachment_sink &sink, std::size_t length)
{
    while (length > 0) {
        if (ctx->buffer_index >= ctx->buffer_length && soap_recv_more(ctx) != SOAP_OK)
            return fail_at_end(ctx);
        const std::size_t unread = ctx->buffer_length - ctx->buffer_index;
        const std::size_t part = unread < length ? unread : length;
        if (sink.put(ctx->buffer + ctx->buffer_index, part) != SOAP_OK)
            return ctx->error;
        ctx->buffer_index += part;
        length -= part;
    }
    return skip_padding(ctx, padding_of(ctx->dime.size));
}

int take_all_data(soap *ctx, attachment_sink &sink)
{
    for (;;) {
        const bool more = (ctx->dime.flags & CHUNK) != 0;
        if (take_data(ctx, sink, ctx->dime.size) != SOAP_OK)
            return ctx->error;
        if (!more)
            return SOAP_OK;
        if ((ctx->mode & MODE_DIME) == 0)
            return fail(ctx, SOAP_DIME_ERROR); // the message ended within a record
        if (read_chunk_header(ctx) != SOAP_OK)
            return ctx->error;
    }
}

int receive_to_memory(soap *ctx, soap_attachment *record)
{
    attachment_sink sink(ctx);
    return take_all_data(ctx, sink) == SOAP_OK ? sink.finish(record) : ctx->error;
}

int receive_to_stream(soap *ctx, soap_attachment *record, void *handle)
{
    attachment_sink sink(ctx, handle, ctx->dime_write);
    int result = take_all_data(ctx, sink);
    if (result == SOAP_OK)
        result = sink.finish(record);
    if (ctx->dime_write_close != nullptr)
        ctx->dime_write_close(ctx, handle);
    return result != SOAP_OK ? result : ctx->error;
}

int receive_record(soap *ctx)
{
    if ((ctx->dime.flags & MESSAGE_BEGIN) != 0 || (ctx->dime.flags & TYPE_FORMAT) == 0)
        return fail(ctx, SOAP_DIME_ERROR); // another message, or a chunk without its first
    soap_attachment *record = soap_attachment_add(ctx, &ctx->dime.list, &ctx->dime.last, nullptr, 0);
    if (record == nullptr)
        return ctx->error;
    record->id = ctx->dime.id;
    record->type = ctx->dime.type;
    record->options = ctx->dime.options;
    void *handle = nullptr;
    if (ctx->dime_write_open != nullptr && ctx->dime_write != nullptr) {
        handle = ctx->dime_write_open(ctx, record->id, record->type, record->options);
        if (attachment_take_handle(ctx, record->id, ctx->dime_write_close, handle) != SOAP_OK)
            return ctx->error;
    }
    if ((handle != nullptr ? receive_to_stream(ctx, record, handle) : receive_to_memory(ctx, record)) !=
        SOAP_OK)
        return ctx->error;
    soap_attachment_bind(ctx, record);
    return ctx->error;
}

} // namespace

char *soap_dime_options_make(soap *ctx, unsigned short type, const char *text)
{
    std::size_t length = text == nullptr ? 0 : std::strlen(text);
    if (length > OPTIONS_TEXT_MAX)
        length = OPTIONS_TEXT_MAX;
    auto *options = static_cast<char *>(soap_block_alloc(ctx, OPTIONS_HEADER + length + 1));
    if (options == nullptr)
        return nullptr;
    put_number(options, 2, type);
    put_number(options + 2, 2, length);
    if (length > 0)
        std::memcpy(options + OPTIONS_HEADER, text, length);
    options[OPTIONS_HEADER + length] = '\0';
    return options;
}

std::size_t dime_options_length(const char *options)
{
    if (options == nullptr)
        return 0;
    const std::size_t length = OPTIONS_HEADER + number(options + 2, 2);
    return mime_is_description(options, length) ? 0 : length;
}

std::uint64_t dime_record_length(const soap_attachment &record)
{
    const std::uint64_t further = record.size == 0 ? 0 : (record.size - 1) / RECORD_MAX;
    return HEADER * (1 + further) + padded(dime_options_length(record.options)) +
           padded(field_length(record.id)) + padded(field_length(record.type)) + padded(record.size);
}

int soap_dime_header_write(soap *ctx)
{
    const soap_dime_state &dime = ctx->dime;
    const std::size_t options = dime_options_length(dime.options);
    const std::size_t id = field_length(dime.id);
    const std::size_t type = field_length(dime.type);
    char header[HEADER];
    if (dime.size > DATA_MAX || options > FIELD_MAX)
        return fail(ctx, SOAP_DIME_ERROR);
    header[0] = static_cast<char>(VERSION | (dime.flags & MARKS));
    header[1] = static_cast<char>(dime.flags & 0xF0);
    put_number(header + 2, 2, options);
    put_number(header + 4, 2, id);
    put_number(header + 6, 2, type);
    put_number(header + 8, 4, dime.size);
    if (soap_send_bytes(ctx, header, HEADER) != SOAP_OK ||
        soap_send_padded(ctx, dime.options, options) != SOAP_OK ||
        soap_send_padded(ctx, dime.id, id) != SOAP_OK)
        return ctx->error;
    return soap_send_padded(ctx, dime.type, type);
}

int soap_dime_attachments_write(soap *ctx)
{
    if (!dime_is_written(ctx))
        return SOAP_OK;
    if (attachment_ids_check_out(ctx) != SOAP_OK)
        return ctx->error;
    for (const soap_attachment *record = ctx->dime.first; record != nullptr; record = record->next) {
        if (send_record(ctx, *record) != SOAP_OK)
            return ctx->error;
    }
    return SOAP_OK;
}

int soap_dime_header_read(soap *ctx)
{
    char header[HEADER];
    if ((ctx->mode & MODE_DIME) == 0)
        return fail(ctx, SOAP_DIME_END);
    if (chunk_pending(ctx) && skip_message_record(ctx) != SOAP_OK)
        return ctx->error;
    if (read_header(ctx, header) != SOAP_OK)
        return ctx->error;
    const std::size_t options = number(header + 2, 2);
    if (read_field(ctx, options, ctx->dime.options) != SOAP_OK || check_options(ctx, options) != SOAP_OK ||
        read_field(ctx, number(header + 4, 2), ctx->dime.id) != SOAP_OK)
        return ctx->error;
    return read_field(ctx, number(header + 6, 2), ctx->dime.type);
}

int soap_dime_attachments_read(soap *ctx)
{
    if (skip_message_record(ctx) != SOAP_OK)
        return ctx->error;
    while ((ctx->mode & MODE_DIME) != 0) {
        if (soap_dime_header_read(ctx) != SOAP_OK || receive_record(ctx) != SOAP_OK)
            return ctx->error;
    }
    return attachment_ids_check(ctx, ctx->dime.list, nullptr, SOAP_DIME_ERROR);
}

int dime_message_begin(soap *ctx)
{
    if (soap_dime_header_read(ctx) != SOAP_OK)
        return ctx->error;
    if ((ctx->dime.flags & MESSAGE_BEGIN) == 0)
        return fail(ctx, SOAP_DIME_ERROR);
    begin_message_data(ctx);
    return SOAP_OK;
}

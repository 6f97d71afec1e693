// trace_log.cpp - copies of the bytes on the wire in files, and certificates taken out of a message's text.
//
// Elsewhere: the places that log (buffered output and input).
// Always: nothing here fails a message; a file that can't be opened is tried again at the next write.
#include "core/trace_log.h"

#include "core/failure.h"

#include <cinttypes>
#include <cstring>
#include <ctime>
#include <fcntl.h>
#include <new>
#include <unistd.h>

#include <zuv_client_pro/soap_error.h>
#include <zuv_client_pro/soap_log.h>
#include <zuv_client_pro/soap_memory.h>

char g_TraceLogFile[SOAP_LOG_PATH_SIZE] = "wsTrace.log";
char soapEnableDebug = 1;

namespace {

constexpr mode_t NEW_FILE_MODE = 0600; // messages hold personal data and credentials
constexpr int CHANNELS = static_cast<int>(SOAP_LOG_CHANNELS);

bool is_channel(int channel)
{
    return channel >= 0 && channel < CHANNELS;
}

// Takes `length` bytes of a path that may lack a terminator.
int set_path(soap *ctx, int channel, const char *path, std::size_t length)
{
    char *copy = nullptr;
    if (path != nullptr) {
        copy = static_cast<char *>(SOAP_MALLOC(ctx, length + 1));
        if (copy != nullptr) {
            std::memcpy(copy, path, length);
            copy[length] = '\0';
        }
    }
    soap_log_close(ctx, channel);
    SOAP_FREE(ctx, ctx->log_paths[channel]);
    ctx->log_paths[channel] = copy;
    if (path != nullptr && copy == nullptr)
        return fail(ctx, SOAP_OUT_OF_MEMORY);
    return SOAP_OK;
}

} // namespace

void trace_log_set_defaults(soap *ctx)
{
    const std::size_t length = strnlen(g_TraceLogFile, SOAP_LOG_PATH_SIZE);
    const char *path = length == 0 ? nullptr : g_TraceLogFile;
    set_path(ctx, SOAP_LOG_RECEIVED, path, length);
    set_path(ctx, SOAP_LOG_SENT, path, length);
}

int soap_log_set(soap *ctx, int channel, const char *path)
{
    if (!is_channel(channel))
        return SOAP_OK;
    return set_path(ctx, channel, path, path == nullptr ? 0 : std::strlen(path));
}

int soap_log_set_received(soap *ctx, const char *path)
{
    return soap_log_set(ctx, SOAP_LOG_RECEIVED, path);
}

int soap_log_set_sent(soap *ctx, const char *path)
{
    return soap_log_set(ctx, SOAP_LOG_SENT, path);
}

void soap_log_open(soap *ctx, int channel)
{
    if (!is_channel(channel) || ctx->log_paths[channel] == nullptr)
        return;
    soap_log_close(ctx, channel);
    const int file = open(ctx->log_paths[channel], O_WRONLY | O_CREAT | O_APPEND | O_CLOEXEC, NEW_FILE_MODE);
    if (file < 0)
        return;
    ctx->log_streams[channel] = fdopen(file, "a");
    if (ctx->log_streams[channel] == nullptr)
        close(file);
}

void soap_log_close(soap *ctx, int channel)
{
    if (!is_channel(channel) || ctx->log_streams[channel] == nullptr)
        return;
    std::fclose(ctx->log_streams[channel]);
    ctx->log_streams[channel] = nullptr;
}

void trace_log_close_all(soap *ctx)
{
    for (int channel = 0; channel < CHANNELS; ++channel)
        soap_log_close(ctx, channel);
}

void trace_log_end(soap *ctx)
{
    for (int channel = 0; channel < CHANNELS; ++channel)
        set_path(ctx, channel, nullptr, 0);
}

namespace {

// The channel's file, opened if need be; null without one.
std::FILE *stream_of(soap *ctx, int channel)
{
    if (ctx->log_streams[channel] == nullptr)
        soap_log_open(ctx, channel);
    return ctx->log_streams[channel];
}

// Notes when the last `length` bytes of a channel's file were written.
void note_time(soap *ctx, int channel, std::size_t length)
{
    std::FILE *times = stream_of(ctx, SOAP_LOG_TIMES);
    if (times == nullptr)
        return;
    const off_t end = ftello(ctx->log_streams[channel]);
    timespec now{};
    if (end < static_cast<off_t>(length) || clock_gettime(CLOCK_REALTIME, &now) != 0)
        return;
    std::fprintf(times, "%" PRId64 " %" PRId64 "%06ld %c\n", static_cast<std::int64_t>(end - length),
                 static_cast<std::int64_t>(now.tv_sec), now.tv_nsec / 1000,
                 channel == SOAP_LOG_SENT ? 's' : 'r');
    std::fflush(times);
}

} // namespace

void soap_log_write(soap *ctx, int channel, const char *data, std::size_t length)
{
    if (!is_channel(channel) || length == 0)
        return;
    std::FILE *stream = stream_of(ctx, channel);
    if (stream == nullptr)
        return;
    std::fwrite(data, 1, length, stream);
    std::fflush(stream); // the trace must survive a crash of the host
    if (channel != SOAP_LOG_TIMES && ctx->log_paths[SOAP_LOG_TIMES] != nullptr)
        note_time(ctx, channel, length);
}

// ---------------------------------------------------------------------------------------------
// Redaction.

namespace {

struct certificate_tag {
    const char *text;
    std::size_t length;
    bool opens;
};

const certificate_tag CERTIFICATE_TAGS[] = {
    {"<protocol:certificate>", 22, true},
    {"<p760:certificate>", 18, true},
    {"</protocol:certificate>", 23, false},
    {"</p760:certificate>", 19, false},
};
constexpr std::size_t SHORTEST_START_TAG = 18;
constexpr char ELLIPSIS[] = "...";
constexpr std::size_t ELLIPSIS_LENGTH = 3;

// An array that takes what fits: the output outgrows the message when a certificate is shorter than its
// ellipsis.
struct bounded_output {
    char *bytes;
    std::size_t capacity;
    std::size_t length;

    void put(const char *data, std::size_t size)
    {
        const std::size_t taken = size < capacity - length ? size : capacity - length;
        std::memcpy(bytes + length, data, taken);
        length += taken;
    }
};

const certificate_tag *certificate_tag_at(const char *text, std::size_t left)
{
    for (const certificate_tag &tag : CERTIFICATE_TAGS) {
        if (tag.length <= left && std::memcmp(text, tag.text, tag.length) == 0)
            return &tag;
    }
    return nullptr;
}

void redact(const char *message, std::size_t size, bounded_output &output)
{
    bool copying = true;
    std::size_t i = 0;
    while (i < size) {
        const certificate_tag *tag = certificate_tag_at(message + i, size - i);
        if (tag != nullptr) {
            output.put(tag->text, tag->length);
            if (tag->opens)
                output.put(ELLIPSIS, ELLIPSIS_LENGTH);
            copying = !tag->opens;
            i += tag->length;
            continue;
        }
        const void *next_tag = std::memchr(message + i + 1, '<', size - i - 1);
        const std::size_t end = next_tag == nullptr
                                    ? size
                                    : static_cast<std::size_t>(static_cast<const char *>(next_tag) - message);
        if (copying)
            output.put(message + i, end - i);
        i = end;
    }
}

} // namespace

char *soap_log_redact_certificates(const char *message, std::int32_t size, std::int32_t *result_length)
{
    const std::size_t length = size < 0 ? 0 : static_cast<std::size_t>(size);
    std::size_t capacity = length + length / SHORTEST_START_TAG * ELLIPSIS_LENGTH;
    if (capacity > INT32_MAX)
        capacity = INT32_MAX;
    *result_length = 0;
    char *array = new (std::nothrow) char[capacity + 1];
    if (array == nullptr)
        return nullptr;
    bounded_output output{array, capacity, 0};
    redact(message, length, output);
    *result_length = static_cast<std::int32_t>(output.length);
    return array;
}

// soap_log.h - trace log: a plain copy of the bytes that go over the wire.
//
// Elsewhere: the places that log (soap_io.h).
// Always: nothing here ever fails a message. `channel` is a SOAP_LOG_...; other values are ignored.
#pragma once

#include <zuv_client_pro/soap.h>

constexpr std::size_t SOAP_LOG_PATH_SIZE = 4096; // bytes of g_TraceLogFile, terminator included
constexpr int SOAP_LOG_RECEIVED = 0;             // received bytes
constexpr int SOAP_LOG_SENT = 1;                 // sent bytes
constexpr int SOAP_LOG_THIRD = 2;              // times of the bytes in the other two; without a path at first
constexpr int SOAP_LOG_TIMES = SOAP_LOG_THIRD; // the same, by what it takes

// Path of the trace of contexts made from now on, relative to the working directory; "wsTrace.log" at first.
// The host program may overwrite it, up to 4096 bytes; the empty text means no trace. Contexts keep the path
// they started with.
extern "C" ZUV_API char g_TraceLogFile[SOAP_LOG_PATH_SIZE];
// Part of the library's interface; nothing in the library reads it.
extern "C" ZUV_API char soapEnableDebug;

// Closes the channel's file and keeps a copy of the new path for the next write. The short forms set the
// channel of received and of sent bytes.
//   channel  whose path it is
//   path     null: no log
//   SOAP_OK
//   SOAP_OUT_OF_MEMORY  the channel is off
//
// With a path, SOAP_LOG_TIMES takes a line for each piece of bytes that is appended to one of the others:
// where it begins in its file, in bytes, when that was, in microseconds since 1970, and "s" for sent or "r"
// for received bytes. `zuv trace FILE` looks for it under FILE with ".times" appended.
ZUV_API int soap_log_set(soap *ctx, int channel, const char *path);
ZUV_API int soap_log_set_received(soap *ctx, const char *path);
ZUV_API int soap_log_set_sent(soap *ctx, const char *path);

// Opens the channel's file for appending if a path is set; soap::log_streams stays null on failure. A new
// file may be read and written by its owner alone (mode 0600); one that exists keeps its mode.
//   channel  whose file it is
ZUV_API void soap_log_open(soap *ctx, int channel);
// Closes the channel's file if it is open; the path stays.
//   channel  whose file it is
ZUV_API void soap_log_close(soap *ctx, int channel);

// Appends bytes to a channel, opening it first if need be, and flushes them, so that the trace survives a
// crash. A file that can't be opened is tried again at the next write; errors of writing are ignored.
//   channel  where to append
//   data     `length` bytes
//   length   bytes
ZUV_API void soap_log_write(soap *ctx, int channel, const char *data, std::size_t length);

// A copy of a message text in which the contents of the elements protocol:certificate and p760:certificate
// are replaced by "...". Tags are matched literally: with attributes or another prefix the contents stay.
//   message        `size` bytes, no terminator needed
//   size           bytes; negative counts as 0
//   result_length  takes the copy's length, which may exceed `size` if a certificate has under three bytes
//   returns        an array without terminator, which the caller frees with delete[]
//   null           out of memory
ZUV_API char *soap_log_redact_certificates(const char *message, std::int32_t size,
                                           std::int32_t *result_length);

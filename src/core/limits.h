// limits.h - what one message may cost: bytes of its XML, memory, copies, raw bytes that bring nothing.
//
// Here: counting, and the one place where a limit's error is set. Elsewhere: the text of that error
// (exchange/error_text.cpp), open elements (soap::max_depth, in xml), heads (net).
//
// Always: counting costs an addition. Received bytes and memory are compared with their limits once for each
// buffer of input and at the end of the message, so that what one buffer (64 KB) is made into comes on top.
// A message that went beyond a limit brings no further input, and its connection carries no other message.
#pragma once

#include <algorithm>
#include <cstddef>

#include <zuv_client_pro/soap.h>

constexpr std::uint64_t EXTRA_BYTES = std::uint64_t{1} << 20; // of copies, or raw bytes, for any message
constexpr std::uint64_t EXTRA_FACTOR = 8;                     // further ones for each byte of the message

// Before a message is received: nothing is counted yet.
void limits_reset(soap *ctx);

// The message went beyond a limit of `value` bytes. `name` is a literal. SOAP_LENGTH, also in ctx->error.
int limit_exceeded(soap *ctx, const char *name, std::uint64_t value);

// Compares what was received and what is held for it with max_message and max_memory. SOAP_OK or SOAP_LENGTH.
int input_limits_check(soap *ctx);

// `length` bytes are copied to another place of the received message, for a reference or a QName. 0, or
// SOAP_LENGTH beyond EXTRA_BYTES and EXTRA_FACTOR times the message so far; the caller then copies nothing.
int copy_charge(soap *ctx, std::size_t length);

// True if copies of `length` bytes more would still be allowed. Nothing is charged.
bool copy_allowed(const soap *ctx, std::uint64_t length);

// Raw bytes came in. SOAP_OK or SOAP_LENGTH when they are more than EXTRA_BYTES and EXTRA_FACTOR times the plain
// bytes that the message has had so far: framing or compression without contents.
int raw_bytes_check(soap *ctx);

// `length` bytes leave the send buffer. SOAP_OK or SOAP_LENGTH.
int output_limit_check(soap *ctx, std::size_t length);

// The XML of a message begins or ends in the output, at the present place. The end gives 0 or SOAP_LENGTH.
void output_xml_begin(soap *ctx);
int output_xml_end(soap *ctx);

// Bytes that malloc takes for a block of `size` bytes: 16, or 8 where nothing wants more.
constexpr std::size_t ALLOCATION_UNIT = std::max(2 * sizeof(std::size_t), alignof(std::max_align_t));
constexpr std::size_t allocation_size(std::size_t size)
{
    return (size + sizeof(std::size_t) + ALLOCATION_UNIT - 1) & ~(ALLOCATION_UNIT - 1);
}

// A block of `size` bytes that tracking doesn't see is taken for the message, and stays with it.
inline void memory_charge(soap *ctx, std::size_t size)
{
    // NOLINTNEXTLINE(clang-analyzer-core.NullDereference): no call lacks a context
    ctx->memory_held += static_cast<std::int64_t>(allocation_size(size));
}

// The same for the characters of a std::string of that capacity, when `length` of them are stored.
inline void text_charge(soap *ctx, std::size_t length, std::size_t capacity)
{
    if (length > capacity)
        memory_charge(ctx, length + 1);
}

// head_memory.h - what is remembered of a context's last request: its head, to be sent again while it would be
// the same, and what its endpoint is made of.
//
// Elsewhere: what a head says (http_write.cpp). Always: the texts and values that a head is made from are
// compared one by one, as a host program may change any of them, and a text in place, without telling. Heads
// with credentials are not remembered, so that the host program's texts remain their only place.
#pragma once

#include <zuv_client_pro/soap.h>

// What a head is made from, but for the length of the body.
struct head_source {
    static constexpr std::size_t TEXTS = 6;
    const char *texts[TEXTS]; // null is not the empty text
    int port;
    std::uint32_t flags;
};

// Sends the head for a body of `count` bytes if it is the one remembered, with *result as soap_send_bytes.
// False: it isn't.
bool head_memory_send(soap *ctx, const head_source &source, std::uint64_t count, int *result);

// Remembers the `length` bytes of a head for a body of `count` bytes; one that doesn't fit, or
// for which there is no memory, is not remembered.
void head_memory_keep(soap *ctx, const head_source &source, std::uint64_t count, const char *head,
                      std::size_t length);

// Where the parts of an endpoint are in its text, which has `length` bytes.
struct endpoint_parts {
    std::size_t length, host, host_length;
    std::size_t path; // `length` for none
    int port;
};

// What is known of an endpoint's text, or of that of a list.
struct endpoint_memory {
    static constexpr std::size_t SIZE = 512; // bytes; longer texts are not remembered

    char text[SIZE];
    bool accepted; // by soap_endpoint_check
    bool split;    // `parts` is known
    endpoint_parts parts;
};

// What is remembered of that very text, or null.
endpoint_memory *endpoint_memory_find(soap *ctx, const char *text);

// The same, and remembers it from here on; null if it is too long or memory runs out.
endpoint_memory *endpoint_memory_keep(soap *ctx, const char *text);

// Wipes what is remembered and gives its memory back.
void head_memory_free(soap *ctx);

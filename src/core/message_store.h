// message_store.h - the bytes of a call's message, kept while they are counted, so that it is written only once.
//
// Here: the store, and whether the message's objects were marked. Elsewhere: which calls take this short way
// (exchange/call.cpp), bytes that writers pass in stretches (soap_send_bytes in soap_io.h).
//
// Always: whatever adds to the count and not to the store makes the two differ, and then the message is written
// again: nothing depends on every writer knowing of the store.
#pragma once

#include <zuv_client_pro/soap.h>

#include "core/failure.h"

// Values of soap::mark_state.
constexpr std::int16_t MARKS_MADE = 0;    // as all messages but those of calls have it
constexpr std::int16_t MARKS_SAVED = 1;   // nothing that a mark could change shows in the message
constexpr std::int16_t MARKS_MISSING = 2; // but something does after all: it has to begin anew, with marks

// A message is about to be counted: its bytes are kept from here on, if there is memory for them.
void message_store_begin(soap *ctx);

// The message is counted. The number of its bytes if the store has them all, else 0.
std::size_t message_store_close(soap *ctx);

// Sends the stored message of `length` bytes, as its writers would. Results as soap_send_bytes.
int message_store_send(soap *ctx, std::size_t length);

// Wipes what is stored: a message may hold passwords.
void message_store_wipe(soap *ctx);

// Gives the store back.
void message_store_free(soap *ctx);

// Reserves `length` bytes of the store for a message that is being counted; they count as written. Null if the
// store is full.
inline char *store_reserve(soap *ctx, std::size_t length)
{
    if (length > ctx->store_space)
        return nullptr;
    char *const place = ctx->store_end;
    ctx->store_end += length;
    ctx->store_space -= length;
    ctx->message_count += length;
    return place;
}

// Something is being written that may not go without marks: the error ends the writing that may begin anew.
// SOAP_OK if the message has its marks.
inline int marks_require(soap *ctx)
{
    if (ctx->mark_state == MARKS_MADE)
        return SOAP_OK;
    ctx->mark_state = MARKS_MISSING;
    return fail(ctx, SOAP_STOP);
}

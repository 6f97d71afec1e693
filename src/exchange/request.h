// request.h - the message of a call on its way out: an object in an element of the Body, counted and written.
//
// Elsewhere: the connection and the head (connect.cpp), the end of sending (send.cpp).
#pragma once

#include <zuv_client_pro/soap.h>

#include "binding/class_ops.h"

struct request_message {
    const char *element;
    const binding::class_ops *ops; // of `object`
    const void *object;            // may be null
    std::size_t stored = 0;        // bytes of the message, if the store has them all once it is counted
    std::uint32_t mode = 0;        // the mode that it was counted in
};

// Marks the object and the header where that can show in the message, and counts the message if it needs to be.
// Called after soap_reset_call, with a null encoding style. Results as soap_count_begin, soap_count_end and the
// writers of the envelope.
int request_count(soap *ctx, request_message &message);

// Writes the message that was counted, after soap_send_begin and the head. Results as the writers of the
// envelope. The caller wipes the store when all is sent or given up (message_store_wipe).
int request_write(soap *ctx, const request_message &message);

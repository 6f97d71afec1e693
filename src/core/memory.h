// memory.h - what layers share about memory beyond soap_memory.h: the fields whose values are managed, blocks
// gathered into one piece, instance records, credentials in buffers.
//
// Elsewhere: the table of allocations (tracking.h).
#pragma once

#include <cstddef>

#include <zuv_client_pro/soap.h>

// X(name): set to null when all managed blocks are freed, and null in a copy.
#define CONTEXT_MANAGED_FIELDS(X)                                                                            \
    X(http_content)                                                                                          \
    X(header)                                                                                                \
    X(fault)                                                                                                 \
    X(auth_user)                                                                                             \
    X(auth_password)                                                                                         \
    X(auth_realm)                                                                                            \
    X(action)                                                                                                \
    X(forwarded_for)

// Called for each block that moves: the bytes from `start` up to `end` now lie at `new_address`; they lay at
// `old_address`.
using block_moved = void (*)(soap *ctx, const void *start, const void *end, char *new_address,
                             const char *old_address);

// soap_block_stack_save, which calls `moved` (may be null) for each block.
void *block_stack_gather(soap *ctx, soap_block_stack *stack, void *target, block_moved moved);

// Ends the growing text.
void growing_text_free(soap *ctx);

// Takes back all instance records without destroying their objects.
void instance_records_release(soap *ctx);

// Wipes what credentials left in `buffer` and the scratch texts, if any passed; unread input and unsent
// output stay.
void credentials_wipe(soap *ctx);

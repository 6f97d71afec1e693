// soap_memory.h - memory that belongs to a context: tracked allocation, managed blocks, class instances,
// block stacks, growing text.
//
// Elsewhere: when it is released (soap.h), identity of objects (soap_identity.h).
//
// Always: every engine allocation goes through tracked_malloc. Sizes are in bytes. Memory returned belongs to
// the context unless a function says otherwise. A function that fails for lack of memory, a size near
// SIZE_MAX included, leaves what it was given as it was, sets ctx->error to SOAP_OUT_OF_MEMORY, and returns
// that or null. Nothing else fails. All may be called at any time.
#pragma once

#include <zuv_client_pro/soap.h>

// --- what waits for the next message ---
//
// Objects of data classes, texts and blocks of at most 512 bytes that a context releases are emptied and kept,
// up to soap::pool_limit bytes, and its next messages take them, so that a steady caller's call takes nothing
// from malloc. Each stays a single object or block, which soap_block_unlink gives out as ever. Texts are
// wiped as they are emptied, and so are blocks that held credentials. Instances with a deletion hook of the
// host program's are not kept. A message that holds more than pool_limit bytes (soap::max_memory counts them,
// with those that it takes from here) leaves no more than it found. What no message has needed for 64
// releases goes by halves; a lowered limit holds from the next release on, and the end of the context frees
// all. In a library built with AddressSanitizer the limit is 0 unless it is set, so that late use is seen.
// A copy of a context takes the limit, and nothing of what waits.

// --- tracked allocation ---
//
// Finds leaks and double frees, which it reports on standard error.

// Allocates a block, aligned for any type, and enters it in the context's table under the given place in the
// source.
//   ctx          null: the block is not tracked, and plain free ends it
//   source_file  borrowed for the life of the context
//   source_line  line in it
//   size         bytes
//   returns      the block, to be freed by tracked_free; one that is live when the context ends is reported
//   null         out of memory; here ctx->error is not set
ZUV_API void *tracked_malloc(soap *ctx, const char *source_file, int source_line, std::size_t size);

// Frees a tracked block. A block freed twice, or one that the table does not know, is reported on standard
// error with the given place in the source, and left alone. The last 4096 freed blocks are remembered for
// this.
//   ctx          the context that tracks the block
//   source_file  place of the call, needed during the call only
//   source_line  line in it
//   address      the block; null is ignored
ZUV_API void tracked_free(soap *ctx, const char *source_file, int source_line, void *address);

// tracked_malloc with the place where it is written.
#define SOAP_MALLOC(ctx, size)  tracked_malloc((ctx), __FILE__, __LINE__, (size))
// tracked_free with the place where it is written.
#define SOAP_FREE(ctx, address) tracked_free((ctx), __FILE__, __LINE__, (address))

// --- managed blocks ---
//
// Released together by soap_discard_all. Releasing n of them takes time proportional to n.

// A managed block, aligned to 8 bytes; ctx->allocated becomes 1. With ctx->on_malloc set, its result is
// returned as it is and not managed.
//   ctx      null: a block that plain free ends
//   size     bytes; 0 gives the shared empty text, which is read-only and no block, and leaves ctx->allocated
//   returns  the block, with undefined contents
//   null     SOAP_OUT_OF_MEMORY
ZUV_API void *soap_block_alloc(soap *ctx, std::size_t size);

// Frees one managed block, or all of them. With all, the fields that point into them are cleared:
// http_content, action, fault, header, credentials (wiped), realm, forwarded_for, attachment lists; MODE_MIME
// leaves output_mode. A block whose end was overwritten stops the release or the search: a line on standard
// error, and SOAP_CORRUPTION in ctx->error; that block and the older ones stay. Does nothing on a context
// that has ended.
//   address  start of the block, searched from the newest on; an address that is no block is passed to
//            soap_discard_objects; null: all blocks
ZUV_API void soap_block_free(soap *ctx, void *address);

// Enters an object in the list of managed instances.
//   object      borrowed until the hook runs; may also be filled in later, in the record
//   type_id     see soap_registry.h
//   array_size  negative: a single object; otherwise the number of objects
//   hook        destroys instance->object when the context releases it, and returns 0 if it did; null:
//               nothing to destroy
//   returns     the record, which the context owns until the object is discarded or unlinked
//   null        SOAP_OUT_OF_MEMORY
ZUV_API soap_instance *soap_instance_register(soap *ctx, void *object, int type_id, int array_size,
                                              int (*hook)(soap_instance *instance));

// Destroys all managed instances, newest first, or a single one. A hook that returns non-zero is reported on
// standard error, and its object is forgotten. Does nothing on a context that has ended.
//   object  start of the one to destroy; null: all. ctx->header and ctx->fault become null if it is theirs, with
//           null, and with an address that is not known
ZUV_API void soap_discard_objects(soap *ctx, void *object);

// Removes a block or an instance from management: the caller owns it, ends a block by plain free and an
// instance as its class requires.
//   ctx      null is allowed
//   address  start of the block or instance
//   0        it was removed
//   -1       it is unknown, or an argument is null; ctx->error is not set
ZUV_API int soap_block_unlink(soap *ctx, const void *address);

// Gives all blocks and instances of one context to another; they stay where they are in memory. On failure
// both are as they were, with source->error SOAP_CORRUPTION (a damaged block; a line on standard error) or
// SOAP_OUT_OF_MEMORY.
//   source  loses them
//   target  owns them afterwards; nothing happens if it is the source
ZUV_API void soap_blocks_move(soap *source, soap *target);

// Managed copies of a terminated text, or of `length` bytes with a terminator added.
//   text     null stays null, without an error
//   length   bytes
//   returns  the copy, terminated
//   null     SOAP_OUT_OF_MEMORY, unless `text` is null
ZUV_API char *soap_string_dup(soap *ctx, const char *text);
ZUV_API char *soap_string_dup_n(soap *ctx, const char *text, std::size_t length);
ZUV_API char32_t *soap_wide_string_dup(soap *ctx, const char32_t *text);

// --- block stacks ---
//
// The context has a stack of block stacks. In all functions `stack` is one of its records, or null for the
// top one; with no stack at all they do nothing and return null or 0, without an error. Data areas are
// aligned to 8 bytes and live until soap_block_stack_next passes their block, the stack is saved or dropped,
// or the call ends.

// Pushes an empty stack.
//   returns  the new top one
//   null     SOAP_OUT_OF_MEMORY
ZUV_API soap_block_stack *soap_block_stack_push(soap *ctx);
// Adds a block.
//   stack    where to
//   size     bytes
//   returns  its data area, with undefined contents
//   null     SOAP_OUT_OF_MEMORY, or there is no stack
ZUV_API void *soap_block_stack_grow(soap *ctx, soap_block_stack *stack, std::size_t size);
// Reverses the stack, so that it runs oldest first. To be called once.
//   stack    which one
//   returns  the first data area
//   null     the stack is empty
ZUV_API char *soap_block_stack_first(soap *ctx, soap_block_stack *stack);
// Frees the current block.
//   stack    which one
//   returns  the next data area
//   null     there is none
ZUV_API char *soap_block_stack_next(soap *ctx, soap_block_stack *stack);
// Size of the current block: the newest, or after soap_block_stack_first the one that was returned last.
//   stack    which one
//   returns  bytes
ZUV_API std::size_t soap_block_stack_size(soap *ctx, soap_block_stack *stack);
// Shortens the newest block.
//   stack    which one
//   size     bytes that it keeps; a larger size changes nothing
//   returns  bytes in the whole stack
ZUV_API std::size_t soap_block_stack_trim(soap *ctx, soap_block_stack *stack, std::size_t size);
// Copies the blocks to one area, oldest first, and drops the stack, also on failure.
//   stack           which one
//   target          takes the stack's total bytes; null: a new managed block
//   fix_references  not 0: places inside a block that wait for an address move along (soap_forward_relocate)
//   returns         target, or the new block
//   null            SOAP_OUT_OF_MEMORY
ZUV_API void *soap_block_stack_save(soap *ctx, soap_block_stack *stack, void *target, int fix_references);
// Frees a stack and its blocks, wherever it is in the context's stack.
//   stack  which one; an unknown one is ignored
ZUV_API void soap_block_stack_drop(soap *ctx, soap_block_stack *stack);

// --- growing text ---
//
// soap::label_buffer, with label_index bytes in use and no terminator of its own. It starts with 256 bytes,
// doubles until a text fits, and lives until the end of the call; an address in it is valid until the next
// growth.

// Appends bytes to the growing text; the second form empties it first.
//   text    must not be in the growing text itself
//   length  bytes
//   SOAP_OK
//   SOAP_OUT_OF_MEMORY
ZUV_API int soap_text_buffer_put(soap *ctx, const char *text, std::size_t length);
ZUV_API int soap_text_buffer_reset_put(soap *ctx, const char *text, std::size_t length);
// Makes space for more bytes after label_index without using them.
//   bytes  that will be appended
//   SOAP_OK
//   SOAP_OUT_OF_MEMORY
ZUV_API int soap_text_buffer_reserve(soap *ctx, std::size_t bytes);

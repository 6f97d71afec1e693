// soap_memory.h - memory that belongs to a context: tracked allocation, managed blocks, class instances,
// block stacks, growing text.
//
// Elsewhere: when it is released (soap.h), identity of objects (soap_identity.h).
// Always: every engine allocation goes through tracked_malloc. Sizes are in bytes. A function that fails for
// lack of memory, a size near SIZE_MAX included, returns null (or 20), sets ctx->error to 20 and leaves what
// it was given as it was, unless it says otherwise. Nothing else fails.
#pragma once

#include <zuv_client_pro/soap.h>

// ---------------------------------------------------------------------------------------------
// Tracked allocation: finds leaks and double frees, which it names on standard error.

// Allocates `size` bytes, aligned for any type, and enters the block in the context's table under the given
// place in the source.
//   ctx          null: the block is not tracked, and plain free ends it
//   source_file  borrowed for the life of the context
//   The block, to be freed by tracked_free: one still live when the context ends is reported as a leak.
//   Null if memory runs out; ctx->error is left to the caller.
ZUV_API void *tracked_malloc(soap *ctx, const char *source_file, int source_line, std::size_t size);

// Frees a tracked block. A block freed twice, or one that the table does not know, is named on standard error
// with `source_file` and `source_line` and left alone. The last 4096 freed blocks are remembered for this.
// Null is ignored.
ZUV_API void tracked_free(soap *ctx, const char *source_file, int source_line, void *address);

#define SOAP_MALLOC(ctx, size)  tracked_malloc((ctx), __FILE__, __LINE__, (size))
#define SOAP_FREE(ctx, address) tracked_free((ctx), __FILE__, __LINE__, (address))

// ---------------------------------------------------------------------------------------------
// Managed blocks: released together by soap_discard_all. Releasing n of them costs time in n.

// A block of `size` bytes, aligned to 8, and ctx->allocated set to 1.
//   size  0 gives the shared empty text, which is read-only, no block, and leaves ctx->allocated alone
//   ctx   null: a block that plain free ends
//   With ctx->on_malloc set its result is returned as it is and not managed; null sets ctx->error to 20.
ZUV_API void *soap_block_alloc(soap *ctx, std::size_t size);

// Frees the managed block that starts at `address`, after a search from the newest on; an address that is no
// block goes to soap_discard_objects. With null frees all blocks and forgets the fields that live in them:
// http_content, action, fault, header, credentials (wiped), realm, forwarded_for, attachment lists; MODE_MIME
// leaves output_mode. A block whose end was overwritten stops the release or the search: a line on standard
// error, ctx->error 21 (SOAP_CORRUPTION); it and the older blocks stay. Does nothing on a context that has
// ended.
ZUV_API void soap_block_free(soap *ctx, void *address);

// Enters an object in the list of managed instances.
//   object      borrowed until the hook runs; may also be filled in later, in the record
//   type_id     see soap_registry.h
//   array_size  negative: a single object; otherwise the number of objects
//   hook        destroys instance->object when the context lets go, and returns 0 if it did; null: nothing to
//               destroy
//   The record, which the context owns until the object is discarded or unlinked.
ZUV_API soap_instance *soap_instance_register(soap *ctx, void *object, int type_id, int array_size,
                                              int (*hook)(soap_instance *instance));

// Destroys all instances, newest first, or with an address the one that starts there. With null, or an
// address that is not known, ctx->header and ctx->fault become null. A hook that returns non-zero is named on
// standard error, and its object is forgotten. Does nothing on a context that has ended.
ZUV_API void soap_discard_objects(soap *ctx, void *object);

// Takes the block or instance that starts at `address` out of management: the caller owns it, ends a block by
// plain free and an instance in the way its class asks for.
//   0; -1 if it is unknown or an argument is null
ZUV_API int soap_block_unlink(soap *ctx, const void *address);

// Gives all blocks and instances of `source` to `target`; they stay where they are in memory. A damaged block
// (source->error 21, a line on standard error) or lack of memory (source->error 20) leaves both as they were.
ZUV_API void soap_blocks_move(soap *source, soap *target);

// Managed copies of a terminated text, or of `length` bytes of one with a terminator added. Null stays null.
ZUV_API char *soap_string_dup(soap *ctx, const char *text);
ZUV_API char *soap_string_dup_n(soap *ctx, const char *text, std::size_t length);
ZUV_API char32_t *soap_wide_string_dup(soap *ctx, const char32_t *text);

// ---------------------------------------------------------------------------------------------
// Block stacks, of which the context has a stack. `stack` is one of its records, or null for the top one;
// with no stack at all the functions do nothing and return null or 0. Data areas are aligned to 8 and live
// until their block is passed by soap_block_stack_next, or the stack is saved or dropped, at the latest until
// the end of the call.

// Pushes an empty stack.
ZUV_API soap_block_stack *soap_block_stack_push(soap *ctx);
// Adds a block of `size` bytes; its data area, with undefined contents.
ZUV_API void *soap_block_stack_grow(soap *ctx, soap_block_stack *stack, std::size_t size);
// Reverses the stack, so that it runs oldest first (to be called once), and gives the first data area, null
// if empty.
ZUV_API char *soap_block_stack_first(soap *ctx, soap_block_stack *stack);
// Frees the current block; the next data area, null at the end.
ZUV_API char *soap_block_stack_next(soap *ctx, soap_block_stack *stack);
// Bytes of the current block: the newest, or after soap_block_stack_first the one that was given last.
ZUV_API std::size_t soap_block_stack_size(soap *ctx, soap_block_stack *stack);
// Shortens the newest block to `size` bytes (a larger size changes nothing); bytes in the whole stack.
ZUV_API std::size_t soap_block_stack_trim(soap *ctx, soap_block_stack *stack, std::size_t size);
// Gathers the blocks, oldest first, and drops the stack, in case of failure too.
//   target          takes the stack's total bytes; null: a new managed block
//   fix_references  not 0: places inside a block that wait for an address move along (soap_forward_relocate)
//   target or the new block; null if memory runs out
ZUV_API void *soap_block_stack_save(soap *ctx, soap_block_stack *stack, void *target, int fix_references);
// Frees the stack and its blocks, wherever it stands. An unknown stack is ignored.
ZUV_API void soap_block_stack_drop(soap *ctx, soap_block_stack *stack);

// ---------------------------------------------------------------------------------------------
// Growing text: `label_buffer`, with `label_index` bytes in use and no terminator of its own. It starts with
// 256 bytes, doubles until a text fits, and lives until the end of the call; an address in it lasts until the
// next growth.

// Appends `length` bytes, which must not lie in the growing text itself. 0 or 20.
ZUV_API int soap_text_buffer_put(soap *ctx, const char *text, std::size_t length);
// The same on an empty text.
ZUV_API int soap_text_buffer_reset_put(soap *ctx, const char *text, std::size_t length);
// Makes room for `room` more bytes behind label_index without using them. 0 or 20.
ZUV_API int soap_text_buffer_reserve(soap *ctx, std::size_t room);

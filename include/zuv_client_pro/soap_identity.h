// soap_identity.h - identity of objects across a message: the pointer table of the writer, the id table of
// the reader.
//
// Elsewhere: the text of ids and references (soap_xml.h), what a class does in the mark pass (soap_class.h).
// Always: both tables belong to one message. They know objects by address and type id and own none of them.
// Addresses that were entered must stay valid until the table is reset.
#pragma once

#include <zuv_client_pro/soap.h>

// --- writing: the pointer table ---
//
// Common arguments: `address` is the object; `array` is null, or the holder of an array value, which begins
// with its content pointer, followed by `dimensions` 32-bit sizes; `type` is a type id.

// One object of the message; lives until soap_pointer_table_reset. Marks: 0 met once, 1 written or to be
// referred to, 2 met more than once, 3 sent as an attachment.
struct soap_pointer_record {
    soap_pointer_record *next; // in its chain
    const void *ptr;           // the object
    const void *array;         // holder of an array value, or null
    std::int32_t type;         // type id
    std::int32_t id;           // number of the entry, from 1
    std::int8_t count_mark;    // mark of the counting pass
    std::int8_t send_mark;     // mark of the sending pass
    std::uint32_t hash;        // of the address that counts: the object's, or that of an array's content
};

// Empties the table and frees its records. Costs nothing when the table is empty.
ZUV_API void soap_pointer_table_reset(soap *ctx);

// Look an object up. The array form compares the holder's content pointer and sizes, and not `address`.
//   address     the object
//   array       the holder; null is in no table
//   dimensions  sizes in the holder
//   type        type id
//   record      takes the record, null if there is none; may be null
//   returns     the number under which it is entered
//   0           it is not entered
ZUV_API int soap_pointer_find(soap *ctx, const void *address, int type, soap_pointer_record **record);
ZUV_API int soap_array_pointer_find(soap *ctx, const void *address, const void *array, int dimensions,
                                    int type, soap_pointer_record **record);

// Enters an object that is not yet entered, both marks 0.
//   address     the object
//   array       null, or the holder, which must keep its content while the table is in use
//   dimensions  not used
//   type        type id
//   record      takes the record; may be null
//   returns     the new number
//   0           SOAP_OUT_OF_MEMORY in ctx->error
ZUV_API int soap_pointer_add(soap *ctx, const void *address, const void *array, int dimensions, int type,
                             soap_pointer_record **record);

// The mark pass, before a message is counted: enters an object, or notes that it is met again.
//   address     the object; with null nothing is entered (in the array form a null content)
//   array       the holder
//   dimensions  sizes in the holder
//   type        type id
//   0           the first visit: the caller continues with the object's members
//   returns     otherwise the members need no visit: a null address, tree mode (not considered in the array
//               form), an object met before, or memory ran out (SOAP_OUT_OF_MEMORY in ctx->error)
ZUV_API int soap_mark_pointer(soap *ctx, const void *address, int type);
ZUV_API int soap_array_mark_pointer(soap *ctx, const void *address, const void *array, int dimensions,
                                    int type);

// How the current pass writes an object: multi, as a reference; single, in place without an id. In the header
// every object is single. A null record is neither, outside the header.
//   record  from the look-up
//   1       it is
//   0       it is not
ZUV_API int soap_pointer_is_multi(soap *ctx, const soap_pointer_record *record);
ZUV_API int soap_pointer_is_single(soap *ctx, const soap_pointer_record *record);

// Sets the current pass's mark of a record to "written".
//   record  null is ignored
ZUV_API void soap_pointer_set_written(soap *ctx, soap_pointer_record *record);
// Sets both marks of an object to "written".
//   address  an object that is not entered is ignored
//   type     type id
ZUV_API void soap_pointer_set_seen(soap *ctx, const void *address, int type);

// The id for the start tag of an object written in place. A literal message has none unless graph mode is on.
// Called during sending, as are the functions below.
//   id          what the caller was given: negative to look it up
//   address     the object
//   array       the holder, by which the array form finds it
//   dimensions  sizes in the holder
//   type        type id
//   returns     above 0 the number for an id attribute, otherwise none
ZUV_API int soap_element_id(soap *ctx, int id, const void *address, int type);
ZUV_API int soap_array_element_id(soap *ctx, int id, const void *address, const void *array, int dimensions,
                                  int type);

// Decides the form of an object held by pointer.
//   tag         name of its element
//   id          what the caller was given: negative to look it up
//   address     the object; null writes a null value
//   array       the holder, or null
//   dimensions  sizes in the holder
//   type_text   value of xsi:type of a null value
//   type        type id
//   returns     0 or above: the caller writes it in place with this id
//   -1          the element was written (a null value or a reference), or writing it failed: see ctx->error
ZUV_API int soap_element_ref(soap *ctx, const char *tag, int id, const void *address, const void *array,
                             int dimensions, const char *type_text, int type);

// The id under which an independent object is written now. In SOAP 1.2 the next start tag then carries the
// encoding style.
//   address     the object
//   array       the holder, or null
//   dimensions  sizes in the holder
//   type_text   not used
//   type        type id
//   returns     the number for an id attribute
//   0           no id
ZUV_API int soap_multiref_begin(soap *ctx, const void *address, const void *array, int dimensions,
                                const char *type_text, int type);

// --- reading: the id table ---
//
// Id texts begin with "#"; one that does not names something outside the message. Used during receiving.

// Copies an object to a place that waited for it: `place_type` and `length` are those of the place. With a
// place that holds the object at more indirections than the id does, `source` is a cell with the address.
using soap_copy_hook = void (*)(soap *ctx, int type, int place_type, void *place, std::size_t length,
                                const void *source, std::size_t size);
// Makes an object by type id; the default is soap_instantiate (soap_registry.h).
using soap_instantiate_function = void *(*)(soap *ctx, int type, const char *xsi_type, const char *array_type,
                                            std::size_t *size);

// Chain of an id text in soap::id_table.
//   text     id text
//   returns  0 to SOAP_ID_HASH_SIZE - 1
ZUV_API std::size_t soap_id_hash(const char *text);
// Looks an id text up.
//   text     id text
//   returns  its record, which lives until soap_id_table_reset
//   null     it is not entered
ZUV_API soap_id_record *soap_id_lookup(soap *ctx, const char *text);
// Enters an id text that is not yet entered.
//   text     id text, copied
//   returns  its record, which lives until soap_id_table_reset
//   null     SOAP_OUT_OF_MEMORY in ctx->error
ZUV_API soap_id_record *soap_id_add(soap *ctx, const char *text);
// Type id under which an id text is entered.
//   text     id text
//   returns  the type id
//   0        it is not entered
ZUV_API int soap_id_type(soap *ctx, const char *text);
// Forgets all ids and whatever still waits for one. No waiting place is changed. Costs nothing on an empty
// table.
ZUV_API void soap_id_table_reset(soap *ctx);

// Enters an object that is about to be read.
//   id           its id text; null or empty: nothing is entered
//   address      the object; null: it is made, and ctx->allocated is set
//   type         type id
//   size         bytes
//   level        pointer indirections at which the object is held
//   type_text    its xsi:type, passed to instantiate
//   array_type   its array type, passed to instantiate
//   instantiate  makes the object; null: a managed block of `size` bytes
//   returns      the object's address
//   null         ctx->error: SOAP_OUT_OF_MEMORY; SOAP_DUPLICATE_ID (the id has an object already) or
//                SOAP_ID_CONFLICT (references to the id expect another type or size), with the id in
//                element_id
ZUV_API void *soap_object_register(soap *ctx, const char *id, void *address, int type, std::size_t size,
                                   unsigned level, const char *type_text, const char *array_type,
                                   soap_instantiate_function instantiate);

// Stores at a pointer place the address of the object with an id, now or when the message ends; until then
// the place must stay where it is, keep what is put there and wait for nothing else.
//   id       id text; null or empty: does nothing
//   place    takes the address; null: does nothing
//   type     type id
//   size     bytes of the object
//   level    pointer indirections; above those of the object, managed cells are put between
//   returns  the place that receives the address (the last cell), or `place` if nothing was done
//   null     ctx->error: SOAP_OUT_OF_MEMORY or SOAP_ID_CONFLICT (another type), with the id in element_id
ZUV_API void **soap_object_forward_ptr(soap *ctx, const char *id, void **place, int type, std::size_t size,
                                       unsigned level);

// Asks for a copy of the object with an id, made at the end of the message.
//   href        id text; null or empty: does nothing
//   place       without a hook takes a copy of the object's bytes: it stays where it is, undefined until
//               then, and waits for nothing else; with one, what the hook expects: for containers the
//               container
//   length      for containers the element's index
//   type        type id of the object
//   place_type  type id of the place
//   size        bytes of the object
//   level       pointer indirections; for containers 1 if the elements are pointers
//   hook        copies the object; null: its bytes are copied
//   returns     the place
//   null        ctx->error: SOAP_OUT_OF_MEMORY or SOAP_ID_CONFLICT (another type or size), with the id in
//               element_id; or `place` was null
ZUV_API void *soap_object_forward(soap *ctx, const char *href, void *place, std::size_t length, int type,
                                  int place_type, std::size_t size, unsigned level, soap_copy_hook hook);

// Fills all that waits, at the end of a message. Values are copied once they are complete themselves; values
// that can only be copied from each other stay as they are (places of a byte copy with 0 in their first
// bytes).
//   SOAP_OK
//   SOAP_OUT_OF_MEMORY
//   SOAP_MISSING_ID     a reference to an id that the message lacks, which is in element_id without "#"
//   SOAP_LENGTH         copies, those of QNames included, exceed 1 MB and 8 times the message's bytes so far
ZUV_API int soap_forward_resolve(soap *ctx);

// Whether a place that waits is in an area. Takes time proportional to all that waits.
//   start  of the area
//   end    after its last byte
//   -1     there is one
//   0      there is none
ZUV_API int soap_forward_has_pending(soap *ctx, const void *start, const void *end);

// Informs the table that the bytes of an area move. Both the old and the new area must be allocated; it does
// not matter which of them holds the bytes yet. Takes time proportional to all that is entered, so collect an
// array in few blocks.
//   start        of the area
//   end          after its last byte
//   new_address  where a byte of it moves to
//   old_address  where that byte was
ZUV_API void soap_forward_relocate(soap *ctx, const void *start, const void *end, char *new_address,
                                   const char *old_address);

// The hook for plain values: copies bytes.
//   type        not used
//   place_type  not used
//   place       takes the bytes
//   length      not used
//   source      the bytes
//   size        bytes
ZUV_API void soap_copy_bytes(soap *ctx, int type, int place_type, void *place, std::size_t length,
                             const void *source, std::size_t size);

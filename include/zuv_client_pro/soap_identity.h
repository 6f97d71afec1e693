// soap_identity.h - identity of objects across a message: the pointer table of the writer, the id table of
// the reader.
//
// Elsewhere: the text of ids and references (soap_xml.h), what a class does at a mark (soap_binding.h).
// Always: both tables belong to one message. The tables know objects by address and type id; they own none of
// them. Addresses entered must stay valid until the table is reset.
#pragma once

#include <zuv_client_pro/soap.h>

// ---------------------------------------------------------------------------------------------
// Writing: the pointer table.

// One object of the message. Lives until soap_pointer_table_reset.
// Values of a mark: 0 met once, 1 written or to be referred to, 2 met more than once, 3 goes out as an
// attachment.
struct soap_pointer_record {
    soap_pointer_record *next; // in its chain
    const void *ptr;           // the object
    const void *array; // holder of an array value (content pointer first, then its 32-bit sizes), or null
    std::int32_t type;
    std::int32_t id;        // number of the entry, from 1
    std::int8_t count_mark; // mark of the counting pass
    std::int8_t send_mark;  // mark of the sending pass
    std::uint32_t hash;     // of the address that counts: the object's, or that of an array's content
};

// Empties the table and frees its records. Costs nothing when the table is empty.
ZUV_API void soap_pointer_table_reset(soap *ctx);

// The number under which an object is entered, or 0. `record` (may be null) receives the record, null if
// there is none. The array form finds by the holder's content pointer and `dimensions` sizes, and not by
// `address`.
ZUV_API int soap_pointer_find(soap *ctx, const void *address, int type, soap_pointer_record **record);
ZUV_API int soap_array_pointer_find(soap *ctx, const void *address, const void *array, int dimensions,
                                    int type, soap_pointer_record **record);

// Enters an object that is not yet entered, both marks 0. `array` is null or the holder of an array value,
// which must keep its content while the table is in use. Returns the new number; 0 with error 20 if memory
// runs out.
ZUV_API int soap_pointer_add(soap *ctx, const void *address, const void *array, int dimensions, int type,
                             soap_pointer_record **record);

// The mark pass. 0: this is the first visit, and the caller goes on into the object's members. Not 0: a null
// address, tree mode, an object met before (which is now known to be shared), or memory ran out (error 20).
// In the array form a null content counts as a null address, and tree mode is not looked at.
ZUV_API int soap_mark_pointer(soap *ctx, const void *address, int type);
ZUV_API int soap_array_mark_pointer(soap *ctx, const void *address, const void *array, int dimensions,
                                    int type);

// How the current pass stands to an object: multi (1) to be written as a reference, single (1) in place with
// no id. In the header every object is single. A null record is neither.
ZUV_API int soap_pointer_is_multi(soap *ctx, const soap_pointer_record *record);
ZUV_API int soap_pointer_is_single(soap *ctx, const soap_pointer_record *record);

// Sets the current pass's mark of a record (null is allowed) to "written".
ZUV_API void soap_pointer_set_written(soap *ctx, soap_pointer_record *record);
// Sets both marks of an object to "written", if it is entered.
ZUV_API void soap_pointer_set_seen(soap *ctx, const void *address, int type);

// The id for the start tag of an object written in place: above 0 an id attribute, otherwise none. `id` is
// what the caller was given: negative to look it up. A literal message has none unless graph mode is on. The
// array form finds the object by its holder.
ZUV_API int soap_element_id(soap *ctx, int id, const void *address, int type);
ZUV_API int soap_array_element_id(soap *ctx, int id, const void *address, const void *array, int dimensions,
                                  int type);

// For an object held by pointer: decides its form. 0 or above: the caller writes it in place with this id.
// -1: all is written (a null value or a reference), or writing it failed with ctx->error.
ZUV_API int soap_element_ref(soap *ctx, const char *tag, int id, const void *address, const void *array,
                             int dimensions, const char *type_text, int type);

// The id under which an independent object is written now, or 0 for no id. In SOAP 1.2 the next start tag
// then carries the encoding style.
ZUV_API int soap_multiref_begin(soap *ctx, const void *address, const void *array, int dimensions,
                                const char *type_text, int type);

// ---------------------------------------------------------------------------------------------
// Reading: the id table. Id texts begin with "#"; one that does not names something outside the message.

// Copies an object to a place that waited for it: `place_type` and `length` are those of the place. With a
// place that holds the object at more indirections than the id does, `source` is a cell with the address.
using soap_copy_hook = void (*)(soap *ctx, int type, int place_type, void *place, std::size_t length,
                                const void *source, std::size_t size);
// Makes an object by type id; the default instantiate operation is soap_instantiate (soap_registry.h).
using soap_instantiate_function = void *(*)(soap *ctx, int type, const char *xsi_type, const char *array_type,
                                            std::size_t *size);

// Bucket of an id text, 0 to SOAP_ID_HASH_SIZE - 1.
ZUV_API std::size_t soap_id_hash(const char *text);
// The record of an id text, or null. Records live until soap_id_table_reset.
ZUV_API soap_id_record *soap_id_lookup(soap *ctx, const char *text);
// Enters a text that is not yet entered; null with error 20 if memory runs out.
ZUV_API soap_id_record *soap_id_add(soap *ctx, const char *text);
// Type id under which a text is entered, or 0.
ZUV_API int soap_id_type(soap *ctx, const char *text);
// Forgets all ids and whatever still waits for one. No waiting place is touched. Costs nothing on an empty
// table.
ZUV_API void soap_id_table_reset(soap *ctx);

// Enters an object that is about to be read. `address` null: it is made, by `instantiate` or, without one, as
// a managed block of `size` bytes, and ctx->allocated is set. `size` is in bytes, `level` counts the pointer
// indirections at which the object is held. A null or empty id enters nothing. Returns the object's address,
// or null with error 20, 24 (the id has an object already) or 26 (references to the id expect another type or
// size); for 24 and 26 the id stands in element_id.
ZUV_API void *soap_object_register(soap *ctx, const char *id, void *address, int type, std::size_t size,
                                   unsigned level, const char *type_text, const char *array_type,
                                   soap_instantiate_function instantiate);

// Stores at a pointer place the address of the object with this id, now or when the message ends; until then
// the place must stay where it is, hold what is put there and wait for nothing else. With `level` above the
// object's own, managed cells are put between. Returns the place that receives the address (the last cell),
// or null with error 20 or 26. A null place or an empty id does nothing and returns the place.
ZUV_API void **soap_object_forward_ptr(soap *ctx, const char *id, void **place, int type, std::size_t size,
                                       unsigned level);

// Asks for a copy of the object with this id, made at the end of the message: without a hook a copy of its
// bytes to `place` (of `size` bytes; it stays where it is, undefined until then, and waits for nothing else),
// with one whatever the hook does. For containers `place` is the container, `length` the element's index and
// `level` 1 if the elements are pointers. Returns the place, or null with error 20 or 26. A null place or an
// empty href does nothing and returns the place.
ZUV_API void *soap_object_forward(soap *ctx, const char *href, void *place, std::size_t length, int type,
                                  int place_type, std::size_t size, unsigned level, soap_copy_hook hook);

// Fills all that waits, at the end of a message. Values are copied once they are complete themselves; values
// that can only be copied from each other stay as they are (places of a byte copy with 0 in their first
// bytes). 0, 20, 25 for a reference to an id that the message lacks, the id without "#" in element_id, or 45:
// copies, those of QNames included, come to 1 MB and 8 times the message's bytes so far at most.
ZUV_API int soap_forward_resolve(soap *ctx);

// -1 if a place that waits lies in [start, end), else 0. Goes through all that waits.
ZUV_API int soap_forward_has_pending(soap *ctx, const void *start, const void *end);

// Tells the table that the bytes [start, end) move, by the distance from old_address to new_address. Both
// the old and the new area must be allocated; it does not matter which of them holds the bytes yet.
// Goes through all that is entered, so gather an array in few blocks.
ZUV_API void soap_forward_relocate(soap *ctx, const void *start, const void *end, char *new_address,
                                   const char *old_address);

// The hook for plain values: copies `size` bytes.
ZUV_API void soap_copy_bytes(soap *ctx, int type, int place_type, void *place, std::size_t length,
                             const void *source, std::size_t size);

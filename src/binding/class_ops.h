// class_ops.h - a class as the shared code sees it: constants and a few functions, one record for each class.
//
// Here: the record, and what is done with it that needs no knowledge of the class. Elsewhere: how the record
// is made from a member list (class_rules.h).
#pragma once

#include <array>
#include <cstddef>
#include <cstdint>
#include <string>
#include <string_view>
#include <typeinfo>

#include <zuv_client_pro/soap.h>

namespace binding {

// Reads the held element into one member of an object. True: consumed. False: ctx->error says whether it was
// another element (3, 6) or a failure.
using member_reader = bool (*)(soap *ctx, const char *tag, void *object);

struct member_entry {
    std::string_view tag;   // terminated
    std::string_view local; // its local part
    member_reader read;
    bool single;   // taken once; a further occurrence is unknown
    bool required; // in strict mode its absence is SOAP_OCCURS (single members)
};

constexpr std::size_t MEMBERS_MAX = 64; // members of a class, inherited ones included: bits of a mask

// All members of a class, inherited ones first, with an index from local names to members.
struct member_table {
    const member_entry *entries;
    std::size_t count;
    const std::uint8_t *slots; // open addressing by name hash: index + 1, 0 for an empty slot
    std::uint32_t slot_mask;
    const std::uint8_t *next_same; // index + 1 of the next member with the same local name, 0 for none
    std::uint64_t required;        // mask of single members that strict mode asks for
    bool minima;                   // some vector has a minimum
};

struct class_ops;

// Reads what follows the consumed start tag of an element into `object`, up to and with the end tag.
// The object, or null with error set.
using content_reader = void *(*)(soap *ctx, const class_ops &ops, const char *tag, void *object);

struct class_ops {
    int type_id;
    const char *xml_type;
    const class_ops *base; // null for a root class
    std::size_t size;      // bytes of one object
    bool global_element;   // type of a top-level element
    bool nillable;         // xsi:nil is no failure even where the object is alone
    const member_table *members;
    void *(*create)(soap *owner, int count); // count < 0: one object; null if memory runs out
    void (*destroy)(void *object, int count);
    void (*assign)(void *target, const void *source);
    int (*type_of)(const void *object);                     // virtual soap_type
    const std::type_info *(*type_info)(const void *object); // of the object, which a host may have derived
    const std::type_info *own_type_info;                    // of the class
    void (*mark)(const void *object, soap *ctx);            // virtual soap_serialize
    int (*out)(const void *object, soap *ctx, const char *tag, int id, const char *type); // virtual soap_out
    int (*write_content)(soap *ctx, const void *object,
                         const char *tag); // members, or the text of simple content
    int (*write_attributes)(soap *ctx, const void *object);
    content_reader read;
    bool (*read_attributes)(soap *ctx, void *object);
    bool (*holds_minima)(const void *object); // vectors hold their minima
    std::string *(*text)(void *object);       // simple content
    void (*copy_hook)(soap *ctx, int type, int place_type, void *place, std::size_t length,
                      const void *source, std::size_t size);
    // Makes an object as new for the next message of its context; what its vectors and texts have allocated
    // stays. The bytes that it holds.
    std::size_t (*recycle)(void *object, soap *owner);
};

// True if `derived` is `base` or descends from it.
bool class_descends(const class_ops *derived, const class_ops *base);

// The rules for a whole object. `class_in` reads the element `tag` (null: any) into `object`, or into a new
// one when it is null; it gives the object, or null with error set.
int class_out(soap *ctx, const class_ops &ops, const void *object, const char *tag, int id, const char *type);
int class_put(soap *ctx, const class_ops &ops, const void *object, const char *tag, const char *type);
void *class_in(soap *ctx, const class_ops &ops, const char *tag, void *object);
void *class_get(soap *ctx, const class_ops &ops, const char *tag, void *object);

// soap_read_independents with an unknown element left to the parent's end.
bool independents_read(soap *ctx);

// The content readers: elements, and text with attributes.
void *read_members(soap *ctx, const class_ops &ops, const char *tag, void *object);
// Goes on with the elements of an object after a value that was refused and dropped.
void *read_further_members(soap *ctx, const class_ops &ops, const char *tag, void *object);
void *read_simple_content(soap *ctx, const class_ops &ops, const char *tag, void *object);

// Pointer forms. The reader takes the element `tag`, nil and references included, and fills the place.
bool class_pointer_in(soap *ctx, const class_ops &ops, const char *tag, void **place);
// The same after a consumed start tag that is neither nil nor a reference.
bool class_new_in(soap *ctx, const class_ops &ops, const char *tag, void **place);
int class_pointer_out(soap *ctx, const class_ops &ops, const char *tag, int id, const void *object,
                      const char *type);
void class_pointer_mark(soap *ctx, const class_ops &ops, const void *object);

// A reference is to be filled by a copy of an object of `size` bytes with `content` bytes in addition. False
// with SOAP_LENGTH.
bool object_copy_allowed(soap *ctx, std::size_t size, std::size_t content);

// Makes a managed object of the class, or of the derived class that xsi_type names. Null with SOAP_OUT_OF_MEMORY.
void *class_instantiate(soap *ctx, const class_ops &ops, int count, const char *xsi_type, std::size_t *size,
                        const class_ops **made);

} // namespace binding

// registry.h - the tables that dispatch by type id uses: what the generator fills, what registry.cpp looks up.
//
// Here: the rows' layout. Elsewhere: the operations (registry.cpp), the rows (registry_tables.cpp,
// generated).
#pragma once

#include <cstddef>
#include <cstdint>
#include <string_view>

#include "binding/class_ops.h"
#include "binding/traits.h"

namespace binding {

constexpr int TYPE_ID_MAX = 892;     // the last id
constexpr int DISPATCH_ID_MAX = 877; // the last id that reading and writing by id know
constexpr int INSTANCE_ID_MIN = 8;   // the first id that a managed instance may have

enum class type_kind : std::uint8_t {
    none,
    chars,         // pointer to characters
    text,          // held as std::string
    simple,        // a number or boolean; `simple`
    enumeration,   // `names`
    object,        // a data class, xsd__base64Binary included; `ops`
    text_vector,   // std::vector<std::string>
    code_vector,   // std::vector of an enumeration
    object_vector, // std::vector of pointers to a class
    envelope,      // SOAP_ENV__Header, _Detail, _Code, _Reason, _Fault
    request,       // wrapper with one pointer, written under `element`
    response,      // likewise
    pointer        // pointer to the type `item`
};

// A simple type by its parser and its text.
struct simple_ops {
    int type_id;
    const char *xml_type;
    std::size_t size;
    void *(*in)(soap *ctx, const char *tag, void *place, const char *type);
    int (*out)(soap *ctx, const char *tag, int id, const void *place, const char *type);
};

// A vector by type: made, destroyed, appended to and filled.
struct vector_ops {
    void *(*create)();
    void (*destroy)(void *vector);
    std::size_t (*length)(const void *vector);
    const void *(*item)(const void *vector,
                        std::size_t index);         // std::string *, code *, or the pointer itself
    bool (*append)(void *vector, const void *item); // null: an empty item; false if memory runs out
    void (*store)(void *vector, std::size_t index, const void *item); // `item`: the new item's address
    std::size_t size;                                                 // bytes of the vector object
};

struct type_entry {
    type_kind kind = type_kind::none;
    const char *xml_name = nullptr; // XML type, or the wrapper's element name with its leading "-"
    const class_ops *ops = nullptr;
    const enum_table *names = nullptr;
    const simple_ops *simple = nullptr;
    const vector_ops *vector = nullptr;
    int item = 0; // element type of a vector, target of a pointer, class of a wrapper's member;
                  // an envelope record's own id
    const char *element = nullptr; // element of a wrapper's member
};

extern const type_entry type_entries[TYPE_ID_MAX + 1]; // by id

// Names that an element may be known by when nothing else gives its type, with an index from local names; see
// name_index.h for how the generated table makes one.
struct type_name {
    std::string_view name; // "protocol:Identity"
    int type_id;
};
struct name_index {
    const type_name *names;
    const std::uint16_t *slots; // open addressing by hash of the local name: index + 1, 0 for an empty slot
    std::uint32_t slot_mask;
    const std::uint16_t *next_same; // index + 1 of the next name with the same local part, 0 for none
};
extern const name_index type_index;    // XML types, the anonymous class included
extern const name_index element_index; // top-level elements whose type has no name of its own

// The simple types, written once in registry_simple.cpp.
extern const simple_ops simple_int, simple_byte, simple_unsigned_int, simple_unsigned_byte, simple_boolean,
    simple_double;

// Reads the element that comes next, whatever its name, as a type; null with error set.
void *read_by_type(soap *ctx, int type_id);
// Row of an id, or null when the id names nothing.
const type_entry *type_entry_of(int type_id);
// Type id of a name with a prefix of the message, or 0. Leaves ctx->error alone.
int type_by_qname(soap *ctx, const name_index &index, const char *qname);
// Class of an xsi:type as the message spells it, or null. Leaves ctx->error alone.
const class_ops *class_by_xsi_type(soap *ctx, const char *xsi_type);

} // namespace binding

#include "binding/vector_forms.h"

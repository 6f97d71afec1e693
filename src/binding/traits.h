// traits.h - how the contract's declarations reach the rules: the vocabulary of a generated member
// list.
//
// Here: rows of a member list and the traits that a list specialises. Elsewhere: what the rules do with a
// list (class_rules.h), leaf reads and writes (member_read.h, member_write.h).
//
// Always: a class costs its declaration and one traits<T>; everything else is unrolled from it by the
// compiler.
#pragma once

#include <cstddef>
#include <cstdint>
#include <string_view>
#include <tuple>

#include <zuv_client_pro/soap_primitive.h>

#include "binding/class_ops.h"

namespace binding {

// How often a member occurs on the wire, and so how it is held.
enum class occurs : std::uint8_t {
    optional, // a pointer; null writes nothing
    required, // a pointer (null writes nil) or a value
    many,     // a vector
    always    // a value with a default, written whatever it is
};

// One element of a class. `M` is a pointer to the data member; its type decides how it is read and written.
template <class M, class D = int> struct element {
    std::string_view tag; // "prefix:local"; the text is terminated
    M member;
    occurs how;
    std::uint16_t item_type;   // type id of the element's type
    std::uint16_t vector_type; // type id of the vector, 0 when there is none
    std::uint8_t minimum;      // fewest elements in strict mode
    D initial;                 // value of a new object when held by value
};

template <class M> constexpr element<M> optional(std::string_view tag, M member, std::uint16_t item_type)
{
    return {tag, member, occurs::optional, item_type, 0, 0, 0};
}
template <class M> constexpr element<M> required(std::string_view tag, M member, std::uint16_t item_type)
{
    return {tag, member, occurs::required, item_type, 0, 1, 0};
}
template <class M, class D>
constexpr element<M, D> required(std::string_view tag, M member, std::uint16_t item_type, D initial)
{
    return {tag, member, occurs::required, item_type, 0, 1, initial};
}
template <class M>
constexpr element<M> many(std::string_view tag, M member, std::uint16_t item_type, std::uint16_t vector_type,
                          std::uint8_t minimum = 0)
{
    return {tag, member, occurs::many, item_type, vector_type, minimum, 0};
}
template <class M, class D>
constexpr element<M, D> always(std::string_view tag, M member, std::uint16_t item_type, D initial)
{
    return {tag, member, occurs::always, item_type, 0, 0, initial};
}

// One attribute: held by value (required) or by pointer (optional).
template <class M> struct attribute {
    const char *name;
    M member;
    bool required;
};
template <class M> attribute(const char *, M, bool) -> attribute<M>;

// Specialised for each class by the generator:
//   using self, base (void for a root class); type_id; xml_type; attributes and elements (tuples of rows);
//   global_element: true for the type of a top-level element without a name of its own
//   text: pointer to the std::string member of simple content, or nullptr
//   ops: static const class_ops, the class as the shared code sees it; BINDING_DEFINE_CLASS defines it, in
//   one unit
template <class T> struct traits;

struct class_ops;
template <class T> inline constexpr const class_ops &ops_of = traits<T>::ops;

// Specialised for each enumeration: type_id, xml_type, codes (rows in code order), count.
template <class E> struct enum_traits;

// An enumeration's table as the leaf operations take it.
struct enum_table {
    int type_id;
    const char *xml_type;
    const soap_code_row *codes; // codes run from 0, so a row's index is its code
    std::uint32_t count;
};
template <class E>
inline constexpr enum_table enum_of = {enum_traits<E>::type_id, enum_traits<E>::xml_type,
                                       enum_traits<E>::codes, enum_traits<E>::count};

} // namespace binding

// contract.h - the contract as data: classes with their members and documentation, enumerations with their
// words.
//
// Here: the records, and looking them up by name. Elsewhere: the data itself (contract_description.cpp,
// generated), the operations (operations.h).
//
// Always: texts are constants of the program. Types are named by their XML names, "protocol:Identity" or
// "xsd:string".
#pragma once

#include <span>
#include <string>
#include <string_view>
#include <vector>

namespace contract {

struct member {
    const char *tag;     // "protocol:identity"
    const char *type;    // of one item
    unsigned minimum;    // items that must be there
    bool many;           // any number of them; otherwise one at most
    const char *initial; // value of a member that always has one; empty for none
    const char *documentation;
};

struct attribute {
    const char *name;
    const char *type; // an enumeration
    bool required;
    const char *documentation;
};

struct data_class {
    const char *name;
    const char *base; // empty for a root class
    bool text;        // holds a text instead of members
    const char *documentation;
    std::span<const member> members;       // its own, in wire order
    std::span<const attribute> attributes; // its own
};

struct word {
    const char *text;
    const char *documentation;
};

struct enumeration {
    const char *name;
    const char *documentation;
    std::span<const word> words;
};

extern const std::span<const data_class> classes;
extern const std::span<const enumeration> enumerations;

// The class or enumeration of an XML name, or null.
const data_class *find_class(std::string_view xml_name);
const enumeration *find_enumeration(std::string_view xml_name);

// The classes that a user may mean: by XML name, C++ name, or the name without its prefix, ignoring
// case.
std::vector<const data_class *> classes_meant(std::string_view name);

// The class and its bases, the root class first.
std::vector<const data_class *> lineage(const data_class &of);
bool descends(const data_class &derived, const data_class &base);

// A member by its tag, of the class or of a base; null if there is none.
const member *find_member(const data_class &of, std::string_view tag);
const attribute *find_attribute(const data_class &of, std::string_view name);
bool holds_text(const data_class &of);

// The name after the colon; all of a name without a prefix.
std::string_view local_name(std::string_view name);

} // namespace contract

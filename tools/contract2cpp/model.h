// model.h - the contract as the generated code will hold it: every name resolved, every type with its id.
//
// Here: the records that the emitters print. Elsewhere: making them (build_model.cpp), printing them
// (dump_model.cpp).
//
// Always: vectors are in the order of emission, which depends on the files alone.
#pragma once

#include <iosfwd>
#include <string>
#include <vector>

#include "declarations.h"

// How the value of a member is held.
enum class held { text, boolean, int32, float64, binary, code, object };

// How often a member occurs on the wire, and so how it is held.
enum class occurs {
    optional, // a pointer
    required, // a pointer
    value,    // by value, required
    always,   // by value with a default, written whatever it is
    many      // a vector
};

struct literal {
    std::string text;
    std::string name; // the enumerator
    std::string documentation;
};

struct enumeration {
    std::string xml_type; // "protocol:Medium"
    std::string name;     // protocol__Medium
    std::string type_id;  // the constant
    std::string documentation;
    std::vector<literal> literals; // by code, from 0
};

struct class_attribute {
    std::string xml_name;
    std::string name;
    std::string type; // the enumeration
    std::string type_prefix;
    bool required = false;
    std::string documentation;
};

struct class_member {
    std::string tag; // "protocol:subject"
    std::string name;
    held form = held::text;
    occurs how = occurs::optional;
    std::string type; // of one item: std::string, bool, protocol__Identity
    std::string type_prefix;
    std::string item_id;   // constant of the item's type
    std::string vector_id; // constant of the vector, empty for none
    unsigned minimum = 0;  // items of a vector
    std::string initial;   // an expression; empty for texts and for what isn't held by value
    std::string documentation;
};

struct data_class {
    place at;
    std::string prefix;
    std::string xml_type;
    std::string name;
    std::string base; // empty for a root class
    std::string base_prefix;
    std::string type_id;
    bool top_level = false;      // type of an element, without a name of its own
    bool simple_content = false; // has the text `value`
    std::string documentation;
    std::vector<class_attribute> attributes;
    std::vector<class_member> members; // its own, in wire order
};

struct service_namespace {
    std::string prefix;
    std::string file;
    std::string documentation;
    std::vector<enumeration> enumerations;
    std::vector<data_class> classes; // bases first
};

// One direction of an operation: the record, and the one object that it points to.
struct message_record {
    std::string name;    // __protocolProfile__set
    std::string type_id; // the constant
    std::string element; // "protocolProfile:setRequest"
    std::string object;  // class of the object
    std::string object_prefix;
};

struct operation {
    std::string name;
    std::string documentation;
    message_record request;
    message_record response;
};

struct port {
    std::string name;    // "Profile"
    std::string binding; // "ProfileSoapBinding"
    std::string prefix;
    std::string file;
    std::string documentation;
    std::string address; // where clients look for the service
    bool proxy = false;  // a proxy class is made, not only the records
    std::vector<operation> operations;
};

// Those before `envelope` are read and written by id.
enum class id_kind { primitive, text, binary, object, code, vector, envelope, response, request, pointer };

// A type id, with what dispatch by id needs to know.
struct identified_type {
    int id = 0;
    id_kind kind = id_kind::primitive;
    std::string constant;  // SOAP_TYPE_...
    std::string name;      // of C++, for what is one: protocol__Identity
    std::string xml_name;  // XML type; "-protocolProfile:set" for a wrapper
    std::string item;      // constant of a vector's items, a pointer's target, a wrapper's object
    std::string item_name; // the same of C++
    held item_form = held::object;
    std::string element; // of a wrapper's object
};

struct contract_model {
    std::vector<namespace_declaration> table;
    std::vector<service_namespace> services; // those with types, in the order of the table
    std::vector<port> ports;
    std::vector<identified_type> types; // by id
};

constexpr int TYPE_ID_MAX = 892;     // the last id
constexpr int DISPATCH_ID_MAX = 877; // the last id by which the library reads and writes objects
constexpr int FIRST_NEW_ID = 582;    // new types take the free ids from here on

// Resolves the declarations. contract_error for whatever has no translation.
contract_model build_model(const contract_declarations &contract);

// Prints the model, one thing on a line.
void dump_model(const contract_model &model, std::ostream &out);

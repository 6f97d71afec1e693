// declarations.h - the contract as declared in its files: nothing resolved, every item with its place.
//
// Here: the records that the read stage fills. Elsewhere: reading (read_*.cpp), what they mean
// (build_model.cpp).
#pragma once

#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "contract_error.h"

// A name of XML with its namespace resolved.
struct qualified_name {
    std::string uri;
    std::string local;
    place at;
};

struct literal_declaration {
    place at;
    std::string value;
    std::string documentation;
};

// A simple type: an enumeration when it has literals, else a type held as text.
struct simple_declaration {
    place at;
    std::string name; // empty inside an element
    std::string documentation;
    qualified_name base;
    std::vector<literal_declaration> literals;
};

struct attribute_declaration {
    place at;
    std::string name;
    std::string documentation;
    qualified_name type;
    bool required = false;
};

struct complex_declaration;

// An element: top-level, or in the sequence of a class. One of reference, type, simple and complex gives its
// type.
struct element_declaration {
    place at;
    std::string name; // empty for a reference
    std::string documentation;
    std::optional<qualified_name> reference;
    std::optional<qualified_name> type;
    std::shared_ptr<simple_declaration> simple;
    std::shared_ptr<complex_declaration> complex;
    unsigned minimum = 1;
    bool unbounded = false;
    bool by_value = false; // marked by appinfo
    std::optional<std::string> initial;
};

struct complex_declaration {
    place at;
    std::string name; // empty inside an element
    std::string documentation;
    std::optional<qualified_name> base; // the class extended, or the type of the text
    bool simple_content = false;
    std::vector<element_declaration> elements;
    std::vector<attribute_declaration> attributes;
};

struct schema_declaration {
    std::string file; // as below the schema directory
    place at;
    std::string uri;
    std::string documentation;
    std::vector<simple_declaration> simple_types;
    std::vector<complex_declaration> complex_types;
    std::vector<element_declaration> elements;
};

struct operation_declaration {
    place at;
    std::string name;
    std::string documentation;
    qualified_name request;  // element of the input message
    qualified_name response; // element of the output message
};

// One WSDL: its port type, with the binding and the address for SOAP 1.1.
struct port_declaration {
    std::string file;
    place at;
    std::string uri;
    std::string name; // of the port type
    std::string documentation;
    std::string binding;
    std::string address;
    std::vector<operation_declaration> operations;
};

// A row of namespaces.txt.
struct namespace_declaration {
    place at;
    std::string prefix;
    std::string uri;
    std::string pattern; // empty for none
};

// A row of type_ids.txt.
struct type_id_declaration {
    place at;
    int id = 0;
    std::string kind;
    std::string name;
};

struct contract_declarations {
    std::vector<namespace_declaration> namespaces;
    std::vector<type_id_declaration> type_ids;
    std::vector<schema_declaration> schemas; // by file name
    std::vector<port_declaration> ports;     // by file name
};

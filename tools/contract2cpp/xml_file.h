// xml_file.h - an XML file with the lines of its nodes and the namespaces in force at them.
//
// Here: what both readers of XML need. Elsewhere: XSD (read_xsd.cpp), WSDL (read_wsdl.cpp).
#pragma once

#include <filesystem>
#include <initializer_list>
#include <string_view>
#include <vector>

#include <pugixml.hpp>

#include "declarations.h"

class xml_file {
public:
    // Loads and parses. contract_error if the file can't be read or isn't well-formed.
    xml_file(const std::filesystem::path &path, const std::string &name);

    pugi::xml_node root() const { return document.document_element(); }
    const std::string &file() const { return name; }

    place at(pugi::xml_node node) const;

    // The name of an element, namespace and all.
    qualified_name name_of(pugi::xml_node element) const;
    // True for the element `local` of the namespace `uri`.
    bool is(pugi::xml_node element, std::string_view uri, std::string_view local) const;
    // The value of an attribute that holds a qualified name. contract_error if its prefix isn't declared.
    qualified_name qualified(pugi::xml_node node, const char *attribute) const;
    // The value of a required attribute.
    std::string required(pugi::xml_node node, const char *attribute) const;

    // Refuses any attribute but these and namespace declarations.
    void allow_attributes(pugi::xml_node node, std::initializer_list<std::string_view> names) const;
    [[noreturn]] void refuse(pugi::xml_node node, const std::string &reason) const;

private:
    std::string uri_of(pugi::xml_node node, std::string_view prefix) const;

    std::size_t line_at(std::ptrdiff_t offset) const;

    std::string name;
    std::vector<std::size_t> line_ends; // offsets of the line feeds
    pugi::xml_document document;
};

// Text with each run of blanks and line ends as one blank, none at the ends.
std::string plain_text(std::string_view text);

inline constexpr char XSD_URI[] = "http://www.w3.org/2001/XMLSchema";

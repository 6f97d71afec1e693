// names.h - XML names as names of C++.
//
// Here: spelling alone. Elsewhere: whether two names clash (build_model.cpp).
#pragma once

#include <string>
#include <string_view>
#include <utility>

// Prefix and local name of a qualified name; without a colon the prefix is empty.
std::pair<std::string_view, std::string_view> split_name(std::string_view name);

// A local name spelled for C++: "." as _x002e, "-" as "_". Empty if it holds anything but letters, digits and
// these.
std::string spelled(std::string_view local);

// A member, an enumerator, an operation: spelled, and kept off keywords ("private" becomes private_) and
// leading digits.
std::string identifier(std::string_view local);

// A class or an enumeration: prefix__local.
std::string type_name(std::string_view prefix, std::string_view local);

// The same from an XML type name: "protocol:Client.Authentication".
std::string type_name(std::string_view xml_type);

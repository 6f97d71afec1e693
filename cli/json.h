// json.h - documents of the contract as JSON, and back. Both directions follow the contract's member lists.
//
//   element with members    object; members by their names without prefix, with it where a class has two of a name
//   member that may repeat  array, also for one item; one item without an array is taken as well
//   xsd:boolean             true or false; xsd:int, xsd:double: number; anything else, and INF and NaN: string
//   xsi:nil                 null; "@nil" where there are attributes
//   attribute               member "@name"; xsi:type is "@type"
//   bytes in an attachment  object with the attachment's id in "@href"
//   text with attributes    object with the text in "text"
//
// Always: the XML that JSON is made of, and the XML made of that JSON, are read as equal objects. Whole numbers
// of any size are strings, as JSON's readers round numbers; one that is written as a number is taken as long as
// it isn't rounded.
#pragma once

#include <string>
#include <string_view>

#include "contract.h"

namespace cli {

// `xml`: a document as the library writes it, of the class. The JSON is indented, with a line end after it.
std::string json_of(const std::string &xml, const contract::data_class &type);

// True if a document is meant to be JSON: its first character other than a blank is "{".
bool is_json(std::string_view document);

// The XML of a document in JSON, its root element named by the class.
//   file     name for the lines of a refusal, "FILE: /contact/0/name: what it should be"
//   failure  EXIT_DOCUMENT, with a line for each thing that isn't as the class wants it
std::string xml_of(std::string_view document, const contract::data_class &type, const std::string &file);

} // namespace cli

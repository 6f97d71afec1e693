// json.h - a document of the contract as JSON.
//
//   element with members   object; members by their names without prefix
//   member that may repeat array, also for one item
//   xsd:boolean            true or false; xsd:int, xsd:double: number; anything else: string
//   xsi:nil                null
//   attribute              member "@name"; xsi:type is "@type"
//   bytes in an attachment  object with the attachment's id in "@href"
//   text with attributes   object with the text in "text"
#pragma once

#include <string>
#include <string_view>

#include "contract.h"

namespace cli {

// `xml`: a document as the library writes it, of the class. The JSON is indented, with a line end after it.
std::string json_of(const std::string &xml, const contract::data_class &type);

} // namespace cli

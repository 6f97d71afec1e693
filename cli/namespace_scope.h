// namespace_scope.h - namespace declarations of a document, translated to the contract's prefixes.
#pragma once

#include <cstddef>
#include <map>
#include <string>
#include <string_view>
#include <vector>

#include <pugixml.hpp>

namespace cli {

// The declarations in force while the elements of a document are traversed.
class namespace_scope {
public:
    // Adds the declarations of an element; `leave` removes them.
    void enter(const pugi::xml_node &element);
    void leave();
    // "protocol:identity" for whatever prefix the document uses. A namespace that isn't the contract's gives
    // "?:identity".
    std::string name_of(std::string_view qname, bool is_attribute = false) const;

private:
    std::map<std::string, std::vector<std::string>> bound_; // contract prefixes by prefix, innermost last
    std::vector<std::string> order_;
    std::vector<std::size_t> counts_;
};

} // namespace cli

// namespace_scope.cpp - see namespace_scope.h.
#include "namespace_scope.h"

#include <cstring>

#include <zuv_client_pro/soap.h>
#include <zuv_client_pro/soap_xml.h>

#include "contract.h"

namespace cli {

namespace {

std::string contract_prefix(const char *uri)
{
    for (const soap_namespace *row = soap_program_namespaces; row->prefix != nullptr; ++row)
        if (std::strcmp(row->uri, uri) == 0 ||
            (row->pattern != nullptr && soap_tag_match(uri, row->pattern) == 0))
            return row->prefix;
    return "?";
}

} // namespace

void namespace_scope::enter(const pugi::xml_node &element)
{
    counts_.push_back(0);
    for (const pugi::xml_attribute &attribute : element.attributes()) {
        const std::string_view name = attribute.name();
        if (name != "xmlns" && !name.starts_with("xmlns:"))
            continue;
        const std::string prefix(name == "xmlns" ? "" : name.substr(6));
        bound_[prefix].push_back(contract_prefix(attribute.value()));
        order_.push_back(prefix);
        ++counts_.back();
    }
}

void namespace_scope::leave()
{
    for (; counts_.back() != 0; --counts_.back()) {
        bound_[order_.back()].pop_back();
        order_.pop_back();
    }
    counts_.pop_back();
}

std::string namespace_scope::name_of(std::string_view qname, bool is_attribute) const
{
    const std::size_t colon = qname.find(':');
    if (colon == std::string_view::npos && is_attribute)
        return std::string(qname);
    const std::string prefix(colon == std::string_view::npos ? "" : qname.substr(0, colon));
    const auto found = bound_.find(prefix);
    const bool bound = found != bound_.end() && !found->second.empty();
    const std::string ours = bound ? found->second.back() : prefix == "xml" ? "xml" : "?";
    return ours + ":" + std::string(contract::local_name(qname));
}

} // namespace cli

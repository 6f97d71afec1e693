// name_lookup.h - from an XML name, as a message or the contract spells it, to a type id.
#pragma once

#include <string_view>

#include "binding/registry.h"

namespace binding {

constexpr std::string_view name_local(std::string_view name)
{
    const auto colon = name.find(':');
    return colon == std::string_view::npos ? name : name.substr(colon + 1);
}

// Type id of a name with a prefix of the message, or 0. Leaves ctx->error alone.
int type_by_qname(soap *ctx, const name_index &index, const char *qname);

} // namespace binding

// filter.h - judges items by the filter expressions of a request, in both filter languages.
//
// Elsewhere: operators (comparison.h), values (filter_facts.h), which comparison asks for which value
// (filter_update.cpp, filter_report.cpp).
#pragma once

#include <zuv_client_pro/protocolPRFilter.h>
#include <zuv_client_pro/protocolUpdateOrderFilter.h>

#include "filter_facts.h"

namespace service {

// Throw filter_error. Objects of a request may refer to each other, so an expression may have more nodes than
// it has bytes, or no end at all; beyond the limits (filter_work.h) it is refused as too complex.
bool filter_holds(const protocolUpdateOrderFilter__Filter &filter, const filter_facts &facts);
bool filter_holds(const protocolPRFilter__Filter &filter, const filter_facts &facts);

} // namespace service

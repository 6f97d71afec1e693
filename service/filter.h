// filter.h - judges items by the filter expressions of a request, in both filter languages.
//
// Elsewhere: operators (comparison.h), values (filter_facts.h), which comparison asks for which value
// (filter_update.cpp, filter_report.cpp).
#pragma once

#include <stdexcept>

#include <zuv_client_pro/protocolPRFilter.h>
#include <zuv_client_pro/protocolUpdateOrderFilter.h>

#include "filter_facts.h"

namespace service {

// A filter that can't be judged. Objects of a request may refer to each other, so an expression may have more
// nodes than it has bytes, or no end at all; beyond the limits it is too complex.
struct filter_error : std::runtime_error {
    filter_error(const char *text, bool complex) : std::runtime_error(text), too_complex(complex) {}
    bool too_complex;
};

constexpr unsigned FILTER_DEPTH_MAX = 100;   // operators within each other
constexpr unsigned FILTER_NODES_MAX = 10000; // nodes looked at for one item

// Throw filter_error.
bool filter_holds(const protocolUpdateOrderFilter__Filter &filter, const filter_facts &facts);
bool filter_holds(const protocolPRFilter__Filter &filter, const filter_facts &facts);

} // namespace service

// expansion.h - which updates an order selects: those that it names, restricted by its filters, and those
// that it asks for in addition.
//
// Elsewhere: the answer made from it (update_order_port.cpp).
#pragma once

#include <string>
#include <vector>

#include <zuv_client_pro/protocolUpdateOrder.h>

#include "catalogue.h"
#include "filter_work.h"

namespace service {

// Why an update is in an expansion.
enum class update_role { base, requisite, supersede, replacement, patch };

struct chosen_update {
    const update_record *update;
    update_role role;
};

struct unknown_update {
    std::string id, qualifier;
};

struct expansion {
    std::vector<chosen_update> chosen; // in the order in which they were found, each once
    std::vector<unknown_update> unknown;
};

// True if the order names updates in some way: by identifier, scope or filter.
bool names_updates(const protocolUpdateOrder__UpdateOrderContent &order);

// Throws filter_error.
expansion expand(filter_work &work, const catalogue &offered,
                 const protocolUpdateOrder__UpdateOrderContent &order);

// How the data of updates is answered.
const protocol__Attachment &update_package();

} // namespace service

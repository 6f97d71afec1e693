// inventory_report_port.cpp - the operations on inventory reports.
#include <zuv_client_pro/protocolInventoryReport.h>

#include "report_rules.h"

namespace service {

namespace {

using report = protocolInventoryReport__InventoryReportContent;
using state = protocolInventoryReport__InventoryReportState;

report_rules<report> rules_of(call &c)
{
    return {c, "InventoryReport", "inventoryreport"};
}

report *get(call &c, _protocolInventoryReport__getRequest &)
{
    return rules_of(c).get();
}

report *submit(call &c, report &request)
{
    return rules_of(c).submit(request);
}

report *close(call &c, _protocolInventoryReport__closeRequest &)
{
    return rules_of(c).end(state::closed);
}

report *cancel(call &c, _protocolInventoryReport__cancelRequest &)
{
    return rules_of(c).end(state::cancelled);
}

report *remove(call &c, report &request)
{
    return rules_of(c).remove(request);
}

constexpr operation OPERATIONS[] = {
    row<get>("protocolInventoryReport:getRequest", "protocolInventoryReport:getResponse"),
    row<submit>("protocolInventoryReport:submitRequest", "protocolInventoryReport:submitResponse"),
    row<close>("protocolInventoryReport:closeRequest", "protocolInventoryReport:closeResponse"),
    row<cancel>("protocolInventoryReport:cancelRequest", "protocolInventoryReport:cancelResponse"),
    row<remove>("protocolInventoryReport:removeRequest", "protocolInventoryReport:removeResponse"),
};

} // namespace

const port inventory_report_port = {.name = "InventoryReport", .operations = OPERATIONS};

} // namespace service

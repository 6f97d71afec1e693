// status_report_port.cpp - the operations on status reports.
#include <zuv_client_pro/protocolStatusReport.h>

#include "report_rules.h"

namespace service {

namespace {

using report = protocolStatusReport__StatusReportContent;
using state = protocolStatusReport__StatusReportState;

report_rules<report> rules_of(call &c)
{
    return {c, "StatusReport", "statusreport"};
}

report *create(call &c, report &request)
{
    return rules_of(c).create(request);
}

report *get(call &c, _protocolStatusReport__getRequest &)
{
    return rules_of(c).get();
}

report *submit(call &c, report &request)
{
    return rules_of(c).submit(request);
}

report *close(call &c, _protocolStatusReport__closeRequest &)
{
    return rules_of(c).end(state::closed);
}

report *cancel(call &c, _protocolStatusReport__cancelRequest &)
{
    return rules_of(c).end(state::cancelled);
}

report *attach(call &c, _protocolStatusReport__attachRequest &request)
{
    return rules_of(c).attach(request.attachment, request.dataPortPreference);
}

report *attach_status(call &c, protocol__AttachStatusRequest &request)
{
    return rules_of(c).note_progress(request);
}

report *remove(call &c, report &request)
{
    return rules_of(c).remove(request);
}

constexpr operation OPERATIONS[] = {
    row<create>("protocolStatusReport:createRequest", "protocolStatusReport:createResponse"),
    row<get>("protocolStatusReport:getRequest", "protocolStatusReport:getResponse"),
    row<submit>("protocolStatusReport:submitRequest", "protocolStatusReport:submitResponse"),
    row<close>("protocolStatusReport:closeRequest", "protocolStatusReport:closeResponse"),
    row<cancel>("protocolStatusReport:cancelRequest", "protocolStatusReport:cancelResponse"),
    row<attach>("protocolStatusReport:attachRequest", "protocolStatusReport:attachResponse"),
    row<attach_status>("protocolStatusReport:attachStatusRequest",
                       "protocolStatusReport:attachStatusResponse"),
    row<remove>("protocolStatusReport:removeRequest", "protocolStatusReport:removeResponse"),
};

} // namespace

const port status_report_port = {.name = "StatusReport", .operations = OPERATIONS};

} // namespace service

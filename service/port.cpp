// port.cpp - the ports that the service offers.
#include "port.h"

#include <zuv_client_pro/soap_error.h>
#include <zuv_client_pro/soap_xml.h>

namespace service {

const port *const PORTS[] = {&profile_port,      &status_report_port,  &inventory_report_port,
                             &update_order_port, &problem_report_port, &query_port};

const port *find_port(std::string_view path)
{
    if (!path.starts_with(SERVICES_PATH))
        return nullptr;
    path.remove_prefix(SERVICES_PATH.size());
    for (const port *candidate : PORTS)
        if (candidate->name == path)
            return candidate;
    return nullptr;
}

const operation *find_operation(soap *ctx, const port &target)
{
    const bool typed = target.by_type && ctx->element_type[0] != '\0';
    for (const operation &candidate : target.operations)
        if (soap_tag_compare(ctx, typed ? ctx->element_type : ctx->tag, candidate.request_element) == 0)
            return &candidate;
    return nullptr;
}

std::string_view name_of(const operation &op)
{
    constexpr std::string_view ENDING = "Request";
    std::string_view name = op.request_element;
    name.remove_prefix(name.find(':') + 1);
    if (name.ends_with(ENDING))
        name.remove_suffix(ENDING.size());
    return name;
}

std::span<const port *const> all_ports()
{
    return PORTS;
}

} // namespace service

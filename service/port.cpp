// port.cpp - the ports that the service offers.
#include "port.h"

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

std::span<const port *const> all_ports()
{
    return PORTS;
}

} // namespace service

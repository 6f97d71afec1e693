// call_report.h - what happened in an exchange, as --verbose tells it.
#pragma once

#include <string>

#include <zuv_client_pro/soap_report.h>

namespace cli {

// Lines that begin with "* ", one for each step that the exchange came to.
std::string call_report(const soap_report &told);

} // namespace cli

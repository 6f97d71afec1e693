// fault_report.h - why a call failed, told to a person: what, who, where, the typed detail, what to try.
#pragma once

#include <string>

#include <zuv_client_pro/soap.h>

#include "exit_codes.h"

namespace cli {

// What the program ends with after an error of the engine.
exit_code exit_code_of(soap *ctx);

// The report, lines with ends, fit for a terminal.
//   what   "profile get"
//   where  the endpoints called
std::string fault_report(soap *ctx, const std::string &what, const std::string &where);

} // namespace cli

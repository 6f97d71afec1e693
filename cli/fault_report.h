// fault_report.h - why a call failed, explained to the user: what, who, where, the typed detail, what to try.
#pragma once

#include <string>

#include <zuv_client_pro/soap.h>

#include "exit_codes.h"

namespace cli {

// The program's exit code for an error of the engine.
exit_code exit_code_of(soap *ctx);

// The report, lines with ends, fit for a terminal.
//   what   "profile get"
//   where  the endpoints called
std::string fault_report(soap *ctx, const std::string &what, const std::string &where);

} // namespace cli

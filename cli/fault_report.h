// fault_report.h - why a call failed, explained to the user: what, who, where, the typed detail, what to try.
#pragma once

#include <string>

#include <zuv_client_pro/soap.h>

#include "exit_codes.h"

namespace cli {

// The program's exit code for an error of the engine.
exit_code exit_code_of(soap *ctx);

// Name of the fault received: its typed detail's, "Client.ObjectNotFound", or else its code. Empty for another
// failure.
std::string fault_name(soap *ctx);

// What happened, in one line.
std::string failure_line(soap *ctx);

// The report, lines with ends, fit for a terminal.
//   what   "profile get"
//   where  the endpoints called
std::string fault_report(soap *ctx, const std::string &what, const std::string &where);

} // namespace cli

// call_report.h - what happened in an exchange, as --verbose prints it.
#pragma once

#include <cstdint>
#include <string>
#include <vector>

#include <zuv_client_pro/soap_report.h>

namespace cli {

// How the connection of an exchange came about, a line for each step: look-up, connection, TLS and
// certificate, what ended it.
std::vector<std::string> connection_steps(const soap_report &report);

// Of a time of the report.
double milliseconds(std::int64_t microseconds);

// Seconds since 1970 as "2026-11-21T05:06:00Z".
std::string utc_time(std::int64_t seconds);

// Lines that begin with "* ", one for each step that the exchange came to.
std::string call_report(const soap_report &report);

} // namespace cli

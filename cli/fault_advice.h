// fault_advice.h - who is to blame for a failure, and what to try: words by exit code, by fault, by HTTP
// status.
#pragma once

#include <string>

#include <zuv_client_pro/soap_report.h>

#include "exit_codes.h"

namespace cli {

struct failure_words {
    exit_code code;
    const char *who;
    const char *advice; // null: a fault's
};

const failure_words &words_of(exit_code code);

// What to try after a fault of the contract, by its name ("Client.ObjectNotFound") or the one it is derived
// from; null for others.
const char *advice_for(const std::string &fault);

// What to try after an exchange that was ended so; null if there is nothing to add.
const char *ending_advice(soap_ending by);

// What to try after an HTTP status; null if there is nothing to add.
const char *http_advice(int status);

} // namespace cli

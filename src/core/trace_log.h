// trace_log.h - what a context's start and end do with its trace.
#pragma once

#include <zuv_client_pro/soap.h>

// Both directions to the file that g_TraceLogFile names now. Without memory or with an empty name: no trace.
void trace_log_set_defaults(soap *ctx);

// Closes the files; trace_log_end also drops the paths.
void trace_log_close_all(soap *ctx);
void trace_log_end(soap *ctx);

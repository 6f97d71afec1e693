// documents.h - the messages that are measured: problem reports of generated classes, the same at each run.
//
// Elsewhere: the same content in plain structs (peer_report.h).
#pragma once

#include <cstddef>

#include <zuv_client_pro/protocolProblemReport.h>

// Makes a report whose message is about `bytes` long, by nesting as many reports as that takes. It belongs to
// `owner`.
protocolProblemReport__ProblemReportContent *make_document(soap *owner, std::size_t bytes);

// query.h - answers to queries: which reports there are, and what the service recognizes.
//
// Elsewhere: how queries reach it (query_port.cpp), subjects (recognized_subjects.h).
#pragma once

#include <zuv_client_pro/protocol.h>

#include "port.h"

namespace service {

// One response for each request, in their order. A request that fails has its fault in its response, so that
// the others are answered all the same.
protocol__QueryResponses *answer_queries(call &c, const protocol__QueryRequests &requests);

} // namespace service

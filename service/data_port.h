// data_port.h - the data that travels through data ports: fetched by GET, delivered by POST.
//
// Elsewhere: how data ports are offered (attachments.h).
#pragma once

#include <cstdint>
#include <string_view>

#include <zuv_client_pro/soap.h>

#include "store.h"

namespace service {

// Both serve a name below DATA_PATH, after the head was read. They answer a request that succeeds and return
// SOAP_STOP; otherwise an HTTP status or an error of the engine, which ctx->error holds too, and nothing
// was sent.
int send_data(soap *ctx, store &documents, std::string_view name);
int receive_data(soap *ctx, store &documents, std::string_view name); // after soap_receive_begin

} // namespace service

// data_port.h - the data that travels through data ports: fetched by GET, delivered by POST.
//
// Elsewhere: how data ports are offered (attachments.h).
#pragma once

#include <cstddef>
#include <cstdint>
#include <functional>
#include <string_view>

#include <zuv_client_pro/soap.h>

#include "store.h"

namespace service {

// Reads the body of a request, framing and compression undone, in stretches. False if less arrived than was
// announced, or ctx->error is set. The size is limited by reception.cpp, and by `take`, which may throw.
bool read_body(soap *ctx, const std::function<void(const char *data, std::size_t length)> &take);

// Both serve a name below DATA_PATH, after the head was read. They answer a request that succeeds and return
// SOAP_STOP; otherwise an HTTP status or an error of the engine, which ctx->error holds too, and nothing
// was sent.
int send_data(soap *ctx, store &documents, std::string_view name);
int receive_data(soap *ctx, store &documents, std::string_view name); // after soap_receive_begin

} // namespace service

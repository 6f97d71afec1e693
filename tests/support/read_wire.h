// read_wire.h - a wire that has begun to receive a message by the time it is there.
#pragma once

#include <string>

#include <zuv_client_pro/soap_http.h>
#include <zuv_client_pro/soap_io.h>

#include "support/memory_wire.h"

struct read_wire : memory_wire {
    explicit read_wire(const std::string &bytes, std::uint32_t modes = 0, std::size_t piece_size = 65536)
        : memory_wire(modes, modes)
    {
        receive(bytes);
        piece = [piece_size](std::size_t) { return piece_size; };
        keep_alive = (modes & MODE_KEEP_ALIVE) != 0 ? 1 : 0;
        result = soap_receive_begin(this);
    }
    int result;
};

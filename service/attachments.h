// attachments.h - attachments of documents: taken in, offered data ports, and their progress noted.
//
// Elsewhere: the bytes that come through a data port (data_port.h).
#pragma once

#include <string>
#include <string_view>
#include <vector>

#include <zuv_client_pro/protocol.h>

#include "port.h"

namespace service {

using attachments = std::vector<protocol__Attachment *>;

constexpr std::string_view DATA_PATH = "/zuv/v1.0/data/";
constexpr std::string_view UPDATE_DATA = "update/"; // names of the data of updates begin so

// An open data port for a name below DATA_PATH.
protocol__DataPort *make_data_port(const call &c, protocol__Direction direction, const std::string &name);

// Null if the service can serve the wish with a data port of the direction; otherwise a fault that says what
// it has.
protocol__Client_x002eDataPortIncompatibility *
incompatibility(const call &c, const protocol__DataPortPreference *wish, protocol__Direction direction);

// Adds an attachment, with a data port unless it holds its data. Refused if it is missing, or the wish can't
// be met. To be called within a transaction of the store.
void take_attachment(call &c, attachments &held, protocol__Attachment *given,
                     const protocol__DataPortPreference *wish);

// Notes what a client reports of a transfer. Refused if no attachment is meant.
void note_progress(call &c, const attachments &held, const protocol__AttachStatusRequest &report);

// True if no transfer is pending.
bool all_arrived(const attachments &held);

} // namespace service

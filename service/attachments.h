// attachments.h - attachments of documents: taken in, offered data ports, and their progress noted.
//
// Elsewhere: the bytes that come through a data port (data_port.h).
#pragma once

#include <functional>
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

// True if the service can serve the preference with a data port in the direction. Otherwise `incompatibility`
// makes the fault that says what it has; null if it can.
bool serves(const call &c, const protocol__DataPortPreference *preference, protocol__Direction direction);
protocol__Client_x002eDataPortIncompatibility *
incompatibility(const call &c, const protocol__DataPortPreference *preference, protocol__Direction direction);

// Adds an attachment, with a data port unless it holds its data or has brought it with the message. Refused
// if it is missing, or the preference can't be met. To be called within a transaction of the store.
void take_attachment(call &c, attachments &held, protocol__Attachment *given,
                     const protocol__DataPortPreference *preference);

// Keeps what the attachments of a given document refer to: data that came with the message, or that the
// document held already. Refused if a reference leads nowhere. To be called within a transaction.
void take_references(call &c, attachments &given, const attachments *held = nullptr);

// Of the attachments of an answer, those for which `is_sent` is true get their data sent with the message, if
// the request's form allows it. The others lose their references: their data ports lead to the data.
void settle_references(call &c, attachments &answered,
                       const std::function<bool(const protocol__Attachment &)> &is_sent);

// Forgets the data that documents no longer refer to.
void forget_data(call &c, const attachments &gone, const attachments *remaining = nullptr);

// The attachment that a client's report is about; refused if there is none.
protocol__Attachment &find_attachment(call &c, const attachments &held,
                                      const protocol__AttachStatusRequest &report);

// Notes what a client reports of a transfer. Refused if no attachment is meant.
void note_progress(call &c, const attachments &held, const protocol__AttachStatusRequest &report);

// True if no transfer is pending.
bool all_arrived(const attachments &held);

} // namespace service

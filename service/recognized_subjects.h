// recognized_subjects.h - the subjects and product collections that the service recognizes, as answers list
// them.
#pragma once

#include <set>
#include <vector>

#include <zuv_client_pro/protocol.h>
#include <zuv_client_pro/protocolUpdateOrder.h>

#include "filter_facts.h"
#include "port.h"

namespace service {

// What updates are made for, each product once. Those that only implicitly excluded updates are made for are
// omitted unless asked for.
std::vector<const protocol__Identity *> known_subjects(bool with_excluded);

// True if an item passes a filter of either language, or if there is none. Throws filter_error, also for a
// filter of neither language.
bool passes(const protocol__Filter *filter, const filter_facts &facts);
bool subject_passes(filter_work &work, const protocol__Filter *filter, const protocol__Identity &subject);

using subject_properties = std::set<protocol__SubjectProperty>;

// A subject with the members asked for; with all of them if none is named.
protocol__RecognizedSubject *recognized(soap *ctx, const protocol__Identity &subject,
                                        const subject_properties &wanted);

// The product collections, flat or nested.
protocol__QueryResponse *
query_collections(call &c, const protocolUpdateOrder__QueryRecognizedProductCollectionsRequest &request);

} // namespace service

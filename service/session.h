// session.h - what a connection's thread works with: used by one connection at a time, then by another.
#pragma once

#include "document.h"
#include "journal.h"
#include "rules.h"
#include "settings.h"
#include "store.h"

namespace service {

struct session {
    session(database &place, const settings &config, journal &shared_notes, rule_book &shared_rules)
        : notes(shared_notes), rules(shared_rules), documents(place),
          codec(config.body_limit, config.depth_limit, config.memory_limit()),
          judged(config.body_limit, config.depth_limit, config.memory_limit())
    {}
    journal &notes;   // of all connections
    rule_book &rules; // of all connections
    store documents;
    document_codec codec, judged;
};

} // namespace service

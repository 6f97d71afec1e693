// session.h - what a connection's thread works with: used by one connection at a time, then by another.
#pragma once

#include "document.h"
#include "settings.h"
#include "shared_state.h"
#include "store.h"

namespace service {

struct session {
    session(database &place, const settings &config, shared_state &common)
        : shared(common), documents(place),
          codec(config.body_limit, config.depth_limit, config.memory_limit()),
          judged(config.body_limit, config.depth_limit, config.memory_limit())
    {}
    shared_state &shared;
    store documents;
    document_codec codec, judged;
};

} // namespace service

// seed.h - what the store begins with: request documents in files, carried out as if clients had sent them.
//
// Elsewhere: the operations (port.h), when a store is seeded (server.cpp, exchange.cpp).
#pragma once

#include <cstddef>

#include "session.h"
#include "settings.h"

namespace service {

// Carries out the requests of `config.seed`: a file that holds one, or a folder whose files NAME.xml each hold one,
// in the order of their names. Their documents keep the names that they have (thisURI). They are read strictly.
// Returns how many there were. Throws std::runtime_error that names the file and says what is wrong; the store is
// empty then, as it has to be before.
std::size_t seed_store(session &borrowed, const settings &config);

// Forgets all documents and their data.
void empty_store(session &borrowed);

} // namespace service

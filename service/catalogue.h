// catalogue.h - the updates that the service offers, and the tree of product collections that they belong to.
//
// Here: reading the catalogue and looking up updates in it. Elsewhere: its text (catalogue_text.cpp), what an
// order selects from it (expansion.h).
//
// Always: the catalogue is read once and never changed, so threads share it.
#pragma once

#include <span>
#include <string>
#include <string_view>
#include <vector>

#include <zuv_client_pro/protocolUpdateOrder.h>

#include "document.h"

namespace service {

using update_record = protocolUpdateOrder__UpdateMetaData;
using updates = std::vector<const update_record *>;

class catalogue {
public:
    catalogue();

    const updates &all() const { return all_; }
    // The update of an identifier; an empty qualifier matches any. Null if there is none.
    const update_record *find(std::string_view id, std::string_view qualifier = {}) const;

    // Those that supersede, or are superseded by, an update, directly.
    updates superseding(const update_record &update) const;
    updates superseded(const update_record &update) const;
    updates required(const update_record &update) const;
    updates patches(const update_record &update) const;      // that patch it
    updates contained(const update_record &update) const;    // that it groups
    updates replacements(const update_record &update) const; // that replace it under some condition

private:
    template <class Reference> updates follow(const std::vector<Reference *> &references) const;

    document_codec codec_;
    updates all_;
};

// The one catalogue, read by the first call, which throws if that fails.
const catalogue &the_catalogue();

// XML of the updates: the content of an UpdateMetaData, in prefixes of its own.
std::string catalogue_text();

// A product collection and the one above it, whose text is empty at the top.
struct collection_row {
    std::string_view id, name, parent;
};
std::span<const collection_row> collections();
std::string_view collection_parent(std::string_view id);                   // empty: at the top, or unknown
bool collection_is_within(std::string_view id, std::string_view ancestor); // or the same

// The bytes delivered for an update, as many as its record says.
std::string update_data(const update_record &update);

} // namespace service

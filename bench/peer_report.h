// peer_report.h - the benchmark's document as a host would write it down by hand: plain structs of texts and
// vectors.
//
// Here: the structs and their tables of words. Elsewhere: reading them (peer_read.cpp), writing them
// (peer_write.h). Always: an empty text or vector and an enumeration of -1 stand for an absent element.
#pragma once

#include <optional>
#include <string>
#include <vector>

namespace peer {

struct identity {
    int type = -1;
    std::string uuid, product, product_name, version, platform, serial_number, host_name, name;
    std::vector<std::string> customer_number;
    std::string country;
    std::vector<identity> nested;
};

struct address {
    int type = -1;
    std::string lines, city, state, country, postal_code, time_zone;
};

struct telephone {
    std::string number, extension, type;
};

struct contact {
    std::string name, organization, role;
    std::vector<address> addresses;
    std::vector<telephone> voice;
    std::vector<std::string> email;
    std::vector<int> preference;
};

struct rich_notes {
    std::string category, date_time;
    std::optional<identity> author;
    std::string notes;
};

struct update_information {
    std::string product, update_id, qualifier, confidence;
};

struct action {
    bool is_update = false; // xsi:type protocolProblemReport:Action.Update
    std::string description, date_time;
    int timing = -1;
    std::vector<int> intention, result;
    std::string originator, notes;
    std::vector<update_information> updates;
};

struct report {
    std::vector<std::string> this_uri;
    int state = -1;
    std::string client_uri;
    int test = -1;
    std::optional<identity> subject;
    std::vector<identity> environment;
    std::vector<int> problem_type;
    std::string title, description, occurrence, submission, severity;
    std::vector<int> impact;
    std::vector<action> actions;
    std::vector<std::string> reference, notes;
    std::vector<rich_notes> annotations;
    std::optional<identity> submitter;
    std::vector<contact> contacts;
    std::vector<report> nested;
};

struct profile {
    std::vector<std::string> this_uri;
    int state = -1;
    std::optional<identity> owner;
    std::vector<contact> contacts;
};

struct words {
    const char *const *list;
    int count;
};
#define PEER_WORDS(name, ...)                                                                                \
    inline constexpr const char *name##_list[] = {__VA_ARGS__};                                              \
    inline constexpr words name = {name##_list, sizeof name##_list / sizeof *name##_list}

PEER_WORDS(booleans, "false", "true");
PEER_WORDS(identity_types, "system", "hardware", "software", "operatingSystem", "firmware", "microcode",
           "service", "person", "organization", "group", "cluster", "other");
PEER_WORDS(address_types, "primary", "shipping", "billing", "service", "other");
PEER_WORDS(contact_preferences, "mail", "voice", "pager", "fax", "email", "instantMessage");
PEER_WORDS(report_states, "open", "processing", "complete", "closed", "cancelled", "error", "submitted",
           "rejected");
PEER_WORDS(profile_states, "active", "inactive", "inactive.suspended", "inactive.revoked", "closed");
PEER_WORDS(problem_types, "abnormalTermination", "errorIndication", "dysfunction", "performance", "overrun",
           "intermittent", "temporary", "permanent", "other");
PEER_WORDS(impacts, "systemUnavailable", "systemImpaired", "serviceUnavailable", "serviceImpaired", "other");
PEER_WORDS(timings, "beforeProblemOccurrence", "concurrentWithProblemOccurrence", "afterProblemOccurrence");
PEER_WORDS(intentions, "resolveProblem", "reproduceProblem", "diagnoseProblem", "workaroundProblem",
           "otherRelated", "otherUnrelated");
PEER_WORDS(results, "noChange", "problemChanged", "problemNotResolved", "problemResolved",
           "problemResolvedPartially", "problemReproducible", "problemNotReproducible", "problemManifest",
           "problemNotManifest");

// Parses with pugixml's DOM and binds. False if it is no document of this kind.
bool read(const std::string &bytes, report &target);
bool read(const std::string &bytes, profile &target);

} // namespace peer

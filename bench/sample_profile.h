// sample_profile.h - the profile that calls bring back: names and numbers of a small company, short texts as most
// are, the same at each run. At 2,160 bytes it is the answer of the calls that are measured.
//
// Elsewhere: problem reports of mixed texts (documents.h); the same content in plain structs (peer_report.h).
#pragma once

#include <deque>
#include <string>

#include <zuv_client_pro/protocolProfile.h>

#include "binding/class_ops.h"

constexpr char PROFILE_ELEMENT[] = "protocolProfile:createResponse";
constexpr std::size_t PROFILE_ANSWER_BYTES = 2160;

const binding::class_ops &profile_ops();

// Owns all that the profile points to.
class sample_profile {
public:
    explicit sample_profile(std::size_t contacts = 2);
    sample_profile(const sample_profile &) = delete;
    sample_profile &operator=(const sample_profile &) = delete;

    protocolProfile__ProfileContent profile;
    std::string company = "Zo\xC3\xAB & company"; // the identity's name

private:
    std::string city = "Graz", country = "Austria", code = "8010", person = "Contact",
                department = "Workshop", mail = "one@workshop.example";
    protocol__IdentityType kind = protocol__IdentityType::organization;
    protocolProfile__ProfileState state = protocolProfile__ProfileState::active;
    protocol__Identity identity;
    protocol__Address address;
    std::deque<protocol__Contact> contacts;
};

// The profile's message as a service of this library writes it, whose Envelope declares the whole namespace
// table, and one namespace more that the table doesn't hold. A message shorter than PROFILE_ANSWER_BYTES is
// brought to that by a longer name of the company.
std::string profile_answer(sample_profile &sample);

// The same message as other toolkits write it: no prefixes, but a default namespace on each element; those that
// attributes need are declared on the Body's child.
std::string in_default_namespaces(const std::string &message);

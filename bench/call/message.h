// message.h - the exchange that all ways to call make: what the host gives, what the server answers, and both
// as records of a host that binds by hand.
#pragma once

#include <string>
#include <vector>

namespace call_bench {

// What the host gives to a call.
struct order {
    std::string name = "Zo\xC3\xAB & company", type = "organization";
};

// The answer, bound.
struct contact {
    std::string name, organization, role, city, country, postal_code;
    std::vector<std::string> mail;
};
struct profile {
    std::string uri, state, name;
    std::vector<contact> contacts;
};

// Of the answer.
constexpr std::size_t CONTACTS = 2;

// The body of an answer of 2,160 bytes, whose Envelope declares 15 namespaces.
std::string answer_body();

// The same with a head.
std::string answer();

// The answer's envelope read with pugixml into records; false if it isn't the one expected. Changes the
// bytes.
bool bind(char *body, std::size_t length, profile &into);

// The request's envelope, put together by hand; with further declarations of namespaces, " xmlns:..." each.
std::string request_body(const order &what, const std::string &further = "");

} // namespace call_bench

// sample_profile.cpp - see sample_profile.h.
#include "sample_profile.h"

#include <algorithm>
#include <map>

#include <zuv_client_pro/protocol.h>

#include "engine_run.h"
#include "traits_protocolProfile.h"

const binding::class_ops &profile_ops()
{
    return binding::traits<protocolProfile__ProfileContent>::ops;
}

sample_profile::sample_profile(std::size_t count) : contacts(count)
{
    identity.type = &kind;
    identity.name = &company;
    address.city = &city;
    address.country = &country;
    address.postalCode = &code;
    for (protocol__Contact &one : contacts) {
        one.name = &person;
        one.organization = &department;
        one.email = {mail};
        if (profile.contact.size() % 2 == 0)
            one.address = {&address};
        profile.contact.push_back(&one);
    }
    profile.thisURI = {"urn:zuv:profile:9b2d9d5e-6b0c-4d0f-9e62-0c4f5a1c7d11"};
    profile.state = &state;
    profile.identity = &identity;
}

std::string profile_answer(sample_profile &sample)
{
    const std::string more = " xmlns:wsdl=\"http://schemas.xmlsoap.org/wsdl/\"";
    engine_run engine(profile_ops(), PROFILE_ELEMENT);
    const std::size_t size = engine.written(&sample.profile).size() + more.size();
    if (size < PROFILE_ANSWER_BYTES)
        sample.company.append(PROFILE_ANSWER_BYTES - size, 'x');
    std::string bytes = engine.written(&sample.profile);
    return bytes.insert(bytes.find(" xmlns:xsd="), more);
}

namespace {

// The namespaces that the root element declares, by prefix.
std::map<std::string, std::string> declared(const std::string &root)
{
    std::map<std::string, std::string> found;
    for (std::size_t at = root.find("xmlns:"); at != std::string::npos; at = root.find("xmlns:", at)) {
        const std::size_t equals = root.find('=', at), end = root.find('"', equals + 2);
        found[root.substr(at + 6, equals - at - 6)] = root.substr(equals + 2, end - equals - 2);
        at = end;
    }
    return found;
}

} // namespace

std::string in_default_namespaces(const std::string &message)
{
    const std::size_t root = message.find("<SOAP-ENV:Envelope");
    const std::size_t content = message.find('>', root) + 1;
    const auto namespaces = declared(message.substr(root, content - root));
    std::string result = message.substr(0, root) + "<Envelope xmlns=\"" + namespaces.at("SOAP-ENV") + "\">";
    bool in_body = false; // the next element is the Body's child
    for (std::size_t at = content; at < message.size();) {
        const std::size_t tag = std::min(message.find('<', at), message.size());
        result.append(message, at, tag - at);
        if (tag == message.size())
            break;
        const bool closes = message[tag + 1] == '/';
        const std::size_t name = tag + (closes ? 2 : 1), colon = message.find(':', name),
                          end = message.find('>', tag);
        const std::string local = message.substr(colon + 1, end - colon - 1);
        result += (closes ? "</" : "<") + local;
        if (!closes)
            result += " xmlns=\"" + namespaces.at(message.substr(name, colon - name)) + '"';
        if (in_body)
            result += " xmlns:xsi=\"" + namespaces.at("xsi") + "\" xmlns:xsd=\"" + namespaces.at("xsd") + '"';
        in_body = local == "Body" && !closes;
        result += '>';
        at = end + 1;
    }
    return result;
}

// peer_read.cpp - a reader written by hand over pugixml's DOM, as a host without this library would have it.
#include <cstring>

#include <pugixml.hpp>

#include "peer_report.h"

namespace peer {

namespace {

// The name without its prefix: the sender's prefixes are trusted.
const char *local_name(const char *name)
{
    const char *colon = std::strchr(name, ':');
    return colon ? colon + 1 : name;
}

bool is(const char *name, const char *wanted)
{
    return *name == *wanted && std::strcmp(name, wanted) == 0;
}

int code_of(const words &table, const char *text)
{
    for (int i = 0; i < table.count; ++i) {
        if (is(text, table.list[i]))
            return i;
    }
    return -1;
}

void bind(const pugi::xml_node &node, identity &target);
void bind(const pugi::xml_node &node, address &target);
void bind(const pugi::xml_node &node, telephone &target);
void bind(const pugi::xml_node &node, contact &target);
void bind(const pugi::xml_node &node, rich_notes &target);
void bind(const pugi::xml_node &node, update_information &target);
void bind(const pugi::xml_node &node, action &target);
void bind(const pugi::xml_node &node, report &target);

void bind(const pugi::xml_node &node, std::string &target)
{
    target = node.child_value();
}

template <class T> void bind(const pugi::xml_node &node, std::optional<T> &target)
{
    bind(node, target.emplace());
}

template <class T> void bind(const pugi::xml_node &node, std::vector<T> &target)
{
    bind(node, target.emplace_back());
}

void bind(const pugi::xml_node &node, identity &target)
{
    for (const pugi::xml_node &child : node) {
        const char *name = local_name(child.name());
        if (is(name, "type"))
            target.type = code_of(identity_types, child.child_value());
        else if (is(name, "uuid"))
            bind(child, target.uuid);
        else if (is(name, "product"))
            bind(child, target.product);
        else if (is(name, "productName"))
            bind(child, target.product_name);
        else if (is(name, "version"))
            bind(child, target.version);
        else if (is(name, "platform"))
            bind(child, target.platform);
        else if (is(name, "serialNumber"))
            bind(child, target.serial_number);
        else if (is(name, "hostName"))
            bind(child, target.host_name);
        else if (is(name, "name"))
            bind(child, target.name);
        else if (is(name, "customerNumber"))
            bind(child, target.customer_number);
        else if (is(name, "country"))
            bind(child, target.country);
        else if (is(name, "identity"))
            bind(child, target.nested);
    }
}

void bind(const pugi::xml_node &node, address &target)
{
    for (const pugi::xml_node &child : node) {
        const char *name = local_name(child.name());
        if (is(name, "addressType"))
            target.type = code_of(address_types, child.child_value());
        else if (is(name, "localeDependentLines"))
            bind(child, target.lines);
        else if (is(name, "city"))
            bind(child, target.city);
        else if (is(name, "state"))
            bind(child, target.state);
        else if (is(name, "country"))
            bind(child, target.country);
        else if (is(name, "postalCode"))
            bind(child, target.postal_code);
        else if (is(name, "timeZone"))
            bind(child, target.time_zone);
    }
}

void bind(const pugi::xml_node &node, telephone &target)
{
    for (const pugi::xml_node &child : node) {
        const char *name = local_name(child.name());
        if (is(name, "number"))
            bind(child, target.number);
        else if (is(name, "extension"))
            bind(child, target.extension);
        else if (is(name, "type"))
            bind(child, target.type);
    }
}

void bind(const pugi::xml_node &node, contact &target)
{
    for (const pugi::xml_node &child : node) {
        const char *name = local_name(child.name());
        if (is(name, "name"))
            bind(child, target.name);
        else if (is(name, "organization"))
            bind(child, target.organization);
        else if (is(name, "role"))
            bind(child, target.role);
        else if (is(name, "address"))
            bind(child, target.addresses);
        else if (is(name, "voice"))
            bind(child, target.voice);
        else if (is(name, "email"))
            bind(child, target.email);
        else if (is(name, "contactPreference"))
            target.preference.push_back(code_of(contact_preferences, child.child_value()));
    }
}

void bind(const pugi::xml_node &node, rich_notes &target)
{
    for (const pugi::xml_node &child : node) {
        const char *name = local_name(child.name());
        if (is(name, "category"))
            bind(child, target.category);
        else if (is(name, "dateTime"))
            bind(child, target.date_time);
        else if (is(name, "author"))
            bind(child, target.author);
        else if (is(name, "notes"))
            bind(child, target.notes);
    }
}

void bind(const pugi::xml_node &node, update_information &target)
{
    for (const pugi::xml_node &child : node) {
        const char *name = local_name(child.name());
        if (is(name, "product"))
            bind(child, target.product);
        else if (is(name, "updateId"))
            bind(child, target.update_id);
        else if (is(name, "updateIdQualifier"))
            bind(child, target.qualifier);
        else if (is(name, "confidence"))
            bind(child, target.confidence);
    }
}

void bind(const pugi::xml_node &node, action &target)
{
    target.is_update = is(local_name(node.attribute("xsi:type").value()), "Action.Update");
    for (const pugi::xml_node &child : node) {
        const char *name = local_name(child.name());
        if (is(name, "description"))
            bind(child, target.description);
        else if (is(name, "actionDateTime"))
            bind(child, target.date_time);
        else if (is(name, "timing"))
            target.timing = code_of(timings, child.child_value());
        else if (is(name, "intention"))
            target.intention.push_back(code_of(intentions, child.child_value()));
        else if (is(name, "result"))
            target.result.push_back(code_of(results, child.child_value()));
        else if (is(name, "originator"))
            bind(child, target.originator);
        else if (is(name, "notes"))
            bind(child, target.notes);
        else if (is(name, "updateInformation"))
            bind(child, target.updates);
    }
}

void bind(const pugi::xml_node &node, report &target)
{
    for (const pugi::xml_node &child : node) {
        const char *name = local_name(child.name());
        if (is(name, "thisURI"))
            bind(child, target.this_uri);
        else if (is(name, "state"))
            target.state = code_of(report_states, child.child_value());
        else if (is(name, "clientURI"))
            bind(child, target.client_uri);
        else if (is(name, "test"))
            target.test = code_of(booleans, child.child_value());
        else if (is(name, "subject"))
            bind(child, target.subject);
        else if (is(name, "subjectEnvironment"))
            bind(child, target.environment);
        else if (is(name, "problemType"))
            target.problem_type.push_back(code_of(problem_types, child.child_value()));
        else if (is(name, "title"))
            bind(child, target.title);
        else if (is(name, "problemDescription"))
            bind(child, target.description);
        else if (is(name, "occurrenceDateTime"))
            bind(child, target.occurrence);
        else if (is(name, "submitDateTime"))
            bind(child, target.submission);
        else if (is(name, "severity"))
            bind(child, target.severity);
        else if (is(name, "impact"))
            target.impact.push_back(code_of(impacts, child.child_value()));
        else if (is(name, "actionTaken"))
            bind(child, target.actions);
        else if (is(name, "reference"))
            bind(child, target.reference);
        else if (is(name, "notes"))
            bind(child, target.notes);
        else if (is(name, "richNotes"))
            bind(child, target.annotations);
        else if (is(name, "submitter"))
            bind(child, target.submitter);
        else if (is(name, "contact"))
            bind(child, target.contacts);
        else if (is(name, "problemReport"))
            bind(child, target.nested);
    }
}

void bind(const pugi::xml_node &node, profile &target)
{
    for (const pugi::xml_node &child : node) {
        const char *name = local_name(child.name());
        if (is(name, "thisURI"))
            bind(child, target.this_uri);
        else if (is(name, "state"))
            target.state = code_of(profile_states, child.child_value());
        else if (is(name, "identity"))
            bind(child, target.owner);
        else if (is(name, "contact"))
            bind(child, target.contacts);
    }
}

template <class T> bool parse(const std::string &bytes, T &target)
{
    pugi::xml_document document;
    if (!document.load_buffer(bytes.data(), bytes.size()))
        return false;
    const pugi::xml_node body = document.first_child().first_child();
    const pugi::xml_node root = body.first_child();
    if (!root || !is(local_name(body.name()), "Body"))
        return false;
    bind(root, target);
    return true;
}

} // namespace

bool read(const std::string &bytes, report &target)
{
    return parse(bytes, target);
}
bool read(const std::string &bytes, profile &target)
{
    return parse(bytes, target);
}

} // namespace peer

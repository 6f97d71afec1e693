// peer_write.h - the peers' structs written as the document, to any sink.
//
// A sink has start(tag), start_typed(tag, xsi_type), end(tag) and element(tag, text). Here: the walk, in the
// contract's order, and the sink of the plain append loop. Elsewhere: reading (peer_read.cpp).
#pragma once

#include <string>
#include <string_view>

#include "peer_report.h"

namespace peer {

// Appends to a text, with escapes.
class append_sink {
public:
    explicit append_sink(std::string &target) : text(target) {}
    void start(std::string_view tag) { text.append(1, '<').append(tag).append(1, '>'); }
    void start_typed(std::string_view tag, std::string_view type)
    {
        text.append(1, '<').append(tag).append(" xsi:type=\"").append(type).append("\">");
    }
    void end(std::string_view tag) { text.append("</").append(tag).append(1, '>'); }
    void element(std::string_view tag, std::string_view value)
    {
        start(tag);
        escaped(value);
        end(tag);
    }

private:
    void escaped(std::string_view value)
    {
        std::size_t done = 0;
        for (std::size_t i = 0; i < value.size(); ++i) {
            const char *escape = nullptr;
            switch (value[i]) {
            case '&':
                escape = "&amp;";
                break;
            case '<':
                escape = "&lt;";
                break;
            case '>':
                escape = "&gt;";
                break;
            case '\n':
                escape = "&#xA;";
                break;
            case '\r':
                escape = "&#xD;";
                break;
            default:
                continue;
            }
            text.append(value, done, i - done).append(escape);
            done = i + 1;
        }
        text.append(value, done);
    }

    std::string &text;
};

#define PEER_P  "protocol:"
#define PEER_PR "protocolProblemReport:"

template <class Sink> void put(Sink &sink, std::string_view tag, const std::string &value)
{
    if (!value.empty())
        sink.element(tag, value);
}

template <class Sink> void put(Sink &sink, std::string_view tag, int code, const words &table)
{
    if (code >= 0)
        sink.element(tag, table.list[code]);
}

template <class Sink>
void put(Sink &sink, std::string_view tag, const std::vector<int> &codes, const words &table)
{
    for (const int code : codes)
        put(sink, tag, code, table);
}

template <class Sink, class T> void put(Sink &sink, std::string_view tag, const std::vector<T> &items)
{
    for (const T &item : items)
        put(sink, tag, item);
}

template <class Sink, class T> void put(Sink &sink, std::string_view tag, const std::optional<T> &item)
{
    if (item)
        put(sink, tag, *item);
}

template <class Sink> void put(Sink &sink, std::string_view tag, const identity &value)
{
    sink.start(tag);
    put(sink, PEER_P "type", value.type, identity_types);
    put(sink, PEER_P "uuid", value.uuid);
    put(sink, PEER_P "product", value.product);
    put(sink, PEER_P "productName", value.product_name);
    put(sink, PEER_P "version", value.version);
    put(sink, PEER_P "platform", value.platform);
    put(sink, PEER_P "serialNumber", value.serial_number);
    put(sink, PEER_P "hostName", value.host_name);
    put(sink, PEER_P "name", value.name);
    put(sink, PEER_P "customerNumber", value.customer_number);
    put(sink, PEER_P "country", value.country);
    put(sink, PEER_P "identity", value.nested);
    sink.end(tag);
}

template <class Sink> void put(Sink &sink, std::string_view tag, const address &value)
{
    sink.start(tag);
    put(sink, PEER_P "addressType", value.type, address_types);
    put(sink, PEER_P "localeDependentLines", value.lines);
    put(sink, PEER_P "city", value.city);
    put(sink, PEER_P "state", value.state);
    put(sink, PEER_P "country", value.country);
    put(sink, PEER_P "postalCode", value.postal_code);
    put(sink, PEER_P "timeZone", value.time_zone);
    sink.end(tag);
}

template <class Sink> void put(Sink &sink, std::string_view tag, const telephone &value)
{
    sink.start(tag);
    put(sink, PEER_P "number", value.number);
    put(sink, PEER_P "extension", value.extension);
    put(sink, PEER_P "type", value.type);
    sink.end(tag);
}

template <class Sink> void put(Sink &sink, std::string_view tag, const contact &value)
{
    sink.start(tag);
    put(sink, PEER_P "name", value.name);
    put(sink, PEER_P "organization", value.organization);
    put(sink, PEER_P "role", value.role);
    put(sink, PEER_P "address", value.addresses);
    put(sink, PEER_P "voice", value.voice);
    put(sink, PEER_P "email", value.email);
    put(sink, PEER_P "contactPreference", value.preference, contact_preferences);
    sink.end(tag);
}

template <class Sink> void put(Sink &sink, std::string_view tag, const rich_notes &value)
{
    sink.start_typed(tag, PEER_PR "ProblemReportRichNotes");
    put(sink, PEER_P "category", value.category);
    put(sink, PEER_P "dateTime", value.date_time);
    put(sink, PEER_P "author", value.author);
    put(sink, PEER_P "notes", value.notes);
    sink.end(tag);
}

template <class Sink> void put(Sink &sink, std::string_view tag, const update_information &value)
{
    sink.start(tag);
    put(sink, PEER_PR "product", value.product);
    put(sink, PEER_PR "updateId", value.update_id);
    put(sink, PEER_PR "updateIdQualifier", value.qualifier);
    put(sink, PEER_PR "confidence", value.confidence);
    sink.end(tag);
}

template <class Sink> void put(Sink &sink, std::string_view tag, const action &value)
{
    if (value.is_update)
        sink.start_typed(tag, PEER_PR "Action.Update");
    else
        sink.start(tag);
    put(sink, PEER_PR "description", value.description);
    put(sink, PEER_PR "actionDateTime", value.date_time);
    put(sink, PEER_PR "timing", value.timing, timings);
    put(sink, PEER_PR "intention", value.intention, intentions);
    put(sink, PEER_PR "result", value.result, results);
    put(sink, PEER_PR "originator", value.originator);
    put(sink, PEER_PR "notes", value.notes);
    put(sink, PEER_PR "updateInformation", value.updates);
    sink.end(tag);
}

template <class Sink> void put(Sink &sink, std::string_view tag, const report &value)
{
    sink.start(tag);
    put(sink, PEER_PR "thisURI", value.this_uri);
    put(sink, PEER_PR "state", value.state, report_states);
    put(sink, PEER_PR "clientURI", value.client_uri);
    put(sink, PEER_PR "test", value.test, booleans);
    put(sink, PEER_P "subject", value.subject);
    put(sink, PEER_P "subjectEnvironment", value.environment);
    put(sink, PEER_PR "problemType", value.problem_type, problem_types);
    put(sink, PEER_PR "title", value.title);
    put(sink, PEER_PR "problemDescription", value.description);
    put(sink, PEER_PR "occurrenceDateTime", value.occurrence);
    put(sink, PEER_PR "submitDateTime", value.submission);
    put(sink, PEER_PR "severity", value.severity);
    put(sink, PEER_PR "impact", value.impact, impacts);
    put(sink, PEER_PR "actionTaken", value.actions);
    put(sink, PEER_PR "reference", value.reference);
    put(sink, PEER_PR "notes", value.notes);
    put(sink, PEER_PR "richNotes", value.annotations);
    put(sink, PEER_P "submitter", value.submitter);
    put(sink, PEER_P "contact", value.contacts);
    put(sink, PEER_PR "problemReport", value.nested);
    sink.end(tag);
}

template <class Sink> void put(Sink &sink, std::string_view tag, const profile &value)
{
    sink.start(tag);
    put(sink, "protocolProfile:thisURI", value.this_uri);
    put(sink, "protocolProfile:state", value.state, profile_states);
    put(sink, PEER_P "identity", value.owner);
    put(sink, PEER_P "contact", value.contacts);
    sink.end(tag);
}

#undef PEER_P
#undef PEER_PR

} // namespace peer

// message.cpp - see message.h.
#include "message.h"

#include <cstring>

#include <pugixml.hpp>

#include "sample_profile.h"

namespace call_bench {

namespace {

std::string element(const char *name, const std::string &content)
{
    return std::string("<c:") + name + ">" + content + "</c:" + name + ">";
}

std::string escaped(const std::string &text)
{
    std::string out;
    out.reserve(text.size());
    for (const char c : text) {
        if (c == '&')
            out += "&amp;";
        else if (c == '<')
            out += "&lt;";
        else if (c == '>')
            out += "&gt;";
        else
            out += c;
    }
    return out;
}

const char *local_name(const pugi::xml_node &node)
{
    const char *const colon = std::strchr(node.name(), ':');
    return colon ? colon + 1 : node.name();
}

contact bound_contact(const pugi::xml_node &node)
{
    contact made;
    for (const pugi::xml_node &child : node.children()) {
        const std::string name = local_name(child);
        if (name == "name")
            made.name = child.text().get();
        else if (name == "organization")
            made.organization = child.text().get();
        else if (name == "role")
            made.role = child.text().get();
        else if (name == "email")
            made.mail.emplace_back(child.text().get());
        else if (name == "address")
            for (const pugi::xml_node &part : child.children()) {
                const std::string what = local_name(part);
                if (what == "city")
                    made.city = part.text().get();
                else if (what == "country")
                    made.country = part.text().get();
                else if (what == "postalCode")
                    made.postal_code = part.text().get();
            }
    }
    return made;
}

} // namespace

std::string answer_body()
{
    sample_profile sample;
    return profile_answer(sample);
}

std::string answer()
{
    const std::string body = answer_body();
    return "HTTP/1.1 200 OK\r\nServer: bench\r\nContent-Type: text/xml; charset=utf-8\r\nContent-Length: " +
           std::to_string(body.size()) + "\r\nConnection: keep-alive\r\n\r\n" + body;
}

bool bind(char *body, std::size_t length, profile &into)
{
    pugi::xml_document document;
    if (!document.load_buffer_inplace(body, length))
        return false;
    const pugi::xml_node content = document.first_child().first_child().first_child();
    if (std::strcmp(local_name(content), "createResponse") != 0)
        return false;
    for (const pugi::xml_node &child : content.children()) {
        const std::string name = local_name(child);
        if (name == "thisURI")
            into.uri = child.text().get();
        else if (name == "state")
            into.state = child.text().get();
        else if (name == "contact")
            into.contacts.push_back(bound_contact(child));
        else if (name == "identity")
            for (const pugi::xml_node &part : child.children())
                if (std::strcmp(local_name(part), "name") == 0)
                    into.name = part.text().get();
    }
    return into.contacts.size() == CONTACTS;
}

std::string request_body(const order &what, const std::string &further)
{
    return "<?xml version=\"1.0\" encoding=\"UTF-8\"?>\n<E:Envelope"
           " xmlns:E=\"http://schemas.xmlsoap.org/soap/envelope/\""
           " xmlns:c=\"http://www.zuv.example/xmlns/b2b/zuv/v1.0\""
           " xmlns:p=\"http://www.zuv.example/xmlns/b2b/zuv/v1.0/Profile\"" +
           further + "><E:Body><p:createRequest>" +
           element("identity", element("type", escaped(what.type)) + element("name", escaped(what.name))) +
           "</p:createRequest></E:Body></E:Envelope>\r\n";
}

} // namespace call_bench

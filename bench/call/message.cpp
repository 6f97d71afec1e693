// message.cpp - see message.h.
#include "message.h"

#include <cstring>

#include <pugixml.hpp>

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
    std::string body =
        "<?xml version=\"1.0\" encoding=\"UTF-8\"?>\n<E:Envelope"
        " xmlns:E=\"http://schemas.xmlsoap.org/soap/envelope/\""
        " xmlns:c=\"http://www.zuv.example/xmlns/b2b/zuv/v1.0\""
        " xmlns:p=\"http://www.zuv.example/xmlns/b2b/zuv/v1.0/Profile\"><E:Body><p:createResponse>"
        "<c:thisURI>urn:zuv:profile:9b2d9d5e-6b0c-4d0f-9e62-0c4f5a1c7d11</c:thisURI><p:state>active</"
        "p:state>" +
        element("identity", element("type", "organization") + element("name", "Zo\xC3\xAB &amp; company"));
    for (const char *const who : {"one", "two", "three", "four", "five", "six"})
        body += element("contact",
                        element("name", std::string("Contact number ") + who) +
                            element("organization", "Workshop") + element("role", "maintainer") +
                            element("address", element("city", "Graz") + element("country", "Austria") +
                                                   element("postalCode", "8010")) +
                            element("email", std::string(who) + "@workshop.example"));
    return body + "</p:createResponse></E:Body></E:Envelope>\r\n";
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
    return into.contacts.size() == 6;
}

std::string request_body(const order &what)
{
    return "<?xml version=\"1.0\" encoding=\"UTF-8\"?>\n<E:Envelope"
           " xmlns:E=\"http://schemas.xmlsoap.org/soap/envelope/\""
           " xmlns:c=\"http://www.zuv.example/xmlns/b2b/zuv/v1.0\""
           " xmlns:p=\"http://www.zuv.example/xmlns/b2b/zuv/v1.0/Profile\"><E:Body><p:createRequest>" +
           element("identity", element("type", escaped(what.type)) + element("name", escaped(what.name))) +
           "</p:createRequest></E:Body></E:Envelope>\r\n";
}

} // namespace call_bench

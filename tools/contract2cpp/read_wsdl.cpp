// read_wsdl.cpp - one WSDL to the declaration of its port.
//
// Read: messages, the one port type, and name and address of the binding for SOAP 1.1. Bindings are all alike
// (document style, literal use), so their operations are not read; faults are dispatched by their
// classes.
#include <map>

#include "reader.h"
#include "xml_file.h"

namespace {

constexpr std::string_view WSDL_URI = "http://schemas.xmlsoap.org/wsdl/";
constexpr std::string_view SOAP_URI = "http://schemas.xmlsoap.org/wsdl/soap/";

using message_table = std::map<std::string, qualified_name>; // element of each message's one part

message_table messages_of(const xml_file &xml)
{
    message_table messages;
    for (const pugi::xml_node message : xml.root().children()) {
        if (!xml.is(message, WSDL_URI, "message"))
            continue;
        const pugi::xml_node part = message.first_child();
        if (!part || part.next_sibling() || !xml.is(part, WSDL_URI, "part"))
            xml.refuse(message, "a message must have one part");
        if (!messages.emplace(xml.required(message, "name"), xml.qualified(part, "element")).second)
            xml.refuse(message, "message \"" + xml.required(message, "name") + "\" is declared twice");
    }
    return messages;
}

qualified_name element_of(const xml_file &xml, pugi::xml_node direction, const message_table &messages)
{
    const qualified_name message = xml.qualified(direction, "message");
    const auto found = messages.find(message.local);
    if (found == messages.end())
        xml.refuse(direction, "unknown message \"" + message.local + "\"");
    return found->second;
}

operation_declaration operation_of(const xml_file &xml, pugi::xml_node node, const message_table &messages)
{
    operation_declaration operation;
    operation.at = xml.at(node);
    operation.name = xml.required(node, "name");
    for (const pugi::xml_node child : node.children()) {
        if (xml.is(child, WSDL_URI, "documentation"))
            operation.documentation = plain_text(child.text().get());
        else if (xml.is(child, WSDL_URI, "input"))
            operation.request = element_of(xml, child, messages);
        else if (xml.is(child, WSDL_URI, "output"))
            operation.response = element_of(xml, child, messages);
        else if (!xml.is(child, WSDL_URI, "fault"))
            xml.refuse(child, std::string(child.name()) + " in an operation can't be translated");
    }
    if (operation.request.local.empty() || operation.response.local.empty())
        xml.refuse(node, "operation \"" + operation.name + "\" must have an input and an output");
    return operation;
}

pugi::xml_node child_of(const xml_file &xml, pugi::xml_node parent, std::string_view uri,
                        std::string_view local)
{
    for (const pugi::xml_node child : parent.children()) {
        if (child.type() == pugi::node_element && xml.is(child, uri, local))
            return child;
    }
    return {};
}

// Name of the binding for SOAP 1.1, and the address of the service that offers it.
void read_binding(const xml_file &xml, port_declaration &port)
{
    for (const pugi::xml_node node : xml.root().children()) {
        if (xml.is(node, WSDL_URI, "binding") && child_of(xml, node, SOAP_URI, "binding"))
            port.binding = xml.required(node, "name");
        if (const pugi::xml_node offered = child_of(xml, node, WSDL_URI, "port");
            offered && xml.is(node, WSDL_URI, "service")) {
            if (const pugi::xml_node address = child_of(xml, offered, SOAP_URI, "address"))
                port.address = xml.required(address, "location");
        }
    }
    if (port.binding.empty() || port.address.empty())
        xml.refuse(xml.root(), "no binding for SOAP 1.1, or no address for it");
}

} // namespace

port_declaration read_port(const std::filesystem::path &path, const std::string &name)
{
    const xml_file xml(path, name);
    const pugi::xml_node root = xml.root();
    if (!xml.is(root, WSDL_URI, "definitions"))
        xml.refuse(root, "not a WSDL");
    port_declaration port;
    port.file = xml.file();
    port.at = xml.at(root);
    port.uri = xml.required(root, "targetNamespace");
    if (const pugi::xml_node text = child_of(xml, root, WSDL_URI, "documentation"))
        port.documentation = plain_text(text.text().get());

    const message_table messages = messages_of(xml);
    for (const pugi::xml_node node : root.children()) {
        if (!xml.is(node, WSDL_URI, "portType"))
            continue;
        if (!port.name.empty())
            xml.refuse(node, "a second port type in one file");
        port.name = xml.required(node, "name");
        for (const pugi::xml_node child : node.children()) {
            if (xml.is(child, WSDL_URI, "operation"))
                port.operations.push_back(operation_of(xml, child, messages));
        }
    }
    if (port.name.empty())
        xml.refuse(root, "no port type");
    read_binding(xml, port);
    return port;
}

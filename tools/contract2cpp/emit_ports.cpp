// emit_ports.cpp - the records and the proxy class of a port.
#include "emit.h"

namespace {

std::string record_text(const message_record &record, const std::string &member, const std::string &about)
{
    return "// " + about + "\nstruct " + record.name + " {\n    " + record.object + " *" + member +
           "; // \"" + record.element + "\"\n};\n\n";
}

std::string records_text(const port &port)
{
    std::string text;
    for (const operation &operation : port.operations) {
        text += record_text(operation.request, "request", "Request of " + operation.name + ".");
        text += record_text(operation.response, "result",
                            "Response of " + operation.name + "; the object is the context's.");
    }
    return text;
}

std::set<std::string> headers_of(const port &port)
{
    std::set<std::string> headers;
    for (const operation &operation : port.operations) {
        headers.insert(operation.request.object_prefix);
        headers.insert(operation.response.object_prefix);
    }
    return headers;
}

std::string proxy_class(const port &port)
{
    const std::string name = port.binding + "Proxy";
    std::string text = comment(port.documentation);
    text += "class ZUV_CLASS " + name + " : public soap {\npublic:\n    SOAP_PROXY_MEMBERS(" + name + ")\n";
    for (const operation &operation : port.operations)
        text += "\n" + comment(operation.documentation, "    ") + "    SOAP_PROXY_CALL(" + operation.name +
                ", " + operation.request.object + ",\n                    " + operation.response.name + ")\n";
    return text + "};\n";
}

emitted_file proxy_source(const port &port)
{
    const std::string name = port.binding + "Proxy";
    std::string text = opening(name + ".cpp", port.file, "");
    text += public_includes({name, "type_ids"}) + "\n";
    text += "#include \"contract_namespaces.h\"\n#include \"exchange/proxy_rules.h\"\n\n";
    text += "static constexpr char default_endpoint[] = " + string_literal(port.address) + ";\n\n";
    text += "PROXY_DEFINE_MEMBERS(" + name + ", " + port.name + "_namespaces)\n";
    for (const operation &operation : port.operations)
        text += "\nPROXY_DEFINE_CALL(" +
                joined({name, operation.name, operation.request.object, operation.response.name,
                        operation.request.type_id, operation.response.type_id},
                       ",\n                  ") +
                ")\n";
    return {"src/" + name + ".cpp", text};
}

} // namespace

std::vector<emitted_file> emit_port(const port &port)
{
    const std::string name = port.binding + (port.proxy ? "Proxy" : "");
    std::set<std::string> headers = headers_of(port);
    if (port.proxy)
        headers.insert("soap_proxy");
    std::string text = opening(name + ".h", port.file, port.proxy ? "" : port.documentation);
    text += "#pragma once\n\n" + public_includes(headers) + "\n" + records_text(port);
    if (!port.proxy)
        return {{"include/zuv_client_pro/" + name + ".h", text.substr(0, text.size() - 1)}};
    return {{"include/zuv_client_pro/" + name + ".h", text + proxy_class(port)}, proxy_source(port)};
}

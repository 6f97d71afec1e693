// emit_clients.cpp - the clients of the ports, one class each, over include/zuv_client_pro/client.h.
#include <cctype>

#include "emit.h"

namespace {

// "ProblemReport" as "problem_report".
std::string lower_words(const std::string &name)
{
    std::string words;
    for (const char c : name) {
        if (std::isupper(static_cast<unsigned char>(c)) != 0 && !words.empty())
            words += '_';
        words += static_cast<char>(std::tolower(static_cast<unsigned char>(c)));
    }
    return words;
}

std::string operation_text(const operation &operation)
{
    const std::string ids = operation.request.type_id + ",\n                                          " +
                            operation.response.type_id;
    return "\n" + comment(operation.documentation, "    ") +
           "    //   request  of the host program, needed during the call only\n"
           "    //   how      what the call has besides: header, attachments, whether it may be repeated\n"
           "    //   returns  the response or why there is none\n"
           "    result<" +
           operation.response.object + ">\n    " + operation.name + "(const " + operation.request.object +
           " &request, const extras &how = extras::none())\n    {\n        static constexpr soap_operation "
           "ids{" +
           ids + "};\n        return call<" + operation.response.object + ">(\"" + operation.name +
           "\", ids, &request, how);\n    }\n";
}

std::string client_class(const port &port)
{
    const std::string name = lower_words(port.name) + "_client";
    std::string text = comment(port.documentation);
    text += "class " + name + " : public client {\npublic:\n";
    text += "    // Makes a client; nothing is sent yet.\n"
            "    //   to      URL, or several with blanks between them, the next of which is tried while "
            "connecting fails;\n"
            "    //           copied\n"
            "    //   wanted  options, copied; without them the defaults\n";
    text += "    explicit " + name + "(std::string_view to = " + string_literal(port.address) +
            ") : client(to) {}\n    " + name +
            "(std::string_view to, const options &wanted) : client(to, wanted) {}\n";
    for (const operation &operation : port.operations)
        text += operation_text(operation);
    return text + "};\n";
}

} // namespace

std::vector<emitted_file> emit_clients(const contract_model &model)
{
    if (model.ports.empty())
        return {};
    std::set<std::string> classes;
    std::string clients;
    for (const port &port : model.ports) {
        for (const operation &operation : port.operations)
            classes.insert({operation.request.object, operation.response.object});
        clients += "\n" + client_class(port);
    }
    std::string text = opening("client_ports.h", "the contract",
                               "The clients of all service ports. To be included through client.h.");
    text += "#pragma once\n\n" + public_includes({"client", "type_ids"}) + "\n";
    for (const std::string &name : classes)
        text += "class " + name + ";\n";
    return {{"include/zuv_client_pro/client_ports.h",
             text + "\nnamespace zuv {\n" + clients + "\n} // namespace zuv\n"}};
}

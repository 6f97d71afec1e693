// contract_files.cpp - see contract_files.h.
#include "contract_files.h"

#include <algorithm>
#include <filesystem>

#include <strings.h>

#include "port.h"

namespace service {

namespace {

constexpr std::string_view USUAL_ROOT = "http://127.0.0.1:9080"; // as the contract has it
constexpr std::string_view LOCATION = "schemaLocation=\"", NAMESPACE = "targetNamespace=\"";

// The value of the attribute that begins there.
std::string_view value_at(std::string_view text, std::size_t at)
{
    return text.substr(at, text.find('"', at) - at);
}

// The file with links and addresses below the root.
std::string handed_out(const contract_file &file, const std::string &root)
{
    const std::filesystem::path folder = std::filesystem::path(CONTRACT_PATH) / file.name;
    std::string result(file.text);
    for (std::size_t at = 0; (at = result.find(LOCATION, at)) != std::string::npos;) {
        at += LOCATION.size();
        const std::string_view location = value_at(result, at);
        const std::string link = root + folder.parent_path().append(location).lexically_normal().string();
        result.replace(at, location.size(), link);
    }
    for (std::size_t at = 0; (at = result.find(USUAL_ROOT, at)) != std::string::npos; at += root.size())
        result.replace(at, USUAL_ROOT.size(), root);
    return result;
}

const contract_file *wsdl_of(const port &described)
{
    const std::string name = "/" + std::string(described.name) + ".wsdl";
    const auto files = contract_files();
    const auto found =
        std::find_if(files.begin(), files.end(), [&](const auto &f) { return f.name.ends_with(name); });
    return found == files.end() ? nullptr : &*found;
}

std::string wsdl_url(const port &described, const std::string &root)
{
    return root + std::string(SERVICES_PATH).append(described.name) + "?wsdl";
}

// Calls `use` with each port that has a WSDL, and the WSDL.
template <class Use> void each_wsdl(const Use &use)
{
    for (const port *described : all_ports())
        if (const contract_file *const file = wsdl_of(*described))
            use(*described, *file);
}

// The part of a text from one mark to another, both included.
std::string_view part_of(std::string_view text, std::string_view first, std::string_view last)
{
    text.remove_prefix(text.find(first));
    return text.substr(0, text.find(last) + last.size());
}

// A WSDL of all ports: it imports theirs, and offers their services, which toolkits don't look for in what is
// imported.
std::string all_wsdls(const std::string &root)
{
    std::string prefixes, imports, services;
    each_wsdl([&](const port &described, const contract_file &file) {
        const std::string_view uri = value_at(file.text, file.text.find(NAMESPACE) + NAMESPACE.size());
        prefixes.append("\n  xmlns:protocol").append(described.name).append("=\"").append(uri).append("\"");
        imports.append("  <wsdl:import namespace=\"").append(uri);
        imports.append("\" location=\"").append(wsdl_url(described, root)).append("\"/>\n");
        services.append("  ")
            .append(part_of(handed_out(file, root), "<wsdl:service", "</wsdl:service>"))
            .append("\n");
    });
    return "<?xml version=\"1.0\" encoding=\"UTF-8\"?>\n<wsdl:definitions name=\"zuv\" "
           "targetNamespace=\"urn:zuv:ports\"\n"
           "  xmlns:wsdl=\"http://schemas.xmlsoap.org/wsdl/\" "
           "xmlns:soap=\"http://schemas.xmlsoap.org/wsdl/soap/\"\n"
           "  xmlns:soap12=\"http://schemas.xmlsoap.org/wsdl/soap12/\"" +
           prefixes + ">\n" + imports + services + "</wsdl:definitions>\n";
}

} // namespace

std::string contract_document(const request_target &target)
{
    const bool asks_wsdl = strcasecmp(target.query.c_str(), "wsdl") == 0;
    if (target.path == "/" && asks_wsdl)
        return all_wsdls(target.root);
    const port *const asked = asks_wsdl || target.query.empty() ? find_port(target.path) : nullptr;
    if (const contract_file *const file = asked == nullptr ? nullptr : wsdl_of(*asked))
        return handed_out(*file, target.root);
    for (const contract_file &file : contract_files())
        if (target.path == std::string(CONTRACT_PATH).append(file.name))
            return handed_out(file, target.root);
    return {};
}

std::vector<std::string_view> namespaces_of_element(std::string_view local_name)
{
    const std::string declared = "element name=\"" + std::string(local_name) + "\"";
    std::vector<std::string_view> result;
    for (const contract_file &file : contract_files()) {
        if (!file.name.ends_with(".xsd") || file.text.find(declared) == std::string_view::npos)
            continue;
        const std::string_view uri = value_at(file.text, file.text.find(NAMESPACE) + NAMESPACE.size());
        if (std::find(result.begin(), result.end(), uri) == result.end())
            result.push_back(uri);
    }
    return result;
}

std::string contract_links(const request_target &target)
{
    std::string html;
    const auto item = [&](const std::string &url, std::string_view text) {
        html.append("<li><a href=\"").append(url).append("\">").append(text).append("</a></li>\n");
    };
    item(target.root + "/?wsdl", "all ports in one WSDL");
    each_wsdl([&](const port &described, const contract_file &) {
        item(wsdl_url(described, target.root), std::string(SERVICES_PATH).append(described.name));
    });
    for (const contract_file &file : contract_files())
        item(target.root + std::string(CONTRACT_PATH).append(file.name), file.name);
    return html;
}

} // namespace service

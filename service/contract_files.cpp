// contract_files.cpp - see contract_files.h.
#include "contract_files.h"

#include <algorithm>
#include <cctype>

#include "port.h"

namespace service {

namespace {

constexpr std::string_view USUAL_ROOT = "http://127.0.0.1:9080"; // as the contract has it
constexpr std::string_view LOCATION = "schemaLocation=\"";

// The root comes from the client, and must not become anything but an address in the document.
bool is_plain_url(std::string_view root)
{
    return root.starts_with("http") && std::ranges::all_of(root, [](unsigned char c) {
               return std::isalnum(c) != 0 ||
                      std::string_view("-._~:/[]").find(static_cast<char>(c)) != std::string_view::npos;
           });
}

// The text with `added` behind each `mark`, or in its place.
std::string rewritten(std::string_view text, std::string_view mark, std::string_view added, bool in_its_place)
{
    std::string result;
    for (std::size_t at; (at = text.find(mark)) != std::string_view::npos;) {
        result.append(text.substr(0, in_its_place ? at : at + mark.size())).append(added);
        text.remove_prefix(at + mark.size());
    }
    return result.append(text);
}

// At the port's address the schemas are further away than at the file's own place.
std::string wsdl_of(const contract_file &file, std::string_view root)
{
    const std::string_view folder = file.name.substr(0, file.name.find('/') + 1);
    const std::string text = rewritten(file.text, LOCATION, std::string(CONTRACT_PATH).append(folder), false);
    return is_plain_url(root) ? rewritten(text, USUAL_ROOT, root, true) : text;
}

} // namespace

std::string contract_document(std::string_view path_and_query, std::string_view root)
{
    const std::size_t mark = std::min(path_and_query.find('?'), path_and_query.size());
    const std::string_view path = path_and_query.substr(0, mark), query = path_and_query.substr(mark);
    const port *const asked = query == "?wsdl" || query == "?WSDL" ? find_port(path) : nullptr;
    for (const contract_file &file : contract_files()) {
        if (path.starts_with(CONTRACT_PATH) && path.substr(CONTRACT_PATH.size()) == file.name)
            return std::string(file.text);
        if (asked != nullptr && file.name.ends_with("/" + std::string(asked->name) + ".wsdl"))
            return wsdl_of(file, root);
    }
    return {};
}

} // namespace service

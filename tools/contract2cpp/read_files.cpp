// read_files.cpp - finds the files of a contract, and reads the two plain tables among them.
#include <algorithm>
#include <sstream>

#include "reader.h"

namespace {

// The words of each line that isn't empty; "#" begins a comment line.
template <class F> void each_row(const std::filesystem::path &path, const std::string &name, F &&row)
{
    std::istringstream lines(read_bytes(path, name));
    std::string line;
    for (std::size_t number = 1; std::getline(lines, line); ++number) {
        std::istringstream text(line);
        std::vector<std::string> words;
        for (std::string word; text >> word;)
            words.push_back(word);
        if (!words.empty() && words[0][0] != '#')
            row(place{name, number}, words);
    }
}

} // namespace

std::vector<namespace_declaration> read_namespaces(const std::filesystem::path &path, const std::string &name)
{
    std::vector<namespace_declaration> rows;
    each_row(path, name, [&](const place &at, const std::vector<std::string> &words) {
        if (words.size() != 3)
            throw contract_error(at, "a row has a prefix, a URI and a pattern (or \"-\")");
        for (const namespace_declaration &row : rows) {
            if (row.prefix == words[0] || row.uri == words[1])
                throw contract_error(at, "prefix or URI is in line " + std::to_string(row.at.line) + " too");
        }
        rows.push_back({at, words[0], words[1], words[2] == "-" ? "" : words[2]});
    });
    return rows;
}

std::vector<type_id_declaration> read_type_ids(const std::filesystem::path &path, const std::string &name)
{
    std::vector<type_id_declaration> rows;
    each_row(path, name, [&](const place &at, const std::vector<std::string> &words) {
        if (words.size() != 3)
            throw contract_error(at, "a row has an id, a kind and a name");
        if (words[0].size() > 6 || words[0].find_first_not_of("0123456789") != std::string::npos)
            throw contract_error(at, "\"" + words[0] + "\" isn't a type id");
        rows.push_back({at, std::stoi(words[0]), words[1], words[2]});
    });
    return rows;
}

contract_declarations read_contract(const std::filesystem::path &directory)
{
    namespace fs = std::filesystem;
    std::vector<std::string> names;
    std::error_code error;
    for (fs::recursive_directory_iterator entry(directory, error), end; !error && entry != end;
         entry.increment(error)) {
        if (entry->is_regular_file())
            names.push_back(entry->path().lexically_relative(directory).generic_string());
    }
    if (error)
        throw contract_error({directory.generic_string(), 0}, "can't be read: " + error.message());
    std::sort(names.begin(), names.end());

    contract_declarations contract;
    contract.namespaces = read_namespaces(directory / "namespaces.txt", "namespaces.txt");
    contract.type_ids = read_type_ids(directory / "type_ids.txt", "type_ids.txt");
    for (const std::string &name : names) {
        if (name.ends_with(".xsd"))
            contract.schemas.push_back(read_schema(directory / name, name));
        else if (name.ends_with(".wsdl"))
            contract.ports.push_back(read_port(directory / name, name));
    }
    return contract;
}

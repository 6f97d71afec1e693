// case_file.cpp - see case_file.h.
#include "case_file.h"

#include <atomic>
#include <fstream>
#include <sstream>
#include <unistd.h>

namespace {

constexpr char BASE_NAMESPACES[] = "xsd http://www.w3.org/2001/XMLSchema http://www.w3.org/*/XMLSchema\n"
                                   "t http://www.zuv.example/t -\n"
                                   "u http://www.zuv.example/u -\n";
constexpr char BASE_TYPE_IDS[] = "1 primitive xsd:int\n"
                                 "4 primitive xsd:string\n"
                                 "8 text xsd:string\n"
                                 "10 binary xsd:base64Binary\n"
                                 "13 primitive xsd:boolean\n"
                                 "14 primitive xsd:double\n"
                                 "15 text xsd:dateTime\n"
                                 "479 vector xsd:string\n";

// A directory of its own, gone with the object.
class scratch_directory {
public:
    scratch_directory()
    {
        static std::atomic<int> next{0};
        path = std::filesystem::temp_directory_path() /
               ("contract-" + std::to_string(getpid()) + "-" + std::to_string(next++));
        std::filesystem::create_directories(path);
    }
    ~scratch_directory() { std::filesystem::remove_all(path); }
    scratch_directory(const scratch_directory &) = delete;
    scratch_directory &operator=(const scratch_directory &) = delete;

    std::filesystem::path path;
};

std::string schema_text(const std::string &prefix, const std::string &body)
{
    return "<xsd:schema xmlns:xsd=\"http://www.w3.org/2001/XMLSchema\" xmlns:t=\"http://www.zuv.example/t\" "
           "xmlns:u=\"http://www.zuv.example/u\" targetNamespace=\"http://www.zuv.example/" +
           prefix + "\" elementFormDefault=\"qualified\">" + body + "</xsd:schema>\n";
}

std::string port_text(const std::string &body)
{
    return "<w:definitions xmlns:w=\"http://schemas.xmlsoap.org/wsdl/\" xmlns:t=\"http://www.zuv.example/t\" "
           "xmlns:s=\"http://schemas.xmlsoap.org/wsdl/soap/\" targetNamespace=\"http://www.zuv.example/t\">"
           "<w:message name=\"m\"><w:part name=\"p\" element=\"t:go\"/></w:message><w:portType "
           "name=\"Port\">" +
           body +
           "</w:portType><w:binding name=\"PortSoapBinding\" type=\"t:Port\"><s:binding style=\"document\"/>"
           "</w:binding><w:service name=\"Port\"><w:port name=\"p\" binding=\"t:PortSoapBinding\">"
           "<s:address location=\"http://127.0.0.1/\"/></w:port></w:service></w:definitions>\n";
}

void write_input(const std::filesystem::path &directory, const std::string &name, const std::string &text)
{
    std::ofstream(directory / name, std::ios::binary) << text;
}

void write_class_of(const std::filesystem::path &directory, const std::string &members, std::string &type_ids)
{
    type_ids.insert(0, "20 class t__Thing\n");
    write_input(directory, "t.xsd",
                schema_text("t", "<xsd:complexType name=\"Thing\"><xsd:sequence>" + members +
                                     "</xsd:sequence></xsd:complexType>"));
}

} // namespace

std::vector<contract_case> read_cases(const std::filesystem::path &path)
{
    std::ifstream file(path);
    std::vector<contract_case> cases = {{path.stem().string(), {}}};
    std::string line;
    for (std::size_t number = 1; std::getline(file, line); ++number) {
        if (!line.starts_with("== ")) {
            if (!cases.back().sections.empty())
                cases.back().sections.back().text += line + "\n";
            continue;
        }
        std::istringstream words(line.substr(3));
        case_section section;
        words >> section.kind >> std::ws;
        if (section.kind == "case") {
            cases.emplace_back();
            std::getline(words, cases.back().name, ':');
            words >> section.kind >> std::ws;
        }
        section.line = number;
        if (section.kind == "schema")
            words >> section.argument >> std::ws;
        const bool is_text = section.kind == "schema" || section.kind == "types" || section.kind == "port";
        std::getline(words, is_text ? section.text : section.argument);
        section.text += section.text.empty() ? "" : "\n";
        cases.back().sections.push_back(section);
    }
    if (cases.front().sections.empty()) // only its remarks come before the first case
        cases.erase(cases.begin());
    return cases;
}

std::string translation::output(const std::string &path) const
{
    if (path == "model")
        return model;
    for (const emitted_file &file : files) {
        if (file.path == path)
            return file.text;
    }
    return {};
}

translation translate(const std::filesystem::path &directory)
{
    translation result;
    try {
        const contract_model model = build_model(read_contract(directory));
        std::ostringstream dump;
        dump_model(model, dump);
        result.model = dump.str();
        result.files = emit_contract(model, "http://service.example");
    } catch (const contract_error &error) {
        result.error = error.what();
    }
    return result;
}

translation translate(const contract_case &contract)
{
    const scratch_directory directory;
    std::string type_ids = BASE_TYPE_IDS;
    write_input(directory.path, "namespaces.txt", BASE_NAMESPACES);
    for (const case_section &section : contract.sections) {
        if (section.kind == "types")
            type_ids.insert(0, section.text);
        else if (section.kind == "schema")
            write_input(directory.path, section.argument + ".xsd",
                        schema_text(section.argument, section.text));
        else if (section.kind == "members")
            write_class_of(directory.path, section.argument, type_ids);
        else if (section.kind == "port")
            write_input(directory.path, "Port.wsdl", port_text(section.text));
        else if (section.kind == "contract")
            return translate(std::filesystem::path(GENERATOR_TEST_DATA) / section.argument);
        else if (section.kind == "file")
            write_input(directory.path, section.argument, section.text);
    }
    write_input(directory.path, "type_ids.txt", type_ids);
    return translate(directory.path);
}

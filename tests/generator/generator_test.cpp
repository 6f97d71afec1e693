// generator_test.cpp - contracts in, text or a refusal out. The cases are data: rules/ and wrong_contracts.txt.
//
// A case file holds sections, each opened by a line "== kind argument":
//   case NAME: ...   in a file of several cases: opens one; its first section follows in the same line
//   types            rows of type_ids.txt; those of BASE_TYPE_IDS follow them
//   schema PREFIX    what is inside xsd:schema in PREFIX.xsd, whose first line is the section's
//   members XML      schema t with the one class Thing, id 20, of these elements, all in its first line
//   port             what is inside the portType of Port.wsdl, with a message m; the first line is the section's
//   file NAME        any other input file, as it is
//   contract FOLDER  all of it in place of the above: a folder of tests/generator
//   expect PATH      lines that come together in this output; "model": in the dump of the model
//   error MESSAGE    what refuses the contract
// A schema, a port or types of one line are in the line of their section. Lines before the first section say what the
// case is about.
#include <fstream>
#include <sstream>

#include <gtest/gtest.h>
#include <sys/wait.h>
#include <unistd.h>

#include "emit.h"
#include "names.h"
#include "reader.h"

namespace {

const std::filesystem::path DATA = GENERATOR_TEST_DATA;

struct case_section {
    std::string kind, argument, text;
    std::size_t line = 0; // in the case file
};

struct contract_case {
    std::string name;
    std::vector<case_section> sections;
};

// What became of a contract.
struct translation {
    std::string error; // empty when it was translated
    std::string model; // as dumped
    std::vector<emitted_file> files;

    // Text of an output, "model" included; empty for none.
    std::string output(const std::string &path) const
    {
        if (path == "model")
            return model;
        for (const emitted_file &file : files) {
            if (file.path == path)
                return file.text;
        }
        return {};
    }
};

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

struct scratch_directory {
    scratch_directory() { std::filesystem::create_directories(path); }
    ~scratch_directory() { std::filesystem::remove_all(path); }
    const std::filesystem::path path =
        std::filesystem::temp_directory_path() / ("contract-" + std::to_string(getpid()));
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

// All cases of a file; a file without "== case" is one, of the file's name.
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
            return translate(DATA / section.argument);
        else if (section.kind == "file")
            write_input(directory.path, section.argument, section.text);
    }
    write_input(directory.path, "type_ids.txt", type_ids);
    return translate(directory.path);
}

std::vector<contract_case> rule_cases()
{
    std::vector<std::filesystem::path> paths;
    for (const auto &entry : std::filesystem::directory_iterator(DATA / "rules"))
        paths.push_back(entry.path());
    std::sort(paths.begin(), paths.end());
    std::vector<contract_case> cases;
    for (const auto &path : paths)
        cases.push_back(read_cases(path).front());
    return cases;
}

std::string file_text(const std::filesystem::path &path)
{
    std::ifstream file(path);
    std::ostringstream text;
    text << file.rdbuf();
    return text.str();
}

std::string case_name(const testing::TestParamInfo<contract_case> &info)
{
    return info.param.name;
}

class rule : public testing::TestWithParam<contract_case> {};
class wrong_contract : public testing::TestWithParam<contract_case> {};

TEST_P(rule, is_translated_as_expected)
{
    const translation result = translate(GetParam());
    ASSERT_EQ(result.error, "");
    std::size_t expectations = 0;
    for (const case_section &section : GetParam().sections) {
        if (section.kind != "expect")
            continue;
        ++expectations;
        const std::string output = "\n" + result.output(section.argument);
        EXPECT_NE(output.find("\n" + section.text), std::string::npos)
            << GetParam().name << ", line " << section.line << ": not in " << section.argument << ":\n"
            << section.text << "which is\n"
            << output;
    }
    EXPECT_GT(expectations, 0U);
}
INSTANTIATE_TEST_SUITE_P(rules, rule, testing::ValuesIn(rule_cases()), case_name);

TEST_P(wrong_contract, is_refused_with_place_and_reason)
{
    const translation result = translate(GetParam());
    const case_section &last = GetParam().sections.back();
    ASSERT_EQ(last.kind, "error");
    EXPECT_EQ(result.error, last.argument) << "line " << last.line;
    EXPECT_TRUE(result.files.empty());
}
INSTANTIATE_TEST_SUITE_P(wrong, wrong_contract, testing::ValuesIn(read_cases(DATA / "wrong_contracts.txt")),
                         case_name);

TEST(published_contract, gives_every_type_id_a_row_and_every_class_one_home)
{
    const translation result = translate(std::filesystem::path(PUBLISHED_CONTRACT));
    ASSERT_EQ(result.error, "");
    const auto count = [](const std::string &text, const std::string &part) {
        std::size_t found = 0;
        for (std::size_t at = text.find(part); at != std::string::npos; at = text.find(part, at + 1))
            ++found;
        return found;
    };
    std::size_t declared = 0, traits = 0, defined = 0;
    for (const emitted_file &file : result.files) {
        declared += count(file.text, "\nclass ZUV_CLASS ") - count(file.text, "Proxy : public soap {");
        traits += count(file.text, "struct traits<");
        const std::size_t in_unit = count(file.text, "BINDING_DEFINE_CLASS(");
        EXPECT_LE(in_unit, 40U) << file.path;
        defined += in_unit;
    }
    const std::size_t ids = count(result.model, "\ntype ");
    EXPECT_EQ(declared, traits);
    EXPECT_EQ(declared, defined);
    EXPECT_EQ(declared,
              count(result.output("src/registry_tables.cpp"), ".ops = &traits<") - 1); // base64Binary
    EXPECT_EQ(ids, count(result.output("include/zuv_client_pro/type_ids.h"), "    SOAP_TYPE_"));
}

TEST(names, are_spelled_for_cpp)
{
    static const std::pair<const char *, const char *> cases[] = {
        {"plain", "plain"}, {"a.b", "a_x002eb"}, {"UTF-8", "UTF_8"}, {"private", "private_"},
        {"xor", "xor_"},    {"7bit", "_7bit"},   {"two words", ""},  {"", ""}};
    for (const auto &[local, name] : cases)
        EXPECT_EQ(identifier(local), name);
    EXPECT_EQ(type_name("p:A.B"), "p__A_x002eB");
}

struct run_result {
    int status;
    std::string said;
};

run_result run(const std::string &arguments)
{
    FILE *pipe = popen((std::string(CONTRACT2CPP) + " " + arguments + " 2>&1").c_str(), "r");
    if (!pipe)
        return {-1, "can't be run"};
    std::string said;
    char buffer[4096];
    for (std::size_t n; (n = fread(buffer, 1, sizeof buffer, pipe)) > 0;)
        said.append(buffer, n);
    const int status = pclose(pipe);
    return {WIFEXITED(status) ? WEXITSTATUS(status) : -1, said};
}

TEST(program, tells_success_refusal_and_wrong_use_apart)
{
    const translation expected = translate(DATA / "everything");
    const std::string everything = " --schema " + (DATA / "everything").string();
    const std::filesystem::path out =
        std::filesystem::temp_directory_path() / ("contract2cpp-" + std::to_string(getpid()));
    const run_result made = run(everything + " --out " + out.string() + " --authority http://other.example");
    EXPECT_EQ(made.status, 0) << made.said;
    EXPECT_EQ(made.said, "");
    EXPECT_EQ(file_text(out / "include/zuv_client_pro/all.h"),
              expected.output("include/zuv_client_pro/all.h"));
    EXPECT_NE(file_text(out / "src/contract_namespaces.cpp").find("\"http://other.example/all\""),
              std::string::npos);
    std::filesystem::remove_all(out);

    EXPECT_EQ(run(everything + " --list").said, file_text(DATA / "everything/outputs.txt"));
    std::filesystem::copy(DATA / "everything", out);
    std::ofstream(out / "outputs.txt", std::ios::app) << "src/one_more.cpp\n";
    const run_result unlisted = run("--schema " + out.string() + " --out " + (out / "made").string());
    EXPECT_EQ(unlisted.status, 1);
    EXPECT_TRUE(unlisted.said.starts_with("outputs.txt: ")) << unlisted.said;
    EXPECT_FALSE(std::filesystem::exists(out / "made"));
    std::filesystem::remove_all(out);

    const run_result dumped = run(everything + " --dump-model");
    EXPECT_EQ(dumped.status, 0);
    EXPECT_EQ(dumped.said, expected.model);

    const run_result refused = run("--schema " + (DATA / "rules").string() + " --dump-model");
    EXPECT_EQ(refused.status, 1);
    EXPECT_EQ(refused.said, "namespaces.txt: can't be read\n");

    for (const char *wrong : {"", "--schema", "--schema x", "--out x", "--schema x --unknown y",
                              "--schema x --out y --dump-model"}) {
        const run_result result = run(wrong);
        EXPECT_EQ(result.status, 2) << wrong;
        EXPECT_TRUE(result.said.starts_with("usage: ")) << wrong;
    }
}

} // namespace

// generator_test.cpp - contracts in, text or a refusal out. The cases are data: rules/ and
// wrong_contracts.txt.
#include <algorithm>
#include <array>
#include <cstdio>
#include <fstream>
#include <sstream>

#include <gtest/gtest.h>
#include <sys/wait.h>

#include "case_file.h"
#include "names.h"

namespace {

const std::filesystem::path DATA = GENERATOR_TEST_DATA;

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

} // namespace

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
    static const std::array<std::array<const char *, 2>, 8> cases = {{{"plain", "plain"},
                                                                      {"a.b", "a_x002eb"},
                                                                      {"UTF-8", "UTF_8"},
                                                                      {"private", "private_"},
                                                                      {"xor", "xor_"},
                                                                      {"7bit", "_7bit"},
                                                                      {"two words", ""},
                                                                      {"", ""}}};
    for (const auto &[local, name] : cases)
        EXPECT_EQ(identifier(local), name);
    EXPECT_EQ(type_name("p:A.B"), "p__A_x002eB");
}

// --- the program ---

namespace {

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

} // namespace

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

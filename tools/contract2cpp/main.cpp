// contract2cpp - translates the contract's declarations into C++: classes, member lists, type table, proxies.
//
// Here: the command line. The work: read (reader.h), model (model.h), emit (emit.h).
// Exit status: 0 done, 1 the contract can't be translated, 2 wrong use.
#include <fstream>
#include <iostream>
#include <sstream>

#include "emit.h"
#include "reader.h"

namespace {

struct options {
    std::filesystem::path schema;
    std::filesystem::path out;
    std::string authority{CONTRACT_AUTHORITY};
    bool dump = false, list = false;
};

constexpr char USAGE[] = "usage: contract2cpp --schema DIR --out DIR [--authority URL]\n"
                         "       contract2cpp --schema DIR --dump-model\n"
                         "       contract2cpp --schema DIR --list\n";

bool parse(int argc, char **argv, options &options)
{
    for (int i = 1; i < argc; ++i) {
        const std::string_view name = argv[i];
        if (name == "--dump-model") {
            options.dump = true;
        } else if (name == "--list") {
            options.list = true;
        } else if (i + 1 == argc) { // NOLINT(bugprone-branch-clone): lacks its value; below, it is unknown
            return false;
        } else if (name == "--schema") {
            options.schema = argv[++i];
        } else if (name == "--out") {
            options.out = argv[++i];
        } else if (name == "--authority") {
            options.authority = argv[++i];
        } else {
            return false;
        }
    }
    return !options.schema.empty() && options.dump + options.list + !options.out.empty() == 1;
}

// The names of the files, a line each.
std::string names_of(const std::vector<emitted_file> &files)
{
    std::string names;
    for (const emitted_file &file : files)
        names += file.path + "\n";
    return names;
}

// The build reads from outputs.txt what will be written: other files would be missing, or not compiled.
void check_outputs(const std::filesystem::path &schema, const std::vector<emitted_file> &files)
{
    std::ifstream file(schema / "outputs.txt");
    std::ostringstream listed;
    listed << file.rdbuf();
    if (listed.str() != names_of(files))
        throw contract_error({"outputs.txt", 0},
                             "other files are written than it lists; renew it: contract2cpp --schema " +
                                 schema.string() + " --list >" + (schema / "outputs.txt").string());
}

} // namespace

int main(int argc, char **argv)
{
    options options;
    if (!parse(argc, argv, options)) {
        std::cerr << USAGE;
        return 2;
    }
    try {
        const contract_model model = build_model(read_contract(options.schema));
        if (options.dump) {
            dump_model(model, std::cout);
            return 0;
        }
        const std::vector<emitted_file> files = emit_contract(model, options.authority);
        if (options.list) {
            std::cout << names_of(files);
            return 0;
        }
        check_outputs(options.schema, files);
        for (const emitted_file &file : files)
            write_file(options.out, file);
    } catch (const contract_error &error) {
        std::cerr << error.what() << "\n";
        return 1;
    }
    return 0;
}

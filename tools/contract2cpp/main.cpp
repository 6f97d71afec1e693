// contract2cpp - translates the contract's declarations into C++: classes, member lists, type table, proxies.
//
// Here: the command line. The work: read (reader.h), model (model.h), emit (emit.h).
// Exit status: 0 done, 1 the contract can't be translated, 2 wrong use.
#include <cstring>
#include <iostream>

#include "emit.h"
#include "reader.h"

namespace {

struct options {
    std::filesystem::path schema;
    std::filesystem::path out;
    std::string authority{CONTRACT_AUTHORITY};
    bool dump = false;
};

constexpr char USAGE[] = "usage: contract2cpp --schema DIR --out DIR [--authority URL]\n"
                         "       contract2cpp --schema DIR --dump-model\n";

bool parse(int argc, char **argv, options &options)
{
    for (int i = 1; i < argc; ++i) {
        const std::string_view name = argv[i];
        if (name == "--dump-model") {
            options.dump = true;
        } else if (i + 1 == argc) { // NOLINT(bugprone-branch-clone): lacks its value; below, nobody knows it
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
    return !options.schema.empty() && options.dump == options.out.empty();
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
        if (options.dump)
            dump_model(model, std::cout);
        else
            for (const emitted_file &file : emit_contract(model, options.authority))
                write_file(options.out, file);
    } catch (const contract_error &error) {
        std::cerr << error.what() << "\n";
        return 1;
    }
    return 0;
}

// seed.cpp - see seed.h.
#include "seed.h"

#include <algorithm>
#include <cstring>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <stdexcept>
#include <string>
#include <string_view>
#include <vector>

#include <zuv_client_pro/soap_error.h>
#include <zuv_client_pro/soap_io.h>
#include <zuv_client_pro/soap_xml.h>

#include "data_files.h"
#include "enclosures.h"
#include "faults.h"
#include "port.h"

namespace service {

namespace {

constexpr std::uint32_t SEED_MODE = MODE_BARE_XML | MODE_BUFFERED | MODE_UTF_STRINGS | MODE_STRICT;

[[noreturn]] void fail(const std::string &path, const std::string &why)
{
    throw std::runtime_error("seed " + path + ": " + why);
}

std::vector<std::string> seed_files(const std::string &place)
{
    if (!std::filesystem::is_directory(place))
        return {place};
    std::vector<std::string> files;
    for (const auto &entry : std::filesystem::directory_iterator(place))
        if (entry.path().extension() == ".xml")
            files.push_back(entry.path());
    if (files.empty())
        fail(place, "the folder holds no .xml file");
    std::sort(files.begin(), files.end());
    return files;
}

std::string text_of_file(const std::string &path)
{
    std::ifstream file(path, std::ios::binary);
    std::string text{std::istreambuf_iterator<char>(file), {}};
    if (!file.is_open() || file.bad())
        throw std::runtime_error("it can't be read");
    return text;
}

std::size_t give_text(soap *ctx, char *buffer, std::size_t length)
{
    auto *const left = static_cast<std::string_view *>(ctx->user);
    const std::size_t given = left->copy(buffer, length);
    left->remove_prefix(given);
    return given;
}

[[noreturn]] void fail_as_engine(soap *ctx)
{
    if (ctx->error == SOAP_EOF)
        throw std::runtime_error("it holds no whole XML document");
    soap_fault_text_fill(ctx);
    const char *const text = *soap_fault_string_field(ctx);
    throw std::runtime_error(text == nullptr ? "error " + std::to_string(ctx->error) : text);
}

// The operation of the element whose tag was read.
const operation &operation_asked(soap *ctx)
{
    for (const port *const candidate : all_ports())
        if (const operation *const found = candidate->by_type ? nullptr : find_operation(ctx, *candidate))
            return *found;
    throw std::runtime_error(std::string("no operation has the request element '") + ctx->tag + "'");
}

void carry_out(soap *ctx, session &borrowed, const settings &config, std::size_t bytes)
{
    if (soap_receive_begin(ctx) != SOAP_OK || soap_element_head_read(ctx) != SOAP_OK)
        fail_as_engine(ctx);
    const operation &asked = operation_asked(ctx);
    void *const object = asked.read(ctx, asked.request_element);
    if (object != nullptr)
        soap_read_independents(ctx);
    if (ctx->error == SOAP_TAG_MISMATCH)
        refuse_unexpected(ctx);
    if (object == nullptr || ctx->error != SOAP_OK || soap_receive_finish(ctx) != SOAP_OK)
        fail_as_engine(ctx);
    enclosures none(config, borrowed.documents.data_directory());
    call c{ctx,  borrowed.documents, borrowed.codec, config,  nullptr, "",
           none, borrowed.judged,    bytes,          {{ctx}}, true};
    asked.run(c, object);
}

void carry_out_file(const std::string &path, session &borrowed, const settings &config)
{
    const std::string text = text_of_file(path);
    std::string_view left = text;
    soap context(SEED_MODE);
    context.max_depth = config.depth_limit;
    context.max_memory = config.memory_limit();
    context.user = &left;
    context.on_recv = give_text;
    try {
        carry_out(&context, borrowed, config, text.size());
    } catch (const refusal &refused) {
        throw std::runtime_error(text_of(refused.fault->description));
    }
}

} // namespace

std::size_t seed_store(session &borrowed, const settings &config)
{
    if (config.seed.empty())
        return 0;
    const std::vector<std::string> files = seed_files(config.seed);
    for (const std::string &file : files) {
        std::string wrong;
        try {
            carry_out_file(file, borrowed, config);
        } catch (const std::exception &failure) {
            wrong = failure.what();
        }
        borrowed.codec.reset();
        borrowed.judged.reset();
        if (wrong.empty())
            continue;
        empty_store(borrowed);
        fail(file, wrong);
    }
    return files.size();
}

void empty_store(session &borrowed)
{
    for (const std::string &name : borrowed.documents.clear())
        remove_data(borrowed.documents.data_directory(), name);
}

} // namespace service

// documents.cpp - see documents.h.
#include "documents.h"

#include <algorithm>
#include <cstring>
#include <new>

#include <zuv_client_pro/soap_error.h>
#include <zuv_client_pro/soap_io.h>
#include <zuv_client_pro/soap_memory.h>
#include <zuv_client_pro/soap_registry.h>

#include "failure.h"
#include "text_files.h"

namespace cli {

namespace {

constexpr std::uint32_t DOCUMENT_MODE = MODE_BARE_XML | MODE_BUFFERED | MODE_UTF_STRINGS;
constexpr std::size_t PROBLEM_SIZE = 512; // bytes of a reason that are kept

std::string problem_of(soap &ctx)
{
    char text[PROBLEM_SIZE] = "";
    soap_fault_print_text(&ctx, text, sizeof text);
    const std::string_view all = text;
    const std::size_t begin = all.find('"'), end = all.find("\"\nDetail");
    return printable(begin < end && end != std::string_view::npos ? all.substr(begin + 1, end - begin - 1)
                                                                  : all);
}

int append(soap *ctx, const char *data, std::size_t length)
{
    static_cast<std::string *>(ctx->user)->append(data, length);
    return SOAP_OK;
}

// A prefix is in use where it begins a name, or a QName in a value.
bool uses_prefix(std::string_view xml, std::string_view prefix)
{
    const std::string name = std::string(prefix) + ":";
    for (std::size_t at = xml.find(name); at != std::string_view::npos; at = xml.find(name, at + 1))
        if (at != 0 && std::strchr("</ \"\n", xml[at - 1]) != nullptr)
            return true;
    return false;
}

// Removes unused declarations from the root element, which has all of them.
std::string without_idle_declarations(std::string xml)
{
    constexpr std::string_view DECLARATION = "xmlns:";
    const std::size_t root = xml.find('<', xml.starts_with("<?") ? 2 : 0);
    std::size_t end = xml.find('>', root);
    for (std::size_t at = xml.find(DECLARATION, root); at < end && end != std::string_view::npos;
         at = xml.find(DECLARATION, at)) {
        const std::size_t name = at + DECLARATION.size(), equals = xml.find('=', name);
        const std::size_t value_end = xml.find('"', equals + 2) + 1;
        const std::string_view all = xml, prefix = all.substr(name, equals - name);
        if (uses_prefix(all.substr(root, at - root), prefix) || uses_prefix(all.substr(value_end), prefix)) {
            at = value_end;
            continue;
        }
        at = xml.find_last_not_of(" \t\r\n", at - 1) + 1;
        xml.erase(at, value_end - at);
        end = xml.find('>', root);
    }
    return xml;
}

} // namespace

std::string namespace_declarations(const std::string &separator, const std::set<std::string> &prefixes)
{
    constexpr char XSI_URI[] = "http://www.w3.org/2001/XMLSchema-instance"; // the table's has a wildcard
    std::string text;
    for (const soap_namespace *row = soap_program_namespaces; row->prefix != nullptr; ++row)
        if (prefixes.contains(row->prefix))
            text.append(separator)
                .append("xmlns:")
                .append(row->prefix)
                .append("=\"")
                .append(row->prefix == std::string_view("xsi") ? XSI_URI : row->uri)
                .append("\"");
    return text;
}

document_reader::document_reader() : context_(std::make_unique<soap>(DOCUMENT_MODE | MODE_STRICT))
{
    context_->user = this;
    context_->on_recv = give_input;
}

document_reader::~document_reader() = default;

std::size_t document_reader::give_input(soap *ctx, char *buffer, std::size_t length)
{
    auto *const self = static_cast<document_reader *>(ctx->user);
    const std::size_t given = std::min(length, self->input_.size());
    std::memcpy(buffer, self->input_.data(), given);
    self->input_.remove_prefix(given);
    return given;
}

void *document_reader::read(std::string_view xml, const std::function<void *(soap *ctx)> &read,
                            std::string &problem)
{
    input_ = xml;
    context_->error = SOAP_OK;
    void *const object = soap_receive_begin(context_.get()) == SOAP_OK ? read(context_.get()) : nullptr;
    if (object != nullptr && soap_receive_finish(context_.get()) == SOAP_OK)
        return object;
    problem = problem_of(*context_);
    return nullptr;
}

void *document_reader::make(int type)
{
    void *const object = soap_instantiate(context_.get(), type, nullptr, nullptr, nullptr);
    if (object == nullptr)
        throw std::bad_alloc();
    return object;
}

std::string document_text(const std::function<int(soap *ctx)> &write, bool indent)
{
    const auto context = std::make_unique<soap>(DOCUMENT_MODE | (indent ? MODE_INDENT : 0));
    soap *const ctx = context.get();
    std::string text;
    ctx->user = &text;
    ctx->on_send = append;
    if (soap_count_begin(ctx) != SOAP_OK || soap_count_end(ctx) != SOAP_OK ||
        soap_send_begin(ctx) != SOAP_OK || write(ctx) != SOAP_OK || soap_send_finish(ctx) != SOAP_OK)
        throw failure(ctx->error == SOAP_OUT_OF_MEMORY ? EXIT_OTHER : EXIT_ANSWER,
                      "the object can't be written: " + problem_of(*ctx));
    return without_idle_declarations(std::move(text));
}

} // namespace cli

// request_document.cpp - see request_document.h.
#include "request_document.h"

#include <zuv_client_pro/soap_registry.h>

#include "check.h"
#include "failure.h"
#include "json.h"
#include "text_files.h"

namespace cli {

namespace {

[[noreturn]] void refuse(const std::string &file, const std::string &why)
{
    throw failure(EXIT_DOCUMENT, (file == "-" ? "standard input" : file) + ": " + why);
}

} // namespace

void *read_document(document_reader &reader, const std::string &file, const contract::data_class &type,
                    const std::function<void *(soap *ctx)> &read)
{
    const std::string given = read_file(file);
    const std::string xml =
        is_json(given) ? xml_of(given, type, file == "-" ? "standard input" : printable(file)) : given;
    const checked_document checked = check_document(xml, nullptr);
    if (checked.type != nullptr && checked.type != &type)
        refuse(file,
               "<" + printable(checked.root) + "> holds a " + checked.type->name + ", not a " + type.name);
    if (!checked.findings.empty())
        refuse(file, "not a " + std::string(type.name) + ":\n" + finding_lines(file, checked.findings));
    if (checked.type == nullptr)
        refuse(file, "a SOAP message, not a " + std::string(type.name));
    std::string problem;
    void *const object = reader.read(xml, read, problem);
    if (object == nullptr)
        refuse(file, problem);
    return object;
}

void *read_request_document(document_reader &reader, const std::string &file, const operation &op)
{
    const contract::data_class &type = *contract::find_class(soap_type_name(op.request_type));
    if (!file.empty())
        return read_document(reader, file, type, op.read_request);
    return reader.make(op.request_type);
}

} // namespace cli

// request_header.cpp - see request_header.h.
#include "request_header.h"

#include <zuv_client_pro/soap_registry.h>

#include "request_document.h"

namespace cli {

namespace {

template <class T> T *read_file_as(document_reader &reader, const std::string &file)
{
    const auto read = [](soap *ctx) -> void * {
        auto *const object =
            static_cast<T *>(soap_instantiate(ctx, T().soap_type(), nullptr, nullptr, nullptr));
        return object == nullptr ? nullptr : object->soap_get(ctx, nullptr, nullptr);
    };
    return static_cast<T *>(
        read_document(reader, file, *contract::find_class(soap_type_name(T().soap_type())), read));
}

} // namespace

request_header::request_header(const header_options &options) : options_(options)
{
    if (!options_.file.empty())
        header_ = read_file_as<protocol__Header>(reader_, options_.file);
    wanted_ = !options_.file.empty() || !options_.credentials.empty() || !options_.notes.empty();
    const auto set = [&](std::string *protocol__Header::*member, std::string &text) {
        if (text.empty())
            return;
        header_->*member = &text;
        wanted_ = true;
    };
    set(&protocol__Header::targetURI, options_.target);
    set(&protocol__Header::transactionId, options_.transaction);
    set(&protocol__Header::sequenceId, options_.sequence);
    set(&protocol__Header::correlationId, options_.correlation);
    set(&protocol__Header::priority, options_.priority);
    header_->note.insert(header_->note.end(), options_.notes.begin(), options_.notes.end());
    for (const std::string &file : options_.credentials)
        header_->credentials.push_back(read_file_as<protocol__Credentials>(reader_, file));
}

} // namespace cli

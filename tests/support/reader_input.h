// reader_input.h - documents for the XML reader, from memory and in every way that a network may cut them.
//
// A reading is a function of the context that tells what it saw as one text; every_reading runs it on the
// document whole, split at every place, and byte by byte, and expects the same text each time.
// expect_readings does so for a table of documents.
#pragma once

#include <algorithm>
#include <cstring>
#include <memory>
#include <span>
#include <string>
#include <string_view>

#include <gtest/gtest.h>

#include <zuv_client_pro/soap.h>
#include <zuv_client_pro/soap_log.h>
#include <zuv_client_pro/soap_xml.h>

namespace reader_input {

inline constexpr soap_namespace NAMESPACES[] = {
    {"SOAP-ENV", "http://schemas.xmlsoap.org/soap/envelope/", "http://www.w3.org/*/soap-envelope", nullptr},
    {"SOAP-ENC", "http://schemas.xmlsoap.org/soap/encoding/", "http://www.w3.org/*/soap-encoding", nullptr},
    {"xsi", "http://www.w3.org/2001/XMLSchema-instance", "http://www.w3.org/*/XMLSchema-instance", nullptr},
    {"xsd", "http://www.w3.org/2001/XMLSchema", nullptr, nullptr},
    {"wsdl", "http://schemas.xmlsoap.org/wsdl/", nullptr, nullptr},
    {"one", "urn:one", nullptr, nullptr},
    {"two_", "urn:two", nullptr, nullptr},
    {nullptr, nullptr, nullptr, nullptr},
};

// One reception of a document: the first piece has `first` bytes, each later one at most `piece`.
class reception {
public:
    explicit reception(std::string document, std::size_t first = SOAP_BUFFER_SIZE,
                       std::size_t piece = SOAP_BUFFER_SIZE, std::uint32_t mode = 0)
        : document_(std::move(document)), rest_(document_), next_(first), piece_(piece),
          context_(std::make_unique<soap>())
    {
        soap_reset_call(context());
        soap_log_set_received(context(), nullptr);
        context()->user = this;
        context()->on_recv = receive;
        context()->namespaces = NAMESPACES;
        context()->mode = mode;
        soap_namespace_table_copy(context());
        context()->soap_version = 1;
    }
    reception(const reception &) = delete;
    reception &operator=(const reception &) = delete;

    soap *context() { return context_.get(); }
    operator soap *() { return context_.get(); }
    soap *operator->() { return context_.get(); }

    // The context behind the start tag of the root element.
    soap *in_root()
    {
        EXPECT_EQ(soap_element_in_begin(context(), nullptr, 1, nullptr), 0);
        return context();
    }

private:
    static std::size_t receive(soap *ctx, char *buffer, std::size_t length)
    {
        auto *self = static_cast<reception *>(ctx->user);
        const std::size_t size = std::min({length, self->next_, self->rest_.size()});
        std::memcpy(buffer, self->rest_.data(), size);
        self->rest_.remove_prefix(size);
        self->next_ = self->piece_;
        return size;
    }

    std::string document_;
    std::string_view rest_;
    std::size_t next_;
    std::size_t piece_;
    std::unique_ptr<soap> context_;
};

template <class Read> std::string every_reading(const std::string &document, std::uint32_t mode, Read read)
{
    reception whole(document, SOAP_BUFFER_SIZE, SOAP_BUFFER_SIZE, mode);
    const std::string expected = read(whole.context());
    for (std::size_t split = 1; split < document.size(); ++split) {
        reception parts(document, split, SOAP_BUFFER_SIZE, mode);
        EXPECT_EQ(read(parts.context()), expected) << document << "\nsplit at " << split;
    }
    reception bytes(document, 1, 1, mode);
    EXPECT_EQ(read(bytes.context()), expected) << document << "\nbyte by byte";
    return expected;
}

struct reading {
    const char *rule;
    std::string document;
    std::string expected;
    std::uint32_t mode = 0;
};

template <class Read> void expect_readings(std::span<const reading> rows, Read read)
{
    for (const reading &row : rows) {
        SCOPED_TRACE(row.rule);
        EXPECT_EQ(every_reading(row.document, row.mode, read), row.expected);
    }
}

inline std::string failure(const soap *ctx)
{
    return "!" + std::to_string(ctx->error);
}

} // namespace reader_input

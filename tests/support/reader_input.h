// reader_input.h - documents for the XML reader, from memory and in every way that a network may cut them.
//
// A reading is a function of the context that tells what it saw as one text; every_reading runs it on the
// document whole, split at every place, and byte by byte, and expects the same text each time.
// expect_readings does so for a table of documents.
#pragma once

#include <span>

#include "support/memory_wire.h"
#include "support/testing.h"

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

// One reception of a document: the first piece has `first` bytes, each later one at most `later`.
struct reception : memory_wire {
    explicit reception(const std::string &document, std::size_t first = SOAP_BUFFER_SIZE,
                       std::size_t later = SOAP_BUFFER_SIZE, std::uint32_t modes = 0)
    {
        receive(document, first, later);
        soap_reset_call(this);
        namespaces = NAMESPACES;
        mode = modes;
        soap_namespace_table_copy(this);
        soap_version = 1;
    }
    soap *context() { return this; }
    operator soap *() { return this; }
    soap *operator->() { return this; }
    // The context after the start tag of the root element.
    soap *in_root()
    {
        EXPECT_EQ(soap_element_in_begin(this, nullptr, 1, nullptr), 0);
        return this;
    }
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

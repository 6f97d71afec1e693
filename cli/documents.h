// documents.h - XML of objects outside of messages: read into objects of a context, and written.
//
// Elsewhere: what is wrong with a document, and where (check.h).
#pragma once

#include <functional>
#include <memory>
#include <set>
#include <string>
#include <string_view>

#include <zuv_client_pro/soap.h>

namespace cli {

// Reads documents by the library's own reader, in strict mode. The objects live as long as the reader.
class document_reader {
public:
    document_reader();
    document_reader(const document_reader &) = delete;
    document_reader &operator=(const document_reader &) = delete;
    ~document_reader();

    // What `read` makes of the document's root element; null if it fails, and then `problem` is the library's
    // reason.
    void *read(std::string_view xml, const std::function<void *(soap *ctx)> &read, std::string &problem);

    // A new object of a type, as it is by default.
    void *make(int type);

private:
    static std::size_t give_input(soap *ctx, char *buffer, std::size_t length);
    std::unique_ptr<soap> context_;
    std::string_view input_;
};

// The XML that `write` writes, indented or in one line, without namespace declarations that nothing uses.
// failure if the library refuses.
std::string document_text(const std::function<int(soap *ctx)> &write, bool indent);

// Declarations of the contract's prefixes, a separator before each: ` xmlns:protocol="http://..."`.
std::string namespace_declarations(const std::string &separator, const std::set<std::string> &prefixes);

} // namespace cli

// request_document.h - documents of a known class, checked against the contract, then read by the library.
#pragma once

#include <functional>
#include <string>

#include "contract.h"
#include "documents.h"
#include "operations.h"

namespace cli {

// An object of the reader, of a document in XML or JSON. failure with EXIT_DOCUMENT and the findings if the document is not one of the
// class.
//   file  "-" for standard input
//   read  reads the root element as the class
void *read_document(document_reader &reader, const std::string &file, const contract::data_class &type,
                    const std::function<void *(soap *ctx)> &read);

// The request of an operation; without a file an empty one. The root element is the request's, one named by
// its class, or any request or answer of that class, so that what `get` gave can be changed and handed to
// `set`.
void *read_request_document(document_reader &reader, const std::string &file, const operation &op);

} // namespace cli

// request_header.h - the header block of a call: the options' members, put into the document given for the
// rest.
#pragma once

#include <string>

#include <zuv_client_pro/protocol.h>

#include "call_options.h"
#include "documents.h"

namespace cli {

class request_header {
public:
    explicit request_header(const header_options &options); // failure for documents that are wrong
    request_header(const request_header &) = delete;
    request_header &operator=(const request_header &) = delete;

    // The block for the next call, or null if it would be empty. Borrowed.
    protocol__Header *block() { return wanted_ ? header_ : nullptr; }

private:
    header_options options_; // the block's texts are its members
    document_reader reader_;
    protocol__Header own_, *header_ = &own_;
    bool wanted_ = false;
};

} // namespace cli

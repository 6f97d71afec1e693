// transfer_encoding.h - decodes the base64 or quoted-printable in which a MIME part may arrive, piece by
// piece.
//
// Always: what is held between two pieces is bounded, and a piece never decodes to more bytes than it
// has and were held.
#pragma once

#include <cstddef>
#include <memory>
#include <string>

#include <openssl/evp.h>

namespace service {

class transfer_decoder {
public:
    // Of a soap_mime_encoding: null for those that leave the bytes as they are.
    static std::unique_ptr<transfer_decoder> of(int encoding);

    transfer_decoder() = default;
    transfer_decoder(const transfer_decoder &) = delete;
    transfer_decoder &operator=(const transfer_decoder &) = delete;
    virtual ~transfer_decoder() = default;

    virtual const char *name() const = 0;
    // Appends what a piece decodes to. False: it isn't in this encoding; nothing more may be decoded.
    virtual bool decode(const char *data, std::size_t length, std::string &out) = 0;
    // The same for the end of the part.
    virtual bool finish(std::string &out) = 0;
};

} // namespace service

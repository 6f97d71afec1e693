// transfer_encoding.h - undoes the base64 or quoted-printable in which a MIME part may come, stretch by
// stretch.
//
// Always: what is held between two stretches is bounded, and a stretch never decodes to more bytes than it
// has, but for those that were held.
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
    // Appends what a stretch decodes to. False: it isn't of this encoding, and nothing more is to be decoded.
    virtual bool decode(const char *data, std::size_t length, std::string &out) = 0;
    // The same for the end of the part.
    virtual bool finish(std::string &out) = 0;
};

} // namespace service

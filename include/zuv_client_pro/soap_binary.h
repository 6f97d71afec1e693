// soap_binary.h - xsd__base64Binary: a byte buffer on the wire, inline as base64 or as an attachment.
#pragma once

#include <zuv_client_pro/soap.h>

class ZUV_CLASS xsd__base64Binary {
public:
    unsigned char *content = nullptr; // the bytes; the host's, or managed in an object that was read
    int size = 0;                     // bytes in content
    char *id = nullptr;               // attachment id ("cid:..."); null with type null: written inline
    char *type = nullptr;             // media type of the attachment
    char *options = nullptr;          // DIME options, or the MIME description on input
    struct soap *soap = nullptr;      // the context that made the object, or null

    xsd__base64Binary();
    xsd__base64Binary(const xsd__base64Binary &) = default;
    xsd__base64Binary &operator=(const xsd__base64Binary &) = default; // shares the bytes
    virtual int soap_type() const;
    virtual void soap_default(struct soap *ctx);
    virtual void soap_serialize(struct soap *ctx) const;
    virtual int soap_put(struct soap *ctx, const char *tag, const char *type) const;
    virtual int soap_out(struct soap *ctx, const char *tag, int id, const char *type) const;
    virtual void *soap_get(struct soap *ctx, const char *tag, const char *type);
    virtual void *soap_in(struct soap *ctx, const char *tag, const char *type);
    virtual ~xsd__base64Binary();
};

// soap_binary.h - xsd__base64Binary: a byte buffer on the wire, inline as base64 or as an attachment.
#pragma once

#include <zuv_client_pro/soap.h>
#include <zuv_client_pro/soap_registry.h>

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

// Makes managed objects, as soap_instantiate_T of every class (soap_class.h).
inline xsd__base64Binary *soap_instantiate_xsd__base64Binary(struct soap *ctx, int n, const char *xsi_type,
                                                             const char *array_type, std::size_t *size)
{
    constexpr int type_id = 10;
    return static_cast<xsd__base64Binary *>(
        soap_instantiate_array(ctx, type_id, n, xsi_type, array_type, size));
}

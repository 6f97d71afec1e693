// soap_binary.h - xsd__base64Binary: a byte buffer on the wire, inline as base64 or as an attachment.
//
// Elsewhere: its operations, which are those of every data class (soap_class.h); attachments
// (soap_attachment.h).
#pragma once

#include <zuv_client_pro/soap.h>
#include <zuv_client_pro/soap_registry.h>

// Bytes as a member of a data class. They are borrowed while a message is sent; those of an object that was
// read are managed. With an id or a type the bytes are sent as an attachment.
class ZUV_CLASS xsd__base64Binary {
public:
    unsigned char *content = nullptr; // the bytes
    int size = 0;                     // bytes in content
    char *id = nullptr;               // attachment id ("cid:..."); null with type null: written inline
    char *type = nullptr;             // media type of the attachment
    char *options = nullptr;          // DIME options, or the MIME description on input
    struct soap *soap = nullptr;      // the context that made the object, or null

    // An empty value, or a copy, which shares the bytes.
    xsd__base64Binary();
    xsd__base64Binary(const xsd__base64Binary &) = default;
    // Shares the bytes.
    //   returns  the object
    xsd__base64Binary &operator=(const xsd__base64Binary &) = default;
    // The operations of a data class: see soap_class.h.
    //   ctx      the context
    //   tag      name of the element, "prefix:local"; when reading, null for any
    //   id       number for an id attribute; -1 to look it up
    //   type     value of xsi:type, none if null or empty
    //   returns  as in soap_class.h
    virtual int soap_type() const;
    virtual void soap_default(struct soap *ctx);
    virtual void soap_serialize(struct soap *ctx) const;
    virtual int soap_put(struct soap *ctx, const char *tag, const char *type) const;
    virtual int soap_out(struct soap *ctx, const char *tag, int id, const char *type) const;
    virtual void *soap_get(struct soap *ctx, const char *tag, const char *type);
    virtual void *soap_in(struct soap *ctx, const char *tag, const char *type);
    // Frees nothing: the bytes belong to the host program or the context.
    virtual ~xsd__base64Binary();
};

// Makes managed objects, as the soap_instantiate_... of every class (SOAP_CLASS_MAKER in soap_class.h).
//   n           objects in one array; -1: a single object
//   xsi_type    null, or an XML name
//   array_type  not used
//   size        takes the bytes of all objects; null is allowed
//   returns     the object or the first of the array
//   null        SOAP_OUT_OF_MEMORY
inline xsd__base64Binary *soap_instantiate_xsd__base64Binary(struct soap *ctx, int n, const char *xsi_type,
                                                             const char *array_type, std::size_t *size)
{
    constexpr int type_id = 10;
    return static_cast<xsd__base64Binary *>(
        soap_instantiate_array(ctx, type_id, n, xsi_type, array_type, size));
}

// soap_class.h - the operations that every data class has, declared once.
//
// Here: what the generated classes (protocol*.h) have in common. Elsewhere: making an object by type id
// (soap_registry.h), the numbers of the types (type_ids.h).
//
// Always: an object that the host makes has a null `soap`, and its pointers are the host's. An object that
// the engine makes belongs to its context with all that it points to, until soap_discard_objects. Copying an
// object copies values and vectors and shares what pointers name. Classes have virtual operations in one
// order, so a derived class's object serves wherever a base's is asked for.
#pragma once

#include <cstddef>

#include <zuv_client_pro/soap.h>
#include <zuv_client_pro/soap_registry.h>

// Construction, copying, and the virtual operations of a root class T, in the order of their slots:
//   soap_type
//       The class's type id.
//   soap_default
//       Sets every member to its default and `soap` to ctx, which may be null.
//   soap_serialize
//       The mark pass: notes what the object reaches, so that shared objects are found. Writes nothing.
//   soap_put
//       Writes the object as a whole element of a message: soap_out, then the independent elements of encoded
//       SOAP 1.1. `tag`: "prefix:local"; null takes the XML type's name. `type`: written as xsi:type unless
//       null or empty; a derived class always writes its own. 0 or an error code.
//   soap_out
//       Writes the object as one element. `id`: number for an id attribute, -1 for none needed.
//   soap_get
//       Reads the object from the element `tag` (null: any), then the independent elements. `type` isn't
//       looked at. This object, or null with ctx->error set.
//   soap_in
//       Reads the element into this object. This object or the one that took its place (of a derived class
//       named by xsi:type, or the target of a reference); null with ctx->error set.
#define SOAP_CLASS_OPERATIONS(T)                                                                             \
    T();                                                                                                     \
    T(const T &) = default;                                                                                  \
    T &operator=(const T &) = default;                                                                       \
    virtual int soap_type() const;                                                                           \
    virtual void soap_default(struct soap *ctx);                                                             \
    virtual void soap_serialize(struct soap *ctx) const;                                                     \
    virtual int soap_put(struct soap *ctx, const char *tag, const char *type) const;                         \
    virtual int soap_out(struct soap *ctx, const char *tag, int id, const char *type) const;                 \
    virtual void *soap_get(struct soap *ctx, const char *tag, const char *type);                             \
    virtual void *soap_in(struct soap *ctx, const char *tag, const char *type);                              \
    virtual ~T();

// The same for a class with a base.
#define SOAP_DERIVED_CLASS_OPERATIONS(T)                                                                     \
    T();                                                                                                     \
    T(const T &) = default;                                                                                  \
    T &operator=(const T &) = default;                                                                       \
    int soap_type() const override;                                                                          \
    void soap_default(struct soap *ctx) override;                                                            \
    void soap_serialize(struct soap *ctx) const override;                                                    \
    int soap_put(struct soap *ctx, const char *tag, const char *type) const override;                        \
    int soap_out(struct soap *ctx, const char *tag, int id, const char *type) const override;                \
    void *soap_get(struct soap *ctx, const char *tag, const char *type) override;                            \
    void *soap_in(struct soap *ctx, const char *tag, const char *type) override;                             \
    ~T() override;

// soap_instantiate_T(ctx, n, xsi_type, array_type, size): makes managed objects of T, freed with the
// context's objects.
//   n           objects in one array; -1: a single object
//   xsi_type    null, or the XML name of T or of a class derived from it, which is made then; other names are
//               passed over
//   array_type  not looked at
//   size        unless null takes the bytes of all objects
// Null with error 20 if memory runs out.
#define SOAP_CLASS_MAKER(T)                                                                                  \
    inline T *soap_instantiate_##T(struct soap *ctx, int n, const char *xsi_type, const char *array_type,    \
                                   std::size_t *size)                                                        \
    {                                                                                                        \
        return static_cast<T *>(soap_instantiate_array(ctx, SOAP_TYPE_##T, n, xsi_type, array_type, size));  \
    }

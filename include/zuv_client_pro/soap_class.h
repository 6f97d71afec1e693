// soap_class.h - the operations that every data class has, declared once.
//
// Here: what the generated classes (protocol*.h) have in common. Elsewhere: making an object by type id
// (soap_registry.h), the numbers of the types (type_ids.h).
//
// Always: an object that the host program makes has a null `soap`, and its pointers belong to the host
// program. An object that the engine makes belongs to its context with all that it points to, until
// soap_discard_objects. Copying an object copies values and vectors; what pointers name is shared. Classes
// have virtual operations in one order, so a derived class's object can be used wherever one of its base is
// asked for.
#pragma once

#include <cstddef>

#include <zuv_client_pro/soap.h>
#include <zuv_client_pro/soap_registry.h>

// Construction, copying, and the virtual operations of a root class T, in the order of their slots. Errors of
// writing and reading: soap_xml.h.
//   constructors
//       All members at their defaults, with a null `soap`; or a copy, which shares what pointers name.
//   operator=
//       Copies all members; what pointers name is shared. Returns the object.
//   destructor
//       Frees vectors and texts that are members; what pointers name is left alone.
//   soap_type
//       Which class the object is of. Returns the class's type id.
//   soap_default
//       Sets every member to its default and `soap` to ctx, which may be null.
//   soap_serialize
//       The mark pass, before sending: enters what the object reaches in the pointer table, so that shared
//       objects are found. Writes nothing. SOAP_OUT_OF_MEMORY in ctx->error if the table can't grow.
//   soap_put
//       Writes the object as a whole element of a message: soap_out, then the independent elements of encoded
//       SOAP 1.1. Called during sending. Null as tag takes the XML type's name. Returns SOAP_OK or an error
//       of writing.
//   soap_out
//       Writes the object as one element. Called during sending. Returns SOAP_OK or an error of writing.
//   soap_get
//       Reads the object from the next element, as soap_in does, then the independent elements. Called during
//       receiving. type is not used. Returns this object; null with ctx->error: SOAP_TAG_MISMATCH or
//       SOAP_NO_TAG if the element doesn't come next, SOAP_OCCURS in strict mode for a missing member, or
//       another error of reading.
//   soap_in
//       Reads the next element into this object; what it refers to in a later element is stored at the end of
//       the message. Called during receiving. type is not used. Returns this object, or null as soap_get.
// Their arguments:
//   ctx   the context
//   tag   name of the element, "prefix:local"; when reading, null for any
//   id    number for an id attribute; -1 to look it up
//   type  value of xsi:type, none if null or empty; a derived class always writes its own
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

// soap_instantiate_T(ctx, n, xsi_type, array_type, size): makes managed objects of class T, which live until
// soap_discard_objects.
//   n           objects in one array; -1: a single object
//   xsi_type    null, or the XML name of T or of a class derived from it, which is made then; other names are
//               ignored
//   array_type  not used
//   size        takes the bytes of all objects; null is allowed
//   returns     the object, or the first of the array
//   null        SOAP_OUT_OF_MEMORY in ctx->error
#define SOAP_CLASS_MAKER(T)                                                                                  \
    inline T *soap_instantiate_##T(struct soap *ctx, int n, const char *xsi_type, const char *array_type,    \
                                   std::size_t *size)                                                        \
    {                                                                                                        \
        return static_cast<T *>(soap_instantiate_array(ctx, SOAP_TYPE_##T, n, xsi_type, array_type, size));  \
    }

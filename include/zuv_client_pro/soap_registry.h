// soap_registry.h - dispatch by type id: make, destroy, read, write and mark an object of any type of the
// contract.
//
// Elsewhere: the ids (type_ids.h, generated), the classes (protocol*.h, generated). Always: an id of
// type_ids.h means one concrete type in all tables. Ids above 877 are pointer types that nothing reads
// or writes by id.
#pragma once

#include <zuv_client_pro/soap.h>

// Makes a managed object of a type, or several in one array.
//   type        type id
//   count       objects in the array; -1: a single object
//   xsi_type    XML name of the type or of a class derived from it, which is made then; null, or an unknown
//               name: the type itself
//   array_type  not used
//   size        takes the bytes of all objects; null is allowed
//   returns     the object, or the first of the array; it lives until soap_discard_objects or
//               soap_discard_all
//   null        SOAP_OUT_OF_MEMORY in ctx->error; or an unknown id, without an error
ZUV_API void *soap_instantiate(soap *ctx, int type, const char *xsi_type, const char *array_type,
                               std::size_t *size);
ZUV_API void *soap_instantiate_array(soap *ctx, int type, int count, const char *xsi_type,
                                     const char *array_type, std::size_t *size);
// Deletion hook of all managed instances.
//   entry  its object is destroyed
//   0      the object was destroyed
//   -1     an unknown type
ZUV_API int soap_delete_object(soap_instance *entry);
// Reads the next element by its id, its xsi:type or its name. Called during receiving.
//   type     takes the type id; 0 for an unknown element
//   returns  the object, managed
//   null     ctx->error: SOAP_TAG_MISMATCH for an unknown element, which stays held; SOAP_NO_TAG if no
//            element comes next; or an error of reading (soap_xml.h)
ZUV_API void *soap_read_element(soap *ctx, int *type);
// Writes an object by type id, with xsi:type. Called during sending.
//   object   the object
//   tag      "prefix:local"; null: the name of its XML type
//   id       number for an id attribute, -1 to look it up
//   type     type id; nothing is written for an unknown one or one above 877
//   SOAP_OK  also if nothing was written
//   returns  otherwise an error of writing (soap_xml.h)
ZUV_API int soap_write_element(soap *ctx, void *object, const char *tag, int id, int type);
// The mark pass by type id: enters the object and what it reaches in the pointer table. Called before
// sending. SOAP_OUT_OF_MEMORY in ctx->error if the table can't grow.
//   object  null is ignored
//   type    type id; an unknown one is ignored
ZUV_API void soap_mark_object(soap *ctx, void *object, int type);
// Reads the independent elements that follow the one asked for (encoded SOAP 1.1). Called during receiving.
//   SOAP_OK            all were read, or the version is not 1.1
//   SOAP_TAG_MISMATCH  an unknown element comes next; it stays held, and the end of its parent skips it
//   returns            otherwise an error of reading (soap_xml.h)
ZUV_API int soap_read_independents(soap *ctx);
// Writes the objects that the mark pass has found to be shared as elements of their own (encoded SOAP 1.1;
// does nothing otherwise). Called during sending.
//   SOAP_OK
//   SOAP_OUT_OF_MEMORY
//   returns  otherwise an error of writing (soap_xml.h)
ZUV_API int soap_put_finish(soap *ctx);
// Copy hook (soap_copy_hook) of vectors filled by a late reference: stores the source at an index of the
// vector.
//   type        type id of the object
//   place_type  type id of the vector
//   vector      the vector
//   index       place in it
//   source      the object, or a cell with its address
//   size        bytes of the source
ZUV_API void soap_insert_into_vector(soap *ctx, int type, int place_type, void *vector, std::size_t index,
                                     const void *source, std::size_t size);
// XML name of a type.
//   type     type id
//   returns  such as "protocol:Identity"; lives as long as the library
//   null     an unknown id
ZUV_API const char *soap_type_name(int type);
// Type id of a class by XML name.
//   name     as in the contract, such as "protocol:Identity"
//   returns  the type id
//   0        there is no such class
ZUV_API int soap_type_by_name(const char *name);

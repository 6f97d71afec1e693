// soap_registry.h - dispatch by type id: make, destroy, read, write and mark an object of any type of the
// contract.
//
// Elsewhere: the ids (type_ids.h, generated), the classes (protocol*.h, generated).
// Always: an id of 1 to 892 stands for one concrete type in all tables; others are refused as told.
#pragma once

#include <zuv_client_pro/soap.h>

// Makes a managed object of a type. With xsi_type naming a class derived from it, that class is made; an
// unknown name gives the type itself. `size`, unless null, takes the object's size in bytes. Null: unknown
// id, or error 20.
ZUV_API void *soap_instantiate(soap *ctx, int type, const char *xsi_type, const char *array_type,
                               std::size_t *size);
// The same for `count` objects in one array; count -1: a single object.
ZUV_API void *soap_instantiate_array(soap *ctx, int type, int count, const char *xsi_type,
                                     const char *array_type, std::size_t *size);
// Deletion hook of all managed instances: 0 done, -1 for an unknown type.
ZUV_API int soap_delete_object(soap_instance *entry);
// Reads whatever known element comes next. `type` takes its id. Null with error 3 if nobody knows it.
ZUV_API void *soap_read_element(soap *ctx, int *type);
// Writes an object by type id, with xsi:type; null tag: its XML type's name. Ids beyond 1 to 877: nothing, 0.
ZUV_API int soap_write_element(soap *ctx, void *object, const char *tag, int id, int type);
// The mark pass by type id.
ZUV_API void soap_mark_object(soap *ctx, void *object, int type);
// Reads the independent elements behind the one asked for (SOAP 1.1). 0; 3 when an element is left that
// nobody knows, held for whoever ends the parent to skip; or a failure.
ZUV_API int soap_read_independents(soap *ctx);
// Writes out the objects that the mark pass set apart (encoded SOAP 1.1 only).
ZUV_API int soap_put_finish(soap *ctx);
// Copy hook of vectors filled by a late reference: stores the source at an index of the vector.
ZUV_API void soap_insert_into_vector(soap *ctx, int type, int place_type, void *vector, std::size_t index,
                                     const void *source, std::size_t size);
// XML name of a type id, or null: "protocol:Identity". The text lives as long as the library.
ZUV_API const char *soap_type_name(int type);
// Type id of a class by XML name as in the contract ("protocol:Identity"), or 0.
ZUV_API int soap_type_by_name(const char *name);

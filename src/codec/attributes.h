// attributes.h - the context's attribute records, shared by writer and reader.
//
// Always: a record holds its name; records and value buffers stay in the list until the call's scratch memory
// is freed, and a bounded number of them beyond that, for the next call.
#pragma once

#include <cstddef>
#include <string_view>

#include <zuv_client_pro/soap.h>

inline std::string_view xml_attribute_name(const soap_attribute *record)
{
    return {record->name, record->name_length};
}

// A new record at the head of the list, idle and without a value. Null if memory runs out, with error 20.
soap_attribute *xml_attribute_make(soap *ctx, std::string_view name);

// Makes the record's value buffer hold at least `size` bytes; its contents are lost if it grows. 0 or
// SOAP_OUT_OF_MEMORY.
int xml_attribute_room(soap *ctx, soap_attribute *record, std::size_t size);

// Copies a text to the record's value and terminates it. 0 or SOAP_OUT_OF_MEMORY.
int xml_attribute_store(soap *ctx, soap_attribute *record, std::string_view value);

// Ends a record that was taken out of the list: it is kept for reuse or freed.
void xml_attribute_drop(soap *ctx, soap_attribute *record);
void xml_attribute_free(soap *ctx, soap_attribute *record);

// Drops all records.
void xml_attributes_drop(soap *ctx);

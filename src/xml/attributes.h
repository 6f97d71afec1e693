// attributes.h - the context's attribute records, shared by writer and reader.
//
// Always: a record holds its name. Those that the element has are visible and in soap::attribute_list;
// all are in hash chains (namespace_scope.h), where an idle one waits for its name to come again. Records
// and value buffers stay until the call's scratch memory is freed, and a bounded number of them beyond that,
// for the next call.
#pragma once

#include <cstddef>
#include <string_view>

#include <zuv_client_pro/soap.h>

inline std::string_view xml_attribute_name(const soap_attribute *record)
{
    return {record->name, record->name_length};
}

// The record of this name, visible or idle; a new one is idle and may still have the value buffer of another
// name. The cost does not depend on how many there are. Null if memory runs out, with SOAP_OUT_OF_MEMORY.
soap_attribute *xml_attribute_record(soap *ctx, std::string_view name);

// Puts an idle record into the attribute list, in the place that a link leads to. `visible`: 1 without a
// value, 2 with one.
void xml_attribute_show(soap *ctx, soap_attribute **link, soap_attribute *record, int visible);

// Makes all records idle.
void xml_attributes_hide(soap *ctx);

// Makes the record's value buffer hold at least `size` bytes; its contents are lost if it grows. 0 or
// SOAP_OUT_OF_MEMORY.
int xml_attribute_reserve(soap *ctx, soap_attribute *record, std::size_t size);

// Copies a text to the record's value and terminates it. SOAP_OK or SOAP_OUT_OF_MEMORY.
int xml_attribute_store(soap *ctx, soap_attribute *record, std::string_view value);

void xml_attribute_free(soap *ctx, soap_attribute *record);

// Drops all records; some are kept as spare ones.
void xml_attributes_drop(soap *ctx);

// soap_plugin.h - plug-ins: code that hooks a context's callbacks and keeps private data with it.
//
// Elsewhere: the callbacks themselves (soap.h). The library brings no plug-in of its own.
// Always: several plug-ins may have the same id; the newest is found. They are deleted newest first.
#pragma once

#include <zuv_client_pro/soap.h>

// One registered plug-in. The record is the context's, what it points to the plug-in's.
struct soap_plugin_record {
    soap_plugin_record *next;
    const char *id; // borrowed; compared by address, then by content
    void *data;     // the plug-in's own
    // Run for a copy of the context on a bytewise copy of the record. Returns 0, or non-zero to refuse the
    // copy. Null: the copy shares `data`, and only the context that registered the plug-in deletes it.
    int (*copy_hook)(soap *ctx, soap_plugin_record *target, soap_plugin_record *source);
    // Run when the context ends, after its connection was released. Required.
    void (*delete_hook)(soap *ctx, soap_plugin_record *record);
};

// Registers a plug-in with the context.
//   create    fills id, data and hooks of an empty record, may replace callbacks, and returns 0, or an error
//             after it has undone its work
//   argument  handed to create
//   What create returned; SOAP_OUT_OF_MEMORY. A plug-in without a delete_hook is dropped: result 0
extern "C" ZUV_API int
soap_register_plugin_arg(soap *ctx, int (*create)(soap *ctx, soap_plugin_record *record, void *argument),
                         void *argument);

// Data of the newest plug-in with this id, or null; the default of on_find_plugin.
ZUV_API void *soap_plugin_find(soap *ctx, const char *id);
// The same through on_find_plugin.
ZUV_API void *soap_plugin_lookup(soap *ctx, const char *id);

// soap_plugin.h - plug-ins: code that hooks a context's callbacks and keeps private data with it.
//
// Elsewhere: the callbacks themselves (soap.h). The library brings no plug-in of its own.
// Always: several plug-ins may have the same id; the newest is found. They are deleted newest first.
#pragma once

#include <zuv_client_pro/soap.h>

// One registered plug-in. The record belongs to the context, what it points to to the plug-in.
struct soap_plugin_record {
    soap_plugin_record *next; // next older plug-in
    const char *id;           // borrowed; compared by address, then by content
    void *data;               // the plug-in's own
    // Runs for a copy of the context on a bytewise copy of the record. Returns SOAP_OK, or a code that
    // refuses the copy. Null: the copy shares `data`, and only the context that registered the plug-in
    // deletes it.
    int (*copy_hook)(soap *ctx, soap_plugin_record *target, soap_plugin_record *source);
    // Runs when the context ends, after its connection was released. Required.
    void (*delete_hook)(soap *ctx, soap_plugin_record *record);
};

// Registers a plug-in with the context. Called between exchanges.
//   create    fills id, data and hooks of an empty record, may replace callbacks, and returns SOAP_OK, or an
//             error after it has undone its work
//   argument  passed to create
//   SOAP_OK             registered; or create left delete_hook null, and the plug-in is dropped
//   SOAP_OUT_OF_MEMORY
//   returns             otherwise the error of create
extern "C" ZUV_API int
soap_register_plugin_arg(soap *ctx, int (*create)(soap *ctx, soap_plugin_record *record, void *argument),
                         void *argument);

// Data of the newest plug-in with this id: directly, which is the default of on_find_plugin, or through
// on_find_plugin.
//   id       the plug-in's
//   returns  soap_plugin_record::data
//   null     there is no such plug-in
ZUV_API void *soap_plugin_find(soap *ctx, const char *id);
ZUV_API void *soap_plugin_lookup(soap *ctx, const char *id);

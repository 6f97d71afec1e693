// soap_call.h - one call of any operation of the contract, on any context.
//
// Elsewhere: the same by name and type, as operations of a proxy object (*SoapBindingProxy.h); the functions
// that a call is made of (soap_io.h, soap_xml.h, soap_http.h), for exchanges that are no call.
#pragma once

#include <zuv_client_pro/soap.h>

// An operation of a service port, by the type ids of its two records (type_ids.h), which determine the elements
// and the classes of request and response. For "set" of the port Profile:
//
//     constexpr soap_operation set = {SOAP_TYPE___protocolProfile__set,
//     SOAP_TYPE___protocolProfile__setResponse};
struct soap_operation {
    int request;  // type id of the request's record
    int response; // type id of the response's record
};

// Sends a request and reads the response: the whole cycle of a call, between calls. ctx->header, unless null, goes into
// the message; an earlier fault is forgotten. The connection is kept for the next call by the rules of
// soap_socket_release.
//   endpoint   URL, or several with blanks between, the next of which is tried while connecting fails; null if on_connect
//              or the context's streams lead somewhere
//   action     SOAPAction; null: empty
//   operation  what is called
//   request    an object of the operation's request class; null: the Body stays empty
//   response   takes the object read, of the response class or one derived from it, which belongs to the context and lives
//              until soap_discard_objects; null after a failure. A null argument sends the request and reads nothing
//   returns              what is also in ctx->error: one of these, an HTTP status that came without a SOAP message, what the
//                        reader refuses (soap_error.h), or the result of a callback
//   SOAP_OK              the response was read, or with a null argument the request sent
//   SOAP_NO_METHOD       the ids are not those of an operation's records; nothing was sent
//   SOAP_CLIENT_FAULT, SOAP_SERVER_FAULT, SOAP_MUST_UNDERSTAND, SOAP_VERSION_MISMATCH, SOAP_FAULT
//                        a fault was received: ctx->fault
//   SOAP_TCP_ERROR, SOAP_TLS_ERROR, SOAP_EOF
//                        no connection, or one that failed or went beyond a time limit; the fault's text says which
//   SOAP_LENGTH          beyond max_message or max_memory, in either direction
//   SOAP_OUT_OF_MEMORY   memory ran out
ZUV_API int soap_call(soap *ctx, const char *endpoint, const char *action, const soap_operation &operation,
                      const void *request, void **response);

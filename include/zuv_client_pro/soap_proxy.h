// soap_proxy.h - what every proxy class has, declared once.
//
// Here: the members and operations common to the generated proxies (*SoapBindingProxy.h). Elsewhere: the
// context that a proxy is (soap.h), the cycle of a call (src/exchange).
//
// Always: a proxy is one engine context: one thread at a time, at most one connection, one set of managed
// objects. What a call leaves behind lives in the proxy until `destroy`.
#pragma once

#include <cstddef>
#include <cstdio>
#include <iosfwd>

#include <zuv_client_pro/protocol.h>
#include <zuv_client_pro/soap.h>
#include <zuv_client_pro/soap_envelope.h>

// Of a proxy class P:
//   endpoint
//       URL to which calls go, or several with blanks between: the next is tried while connections fail.
//       Borrowed, never copied: the text must outlive every call. Null: the port's default, which the next
//       call stores here. One that soap_endpoint_check refuses ends a call with error 28 before anything is
//       sent.
//   constructors
//       Modes for input and output, one for both, or none; the endpoint, or none. A proxy made from a context
//       or from another proxy copies its settings (soap_context_copy) and starts without a connection; its
//       endpoint is null, so that the port's default holds until one is given. A proxy that is moved, as when
//       a vector grows, keeps endpoint, settings and managed objects and loses its connection; what it came
//       from is as P() makes it.
//   P_init
//       Replaces both modes, forgets the endpoint and installs the port's namespaces. 0, or error 20.
//   destroy
//       Frees all managed objects: responses, fault, received header. The proxy stays usable.
//   soap_noheader
//       Forgets the header of the next call; frees nothing.
//   soap_header
//       Sets the header of the next call only, by pointer: the host's object must live until then. Without
//       argument: the header in force, after a call the one received; null for none.
//   soap_fault
//       The fault record of the last call, or null.
//   soap_fault_string, soap_fault_detail
//       Text and raw detail of the fault, for either SOAP version; null for none. Both make the record.
//   soap_close_socket
//       Ends the use of the connection, which stays open if it is to be kept. The context's error code.
//   soap_force_close_socket
//       Closes the connection at once. The result of close, or 0 without a connection.
//   soap_print_fault, soap_stream_fault, soap_print_fault_buffer
//       Print the last error to a file, a stream (the result), or a buffer of `length` bytes (the result).
#define SOAP_PROXY_MEMBERS(P)                                                                                \
    const char *endpoint = nullptr;                                                                          \
                                                                                                             \
    P();                                                                                                     \
    explicit P(int iomode);                                                                                  \
    P(int imode, int omode);                                                                                 \
    explicit P(const char *endpoint);                                                                        \
    P(const char *endpoint, int iomode);                                                                     \
    explicit P(const soap &other);                                                                           \
    P(const P &other);                                                                                       \
    P(P &&other) noexcept;                                                                                   \
    ~P() override;                                                                                           \
    virtual int P##_init(int imode, int omode);                                                              \
    virtual void destroy();                                                                                  \
    virtual void soap_noheader();                                                                            \
    virtual void soap_header(protocol__Header *header);                                                      \
    virtual SOAP_ENV__Header *soap_header();                                                                 \
    virtual SOAP_ENV__Fault *soap_fault();                                                                   \
    virtual const char *soap_fault_string();                                                                 \
    virtual const char *soap_fault_detail();                                                                 \
    virtual int soap_close_socket();                                                                         \
    virtual int soap_force_close_socket();                                                                   \
    virtual void soap_print_fault(std::FILE *file);                                                          \
    virtual std::ostream &soap_stream_fault(std::ostream &stream);                                           \
    virtual char *soap_print_fault_buffer(char *buffer, std::size_t length);

// One operation of the port, in its short and its full form. The short form calls the full one with nulls.
//   endpoint     unless null, stored in the proxy's endpoint, for this call and later ones
//   soap_action  null: empty
//   request      the host's, needed during the call only; null: the Body is empty
//   response     takes the object read, which is the context's and lives until `destroy`. A null reference
//                sends the request and reads nothing
// Returns 0, or the error code that stands in the context; a received fault gives 1, 2, 8, 12 or 39.
#define SOAP_PROXY_CALL(name, Request, Response)                                                             \
    virtual int name(Request *request, Response &response);                                                  \
    virtual int _##name(const char *endpoint, const char *soap_action, Request *request, Response &response);

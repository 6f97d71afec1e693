// soap_proxy.h - what every proxy class has, declared once.
//
// Here: the members and operations common to the generated proxy classes (*SoapBindingProxy.h). Elsewhere:
// the context that a proxy object is (soap.h), the cycle of a call (src/exchange).
//
// Always: a proxy object is one engine context: one thread at a time, at most one connection, one set of
// managed objects. Responses, the fault and the received header belong to it and live until `destroy` or its
// end.
//
// A proxy object is large: a context's buffers and tables are part of it, about 162 KB, at most
// SOAP_CONTEXT_BYTES_MAX. On a thread with a small stack, 256 KB or less, make it with new or in static
// storage. A call takes at most SOAP_CALL_STACK_BYTES of the stack besides, for objects that are nested less
// than 20 deep; what TLS and the system's look-up of names take is not in that.
#pragma once

#include <cstddef>
#include <cstdio>
#include <iosfwd>

#include <zuv_client_pro/protocol.h>
#include <zuv_client_pro/soap.h>
#include <zuv_client_pro/soap_envelope.h>

constexpr std::size_t SOAP_CONTEXT_BYTES_MAX = 174080; // bytes; more than sizeof of any proxy class
constexpr std::size_t SOAP_CALL_STACK_BYTES = 65536;   // bytes

// Members of a proxy class P. All may be called between calls only.
//   endpoint
//       URL to which calls are sent, or several with blanks between: the next is tried while connections
//       fail. Borrowed: the text must outlive every call. Null: the port's default, which the next call
//       stores here. A call to one that soap_endpoint_check refuses ends with SOAP_TCP_ERROR before anything
//       is sent.
//   constructors
//       Makes a proxy object. Without arguments the modes are 0 and the endpoint is null. If memory runs out,
//       `error` is SOAP_OUT_OF_MEMORY. A proxy object made from a context or from another proxy object copies
//       its settings (soap_context_copy) and starts without a connection; its endpoint is null, so that the
//       port's default holds until one is given. One that is moved, as when a vector grows, keeps endpoint,
//       settings and managed objects and loses its connection; what it was made from is then as P() makes it.
//   destructor
//       Frees all managed objects and closes the connection.
//   P_init
//       Replaces both modes, sets endpoint to null and installs the port's namespaces. Returns SOAP_OK or
//       SOAP_OUT_OF_MEMORY.
//   destroy
//       Frees all managed objects: responses, fault, received header. Ends the use of the connection, which
//       stays open if it is to be kept, and closes the trace files. The proxy object stays usable.
//   soap_noheader
//       Forgets the header of the next call; frees nothing.
//   soap_header
//       With an argument: sets the header of the next call only, by pointer; if memory runs out, none is set
//       and `error` is SOAP_OUT_OF_MEMORY. Without argument: asks for the header in force. Returns after a
//       call the header received; null for none.
//   soap_fault
//       The fault of the last call. Returns its record, or null.
//   soap_fault_string
//       Text of the fault, for either SOAP version. Makes the record if there is none. Returns the text, or
//       null for none.
//   soap_fault_detail
//       Raw XML of the fault's detail, for either SOAP version. Makes the record if there is none. Returns
//       the text, or null for none.
//   soap_close_socket
//       Ends the use of the connection, which stays open if it is to be kept. Returns the result of
//       soap_socket_release.
//   soap_force_close_socket
//       Closes the connection at once. Returns the result of soap_force_close.
//   soap_print_fault
//       Prints the last error; nothing if there is none. See soap_fault_print_file.
//   soap_stream_fault
//       Prints the last error; nothing if there is none. See soap_fault_print_stream. Returns the stream.
//   soap_print_fault_buffer
//       Prints the last error; nothing if there is none. See soap_fault_print_text. Returns the buffer.
// Their arguments:
//   imode   MODE_... for input
//   omode   MODE_... for output
//   iomode  MODE_... for both
//   other   what the proxy object is made from
//   header  borrowed: the host program's object must live until the end of the next call
//   file    takes the text
//   stream  takes the text
//   buffer  takes the text, terminated
//   length  bytes in the buffer, terminator included
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

// Called between calls, in two forms: the short one takes the proxy object's endpoint and an empty action.
//   endpoint     unless null, stored in the proxy object's endpoint, for this call and later ones
//   soap_action  SOAPAction; null: empty
//   request      the host program's, needed during the call only; null: the Body is empty
//   response     takes the object read, which the proxy object owns until `destroy`; null if the call fails.
//                A null reference sends the request and reads nothing
//   SOAP_OK                the response was read
//   SOAP_CLIENT_FAULT      the service sent a fault: Client or Sender
//   SOAP_SERVER_FAULT      the service sent a fault: Server or Receiver
//   SOAP_MUST_UNDERSTAND   the service sent this fault, or the response's header demands what is not known
//   SOAP_VERSION_MISMATCH  the service sent this fault, or the response is of another SOAP version
//   SOAP_FAULT             the service sent another fault
//   SOAP_TCP_ERROR         the endpoint was refused, or there is no connection
//   SOAP_TLS_ERROR         TLS or the peer's certificate failed
//   SOAP_EOF               the connection broke, or a time limit has passed
//   SOAP_LENGTH            a limit of the context was exceeded
//   SOAP_OUT_OF_MEMORY     memory ran out
//   returns                otherwise the code of a failure in sending, receiving or reading, or an HTTP
//                          status
#define SOAP_PROXY_CALL(name, Request, Response)                                                             \
    virtual int name(Request *request, Response &response);                                                  \
    virtual int _##name(const char *endpoint, const char *soap_action, Request *request, Response &response);

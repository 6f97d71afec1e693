// soap_report.h - what happened in the last exchange, and ending an exchange from outside.
//
// Elsewhere: the exchange itself (soap_call.h, soap_http.h), what went wrong in words (soap_error.h), time
// limits (soap_tcp.h).
//
// Always: an exchange runs from soap_call, or for one that a host program drives by itself from
// soap_server_connect or soap_connect_one, to soap_socket_release, which soap_call runs at its end. With
// MODE_MIME_AFTER it runs until soap_mime_next_part has read the last part.
#pragma once

#include <cstdint>

#include <zuv_client_pro/soap.h>

// What ended an exchange before its response was there.
enum soap_ending : int {
    ENDED_BY_NOTHING,       // it came to its end, whatever that was, or it still runs
    ENDED_BY_PEER,          // the peer closed the connection, or the system reported it lost
    ENDED_BY_CONNECT_LIMIT, // connect_timeout, also of an HTTP proxy and of the TLS handshake (10 s unless set)
    ENDED_BY_SEND_LIMIT,    // send_timeout
    ENDED_BY_RECV_LIMIT,    // recv_timeout
    ENDED_BY_CALL_LIMIT,    // call_timeout
    ENDED_BY_CANCEL,        // soap_cancel
};

// What happened in an exchange. Times are microseconds since it began, -1 for what it didn't come to or had
// no need of: a reused connection has no look-up. Where several endpoints were tried they are the last one's.
// Texts are never null, empty for what there was not; texts that the peer gave hold printable ASCII only.
struct soap_report {
    std::int64_t lookup_time;     // the name of the peer, or of the HTTP proxy, was found
    std::int64_t connect_time;    // the connection came about
    std::int64_t tls_time;        // the TLS handshake was done, and the peer found to be the one wanted
    std::int64_t first_byte_time; // the first byte of the response came
    std::int64_t total_time;      // the exchange ended; -1 while it runs
    std::uint64_t plain_sent;     // bytes of the request with its head, before compression and framing
    std::uint64_t plain_received; // bytes of the response's body, compression and framing undone
    // Bytes on the socket: heads, framing, attachments, TLS with its handshake, CONNECT. 0 where callbacks or
    // streams took the socket's place.
    std::uint64_t wire_sent, wire_received;
    std::int32_t addresses_tried; // of all endpoints together; 0 for a reused connection
    bool reused;                  // a kept connection carried it
    bool resumed;                 // the TLS session was that of an earlier connection
    // Socket addresses as "192.0.2.1:443" or "[2001:db8::1]:443". The peer is the HTTP proxy where there is
    // one, and the last address tried where no connection came about.
    const char *peer, *local;
    const char *tls_version;             // such as "TLSv1.3"
    const char *tls_cipher;              // such as "TLS_AES_256_GCM_SHA384"
    const char *certificate_subject;     // of the peer's certificate, as by RFC 2253
    std::int64_t certificate_not_before; // when it begins and ends to be valid: seconds since 1970, UTC; 0
    std::int64_t certificate_not_after;  // without a certificate
    const char *certificate_refusal;     // why it wasn't accepted
    soap_ending ended_by;
    int http_status;                // received HTTP status; 0 for none
    const char *certificate_issuer; // who signed the peer's certificate, as by RFC 2253
};

// The report of the last exchange, or of the one that runs.
//   returns  the report, which the context owns; valid until its next exchange, and asked for again it may be
//            more complete
//   null     there was no exchange, or there was no memory to note what happened
ZUV_API const soap_report *soap_call_report(soap *ctx);

// Enables soap_cancel for exchanges of this context; it stays enabled until the context ends. Exchanges
// of an armed context wait before each transfer, as under a time limit: one system call more for each. A copy
// of the context is not armed, nor is the context in a child process until the child arms it. To be called by
// the thread of the context, between exchanges.
//   SOAP_OK             armed; also if it was before
//   SOAP_OUT_OF_MEMORY
//   SOAP_FD_EXCEEDED    no descriptor was to be had, or only one of 1024 or over without
//                       wait_with_poll
ZUV_API int soap_cancel_arm(soap *ctx);

// Ends the exchange that runs: whatever it waits for on the network ends at once, with SOAP_EOF or
// SOAP_TCP_ERROR and the text "The call was cancelled", no further address or endpoint is tried, and the
// connection is closed. The context serves on. The look-up of a name can't be interrupted: the exchange ends
// after it. Nor can streams, callbacks or descriptors of a host program, or work on what has been received. An
// exchange that has all it needs may still succeed.
//
// To be called by any thread and by signal handlers; errno stays. It must not run while the context is being
// armed, moved or ended. A call that comes when no exchange runs changes nothing, and not the next exchange
// either.
//   ctx    an armed context; for any other nothing happens
//   true   an exchange ran and will end
//   false  there was nothing to end
ZUV_API bool soap_cancel(soap *ctx);

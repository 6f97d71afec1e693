// client_options.h - how a client calls: time limits, TLS, HTTP proxy, credentials, limits, trace, repeating.
//
// Elsewhere: what one call has besides its request (client.h).
//
// Always: a client copies its options when it is made; changing them later changes nothing. Texts that are
// empty and limits that are 0 are not set, unless a member says otherwise.
#pragma once

#include <chrono>
#include <cstdint>
#include <string>

#include <zuv_client_pro/soap.h>

namespace zuv {

// When and how often a call is sent again. That happens only if the request surely wasn't taken: no
// connection came about, or a kept connection was closed by the peer before the first byte of a response. A
// call that is marked by extras::repeatable is also sent again after a connection that broke, silence, and
// the statuses 502, 503 and 504. A certificate that is refused, or a fault, never repeats a call.
struct retry_policy {
    int attempts = 2; // how often a request is sent at most; 1: never again
    // Pause before the second attempt; it doubles up to the longest one, and is shortened at random by up to
    // a half. After a kept connection that was closed there is none.
    std::chrono::milliseconds first_pause{100};
    std::chrono::milliseconds longest_pause{5000};
};

// What a client is made with.
struct options {
    // --- time limits ---
    //
    // 0 is no limit. The first three limit one step, or silence in it; the total one limits the whole call,
    // with its repetitions and their pauses. The look-up of a name has the limits of the system alone.

    std::chrono::microseconds connect_limit{std::chrono::seconds{10}}; // for each address of the host
    std::chrono::microseconds send_limit{std::chrono::seconds{30}};    // of silence while sending
    std::chrono::microseconds recv_limit{std::chrono::seconds{60}};    // of silence before and in a response
    std::chrono::microseconds total_limit{std::chrono::seconds{300}};  // of a call

    // --- TLS, for https endpoints ---

    std::string ca_file;      // PEM: certificates to trust
    std::string ca_path;      // directory of such, by hash
    bool system_ca = true;    // trust those of the system too
    std::string certificate;  // PEM: certificate chain and private key of this side
    std::string key_password; // of the private key
    std::string revocations;  // PEM: revocation lists
    bool check_peer = true;   // the service's certificate must be trusted
    bool strict_check = true; // it must name the host by RFC 6125; false: by the rules of soap_tls.h

    // --- HTTP proxy, and credentials for the service ---

    std::string proxy; // "[http://][user:password@]host[:port]", port 8080 unless given
    // If `proxy` is empty: as http_proxy, https_proxy and no_proxy of the environment say when the client is
    // made, for the scheme and host of the endpoint, the first one of a list.
    bool proxy_from_environment = false;
    std::string user, password; // HTTP Basic; an empty user sends none

    // --- messages ---

    bool keep_alive = true;                       // one connection for many calls
    bool compression = false;                     // requests are sent as gzip; responses may always be
    bool chunked = false;                         // requests are sent as they are made, without a length
    bool strict_reading = false;                  // responses must keep to the contract (MODE_STRICT)
    std::uint64_t max_message = SOAP_MAX_MESSAGE; // bytes of a message's XML
    std::uint64_t max_memory = SOAP_MAX_MEMORY;   // bytes held for a response
    std::uint32_t max_depth = SOAP_MAX_DEPTH;     // elements within one another

    // --- trace ---

    // A file that takes all bytes sent and received, secrets included; empty: none. Each client has its own:
    // "calls.log" becomes "calls-1.log" for the first client of the process, "calls-2.log" for the second.
    std::string trace;
    bool trace_as_named = false; // the file is called as `trace` says, and clients append to it in turn
    bool trace_times = false;    // the times of its bytes go to a file beside it, called as it with ".times"

    retry_policy retry; // of calls
};

} // namespace zuv

// client_failure.h - what is known of a failed call: code, kind, texts, HTTP status, faults, what to do.
//
// Elsewhere: the codes themselves (soap_error.h), the record of a fault (soap_envelope.h).
//
// Always: texts and records belong to the result that holds the failure, and live as long as it does.
#pragma once

#include <string>
#include <system_error>
#include <vector>

#include <zuv_client_pro/soap.h>
#include <zuv_client_pro/soap_error.h>

class protocol__Fault;

namespace std {
// Codes of soap_error.h can be compared with std::error_code.
template <> struct is_error_code_enum<soap_error_code> : true_type {};
} // namespace std

namespace zuv {

// The category of the library's codes: those of soap_error.h, and HTTP statuses from 100 to 999. Each has a
// text; codes of callbacks are given by their number.
//   returns  the one category object
ZUV_API const std::error_category &error_category();

// What kind of failure it was: what a host program decides by.
enum class failure_kind : int {
    none,          // the call succeeded
    no_connection, // nothing was sent: the service or an HTTP proxy can't be reached
    not_trusted,   // TLS failed: this side and the service don't trust each other
    out_of_time,   // a time limit ended the call; the service may have taken the request
    broken,        // the connection ended; the service may have taken the request
    refused,       // a fault: the service says that the request can't be served
    failed,        // a fault or a status of the 500s: the service says that it failed
    unauthorized,  // a status 401, 403 or 407
    http,          // another HTTP status without a SOAP message; also 200
    unreadable,    // the response is not what the contract says
    too_large,     // beyond max_message, max_memory or max_depth, in either direction
    request,       // the request can't be sent as it is, or the client can't be used
    memory,        // memory ran out
    cancelled      // soap_cancel (soap_report.h) ended the call; the service may have taken the request
};

// One fault of a failure.
class ZUV_CLASS fault_info {
public:
    // What the fault is made of. Made by failure::faults.
    //   record   the fault
    //   type_id  of its class (type_ids.h)
    fault_info(const protocol__Fault *record, int type_id) : record_(record), type_(type_id) {}

    // Name of the fault in the contract.
    //   returns  such as "Client.ObjectNotFound"
    const char *name() const;
    // What went wrong, in readable words, and what refines the kind of fault.
    //   returns  the text; empty if there is none
    const char *description() const;
    const char *subcode() const;
    // The fault as the class that every fault is derived from.
    //   returns  the record
    const protocol__Fault &record() const { return *record_; }
    // The fault as its own class, with the members that this has, such as `uri` of
    // protocol__Client_x002eObjectNotFound. Needs RTTI: a host program compiled with -fno-rtti asks name() and
    // casts record() by itself.
    //   Fault    a class of protocol.h, which the host program includes
    //   returns  the record
    //   null     it is of another class
    template <class Fault> const Fault *as() const { return dynamic_cast<const Fault *>(record_); }

private:
    const protocol__Fault *record_;
    int type_;
};

// Why a call failed. It belongs to a result; of a call that succeeded it is empty, with code 0.
class ZUV_CLASS failure {
public:
    failure() = default;

    // The code of the call.
    //   returns  a code of soap_error.h, an HTTP status or the code of a callback, in error_category
    std::error_code code() const { return {code_, error_category()}; }
    // What kind of failure it was.
    //   returns  the kind
    failure_kind kind() const { return kind_; }
    // The HTTP status that came.
    //   returns  100 to 999
    //   0        none came
    int http_status() const { return status_; }
    // Code and text of the fault, which the library makes for its own errors too, and the raw text of its
    // detail.
    //   returns  the text; empty if there is none
    const char *fault_code() const { return fault_code_; }
    const char *fault_text() const { return fault_text_; }
    const char *fault_detail() const { return fault_detail_; }
    // Times that the request was sent or tried to be sent.
    //   returns  1 for a call that wasn't repeated
    int attempts() const { return attempts_; }

    // What to do about it, in one sentence.
    //   returns  a constant text; empty for a call that succeeded
    const char *advice() const;

    // All of it in a line for a log: operation, text, detail of an error of the library's own, advice.
    //   returns  the line, without a line end; empty for a call that succeeded
    std::string message() const;

    // The typed faults of the detail, and those from which they grew (nestedFault), outermost first; at most
    // 64 of them.
    //   returns  the faults; none for a failure without typed faults
    std::vector<fault_info> faults() const;

private:
    friend class outcome;
    failure(const failure &) = default;
    failure &operator=(const failure &) = default;
    const char *operation_ = "call";
    const char *fault_code_ = "", *fault_text_ = "", *fault_detail_ = "";
    const SOAP_ENV__Fault *fault_ = nullptr;
    int code_ = SOAP_OK, status_ = 0, attempts_ = 0;
    failure_kind kind_ = failure_kind::none;
};

} // namespace zuv

// A code of soap_error.h as std::error_code.
//   code     the code
//   returns  the same in zuv::error_category
ZUV_API std::error_code make_error_code(soap_error_code code);

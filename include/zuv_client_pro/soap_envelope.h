// soap_envelope.h - the records of the SOAP envelope that the context holds: header, fault, fault detail.
//
// Here: the records, their accessors by SOAP version, and their place in a message. Elsewhere: error codes
// and texts (soap_error.h), the envelope's tags (soap_xml.h), the fault classes (protocol.h).
//
// Always: the records are plain, made by the engine and owned by the context until soap_discard_objects; so
// are the texts of a received one. One fault record serves both SOAP versions; the accessors choose the
// members by soap::soap_version.
#pragma once

#include <zuv_client_pro/soap.h>

class protocol__Header;
#define SOAP_DETAIL_CLASS(name) class protocol__##name;
// The 29 faults of the contract that a detail can hold, in the order in which they are written and tried.
#define SOAP_DETAIL_FAULTS(X)                                                                                \
    X(Client)                                                                                                \
    X(Client_x002eAccountInformation)                                                                        \
    X(Client_x002eAuthentication)                                                                            \
    X(Client_x002eAuthentication_x002eCredentialsExpired)                                                    \
    X(Client_x002eAuthentication_x002eCredentialsMismatch)                                                   \
    X(Client_x002eAuthentication_x002eNotAuthorized)                                                         \
    X(Client_x002eAuthentication_x002eNotRecognized)                                                         \
    X(Client_x002eInsufficientInformation)                                                                   \
    X(Client_x002eInvalidInformation)                                                                        \
    X(Client_x002eInvalidInformation_x002eDataSequenceError)                                                 \
    X(Client_x002eInvalidRequest)                                                                            \
    X(Client_x002eMalformedRequest)                                                                          \
    X(Client_x002eObjectNotAvailable)                                                                        \
    X(Client_x002eObjectNotAvailable_x002eDefective)                                                         \
    X(Client_x002eObjectNotAvailable_x002eHeld)                                                              \
    X(Client_x002eObjectNotFound)                                                                            \
    X(Server)                                                                                                \
    X(Server_x002eDataTooLarge)                                                                              \
    X(Server_x002eProcessing)                                                                                \
    X(Server_x002eProcessing_x002eObjectNotAvailable)                                                        \
    X(Server_x002eRedirection)                                                                               \
    X(Server_x002eServiceUnavailable)                                                                        \
    X(Server_x002eSystem)                                                                                    \
    X(Server_x002eUnsupportedRequest)                                                                        \
    X(Client_x002eDataPortIncompatibility)                                                                   \
    X(Client_x002eDeliveryIncompatibility)                                                                   \
    X(Client_x002eLanguageIncompatibility)                                                                   \
    X(Client_x002eTypeIncompatibility)                                                                       \
    X(Server_x002eUnsupportedRequest_x002eFilterExpressionTooComplex)
SOAP_DETAIL_FAULTS(SOAP_DETAIL_CLASS)
#undef SOAP_DETAIL_CLASS

// The SOAP header.
struct SOAP_ENV__Header {
    // "protocol:header"; belongs to the host program when a proxy object's soap_header() has set it.
    protocol__Header *header;
};

// Code of a SOAP 1.2 fault.
struct SOAP_ENV__Code {
    char *Value;             // a QName such as "SOAP-ENV:Sender"
    SOAP_ENV__Code *Subcode; // null for none
};

// Reason of a SOAP 1.2 fault.
struct SOAP_ENV__Reason {
    char *Text; // null for none
};

// Detail of a fault.
struct SOAP_ENV__Detail {
    char *__any; // raw XML of content that no other member took
#define SOAP_DETAIL_MEMBER(name) protocol__##name *name;
    SOAP_DETAIL_FAULTS(SOAP_DETAIL_MEMBER) // the contract's fault of this name; null for none
#undef SOAP_DETAIL_MEMBER
    int __type;  // type id of `fault`; 0 for none
    void *fault; // one further element of a type known to the registry
};

// A fault of either SOAP version.
struct SOAP_ENV__Fault {
    char *faultcode;          // SOAP 1.1
    char *faultstring;        // SOAP 1.1
    char *faultactor;         // SOAP 1.1
    SOAP_ENV__Detail *detail; // SOAP 1.1
    SOAP_ENV__Code *Code;     // SOAP 1.2
    SOAP_ENV__Reason *Reason; // SOAP 1.2
    char *Node;               // SOAP 1.2
    char *Role;               // SOAP 1.2
    SOAP_ENV__Detail *Detail; // SOAP 1.2
};

// Make the context's header or fault record if there is none. If memory runs out the pointer stays null, and
// ctx->error is SOAP_OUT_OF_MEMORY.
ZUV_API void soap_header_record(soap *ctx);
ZUV_API void soap_fault_record(soap *ctx);

// Where a fault's parts are, by SOAP version: code, subcode, text, raw XML of the detail. The records that
// hold them are made. In SOAP 1.1 the subcode is in the place of the code.
//   returns  address of the member, valid as long as the fault record. Never null: if memory runs out, a
//            place that nothing reads, with SOAP_OUT_OF_MEMORY in ctx->error
ZUV_API const char **soap_fault_code_field(soap *ctx);
ZUV_API const char **soap_fault_subcode_field(soap *ctx);
ZUV_API const char **soap_fault_string_field(soap *ctx);
ZUV_API const char **soap_fault_detail_field(soap *ctx);

// Texts of subcode and detail as they are; nothing is made.
//   returns  the text, which lives as long as the fault record
//   null     there is none; SOAP 1.1 has no subcode
ZUV_API const char *soap_fault_subcode_value(soap *ctx);
ZUV_API const char *soap_fault_detail_value(soap *ctx);

// Enters soap::header in the pointer table. Before sending. SOAP_OUT_OF_MEMORY in ctx->error if that can't
// grow.
ZUV_API void soap_mark_header(soap *ctx);
// Writes soap::header, if there is one, between the start tag of the Envelope and that of the Body. It
// carries mustUnderstand: a peer that doesn't know it has to refuse the message.
//   SOAP_OK
//   returns  otherwise an error of writing (soap_xml.h)
ZUV_API int soap_header_put(soap *ctx);
// Reads the Header, if there is one, into soap::header, between the start tag of the Envelope and that of the
// Body, and runs on_soap_header.
//   SOAP_OK               also if there is none
//   SOAP_MUST_UNDERSTAND  the Header demands what is not known
//   returns               otherwise an error of reading (soap_xml.h), or of on_soap_header
ZUV_API int soap_header_get(soap *ctx);

// Enters soap::fault in the pointer table. Before sending. SOAP_OUT_OF_MEMORY in ctx->error if that can't
// grow.
ZUV_API void soap_mark_fault(soap *ctx);
// Writes soap::fault, which is made if there is none, as the Body's content.
//   SOAP_OK
//   SOAP_OUT_OF_MEMORY
//   returns  otherwise an error of writing (soap_xml.h)
ZUV_API int soap_fault_put(soap *ctx);
// Reads a fault as the Body's content into soap::fault, which is null on failure.
//   SOAP_OK
//   SOAP_TAG_MISMATCH   another element comes next
//   SOAP_NO_TAG         no element comes next
//   SOAP_OUT_OF_MEMORY
//   returns             otherwise an error of reading (soap_xml.h)
ZUV_API int soap_fault_read(soap *ctx);

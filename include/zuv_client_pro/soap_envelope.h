// soap_envelope.h - the records of the SOAP envelope that the context holds: header, fault, fault detail.
//
// Here: the records, their accessors by SOAP version, and their place in a message. Elsewhere: error codes
// and texts (soap_error.h), the envelope's tags (soap_xml.h), the fault classes (protocol.h).
//
// Always: the records are plain, made by the engine and owned by the context until soap_discard_objects. One
// fault record serves both SOAP versions; only the accessors look at the version.
#pragma once

#include <zuv_client_pro/soap.h>

class protocol__Header;
#define SOAP_DETAIL_CLASS(name) class protocol__##name;
// The 29 faults that a detail names, in the order in which they are written and tried.
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

struct SOAP_ENV__Header {
    protocol__Header *header; // "protocol:header"; the host's when set by a proxy's soap_header()
};

struct SOAP_ENV__Code {
    char *Value;             // a QName such as "SOAP-ENV:Sender"
    SOAP_ENV__Code *Subcode; // null for none
};

struct SOAP_ENV__Reason {
    char *Text;
};

struct SOAP_ENV__Detail {
    char *__any; // raw XML of content that no other member took
#define SOAP_DETAIL_MEMBER(name) protocol__##name *name;
    SOAP_DETAIL_FAULTS(SOAP_DETAIL_MEMBER)
#undef SOAP_DETAIL_MEMBER
    int __type;  // type id of `fault`; 0 for none
    void *fault; // one further element of a type known to the registry
};

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

// Make the context's record if there is none. If memory runs out the pointer stays null and error is 20.
ZUV_API void soap_header_record(soap *ctx);
ZUV_API void soap_fault_record(soap *ctx);

// Places of a fault's parts by SOAP version; the records on the way are made. Never null: if memory runs out
// they give a place that is thrown away.
ZUV_API const char **soap_fault_code_field(soap *ctx);
ZUV_API const char **soap_fault_subcode_field(soap *ctx);
ZUV_API const char **soap_fault_string_field(soap *ctx);
ZUV_API const char **
soap_fault_detail_field(soap *ctx); // raw text of the detail, by the rule version 1 or not

// Texts of subcode and detail as they stand; null for none.
ZUV_API const char *soap_fault_subcode_value(soap *ctx);
ZUV_API const char *soap_fault_detail_value(soap *ctx);

// The header's turn in a message. Each returns ctx->error. The block that is written bears mustUnderstand: a
// peer that doesn't know it has to refuse the message.
ZUV_API void soap_mark_header(soap *ctx);
ZUV_API int soap_header_put(soap *ctx);
ZUV_API int soap_header_get(soap *ctx);

// The fault as the Body's content. soap_fault_read stores the record in ctx->fault, null included.
ZUV_API void soap_mark_fault(soap *ctx);
ZUV_API int soap_fault_put(soap *ctx);
ZUV_API int soap_fault_read(soap *ctx);

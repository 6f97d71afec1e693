// fault_advice.cpp - see fault_advice.h.
#include "fault_advice.h"

#include <iterator>

namespace cli {

namespace {

struct advice {
    const char *about; // a fault, with all that are derived from it
    const char *text;
};
constexpr advice FAULT_ADVICE[] = { // the first that fits
    {"Client.Authentication.CredentialsExpired", "renew the credentials: zuv profile refreshCredentials"},
    {"Client.Authentication.NotAuthorized", "ask the service's operator for the right to do this"},
    {"Client.Authentication", "check --user, --password-file and --credentials"},
    {"Client.AccountInformation", "check the account in the document that --credentials names"},
    {"Client.ObjectNotFound", "check the URI given with --target, and the port"},
    {"Client.ObjectNotAvailable", "the document exists, but can't be had now; ask again later"},
    {"Client.InvalidInformation.DataSequenceError", "send what comes first, then this again"},
    {"Client.InsufficientInformation",
     "zuv new CLASS lists all members of a document; --target names the document"},
    {"Client.DataPortIncompatibility", "ask for a data port of the kind in the detail"},
    {"Client.DeliveryIncompatibility", "ask for a delivery of the kind in the detail"},
    {"Client.LanguageIncompatibility", "ask for a language in the detail"},
    {"Client.TypeIncompatibility", "use a type of data in the detail"},
    {"Client", "check the request: zuv check FILE; zuv new CLASS explains the members"},
    {"Server.Redirection", "call the endpoint that the detail names"},
    {"Server.ServiceUnavailable", "try again later, or give further addresses by --endpoint"},
    {"Server.DataTooLarge", "send or ask for less at a time"},
    {"Server.UnsupportedRequest.FilterExpressionTooComplex", "make the filter simpler"},
    {"Server.UnsupportedRequest", "this service doesn't do that; ask its operator"},
    {"Server", "try again; if it stays so, inform the service's operator"}};

constexpr failure_words KINDS[] = {
    {EXIT_NETWORK, "the network, or nothing listens there", "check the address and that the service runs"},
    {EXIT_TLS, "this side and the service don't trust each other",
     "name the authority by --ca-file; the certificate must be made out to the host in the address (see "
     "--no-host-check)"},
    {EXIT_HTTP, "the HTTP server in front of the service",
     "check the path of the address, and the service's log"},
    {EXIT_ANSWER, "the service's answer can't be read",
     "keep a trace by --trace FILE and look at it by zuv trace FILE"},
    {EXIT_SENDER, "the request", nullptr},
    {EXIT_RECEIVER, "the service", nullptr},
    {EXIT_FAULT, "the two sides don't understand each other", "try with or without --soap12"},
    {EXIT_OTHER, "this program", "free memory"}};

} // namespace

const failure_words &words_of(exit_code code)
{
    for (const failure_words &kind : KINDS)
        if (kind.code == code)
            return kind;
    return KINDS[std::size(KINDS) - 1];
}

const char *advice_for(const std::string &fault)
{
    for (const advice &one : FAULT_ADVICE)
        if (fault == one.about || fault.starts_with(std::string(one.about) + "."))
            return one.text;
    return nullptr;
}

const char *ending_advice(soap_ending by)
{
    switch (by) {
    case ENDED_BY_CONNECT_LIMIT:
        return "check the address and that the service runs; --connect-limit gives it more time";
    case ENDED_BY_SEND_LIMIT:
    case ENDED_BY_RECV_LIMIT:
        return "give the service more time by --silence-limit; it may have taken the request";
    case ENDED_BY_PEER:
        return "look into the service's log; it may have taken the request";
    case ENDED_BY_NOTHING:
    case ENDED_BY_CALL_LIMIT:
    case ENDED_BY_CANCEL:
        break;
    }
    return nullptr;
}

const char *http_advice(int status)
{
    switch (status) {
    case 401:
        return "give --user and --password-file";
    case 407:
        return "give --proxy-user and --proxy-password-file";
    case 403:
        return "ask the service's operator for the right to do this";
    case 404:
        return "check the path of the address";
    case 413:
        return "send less at a time";
    case 503:
        return "try again later, or give further addresses by --endpoint";
    default:
        return status >= 300 && status < 400 ? "call the address that it names" : nullptr;
    }
}

} // namespace cli

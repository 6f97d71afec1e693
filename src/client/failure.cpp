// failure.cpp - what is known of a failed call: texts of the codes, advice, the faults of a detail.
//
// Elsewhere: which kind of failure it was (engine.cpp).
#include <cstring>

#include <zuv_client_pro/client_document.h>
#include <zuv_client_pro/client_failure.h>
#include <zuv_client_pro/protocol.h>
#include <zuv_client_pro/soap_envelope.h>
#include <zuv_client_pro/soap_http.h>
#include <zuv_client_pro/soap_registry.h>

namespace zuv {

const std::error_category &error_category()
{
    class codes : public std::error_category {
    public:
        const char *name() const noexcept override { return "zuv"; }
        std::string message(int code) const override
        {
            std::string text = listed(code);
            if (!text.empty())
                return text;
            if (code >= 100 && code <= 999)
                return "HTTP status " + std::to_string(code) + (*http_reason(code) != '\0' ? " " : "") +
                       http_reason(code);
            return "error " + std::to_string(code) + " of a callback";
        }

    private:
        // A text of the list, without what it leaves open: "%s" and what leads to an argument.
        static std::string listed(int code)
        {
            switch (code) {
            case SOAP_OK:
                return "success";
            case SOAP_FAULT:
                return "the service answered with a fault";
            case SOAP_TCP_ERROR:
                return "no connection";
            case SOAP_FORM:
                return "a form was received";
            default:
                break;
            }
            static constexpr struct {
                int code;
                const char *text;
            } rows[] = {
#define ZUV_ERROR_ROW(name, value, text) {value, text},
                SOAP_ERRORS(ZUV_ERROR_ROW)
#undef ZUV_ERROR_ROW
            };
            std::string text;
            for (const auto &row : rows)
                if (row.code == code)
                    text = row.text;
            for (const char *const open : {" '%s'", ": '%s'"})
                if (const std::size_t at = text.find(open); at != std::string::npos)
                    text.erase(at, std::char_traits<char>::length(open));
            while (!text.empty() && (text.back() == ' ' || text.back() == ':'))
                text.pop_back();
            return text;
        }
    };
    static const codes category;
    return category;
}

const char *fault_info::name() const
{
    const char *const whole = soap_type_name(type_);
    if (whole == nullptr)
        return "";
    const char *const local = std::strchr(whole, ':');
    return local != nullptr ? local + 1 : whole;
}

const char *fault_info::description() const
{
    return text(record_->description);
}

const char *fault_info::subcode() const
{
    return text(record_->subcode);
}

const char *failure::advice() const
{
    switch (kind_) {
    case failure_kind::none:
        break;
    case failure_kind::no_connection:
        return "Check the address and that the service runs, and try again.";
    case failure_kind::not_trusted:
        return "Check the CA file, the host in the address and both certificates.";
    case failure_kind::out_of_time:
        return "Give it more time, or ask whether the request was taken before it is sent again.";
    case failure_kind::broken:
        return "Ask whether the request was taken before it is sent again.";
    case failure_kind::refused:
        return "Change the request as the fault says.";
    case failure_kind::failed:
        return "Try again later; if it stays so, inform the service's operator.";
    case failure_kind::unauthorized:
        return status_ == 407 ? "Check the credentials for the HTTP proxy."
                              : "Check the credentials and the rights that go with them.";
    case failure_kind::http:
        return "Check the path of the address: no SOAP message came from there.";
    case failure_kind::unreadable:
        return "Look at the response in a trace, and inform the service's operator.";
    case failure_kind::too_large:
        return "Ask for less, or raise the limit that the text names.";
    case failure_kind::request:
        return "Change the request as the text says.";
    case failure_kind::memory:
        return "Free memory, or ask for less at a time.";
    case failure_kind::cancelled:
        return "Ask whether the request was taken before it is sent again.";
    }
    return "";
}

std::string failure::message() const
{
    if (kind_ == failure_kind::none)
        return "";
    std::string line = std::string(operation_) + " failed: ";
    line += *fault_text_ != '\0' ? fault_text_ : code().message();
    if (*fault_detail_ != '\0' && *fault_detail_ != '<')
        line += std::string(": ") + fault_detail_;
    for (const fault_info &fault : faults())
        line += std::string(" (") + fault.name() + (*fault.description() != '\0' ? ": " : "") +
                fault.description() + ")";
    return line + (line.back() == '.' ? " " : ". ") + advice();
}

std::vector<fault_info> failure::faults() const
{
    constexpr std::size_t most = 64; // references can lead in a circle
    std::vector<fault_info> found;
    const SOAP_ENV__Detail *const detail = fault_ == nullptr           ? nullptr
                                           : fault_->detail != nullptr ? fault_->detail
                                                                       : fault_->Detail;
    const auto add = [&found](const protocol__Fault *fault) {
        for (; fault != nullptr && found.size() < most;
             fault = fault->detail != nullptr ? fault->detail->nestedFault : nullptr)
            found.emplace_back(fault, fault->soap_type());
    };
    if (detail != nullptr) {
#define ZUV_ADD_FAULT(name) add(detail->name);
        SOAP_DETAIL_FAULTS(ZUV_ADD_FAULT)
#undef ZUV_ADD_FAULT
    }
    return found;
}

} // namespace zuv

std::error_code make_error_code(soap_error_code code)
{
    return {static_cast<int>(code), zuv::error_category()};
}

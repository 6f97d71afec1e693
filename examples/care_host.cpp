// care_host.cpp - a host that takes care of one machine: hands in what runs on it, orders its updates, and
// reports how it stands.
//
// Usage: care_host [--readable] [--soap12] [SERVICE], SERVICE being "http://HOST:PORT". Calls every operation
// of the ports InventoryReport, UpdateOrder and StatusReport. All that goes over the wire is in the trace
// file, wsTrace.log.
//
// Who owns what: requests are the host's own objects, and are read during the call only. Answers are the
// proxy's, and live until its `destroy`, so a host that keeps calling frees them from time to time.
#include <cstdio>
#include <stdexcept>
#include <string>

#include <zuv_client_pro/InventoryReportSoapBindingProxy.h>
#include <zuv_client_pro/StatusReportSoapBindingProxy.h>
#include <zuv_client_pro/UpdateOrderSoapBindingProxy.h>
#include <zuv_client_pro/soap_http.h>
#include <zuv_client_pro/soap_io.h>
#include <zuv_client_pro/soap_tcp.h>

#include "host_options.h"

namespace {

// A proxy, and the name of the document that its calls are about.
template <class Proxy> class port {
public:
    port(const char *name, const host_options &options)
        : endpoint_(options.endpoint(name)), proxy_(endpoint_.c_str(), static_cast<int>(options.mode()))
    {
        std::printf("%s\n", name);
        if (soap_set_namespaces(&proxy_, options.namespaces()))
            throw std::runtime_error("out of memory");
    }

    // Calls an operation, which has to succeed. The answer lives as long as this port.
    template <class Request, class Response>
    auto &call(const char *name, int (Proxy::*operation)(Request *, Response &), Request &request)
    {
        protocol__Header header; // names the document; a call without one is about a new document
        header.targetURI = &document;
        if (document.empty())
            proxy_.soap_noheader();
        else
            proxy_.soap_header(&header);
        Response response;
        const int error = (proxy_.*operation)(&request, response);
        proxy_.soap_noheader(); // the answer's header would go back with the next call
        if (error != 0) {
            proxy_.soap_print_fault(stderr);
            throw std::runtime_error(std::string(name) + " failed with error " + std::to_string(error));
        }
        return *response.result;
    }

    // The same for a document, which has to be in a state then. Says so.
    template <class Request, class Response, class State>
    auto &call(const char *name, int (Proxy::*operation)(Request *, Response &), Request &request,
               State state, const char *state_text)
    {
        auto &answer = call(name, operation, request);
        if (answer.thisURI.size() != 1 || answer.state == nullptr || *answer.state != state)
            throw std::runtime_error(std::string(name) + " did not leave the document " + state_text);
        document = answer.thisURI.front();
        std::printf("    %-13s %-19s %s\n", name, state_text, document.c_str());
        return answer;
    }

    std::string document; // empty: none yet

private:
    std::string endpoint_; // borrowed by the proxy
    Proxy proxy_;
};

void expect(bool holds, const char *what)
{
    if (!holds)
        throw std::runtime_error(std::string("not so: ") + what);
}

// The machine: a disk array.
struct machine {
    std::string product = "ZX100", serial = "ZX-4711";
    protocol__Identity identity;

    machine()
    {
        identity.product = &product;
        identity.serialNumber = &serial;
    }
    bool is(const protocol__Identity *other) const
    {
        return other != nullptr && other->serialNumber != nullptr && *other->serialNumber == serial;
    }
};

void hand_in_inventory(const host_options &options, machine &array)
{
    using proxy = InventoryReportSoapBindingProxy;
    using state = protocolInventoryReport__InventoryReportState;
    port<proxy> inventory("InventoryReport", options);

    // A list whose data is still to come keeps the report from being complete.
    protocol__AttachmentState pending = protocol__AttachmentState::pending;
    protocol__Attachment list;
    list.state = &pending;
    protocolInventoryReport__InventoryReportContent report;
    report.subject = &array.identity;
    report.attachment = {&list};
    inventory.call("submit", &proxy::submit, report, state::processing, "processing");
    _protocolInventoryReport__cancelRequest cancel;
    inventory.call("cancel", &proxy::cancel, cancel, state::cancelled, "cancelled");

    inventory.document.clear();
    report.attachment.clear();
    inventory.call("submit", &proxy::submit, report, state::complete, "complete");
    _protocolInventoryReport__getRequest get;
    const auto &held = inventory.call("get", &proxy::get, get, state::complete, "complete");
    expect(array.is(held.subject), "the service holds the machine");
    _protocolInventoryReport__closeRequest close;
    inventory.call("close", &proxy::close, close, state::closed, "closed");
    inventory.call("remove", &proxy::remove, report, state::closed, "closed");
}

void order_updates(const host_options &options, machine &array)
{
    using proxy = UpdateOrderSoapBindingProxy;
    using state = protocolUpdateOrder__UpdateOrderState;
    port<proxy> orders("UpdateOrder", options);

    std::string user = "ada", password = "sesame";
    protocol__Credentials credentials;
    credentials.username = &user;
    credentials.password = &password;
    protocolUpdateOrder__AuthenticateRequest who;
    who.credentials = &credentials;
    const protocolUpdateOrder__AuthenticateResponse &verdict =
        orders.call("authenticate", &proxy::authenticate, who);
    expect(verdict.success && verdict.credentials != nullptr && verdict.credentials->username != nullptr &&
               *verdict.credentials->username == user,
           "the credentials are accepted");
    std::printf("    %-13s accepted            %s\n", "authenticate", user.c_str());

    protocolUpdateOrder__UpdateOrderContent order;
    order.subject = &array.identity;
    order.updateId = {"FW-120"};
    order.includeRequisites = true; // what the firmware needs is ordered along with it
    const auto &found =
        orders.call("submit", &proxy::submit, order, state::complete_x002eavailable, "complete.available");
    expect(found.updateIdExpansion.size() == found.attachment.size() && !found.updateIdExpansion.empty(),
           "each update is delivered");
    for (std::size_t i = 0; i < found.updateIdExpansion.size(); ++i) {
        expect(found.attachment[i]->dataURI != nullptr, "the data has an address");
        std::printf("%18s%-8s %s\n", "", found.updateIdExpansion[i].c_str(),
                    found.attachment[i]->dataURI->c_str());
    }
    _protocolUpdateOrder__getRequest get;
    const auto &held =
        orders.call("get", &proxy::get, get, state::complete_x002eavailable, "complete.available");
    expect(held.updateIdExpansion == found.updateIdExpansion, "the order stays as it was answered");
    _protocolUpdateOrder__closeRequest close;
    orders.call("close", &proxy::close, close, state::closed, "closed");
    orders.call("remove", &proxy::remove, order, state::closed, "closed");

    orders.document.clear();
    orders.call("submit", &proxy::submit, order, state::complete_x002eavailable, "complete.available");
    _protocolUpdateOrder__cancelRequest cancel;
    orders.call("cancel", &proxy::cancel, cancel, state::cancelled, "cancelled");
}

// Delivers data to a data port: plain HTTP, for which an engine context will do.
void deliver(const std::string &address, const std::string &data)
{
    soap context(MODE_BUFFERED);
    context.http_content = "application/octet-stream"; // borrowed
    if (soap_count_begin(&context) || soap_send_bytes(&context, data.data(), data.size()) ||
        soap_count_end(&context) || soap_connect_one(&context, STATUS_POST_FILE, address.c_str(), nullptr) ||
        soap_send_bytes(&context, data.data(), data.size()) || soap_send_finish(&context))
        throw std::runtime_error("the data port can't be reached");
    soap_receive_begin(&context); // an answer without a body is all that is wanted, though no message
    const int status = context.status;
    soap_socket_release(&context);
    expect(status == 200, "the data port takes the data");
    std::printf("%18s%zu bytes to %s\n", "", data.size(), address.c_str());
}

void report_status(const host_options &options, machine &array)
{
    using proxy = StatusReportSoapBindingProxy;
    using state = protocolStatusReport__StatusReportState;
    port<proxy> status("StatusReport", options);

    // Why the report is made is expressed by the reason's class.
    std::string when = "2024-02-29T12:00:00Z";
    protocolStatusReport__Reason_x002eEvent_x002eConfiguration_x002eChanged reason;
    reason.occurrenceDateTime = &when;
    protocolStatusReport__StatusReportContent report;
    report.subject = &array.identity;
    report.reason = {&reason};
    status.call("create", &proxy::create, report, state::open, "open");

    protocol__Attachment configuration;
    protocol__DataPortPreference preference;
    preference.transport = {protocol__Transport::HTTP};
    _protocolStatusReport__attachRequest attach;
    attach.attachment = &configuration;
    attach.dataPortPreference = &preference;
    const auto &offered = status.call("attach", &proxy::attach, attach, state::open, "open");
    expect(offered.attachment.size() == 1 && offered.attachment[0]->dataPort.size() == 1 &&
               offered.attachment[0]->thisURI != nullptr &&
               offered.attachment[0]->dataPort[0]->dataURI != nullptr,
           "the service offers a data port");
    deliver(*offered.attachment[0]->dataPort[0]->dataURI, "controllers=2\n");

    double all = 100;
    protocol__AttachStatusRequest progress;
    progress.attachmentURI = offered.attachment[0]->thisURI; // the answer's text, which outlives the call
    progress.percentComplete = &all;
    const auto &arrived = status.call("attachStatus", &proxy::attachStatus, progress, state::open, "open");
    expect(arrived.attachment.size() == 1 && arrived.attachment[0]->state != nullptr &&
               *arrived.attachment[0]->state == protocol__AttachmentState::complete,
           "the attachment is complete");

    report.attachment = arrived.attachment; // part of an answer goes into a request as it is
    status.call("submit", &proxy::submit, report, state::complete, "complete");
    _protocolStatusReport__getRequest get;
    const auto &held = status.call("get", &proxy::get, get, state::complete, "complete");
    expect(array.is(held.subject) && held.attachment.size() == 1 && held.reason.size() == 1 &&
               held.reason[0]->soap_type() == reason.soap_type(),
           "the service holds the report");
    const auto *const event = dynamic_cast<const protocolStatusReport__Reason_x002eEvent *>(held.reason[0]);
    expect(event != nullptr && event->occurrenceDateTime != nullptr &&
               event->occurrenceDateTime->compare(0, 19, when, 0, 19) == 0,
           "and when its event occurred");
    _protocolStatusReport__closeRequest close;
    status.call("close", &proxy::close, close, state::closed, "closed");
    status.call("remove", &proxy::remove, report, state::closed, "closed");

    status.document.clear();
    status.call("create", &proxy::create, report, state::open, "open");
    _protocolStatusReport__cancelRequest cancel;
    status.call("cancel", &proxy::cancel, cancel, state::cancelled, "cancelled");
}

} // namespace

int main(int argc, char **argv)
{
    const host_options options(argc, argv);
    machine array;
    try {
        hand_in_inventory(options, array);
        order_updates(options, array);
        report_status(options, array);
        return 0;
    } catch (const std::exception &failure) {
        std::fprintf(stderr, "care_host: %s\n", failure.what());
        return 1;
    }
}

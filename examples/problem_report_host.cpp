// problem_report_host.cpp - a host that reports a problem to the service, over a port that has no proxy
// class.
//
// Usage: problem_report_host [--readable] [--soap12] [SERVICE], SERVICE being "http://HOST:PORT". All that
// goes over the wire is in the trace file, wsTrace.log.
//
// What there is instead of a proxy: the records of the port's messages (ProblemReportSoapBinding.h), their
// type ids, and an engine context. The first half of this file is the cycle of a call that a proxy would run,
// the second half a host that uses it.
//
// Who owns what:
//   request objects     the host, from first to last. The engine reads them during the call and keeps
//   nothing. response record     the host. What its `result` points to is the context's, with all that it
//   reaches, and
//                       lives until soap_discard_objects; calls in between leave it alone.
//   header, fault       records of the context. The block in the header that is sent is the host's.
//   context             the host, one for each thread. Its end closes the connection and frees what is the
//                       context's.
#include <cstdio>
#include <new>
#include <stdexcept>
#include <string>

#include <zuv_client_pro/ProblemReportSoapBinding.h>
#include <zuv_client_pro/soap_envelope.h>
#include <zuv_client_pro/soap_error.h>
#include <zuv_client_pro/soap_http.h>
#include <zuv_client_pro/soap_io.h>
#include <zuv_client_pro/soap_memory.h>
#include <zuv_client_pro/soap_registry.h>
#include <zuv_client_pro/soap_tcp.h>
#include <zuv_client_pro/soap_xml.h>
#include <zuv_client_pro/type_ids.h>

#include "host_options.h"

namespace {

using report = protocolProblemReport__ProblemReportContent;

// ---------------------------------------------------------------------------------------------
// The cycle of a call.

// An operation: the type id of its request wrapper, which knows the request's element, and the element of the
// response.
template <class Wrapper, class Response> struct operation {
    const char *name;
    int wrapper_type;
    const char *response_element;
};
#define PROBLEM_REPORT_OPERATION(name)                                                                       \
    constexpr operation<__protocolProblemReport__##name, __protocolProblemReport__##name##Response>          \
        name##_operation = {#name, SOAP_TYPE___protocolProblemReport__##name,                                \
                            "protocolProblemReport:" #name "Response"};
PROBLEM_REPORT_OPERATION(get)
PROBLEM_REPORT_OPERATION(submit)
PROBLEM_REPORT_OPERATION(attach)
PROBLEM_REPORT_OPERATION(attachStatus)
PROBLEM_REPORT_OPERATION(remove)
#undef PROBLEM_REPORT_OPERATION

int write_message(soap *ctx, void *wrapper, int wrapper_type)
{
    if (soap_envelope_out_begin(ctx) || soap_header_put(ctx) || soap_body_out_begin(ctx) ||
        soap_write_element(ctx, wrapper, nullptr, -1, wrapper_type) || soap_body_out_end(ctx) ||
        soap_envelope_out_end(ctx))
        return ctx->error;
    return 0;
}

// Finds the length of the message, which is sent before it. Nothing is sent yet.
int count_message(soap *ctx, void *wrapper, int wrapper_type)
{
    if (soap_count_begin(ctx))
        return ctx->error;
    if ((ctx->mode & MODE_COUNTING) != 0 && write_message(ctx, wrapper, wrapper_type))
        return ctx->error;
    return soap_count_end(ctx);
}

int send_message(soap *ctx, const char *endpoint, void *wrapper, int wrapper_type)
{
    if (soap_server_connect(ctx, endpoint, "") || write_message(ctx, wrapper, wrapper_type))
        return ctx->error;
    return soap_send_finish(ctx);
}

int begin_response(soap *ctx)
{
    if (soap_receive_begin(ctx) || soap_envelope_in_begin(ctx) || soap_header_get(ctx))
        return ctx->error;
    return soap_body_in_begin(ctx);
}

// Makes a report that belongs to the context, and reads it. Null if the Body holds something else.
report *read_report(soap *ctx, const char *element)
{
    report *const made =
        soap_instantiate_protocolProblemReport__ProblemReportContent(ctx, -1, nullptr, nullptr, nullptr);
    return made != nullptr ? static_cast<report *>(made->soap_get(ctx, element, nullptr)) : nullptr;
}

int end_response(soap *ctx)
{
    if (soap_body_in_end(ctx) || soap_envelope_in_end(ctx))
        return ctx->error;
    return soap_receive_finish(ctx);
}

// One call: 0, or the error that stands in the context. What comes back as a fault is an error too, and is
// then in ctx->fault.
template <class Wrapper, class Response, class Request>
int call(soap *ctx, const char *endpoint, const operation<Wrapper, Response> &op, Request &request,
         Response &response)
{
    Wrapper wrapper = {&request}; // needed until the request is sent
    response.result = nullptr;

    ctx->encoding_style = nullptr; // the messages are literal
    soap_reset_call(ctx);
    soap_mark_header(ctx);
    soap_mark_object(ctx, &wrapper, op.wrapper_type);
    if (count_message(ctx, &wrapper, op.wrapper_type))
        return ctx->error; // no connection was asked for, and a kept one stays as it is

    // From here on every way out lets go of the connection, which is kept or closed as its state demands.
    if (send_message(ctx, endpoint, &wrapper, op.wrapper_type) || begin_response(ctx))
        return soap_socket_release(ctx);
    response.result = read_report(ctx, op.response_element);
    if (ctx->error != 0) {
        response.result = nullptr;
        return soap_fault_receive(ctx, 0); // looks for a fault in the response's place; releases, too
    }
    end_response(ctx);
    return soap_socket_release(ctx);
}

// ---------------------------------------------------------------------------------------------
// The host.

void expect(bool holds, const char *what)
{
    if (!holds)
        throw std::runtime_error(std::string("not so: ") + what);
}

class reporter {
public:
    explicit reporter(const host_options &options)
        : context_(options.mode()), endpoint_(options.endpoint("ProblemReport"))
    {
        if (soap_set_namespaces(&context_, options.namespaces()))
            throw std::bad_alloc();
    }

    void run()
    {
        submit();
        attach();
        report_transfer();
        get();
        remove();
        get_removed();
    }

private:
    // A call about the report that was submitted, if there is one yet, that has to succeed. The answer lives
    // until the next call of this.
    template <class Wrapper, class Response, class Request>
    report &answer(const operation<Wrapper, Response> &op, Request &request)
    {
        soap_discard_objects(&context_, nullptr); // the last answer's objects, header and fault too
        soap_discard_all(&context_);              // and what else was made for it; the connection stays
        aim();
        Response response;
        const int error = call(&context_, endpoint_.c_str(), op, request, response);
        if (error != 0) {
            soap_fault_print_file(&context_, stderr);
            throw std::runtime_error(std::string(op.name) + " failed with error " + std::to_string(error));
        }
        expect(response.result != nullptr, "an answer without an error has a report");
        std::printf("%-13s %zu answers, %zu attachments, %s\n", op.name, response.result->answer.size(),
                    response.result->attachment.size(),
                    response.result->thisURI.empty() ? "(no name)"
                                                     : response.result->thisURI.front().c_str());
        return *response.result;
    }

    // Names the report in the next message's header. An answer's header would else be sent back.
    void aim()
    {
        header_.targetURI = &uri_;
        context_.header = nullptr;
        if (uri_.empty())
            return;
        soap_header_record(&context_);
        if (context_.header == nullptr)
            throw std::bad_alloc();
        context_.header->header = &header_;
    }

    void submit()
    {
        // The class of an action tells its kind; it is sent as xsi:type.
        std::string title = "Z database stops", what = "It ends with a deadlock, once a day.", severity = "2";
        std::string tried = "Restarted it.", product = "ZDB";
        protocolProblemReport__Action_x002eReboot action;
        action.description = &tried;
        action.result = {protocolProblemReport__ActionResult::problemNotResolved};
        protocol__Identity subject;
        subject.product = &product;
        report problem;
        problem.title = &title;
        problem.problemDescription = &what;
        problem.severity = &severity;
        problem.subject = &subject;
        problem.problemType = {protocolProblemReport__ProblemType::abnormalTermination,
                               protocolProblemReport__ProblemType::intermittent};
        problem.actionTaken = {&action};

        const report &kept = answer(submit_operation, problem);
        expect(kept.thisURI.size() == 1 && kept.state != nullptr &&
                   *kept.state == protocolProblemReport__ProblemReportState::open,
               "the report has a name and is open");
        uri_ = kept.thisURI.front(); // a copy: the next call frees the answer
        for (const protocolProblemReport__Answer *one : kept.answer) {
            expect(one != nullptr && one->description != nullptr, "an answer has a text");
            std::printf("%14s%s: %s\n", "", soap_type_name(one->soap_type()), one->description->c_str());
        }
        expect(!kept.answer.empty() &&
                   dynamic_cast<protocolProblemReport__Answer_x002eServer *>(kept.answer.front()) != nullptr,
               "the service answers");
        expect(kept.actionTaken.size() == 1 && *kept.actionTaken.front()->description == tried,
               "the report holds what was tried");
    }

    void attach()
    {
        std::string description = "the last lines of its log";
        protocol__Data lines;
        lines.value = "deadlock & rollback\nstopped";
        protocol__Attachment log;
        log.description = &description;
        log.data = &lines;
        _protocolProblemReport__attachRequest request;
        request.attachment = &log;

        const report &kept = answer(attach_operation, request);
        expect(kept.attachment.size() == 1 && kept.attachment.front()->thisURI != nullptr,
               "the attachment has a name");
        attachment_uri_ = *kept.attachment.front()->thisURI;
    }

    void report_transfer()
    {
        double percent = 100;
        protocol__AttachStatusRequest progress;
        progress.attachmentURI = &attachment_uri_;
        progress.percentComplete = &percent;
        const report &kept = answer(attachStatus_operation, progress);
        expect(kept.attachment.size() == 1 && kept.attachment.front()->state != nullptr &&
                   *kept.attachment.front()->state == protocol__AttachmentState::complete,
               "the attachment is complete");
    }

    void get()
    {
        _protocolProblemReport__getRequest request;
        const report &kept = answer(get_operation, request);
        expect(kept.title != nullptr && *kept.title == "Z database stops" && kept.problemType.size() == 2 &&
                   kept.attachment.size() == 1 && kept.attachment.front()->data != nullptr &&
                   kept.attachment.front()->data->value == "deadlock & rollback\nstopped",
               "the service holds what was reported");
    }

    void remove()
    {
        report nothing; // the header names what is removed
        answer(remove_operation, nothing);
    }

    // What a host meets when a call is refused: an error code, a text, and an object that says more.
    void get_removed()
    {
        aim();
        _protocolProblemReport__getRequest request;
        __protocolProblemReport__getResponse response;
        const int error = call(&context_, endpoint_.c_str(), get_operation, request, response);
        expect(error == SOAP_CLIENT_FAULT && response.result == nullptr, "a removed report is refused");
        const SOAP_ENV__Fault *const fault = context_.fault;
        expect(fault != nullptr, "there is a fault");
        const SOAP_ENV__Detail *const detail = context_.soap_version == 2 ? fault->Detail : fault->detail;
        expect(detail != nullptr && detail->Client_x002eObjectNotFound != nullptr &&
                   detail->Client_x002eObjectNotFound->uri.size() == 1,
               "the fault says what wasn't found");
        std::printf("%-13s refused as it should be, error %d: %s\n%14snot found: %s\n", "get", error,
                    *soap_fault_string_field(&context_), "",
                    detail->Client_x002eObjectNotFound->uri.front().c_str());
    }

    soap context_;
    std::string endpoint_; // borrowed by each call
    std::string uri_;      // of the report, once it is submitted
    std::string attachment_uri_;
    protocol__Header header_; // borrowed by the message that is sent next
};

} // namespace

int main(int argc, char **argv)
{
    try {
        reporter(host_options(argc, argv)).run();
        return 0;
    } catch (const std::exception &failure) {
        std::fprintf(stderr, "problem_report_host: %s\n", failure.what());
        return 1;
    }
}

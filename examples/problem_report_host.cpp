// problem_report_host.cpp - a host that reports a problem to the service, over a port that has no proxy
// class.
//
// Usage: problem_report_host [--readable] [--soap12] [SERVICE], SERVICE being "http://HOST:PORT". All that
// goes over the wire is in the trace file, wsTrace.log.
//
// What there is instead of a proxy: the records of the port's messages (ProblemReportSoapBinding.h), their
// type ids, which name an operation, and soap_call, which runs it on a context of the host's.
//
// Who owns what:
//   request objects     the host, from first to last. The library reads them during the call and keeps nothing.
//   response object     the context, with all that it reaches. It lives until soap_discard_objects; calls in between leave
//                       it alone.
//   header, fault       records of the context. The block in the header that is sent is the host's.
//   context             the host, one for each thread. Its end closes the connection and frees what is the
//                       context's.
#include <cstdio>
#include <new>
#include <stdexcept>
#include <string>

#include <zuv_client_pro/ProblemReportSoapBinding.h>
#include <zuv_client_pro/soap_call.h>
#include <zuv_client_pro/soap_envelope.h>
#include <zuv_client_pro/soap_error.h>
#include <zuv_client_pro/soap_memory.h>
#include <zuv_client_pro/soap_registry.h>
#include <zuv_client_pro/soap_xml.h>
#include <zuv_client_pro/type_ids.h>

#include "host_options.h"

namespace {

using report = protocolProblemReport__ProblemReportContent;

struct operation {
    const char *name;
    soap_operation records;
};
#define PROBLEM_REPORT_OPERATION(name)                                                                       \
    constexpr operation name##_operation = {                                                                 \
        #name,                                                                                               \
        {SOAP_TYPE___protocolProblemReport__##name, SOAP_TYPE___protocolProblemReport__##name##Response}};
PROBLEM_REPORT_OPERATION(get)
PROBLEM_REPORT_OPERATION(submit)
PROBLEM_REPORT_OPERATION(attach)
PROBLEM_REPORT_OPERATION(attachStatus)
PROBLEM_REPORT_OPERATION(remove)
#undef PROBLEM_REPORT_OPERATION

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
    report &answer(const operation &op, const void *request)
    {
        soap_discard_objects(&context_, nullptr); // the last answer's objects, header and fault too
        soap_discard_all(&context_);              // and what else was made for it; the connection stays
        aim();
        void *made = nullptr;
        const int error = soap_call(&context_, endpoint_.c_str(), nullptr, op.records, request, &made);
        if (error != SOAP_OK) {
            soap_fault_print_file(&context_, stderr);
            throw std::runtime_error(std::string(op.name) + " failed with error " + std::to_string(error));
        }
        auto *const response =
            static_cast<report *>(made); // every operation of the port answers with a report
        expect(response != nullptr, "an answer without an error has a report");
        std::printf("%-13s %zu answers, %zu attachments, %s\n", op.name, response->answer.size(),
                    response->attachment.size(),
                    response->thisURI.empty() ? "(no name)" : response->thisURI.front().c_str());
        return *response;
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
        // The kind of an action is its class, which goes along as xsi:type.
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

        const report &kept = answer(submit_operation, &problem);
        expect(kept.thisURI.size() == 1 && kept.state != nullptr &&
                   *kept.state == protocolProblemReport__ProblemReportState::open,
               "the report has a name and is open");
        uri_ = kept.thisURI.front(); // a copy: the answer goes with the next call
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

        const report &kept = answer(attach_operation, &request);
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
        const report &kept = answer(attachStatus_operation, &progress);
        expect(kept.attachment.size() == 1 && kept.attachment.front()->state != nullptr &&
                   *kept.attachment.front()->state == protocol__AttachmentState::complete,
               "the attachment is complete");
    }

    void get()
    {
        _protocolProblemReport__getRequest request;
        const report &kept = answer(get_operation, &request);
        expect(kept.title != nullptr && *kept.title == "Z database stops" && kept.problemType.size() == 2 &&
                   kept.attachment.size() == 1 && kept.attachment.front()->data != nullptr &&
                   kept.attachment.front()->data->value == "deadlock & rollback\nstopped",
               "the service holds what was reported");
    }

    void remove()
    {
        report nothing; // the header names what is removed
        answer(remove_operation, &nothing);
    }

    // What a host meets when a call is refused: an error code, a text, and an object that says more.
    void get_removed()
    {
        aim();
        _protocolProblemReport__getRequest request;
        void *made = nullptr;
        const int error =
            soap_call(&context_, endpoint_.c_str(), nullptr, get_operation.records, &request, &made);
        expect(error == SOAP_CLIENT_FAULT && made == nullptr, "a removed report is refused");
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

// call_command.cpp - see call_command.h.
#include "call_command.h"

#include <algorithm>
#include <chrono>
#include <cstdio>
#include <cstring>

#include <zuv_client_pro/soap_attachment.h>
#include <zuv_client_pro/soap_envelope.h>
#include <zuv_client_pro/soap_error.h>
#include <zuv_client_pro/soap_memory.h>
#include <zuv_client_pro/soap_registry.h>

#include "attachments.h"
#include "connection.h"
#include "documents.h"
#include "endpoints.h"
#include "failure.h"
#include "fault_report.h"
#include "json.h"
#include "latency.h"
#include "progress.h"
#include "request_document.h"
#include "request_header.h"
#include "text_files.h"

namespace cli {

namespace {

using clock = std::chrono::steady_clock;

const port &port_of(const operation &op)
{
    const auto ports = all_ports();
    return *std::find_if(ports.begin(), ports.end(),
                         [&](const port &p) { return std::strcmp(p.name, op.port) == 0; });
}

class caller {
public:
    caller(const operation &op, const call_options &options)
        : op_(op), options_(options), addresses_(call_addresses(options.endpoints, port_of(op))),
          connection_(options.connection), header_(options.header),
          files_(options.message, options.connection.quiet),
          request_(read_request_document(reader_, options.request_file, op)), context_(op.make_context())
    {
        connection_.prepare(context_.get());
        files_.prepare(context_.get());
    }

    exit_code run()
    {
        const auto began = clock::now();
        progress shown(name(), options_.message.repeat, false,
                       options_.connection.quiet || options_.message.repeat == 1);
        for (unsigned i = 0; i < options_.message.repeat; ++i) {
            if (const int error = call_once(); error != SOAP_OK)
                return report_failure();
            shown.advance(1);
        }
        print_answer();
        for (const std::string &line : files_.saved())
            std::fprintf(stderr, "saved %s\n", line.c_str());
        if (const std::size_t count = attachments_received();
            count != 0 && options_.message.save_folder.empty())
            std::fprintf(stderr, "%zu attachments came along; --save-attachments DIR keeps them\n", count);
        if (options_.message.repeat > 1)
            std::fprintf(stderr, "%s\n", latency_summary(times_, clock::now() - began).c_str());
        return EXIT_DONE;
    }

private:
    std::string name() const { return lower(op_.port) + " " + op_.name; }

    int call_once()
    {
        soap *const ctx = context_.get();
        soap_discard_objects(ctx, nullptr); // the previous answer
        soap_discard_all(ctx);
        prepare_message(ctx, options_.message, namespaces_);
        connection_.renew(ctx);
        files_.attach(ctx);
        ctx->header = nullptr;
        if (header_.block() != nullptr) {
            soap_header_record(ctx);
            if (ctx->header == nullptr)
                throw std::bad_alloc();
            ctx->header->header = header_.block();
        }
        const char *const action = options_.message.action.empty() ? "" : options_.message.action.c_str();
        const auto began = clock::now();
        const int error = soap_call(ctx, addresses_.c_str(), action, op_.records, request_, &response_);
        times_.push_back(clock::now() - began);
        connection_.report(ctx);
        return error;
    }

    std::size_t attachments_received() const
    {
        std::size_t count = 0;
        for (const soap_attachment *list : {context_->mime.list, context_->dime.list})
            for (; list != nullptr; list = list->next)
                count += list == context_->mime.root ? 0 : 1;
        return count;
    }

    exit_code report_failure()
    {
        if (!files_.problem().empty())
            throw failure(EXIT_FILE, files_.problem());
        const exit_code code = exit_code_of(context_.get());
        std::fputs(fault_report(context_.get(), name(), addresses_).c_str(), stderr);
        if (times_.size() > 1)
            std::fprintf(stderr, "  before    %zu calls went well\n", times_.size() - 1);
        return code;
    }

    void print_answer()
    {
        const auto write = [this](soap *ctx) { return op_.write_response(ctx, response_); };
        const contract::data_class &type = *contract::find_class(soap_type_name(op_.response_type));
        const std::string text =
            options_.json ? json_of(document_text(write, false), type) : document_text(write, true) + "\n";
        write_file(options_.output_file, options_.json ? text : without_controls(text));
    }

    // XML allows no control characters but these three, and a terminal obeys them.
    static std::string without_controls(std::string xml)
    {
        std::replace_if(
            xml.begin(), xml.end(),
            [](char c) {
                return (static_cast<unsigned char>(c) < ' ' && c != '\n' && c != '\t' && c != '\r') ||
                       c == '\x7F';
            },
            '?');
        return xml;
    }

    const operation &op_;
    const call_options &options_;
    std::string addresses_;
    connection connection_;
    std::vector<soap_namespace> namespaces_;
    request_header header_;
    attachment_files files_;
    document_reader reader_;
    void *request_;
    std::unique_ptr<soap> context_; // freed before all that it borrows
    void *response_ = nullptr;
    durations times_;
};

} // namespace

exit_code call_operation(const operation &op, const call_options &options)
{
    return std::make_unique<caller>(op, options)->run();
}

} // namespace cli

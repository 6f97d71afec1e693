// ping_command.cpp - see ping_command.h.
#include "ping_command.h"

#include <algorithm>
#include <cstdio>
#include <memory>
#include <stdexcept>

#include <nlohmann/json.hpp>
#include <zuv_client_pro/soap_error.h>
#include <zuv_client_pro/soap_memory.h>
#include <zuv_client_pro/soap_report.h>

#include "call_report.h"
#include "connection.h"
#include "documents.h"
#include "endpoints.h"
#include "fault_report.h"
#include "operations.h"
#include "text_files.h"

namespace cli {

namespace {

using json = nlohmann::ordered_json;

struct port_answer {
    std::string name, address;
    exit_code code = EXIT_DONE;
    bool answers = false;
    std::string fault, problem; // empty for none
    double milliseconds = 0;
};

const operation &get_operation(const port &of)
{
    for (const operation &op : all_operations())
        if (std::string_view(op.port) == of.name && std::string_view(op.name) == "get")
            return op;
    throw std::logic_error(std::string("the port ") + of.name + " has no get");
}

// One service, by one address.
class pinged_service {
public:
    pinged_service(const ping_options &options, std::string endpoint)
        : endpoint_(std::move(endpoint)), connection_(options.connection), context_(std::make_unique<soap>())
    {
        connection_.prepare(context_.get());
        for (const port &one : all_ports()) {
            ask(one);
            if (ports_.size() == 1)
                note_connection();
            const exit_code code = ports_.back().code;
            if (code == EXIT_TLS || (code == EXIT_NETWORK && connected_ < 0))
                break; // no port can do better
        }
    }

    exit_code code() const
    {
        for (const port_answer &one : ports_)
            if (!one.answers)
                return one.code;
        return EXIT_DONE;
    }

    std::string text() const
    {
        std::string text = endpoint_ + "\n";
        for (const std::string &step : steps_)
            text += "  " + step + "\n";
        for (const port_answer &one : ports_)
            text += connected_ < 0 ? "" : port_line(one);
        return text;
    }
    // Why there is no connection; empty if there is one.
    const std::string &report() const { return report_; }

    json document() const
    {
        json all = {{"endpoint", endpoint_}, {"ok", code() == EXIT_DONE}};
        all.update(facts_);
        if (connected_ < 0)
            all["problem"] = ports_.front().problem;
        all["ports"] = json::object();
        for (const port_answer &one : ports_) {
            json row = {{"address", one.address}, {"answers", one.answers}, {"ms", one.milliseconds}};
            if (!one.fault.empty())
                row["fault"] = one.fault;
            if (!one.problem.empty())
                row["problem"] = one.problem;
            all["ports"][one.name] = std::move(row);
        }
        return all;
    }

private:
    void ask(const port &of)
    {
        soap *const ctx = context_.get();
        const operation &op = get_operation(of);
        soap_discard_objects(ctx, nullptr);
        soap_discard_all(ctx);
        message_options message;
        message.keep_alive = true;
        prepare_message(ctx, message, rows_);
        connection_.renew(ctx);
        void *response = nullptr;
        port_answer answer;
        answer.name = of.name;
        answer.address = full_address(endpoint_, of);
        soap_call(ctx, answer.address.c_str(), "", op.records, reader_.make(op.request_type), &response);
        connection_.report(ctx);
        answer.code = exit_code_of(ctx);
        answer.fault = fault_name(ctx);
        answer.answers = answer.code == EXIT_DONE || !answer.fault.empty();
        if (answer.code != EXIT_DONE)
            answer.problem = failure_line(ctx);
        const soap_report *const last = soap_call_report(ctx);
        answer.milliseconds = last == nullptr ? 0 : milliseconds(last->total_time);
        ports_.push_back(std::move(answer));
    }

    void note_connection()
    {
        const soap_report *const last = soap_call_report(context_.get());
        if (last == nullptr)
            throw std::bad_alloc();
        steps_ = connection_steps(*last);
        connected_ = last->connect_time;
        const exit_code code = ports_.front().code;
        if (connected_ < 0 || code == EXIT_TLS) {
            connected_ = -1;
            report_ = fault_report(context_.get(), "ping", endpoint_);
        }
        const auto add_time = [this](const char *name, std::int64_t time) {
            if (time >= 0)
                facts_[name] = milliseconds(time);
        };
        add_time("lookup_ms", last->lookup_time);
        add_time("connect_ms", last->connect_time);
        add_time("tls_ms", last->tls_time);
        if (*last->peer != '\0')
            facts_["peer"] = last->peer;
        if (*last->tls_version != '\0')
            facts_["tls"] = {{"version", last->tls_version}, {"cipher", last->tls_cipher}};
        if (*last->certificate_subject != '\0')
            facts_["certificate"] = {{"subject", last->certificate_subject},
                                     {"issuer", last->certificate_issuer},
                                     {"valid_from", utc_time(last->certificate_not_before)},
                                     {"valid_to", utc_time(last->certificate_not_after)}};
        if (*last->certificate_refusal != '\0')
            facts_["certificate"]["refused"] = last->certificate_refusal;
    }

    static std::string port_line(const port_answer &one)
    {
        char time[64];
        std::snprintf(time, sizeof time, " in %.3f ms", one.milliseconds);
        std::string line =
            "  " + one.name + std::string(17 - std::min<std::size_t>(one.name.size(), 16), ' ');
        line += one.answers ? "answers" : "doesn't answer";
        line += time;
        if (!one.fault.empty())
            line += " with " + one.fault;
        else if (!one.problem.empty())
            line += ": " + one.problem;
        return line + "\n";
    }

    std::string endpoint_;
    connection connection_;
    std::vector<soap_namespace> rows_;
    document_reader reader_;
    std::unique_ptr<soap> context_; // freed before all that it borrows
    std::vector<port_answer> ports_;
    std::vector<std::string> steps_;
    std::string report_;
    std::int64_t connected_ = -1;
    json facts_ = json::object();
};

std::vector<std::string> endpoints_or_usual(const ping_options &options)
{
    std::vector<std::string> given = options.endpoints;
    for (const port &one : all_ports())
        if (given.empty() && one.default_address != nullptr) {
            const std::string usual = one.default_address;
            given.push_back(usual.substr(0, usual.size() - std::string_view(one.path).size()));
        }
    return given;
}

} // namespace

void ping_options::declare(CLI::App &app)
{
    declare_endpoints(app, endpoints);
    connection.declare(app);
    app.add_flag("--json", json, "As JSON, for scripts")->group("Output");
}

exit_code ping_services(const ping_options &options)
{
    exit_code code = EXIT_DONE;
    json all = json::array();
    for (const std::string &endpoint : endpoints_or_usual(options)) {
        const auto service = std::make_unique<pinged_service>(options, endpoint);
        if (code == EXIT_DONE)
            code = service->code();
        if (options.json)
            all.push_back(service->document());
        else
            std::fputs(service->text().c_str(), stdout);
        std::fputs(options.json ? "" : service->report().c_str(), stderr);
    }
    if (options.json)
        std::printf("%s\n", all.dump(2, ' ', false, json::error_handler_t::replace).c_str());
    return code;
}

} // namespace cli

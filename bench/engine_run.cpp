// engine_run.cpp - the message's part of a call: the same steps in the same order as the proxies'
// (src/exchange/call.cpp).
#include "engine_run.h"

#include <algorithm>
#include <cstring>

#include <zuv_client_pro/soap_envelope.h>
#include <zuv_client_pro/soap_identity.h>
#include <zuv_client_pro/soap_io.h>
#include <zuv_client_pro/soap_log.h>
#include <zuv_client_pro/soap_memory.h>
#include <zuv_client_pro/soap_xml.h>

#include "core/message_store.h"
#include "exchange/request.h"
#include "traits_protocolProblemReport.h"

engine_run::engine_run()
    : engine_run(binding::traits<protocolProblemReport__ProblemReportContent>::ops,
                 "protocolProblemReport:submitRequest")
{}

engine_run::engine_run(const binding::class_ops &object_class, const char *element_name)
    : soap(0, MODE_BUFFERED), ops(object_class), element(element_name)
{
    on_send = take;
    on_recv = give;
    soap_log_set_received(this, nullptr);
    soap_log_set_sent(this, nullptr);
    soap_set_namespaces(this, soap_program_namespaces);
}

int engine_run::take(soap *ctx, const char *data, std::size_t length)
{
    auto &run = *static_cast<engine_run *>(ctx);
    run.sent += length;
    if (run.kept)
        run.kept->append(data, length);
    return 0;
}

std::size_t engine_run::give(soap *ctx, char *buffer, std::size_t length)
{
    auto &run = *static_cast<engine_run *>(ctx);
    length = std::min(length, run.unread_length);
    std::memcpy(buffer, run.unread, length);
    run.unread += length;
    run.unread_length -= length;
    return length;
}

std::size_t engine_run::write(const void *object, std::uint32_t way)
{
    sent = 0;
    encoding_style = nullptr;
    output_mode = way;
    soap_reset_call(this);
    request_message message{element, &ops, object};
    if (request_count(this, message))
        return 0;
    const bool counts = (mode & MODE_COUNTING) != 0;
    const std::size_t counted = static_cast<std::size_t>(soap_message_length(this));
    if (soap_send_begin(this) || request_write(this, message) || soap_send_finish(this))
        return 0;
    message_store_wipe(this);
    return counts && sent != counted ? 0 : sent;
}

std::string engine_run::written(const void *object)
{
    std::string message;
    kept = &message;
    if (write(object) == 0)
        message.clear();
    kept = nullptr;
    return message;
}

void *engine_run::read(const std::string &message)
{
    unread = message.data();
    unread_length = message.size();
    void *object = nullptr;
    soap_reset_call(this);
    if (soap_receive_begin(this) || soap_envelope_in_begin(this) || soap_header_get(this) ||
        soap_body_in_begin(this) || !binding::class_pointer_in(this, ops, element, &object) ||
        !binding::independents_read(this) || soap_body_in_end(this) || soap_envelope_in_end(this) ||
        soap_receive_finish(this))
        return nullptr;
    return object;
}

void engine_run::release()
{
    soap_discard_objects(this, nullptr);
    soap_discard_all(this);
}

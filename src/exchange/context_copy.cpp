// context_copy.cpp - copies of a context, and its move to another place.
//
// A copy takes settings, callbacks, scratch texts and streams as they are. It gets a reference of its own to
// the TLS context. Never shared: what the engine frees at the end of a call or of a context, and a client's
// connection: two contexts on one socket would take each other's answers and close each other's descriptors.
#include <cstdlib>
#include <cstring>
#include <new>

#include <openssl/ssl.h>

#include <zuv_client_pro/soap_envelope.h>
#include <zuv_client_pro/soap_error.h>
#include <zuv_client_pro/soap_http.h>
#include <zuv_client_pro/soap_log.h>
#include <zuv_client_pro/soap_memory.h>
#include <zuv_client_pro/soap_plugin.h>
#include <zuv_client_pro/soap_tcp.h>
#include <zuv_client_pro/soap_tls.h>
#include <zuv_client_pro/soap_xml.h>

#include "core/context_state.h"
#include "core/instance_pool.h"
#include "core/memory.h"
#include "core/tracking.h"
#include "exchange/context.h"
#include "exchange/fault.h"

void soap_context_assign(soap *target, const soap *source)
{
    if (target == source)
        return;
    target->state = source->state;
#define MANAGED_FIELD_COPY(name) target->name = source->name;
    CONTEXT_MANAGED_FIELDS(MANAGED_FIELD_COPY)
#undef MANAGED_FIELD_COPY
#define FIELD_COPY(name, fate, value) field_copy(target->name, source->name);
    CONTEXT_FIELDS(FIELD_COPY)
#undef FIELD_COPY
    if (source->pointer_chains == source->pointer_table)
        target->pointer_chains = target->pointer_table;
    if (source->track_chains == source->track_table)
        target->track_chains = target->track_table;
}

namespace {

// A text of the encoding style may lie in the source's working table, which goes with the source's call.
bool style_is_received(const soap *source)
{
    if (source->local_namespaces == nullptr || source->encoding_style == nullptr)
        return false;
    for (const soap_namespace *row = source->local_namespaces; row->prefix != nullptr; ++row) {
        if (row->received == source->encoding_style)
            return true;
    }
    return false;
}

// Gives the fields of a fate their defaults.
template <field_fate Fate> void reset_fields(soap *ctx)
{
#define FIELD_DEFAULT(name, fate, value)                                                                     \
    if constexpr (field_fate::fate == Fate)                                                                  \
        field_reset(ctx->name, value);
    CONTEXT_FIELDS(FIELD_DEFAULT)
#undef FIELD_DEFAULT
}

// Texts that belong to the source's managed memory.
void forget_managed_fields(soap *ctx)
{
#define FIELD_FORGOTTEN(name) ctx->name = nullptr;
    CONTEXT_MANAGED_FIELDS(FIELD_FORGOTTEN)
#undef FIELD_FORGOTTEN
}

void forget_connection(soap *ctx)
{
    reset_fields<field_fate::CONNECTION>(ctx);
    ctx->input_mode &= ~MODE_TLS;
    ctx->output_mode &= ~MODE_TLS;
}

void forget_resources(soap *ctx)
{
    reset_fields<field_fate::RESOURCE>(ctx);
    if (ctx->tls_context != nullptr)
        SSL_CTX_up_ref(ctx->tls_context);
}

// The copy starts with the rows that the source has; the host's own table is what it falls back on later,
// since the source's working table may go first.
int copy_namespaces(soap *target, const soap *source)
{
    const soap_namespace *rows =
        source->local_namespaces != nullptr ? source->local_namespaces : source->namespaces;
    if (rows != nullptr && soap_set_namespaces(target, rows) != SOAP_OK)
        return target->error = SOAP_OUT_OF_MEMORY;
    target->namespaces = source->namespaces;
    return SOAP_OK;
}

int copy_plugin(soap *target, soap_plugin_record *old)
{
    auto *record = static_cast<soap_plugin_record *>(SOAP_MALLOC(target, sizeof(soap_plugin_record)));
    if (record == nullptr)
        return SOAP_OUT_OF_MEMORY;
    *record = *old;
    const int refusal = record->copy_hook == nullptr ? 0 : record->copy_hook(target, record, old);
    if (refusal != 0) {
        SOAP_FREE(target, record);
        return refusal;
    }
    record->next = target->plugin_list;
    target->plugin_list = record;
    return SOAP_OK;
}

int copy_plugins(soap *target, const soap *source)
{
    for (soap_plugin_record *old = source->plugin_list; old != nullptr; old = old->next) {
        const int result = copy_plugin(target, old);
        if (result != SOAP_OK)
            return target->error = result;
    }
    return SOAP_OK;
}

// A copy without a connection, in a record that holds nothing. Null if `source` has ended, or as the error in
// the copy says.
soap *copy_settings(soap *target, const soap *source)
{
    if (!context_is_alive(source))
        return nullptr;
    soap_context_assign(target, source);
    target->state = 2;
    target->master_shared = true;
    if (style_is_received(source))
        target->encoding_style = "";
    reset_fields<field_fate::MESSAGE>(target);
    forget_managed_fields(target);
    forget_connection(target);
    forget_resources(target);
    context_tables_clear(target);
    soap_log_set_received(target,
                          source->log_paths[SOAP_LOG_RECEIVED]); // a copy without memory for it goes unlogged
    soap_log_set_sent(target, source->log_paths[SOAP_LOG_SENT]);
    context_zlib_make(target);
    if (copy_namespaces(target, source) != SOAP_OK || copy_plugins(target, source) != SOAP_OK)
        return nullptr;
    return target;
}

// What soap_accept has stored is the copy's to serve, unless TLS is on it, which can't be shared.
soap *hand_over_accepted(soap *target, const soap *source)
{
    if (!source->socket_accepted || source->socket == -1 || source->socket_abandoned ||
        source->tls_bio != nullptr)
        return target;
    target->socket = source->socket;
    target->socket_accepted = true;
    target->keep_alive = source->keep_alive;
    target->buffer_index = source->buffer_index;
    target->buffer_length = source->buffer_length;
    return target;
}

} // namespace

soap *soap_context_copy(soap *target, const soap *source)
{
    if (target == source)
        return target;
    if (target == nullptr || !context_is_alive(source))
        return nullptr;
    soap_discard_objects(target, nullptr);
    soap_discard_all(target);
    soap_engine_done(target);
    return copy_settings(target, source) == nullptr ? nullptr : hand_over_accepted(target, source);
}

// A failed copy shows as state 0 or as an error in the new context.
soap::soap(const soap &other)
{
    context_fields_reset(this);
    copy_settings(this, &other);
}

soap *soap_context_copy(const soap *source)
{
    void *memory = context_is_alive(source) ? std::malloc(sizeof(soap)) : nullptr;
    if (memory == nullptr)
        return nullptr;
    auto *target = new (memory) soap(*source);
    if (target->error == SOAP_OK)
        return hand_over_accepted(target, source);
    target->~soap();
    std::free(memory);
    return nullptr;
}

// ---------------------------------------------------------------------------------------------
// Moving.

namespace {

// Ends the connection for good, whatever hooks say. A listening socket is none.
void hang_up(soap *ctx)
{
    const int error = ctx->error;
    const std::uint32_t output_mode = ctx->output_mode;
    ctx->error = SOAP_OK;
    ctx->keep_alive = 0;
    if (ctx->socket == ctx->master_socket)
        ctx->socket = -1;
    ctx->output_mode &= ~MODE_UDP; // else the socket would stay open
    soap_socket_release(ctx);
    if (ctx->socket != -1)
        soap_force_close(ctx);
    SSL_free(ctx->tls_connection); // with its BIO
    ctx->tls_connection = nullptr;
    ctx->tls_bio = nullptr;
    ctx->output_mode = output_mode;
    forget_connection(ctx);
    ctx->error = error;
}

} // namespace

soap::soap(soap &&other) noexcept
{
    context_fields_reset(this);
    if (!context_is_alive(&other))
        return;
    hang_up(&other);
    idle_drop(&other); // objects that wait name the context that they wait in
    soap_context_assign(this, &other);
    if (fault != nullptr && *soap_fault_string_field(this) == other.message_text)
        *soap_fault_string_field(this) = message_text;
    soap_context_init(&other);
}

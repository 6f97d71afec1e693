// context_copy.cpp - copies of a context, and its move to another place.
//
// A copy takes by bytes: settings, callbacks, scratch texts, streams. It gets a reference of its own to the
// TLS context. Never shared: what the engine frees at the end of a call or of a context, and a client's
// connection: two contexts on one socket would take each other's answers and close each other's descriptors.
#include <cstdlib>
#include <cstring>
#include <new>

#include <openssl/ssl.h>

#include <zuv_client_pro/soap_envelope.h>
#include <zuv_client_pro/soap_error.h>
#include <zuv_client_pro/soap_log.h>
#include <zuv_client_pro/soap_memory.h>
#include <zuv_client_pro/soap_plugin.h>
#include <zuv_client_pro/soap_tcp.h>
#include <zuv_client_pro/soap_xml.h>

#include "core/context_fields.h"
#include "core/context_state.h"
#include "core/tracking.h"

void soap_context_assign(soap *target, const soap *source)
{
    if (target == source)
        return;
    const char *base = reinterpret_cast<const char *>(source);
    const auto start = static_cast<std::size_t>(reinterpret_cast<const char *>(&source->state) - base);
    const auto end =
        static_cast<std::size_t>(reinterpret_cast<const char *>(&source->zlib_ratio_out + 1) - base);
    std::memcpy(reinterpret_cast<char *>(target) + start, base + start, end - start);
    if (source->pointer_chains == source->pointer_table)
        target->pointer_chains = target->pointer_table;
    if (source->track_chains == source->track_table)
        target->track_chains = target->track_table;
}

// A text of the encoding style may lie in the source's working table, which goes with the source's call.
static bool style_is_received(const soap *source)
{
    if (source->local_namespaces == nullptr || source->encoding_style == nullptr)
        return false;
    for (const soap_namespace *row = source->local_namespaces; row->prefix != nullptr; ++row) {
        if (row->received == source->encoding_style)
            return true;
    }
    return false;
}

// Lists and managed texts of the message under way: they stay the source's.
static void forget_message(soap *ctx)
{
    ctx->prefix_list = nullptr;
    ctx->prefix_cache_list = nullptr;
    ctx->prefix_cache_valid = 0;
    ctx->tag_resolved = false;
    ctx->block_stack = nullptr;
    ctx->instance_list = nullptr;
    ctx->allocation_list = nullptr;
    ctx->attribute_list = nullptr;
    ctx->label_buffer = nullptr;
    ctx->label_size = 0;
    ctx->label_index = 0;
    ctx->mtom_list = nullptr;
    ctx->mtom_index = nullptr;
    ctx->dime = {};
    ctx->mime = {};
    ctx->header = nullptr;
    ctx->fault = nullptr;
    ctx->action = nullptr;
    ctx->http_content = nullptr;
    ctx->auth_user = nullptr;
    ctx->auth_password = nullptr;
    ctx->auth_realm = nullptr;
    ctx->forwarded_for = nullptr;
    context_tables_clear(ctx);
}

static void forget_connection(soap *ctx)
{
    ctx->socket = -1;
    ctx->socket_abandoned = false;
    ctx->socket_accepted = false;
    ctx->response_unfinished = false;
    ctx->route.known = false;
    ctx->keep_alive = 0;
    ctx->input_mode &= ~MODE_TLS;
    ctx->output_mode &= ~MODE_TLS;
    ctx->filter_stop = 0;
    ctx->look_ahead = 0;
    ctx->buffer_index = ctx->buffer_length = ctx->chunk_buffer_length = 0;
}

static void forget_resources(soap *ctx)
{
    ctx->plugin_list = nullptr;
    ctx->namespace_scope = nullptr;
    ctx->local_namespaces = nullptr;
    ctx->namespaces = nullptr;
    for (std::size_t channel = 0; channel < SOAP_LOG_CHANNELS; ++channel) {
        ctx->log_paths[channel] = nullptr;
        ctx->log_streams[channel] = nullptr;
    }
    ctx->call_deadline = 0;
    ctx->tls_bio = nullptr;
    ctx->tls_connection = nullptr;
    ctx->tls_session = nullptr;
    ctx->session_rules = nullptr;
    if (ctx->tls_context != nullptr)
        SSL_CTX_up_ref(ctx->tls_context);
    ctx->zlib_stream = nullptr;
    ctx->zlib_state = 0;
    ctx->zlib_buffer = nullptr;
    ctx->zlib_buffer_length = 0;
    ctx->raw_aside = false; // the raw bytes lay in zlib_buffer
    ctx->raw_index = 0;
    track_table_clear(ctx);
}

// The copy starts with the rows that the source has; the host's own table is what it falls back on later,
// since the source's working table may go first.
static int copy_namespaces(soap *target, const soap *source)
{
    const soap_namespace *rows =
        source->local_namespaces != nullptr ? source->local_namespaces : source->namespaces;
    if (rows != nullptr && soap_set_namespaces(target, rows) != SOAP_OK)
        return target->error = SOAP_OUT_OF_MEMORY;
    target->namespaces = source->namespaces;
    return SOAP_OK;
}

static int copy_plugin(soap *target, soap_plugin_record *old)
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

static int copy_plugins(soap *target, const soap *source)
{
    for (soap_plugin_record *old = source->plugin_list; old != nullptr; old = old->next) {
        const int result = copy_plugin(target, old);
        if (result != SOAP_OK)
            return target->error = result;
    }
    return SOAP_OK;
}

// A copy without a connection, in a record that holds nothing. Null if `source` has ended, or as the error in
// the copy tells.
static soap *copy_settings(soap *target, const soap *source)
{
    if (!context_is_alive(source))
        return nullptr;
    soap_context_assign(target, source);
    target->state = 2;
    target->master_shared = true;
    if (style_is_received(source))
        target->encoding_style = "";
    forget_message(target);
    forget_connection(target);
    forget_resources(target);
    soap_log_set_received(target,
                          source->log_paths[SOAP_LOG_RECEIVED]); // a copy without memory for it goes unlogged
    soap_log_set_sent(target, source->log_paths[SOAP_LOG_SENT]);
    context_zlib_make(target);
    target->error = SOAP_OK;
    if (copy_namespaces(target, source) != SOAP_OK || copy_plugins(target, source) != SOAP_OK)
        return nullptr;
    return target;
}

// What soap_accept has stored is the copy's to serve, unless TLS is on it, which can't be shared.
static soap *hand_over_accepted(soap *target, const soap *source)
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
    context_fields_clear(this);
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

// Ends the connection for good, whatever hooks say. A listening socket is none.
static void hang_up(soap *ctx)
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

soap::soap(soap &&other) noexcept
{
    context_fields_clear(this);
    if (!context_is_alive(&other))
        return;
    hang_up(&other);
    soap_context_assign(this, &other);
    if (fault != nullptr && *soap_fault_string_field(this) == other.message_text)
        *soap_fault_string_field(this) = message_text;
    soap_context_init(&other);
}

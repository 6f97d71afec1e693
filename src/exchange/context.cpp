// context.cpp - life of a context: defaults, the reset ahead of a call, release at its end, the end itself.
//
// Elsewhere: copies (context_copy.cpp), the list of callbacks (callbacks.cpp), the release of each kind of
// memory (managed_blocks.cpp, instances.cpp, tracking.cpp). Always: every release operation does nothing on a
// context that has ended.
#include <algorithm>
#include <cstdlib>
#include <cstring>
#include <new>

#include <openssl/crypto.h>
#include <openssl/err.h>
#include <openssl/ssl.h>
#include <zlib.h>

#include <zuv_client_pro/soap_error.h>
#include <zuv_client_pro/soap_identity.h>
#include <zuv_client_pro/soap_log.h>
#include <zuv_client_pro/soap_memory.h>
#include <zuv_client_pro/soap_plugin.h>
#include <zuv_client_pro/soap_tcp.h>
#include <zuv_client_pro/soap_tls.h>
#include <zuv_client_pro/soap_xml.h>

#include "core/context_fields.h"
#include "core/context_state.h"
#include "core/instances.h"
#include "core/scratch.h"
#include "core/trace_log.h"
#include "core/tracking.h"
#include "exchange/callbacks.h"
#include "xml/attributes.h"

// ---------------------------------------------------------------------------------------------
// Start.

void context_tables_clear(soap *ctx)
{
    std::memset(ctx->id_table, 0, sizeof ctx->id_table);
    ctx->id_count = 0;
    ctx->id_index = nullptr;
    std::memset(ctx->pointer_table, 0, sizeof ctx->pointer_table);
    ctx->pointer_chains = ctx->pointer_table;
    ctx->pointer_chain_mask = SOAP_POINTER_HASH_SIZE - 1;
    ctx->pointer_count = 0;
    ctx->pointer_blocks = nullptr;
    ctx->pointer_block_used = 0;
}

void context_fields_clear(soap *ctx)
{
    // Ends behind the last field and not at sizeof(soap): a derived class may use the padding there.
    char *first = reinterpret_cast<char *>(ctx) +
                  (reinterpret_cast<char *>(&ctx->state) - reinterpret_cast<char *>(ctx));
    const char *end = reinterpret_cast<const char *>(&ctx->zlib_ratio_out) + sizeof ctx->zlib_ratio_out;
    std::memset(first, 0, static_cast<std::size_t>(end - first));
    ctx->master_socket = -1;
    ctx->socket = -1;
    track_table_clear(ctx);
    context_tables_clear(ctx);
}

void context_zlib_make(soap *ctx)
{
    ctx->zlib_stream = static_cast<z_stream *>(SOAP_MALLOC(ctx, sizeof(z_stream)));
    if (ctx->zlib_stream != nullptr)
        std::memset(ctx->zlib_stream, 0, sizeof(z_stream));
}

void context_credentials_wipe(soap *ctx)
{
    if (!ctx->credentials_passed)
        return;
    ctx->credentials_passed = false;
    OPENSSL_cleanse(ctx->scratch_text, sizeof ctx->scratch_text);
    const bool sending = ctx->buffer_index > ctx->buffer_length;
    const std::size_t kept_from = sending ? 0 : ctx->buffer_index;
    const std::size_t filled = sending ? ctx->buffer_index : ctx->buffer_length;
    const std::size_t kept_to = std::max(filled, ctx->chunk_buffer_length);
    OPENSSL_cleanse(ctx->buffer, kept_from);
    OPENSSL_cleanse(ctx->buffer + kept_to, sizeof ctx->buffer - kept_to);
}

// The fields whose default is not zero, null or empty.
static void set_field_defaults(soap *ctx)
{
    ctx->float_format = "%.9G";
    ctx->double_format = "%.17lG";
    ctx->dime_id_format = "cid:id%d";
    ctx->http_version = "1.1";
    ctx->encoding_style = "";
    ctx->language = "en";
    ctx->namespaces = soap_program_namespaces;
    ctx->send_fd = 1;
    ctx->recv_fd = 0;
    ctx->max_depth = SOAP_MAX_DEPTH;
    ctx->max_message = SOAP_MAX_MESSAGE;
    ctx->max_memory = SOAP_MAX_MEMORY;
    ctx->path[0] = '/';
    ctx->keep_alive_limit = 100;
    ctx->proxy_http_version = "1.0";
    ctx->proxy_port = 8080;
    ctx->zlib_level = 6;
    ctx->tls_flags = TLS_VERIFY_PEER;
    ctx->tls_setup = tls_context_setup;
    ctx->tls_verify = tls_verify_plain;
    ctx->message_part = PART_OUTSIDE;
}

void soap_context_init(soap *ctx)
{
    context_fields_clear(ctx);
    ctx->state = 1;
    trace_log_set_defaults(ctx);
    callbacks_set_defaults(ctx);
    set_field_defaults(ctx);
    context_zlib_make(ctx);
    tls_global_init();
    ctx->error = SOAP_OK;
}

void soap_context_init_modes(soap *ctx, std::uint32_t input_mode, std::uint32_t output_mode)
{
    soap_context_init(ctx);
    ctx->input_mode = input_mode;
    ctx->output_mode = output_mode;
    ctx->mode = output_mode;
}

soap::soap() : soap(0, 0) {}

soap::soap(std::uint32_t both_modes) : soap(both_modes, both_modes) {}

soap::soap(std::uint32_t wanted_input_mode, std::uint32_t wanted_output_mode)
{
    soap_context_init_modes(this, wanted_input_mode, wanted_output_mode);
}

soap *soap_context_create()
{
    return soap_context_create(0, 0);
}

soap *soap_context_create(std::uint32_t mode)
{
    return soap_context_create(mode, mode);
}

soap *soap_context_create(std::uint32_t input_mode, std::uint32_t output_mode)
{
    void *memory = std::malloc(sizeof(soap));
    return memory == nullptr ? nullptr : new (memory) soap(input_mode, output_mode);
}

// ---------------------------------------------------------------------------------------------
// Between calls.

void soap_reset_call(soap *ctx)
{
    if (ctx->keep_alive == 0) {
        ctx->buffer_index = 0;
        ctx->buffer_length = 0;
    }
    soap_element_state_reset(ctx);
    ctx->mode = 0;
    ctx->message_part = PART_OUTSIDE;
    ctx->keep_alive = ((ctx->input_mode | ctx->output_mode) & MODE_KEEP_ALIVE) != 0 ? 1 : 0;
    ctx->message_count = 0;
    ctx->content_length = 0;
    ctx->look_ahead = 0;
    ctx->error = SOAP_OK;
    ctx->fault = nullptr; // it told of an earlier exchange
    ctx->exceeded = nullptr;
    ctx->endpoint[0] = '\0';
    ctx->dime.count = 0;
    ctx->dime.chunk_size = 0;
    ctx->dime.buffer_length = 0;
    soap_call_scratch_free(ctx);
}

// ---------------------------------------------------------------------------------------------
// Release.

static void free_growing_text(soap *ctx)
{
    SOAP_FREE(ctx, ctx->label_buffer);
    ctx->label_buffer = nullptr;
    ctx->label_size = 0;
    ctx->label_index = 0;
}

static void free_attachment_references(soap *ctx)
{
    while (ctx->mtom_list != nullptr) {
        soap_attachment_ref *reference = ctx->mtom_list;
        ctx->mtom_list = reference->next;
        SOAP_FREE(ctx, reference);
    }
}

void soap_call_scratch_free(soap *ctx)
{
    if (!context_is_alive(ctx))
        return;
    soap_prefix_stack_reset(ctx);
    while (ctx->block_stack != nullptr)
        soap_block_stack_drop(ctx, nullptr);
    xml_attributes_drop(ctx);
    free_growing_text(ctx);
    soap_namespace_table_drop(ctx);
    free_attachment_references(ctx);
    soap_pointer_table_reset(ctx);
    soap_id_table_reset(ctx);
}

void soap_discard_all(soap *ctx)
{
    if (!context_is_alive(ctx))
        return;
    soap_call_scratch_free(ctx);
    soap_block_free(ctx, nullptr);
    instance_records_release(ctx);
    soap_socket_release(ctx);
    trace_log_close_all(ctx);
}

// A copy's plug-ins without a copy hook share their data with the source, which deletes it.
static void end_plugins(soap *ctx)
{
    while (ctx->plugin_list != nullptr) {
        soap_plugin_record *record = ctx->plugin_list;
        ctx->plugin_list = record->next;
        if (record->copy_hook != nullptr || ctx->state == 1)
            record->delete_hook(ctx, record);
        SOAP_FREE(ctx, record);
    }
}

static void close_master_socket(soap *ctx)
{
    if (!ctx->master_shared && ctx->master_socket != -1)
        ctx->on_close_socket(ctx, ctx->master_socket);
    ctx->master_socket = -1;
}

static void end_tls(soap *ctx)
{
    SSL_SESSION_free(ctx->tls_session);
    ctx->tls_session = nullptr;
    SSL_CTX_free(ctx->session_rules);
    ctx->session_rules = nullptr;
    SSL_free(ctx->tls_connection); // with its BIO
    ctx->tls_connection = nullptr;
    ctx->tls_bio = nullptr;
    SSL_CTX_free(ctx->tls_context);
    ctx->tls_context = nullptr;
    ERR_clear_error(); // OpenSSL frees the thread's error state itself when the thread ends
}

static void end_compression(soap *ctx)
{
    SOAP_FREE(ctx, ctx->zlib_stream);
    ctx->zlib_stream = nullptr;
    SOAP_FREE(ctx, ctx->zlib_buffer);
    ctx->zlib_buffer = nullptr;
}

void soap_engine_done(soap *ctx)
{
    if (!context_is_alive(ctx))
        return;
    soap_call_scratch_free(ctx);
    soap_namespace_scope_free(ctx);
    SOAP_FREE(ctx, ctx->pointer_blocks); // the one that stays from message to message
    ctx->pointer_blocks = nullptr;
    instance_records_release(ctx);
    if (!context_shares_socket(ctx))
        ctx->output_mode &= ~MODE_UDP; // else the socket would stay open
    ctx->keep_alive = 0;
    soap_socket_release(ctx);
    end_plugins(ctx);
    callbacks_set_defaults(ctx);
    close_master_socket(ctx);
    end_tls(ctx);
    end_compression(ctx);
    context_credentials_wipe(ctx);
    trace_log_end(ctx);
    ctx->state = 0;
    track_end(ctx);
    ctx->allocation_list = nullptr; // what stands there was named as a leak
}

void soap_context_free(soap *ctx)
{
    soap_engine_done(ctx);
    std::free(ctx);
}

soap::~soap()
{
    soap_discard_objects(this, nullptr);
    soap_discard_all(this);
    soap_engine_done(this);
}

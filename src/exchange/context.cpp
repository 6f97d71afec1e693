// context.cpp - life of a context: defaults, the reset before a call, release at its end, the end itself.
//
// Elsewhere: copies (context_copy.cpp), what becomes of each field (context.h), the release of each kind of
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
#include <zuv_client_pro/soap_http.h>
#include <zuv_client_pro/soap_identity.h>
#include <zuv_client_pro/soap_log.h>
#include <zuv_client_pro/soap_memory.h>
#include <zuv_client_pro/soap_plugin.h>
#include <zuv_client_pro/soap_tcp.h>
#include <zuv_client_pro/soap_tls.h>
#include <zuv_client_pro/soap_xml.h>

#include "core/context_state.h"
#include "core/memory.h"
#include "core/message_store.h"
#include "core/trace_log.h"
#include "core/tracking.h"
#include "exchange/context.h"
#include "exchange/fault.h"
#include "net/call_record.h"
#include "net/head_memory.h"
#include "xml/attributes.h"

// ---------------------------------------------------------------------------------------------
// Start.

// Every field has a row: this doesn't compile if there are more or fewer rows than fields, or a name stands
// twice.
[[maybe_unused]] static void every_field_has_a_row(const soap &ctx)
{
#define FIELD_NAME(name, fate, value) , name##_
#define MANAGED_FIELD_NAME(name)      , name##_
    [[maybe_unused]] const auto &[state_ CONTEXT_MANAGED_FIELDS(MANAGED_FIELD_NAME)
                                      CONTEXT_FIELDS(FIELD_NAME)] = ctx;
#undef MANAGED_FIELD_NAME
#undef FIELD_NAME
}

void context_tables_clear(soap *ctx)
{
    ctx->pointer_chains = ctx->pointer_table;
    ctx->pointer_chain_mask = SOAP_POINTER_HASH_SIZE - 1;
    track_table_clear(ctx);
}

void context_fields_reset(soap *ctx)
{
    ctx->state = 0;
#define MANAGED_FIELD_DEFAULT(name) ctx->name = nullptr;
    CONTEXT_MANAGED_FIELDS(MANAGED_FIELD_DEFAULT)
#undef MANAGED_FIELD_DEFAULT
#define FIELD_DEFAULT(name, fate, value) field_reset(ctx->name, value);
    CONTEXT_FIELDS(FIELD_DEFAULT)
#undef FIELD_DEFAULT
    ctx->path[0] = '/';
    context_tables_clear(ctx);
}

void callbacks_set_defaults(soap *ctx)
{
#define CALLBACK_DEFAULT(name, fate, value)                                                                  \
    if constexpr (field_fate::fate == field_fate::CALLBACK)                                                  \
        field_reset(ctx->name, value);
    CONTEXT_FIELDS(CALLBACK_DEFAULT)
#undef CALLBACK_DEFAULT
}

void context_zlib_make(soap *ctx)
{
    ctx->zlib_stream = static_cast<z_stream *>(SOAP_MALLOC(ctx, sizeof(z_stream)));
    if (ctx->zlib_stream != nullptr)
        std::memset(ctx->zlib_stream, 0, sizeof(z_stream));
}

void soap_context_init(soap *ctx)
{
    context_fields_reset(ctx);
    ctx->state = 1;
    ctx->namespaces = soap_program_namespaces;
    trace_log_set_defaults(ctx);
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

void soap_element_state_reset(soap *ctx)
{
    ctx->in_cdata = 0;
    ctx->has_body = 0;
    ctx->position_count = 0;
    ctx->encoding_flag = 0;
    ctx->must_understand = 0;
    ctx->null_flag = 0;
    ctx->namespace_state = 0;
    ctx->attributes_set = 0;
    ctx->peeked = 0;
    ctx->other_flag = 0;
    ctx->root_flag = 0;
    ctx->allocated = 0;
    ctx->wsu_id_flag = 0;
    ctx->nesting_level = 0;
    ctx->next_id = 0;
}

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
    ctx->fault = nullptr; // it is of an earlier exchange
    ctx->exceeded = nullptr;
    ctx->endpoint[0] = '\0';
    ctx->dime.count = 0;
    ctx->dime.chunk_size = 0;
    ctx->dime.buffer_length = 0;
    ctx->attachment_stage = nullptr;
    soap_call_scratch_free(ctx);
}

// ---------------------------------------------------------------------------------------------
// Release.

namespace {

void free_attachment_references(soap *ctx)
{
    while (ctx->mtom_list != nullptr) {
        soap_attachment_ref *reference = ctx->mtom_list;
        ctx->mtom_list = reference->next;
        SOAP_FREE(ctx, reference);
    }
}

} // namespace

void soap_call_scratch_free(soap *ctx)
{
    if (!context_is_alive(ctx))
        return;
    soap_prefix_stack_reset(ctx);
    while (ctx->block_stack != nullptr)
        soap_block_stack_drop(ctx, nullptr);
    xml_attributes_drop(ctx);
    growing_text_free(ctx);
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

namespace {

// A copy's plug-ins without a copy hook share their data with the source, which deletes it.
void end_plugins(soap *ctx)
{
    while (ctx->plugin_list != nullptr) {
        soap_plugin_record *record = ctx->plugin_list;
        ctx->plugin_list = record->next;
        if (record->copy_hook != nullptr || ctx->state == 1)
            record->delete_hook(ctx, record);
        SOAP_FREE(ctx, record);
    }
}

void close_master_socket(soap *ctx)
{
    if (!ctx->master_shared && ctx->master_socket != -1)
        ctx->on_close_socket(ctx, ctx->master_socket);
    ctx->master_socket = -1;
}

void end_tls(soap *ctx)
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

void end_compression(soap *ctx)
{
    SOAP_FREE(ctx, ctx->zlib_stream);
    ctx->zlib_stream = nullptr;
    SOAP_FREE(ctx, ctx->zlib_buffer);
    ctx->zlib_buffer = nullptr;
}

} // namespace

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
    message_store_free(ctx);
    head_memory_free(ctx);
    call_record_free(ctx);
    credentials_wipe(ctx);
    trace_log_end(ctx);
    ctx->state = 0;
    track_end(ctx);
    ctx->allocation_list = nullptr; // what is in it was reported as a leak
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

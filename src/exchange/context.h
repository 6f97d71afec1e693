// context.h - what becomes of each field of a context when it begins, is copied, and loses its connection.
//
// A field has one row here, or in core/memory.h; context.cpp doesn't compile without it. What more
// has to be done for a field than its row says is in the functions of context.cpp and context_copy.cpp
// that use the rows.
#pragma once

#include <cstring>
#include <type_traits>

#include <zuv_client_pro/soap.h>

// In a copy of the context a field
//   SETTING     is the same
//   CALLBACK    is the same; it goes back to its default when the context ends, so that nothing of a plug-in
//   stays STATE       is the same: what an exchange leaves after, and the next one sets before it reads it
//   MESSAGE     has its default: it belongs to the message under way
//   CONNECTION  has its default: a copy has no connection. Also set when a context loses its connection by a
//   move RESOURCE    has its default first: the copy makes its own, or gets a reference of its own
enum class field_fate { SETTING, CALLBACK, STATE, MESSAGE, CONNECTION, RESOURCE };

#if defined(__has_feature)
#define ZUV_HAS_FEATURE(name) __has_feature(name)
#else
#define ZUV_HAS_FEATURE(name) 0
#endif

// Under AddressSanitizer released memory goes back to it at once, so that late use is seen.
#if defined(__SANITIZE_ADDRESS__) || ZUV_HAS_FEATURE(address_sanitizer)
constexpr std::uint64_t POOL_LIMIT_DEFAULT = 0;
#else
constexpr std::uint64_t POOL_LIMIT_DEFAULT = SOAP_POOL_LIMIT;
#endif

// X(name, fate, default). The default {} is zero, null or empty. Without `state`, which tells whether the
// others mean anything.
// clang-format off
#define CONTEXT_FIELDS(X) \
    X(soap_version, SETTING, {}) \
    X(input_mode, SETTING, {}) \
    X(output_mode, SETTING, {}) \
    X(float_format, SETTING, "%.9G") \
    X(double_format, SETTING, "%.17lG") \
    X(dime_id_format, SETTING, "cid:id%d") \
    X(http_version, SETTING, "1.1") \
    X(encoding_style, SETTING, "") \
    X(actor, SETTING, {}) \
    X(language, SETTING, "en") \
    X(recv_timeout, SETTING, {}) \
    X(send_timeout, SETTING, {}) \
    X(connect_timeout, SETTING, {}) \
    X(accept_timeout, SETTING, {}) \
    X(call_timeout, SETTING, {}) \
    X(wait_with_poll, SETTING, {}) \
    X(legacy, SETTING, {}) \
    X(max_message, SETTING, SOAP_MAX_MESSAGE) \
    X(max_memory, SETTING, SOAP_MAX_MEMORY) \
    X(pool_limit, SETTING, POOL_LIMIT_DEFAULT) \
    X(socket_flags, SETTING, {}) \
    X(connect_flags, SETTING, {}) \
    X(bind_flags, SETTING, {}) \
    X(accept_flags, SETTING, {}) \
    X(linger_seconds, SETTING, {}) \
    X(user, SETTING, {}) \
    X(master_socket, SETTING, -1) \
    X(master_shared, SETTING, {}) \
    X(output_stream, SETTING, {}) \
    X(input_stream, SETTING, {}) \
    X(send_fd, SETTING, 1) \
    X(recv_fd, SETTING, {}) \
    X(max_depth, SETTING, SOAP_MAX_DEPTH) \
    X(xml_prolog, SETTING, {}) \
    X(tcp_keep_alive, SETTING, {}) \
    X(tcp_keep_idle, SETTING, {}) \
    X(tcp_keep_interval, SETTING, {}) \
    X(tcp_keep_count, SETTING, {}) \
    X(keep_alive_limit, SETTING, 100) \
    X(proxy_http_version, SETTING, "1.0") \
    X(proxy_host, SETTING, {}) \
    X(proxy_port, SETTING, 8080) \
    X(proxy_user, SETTING, {}) \
    X(proxy_password, SETTING, {}) \
    X(canonical_include, SETTING, {}) \
    X(canonical_exclude, SETTING, {}) \
    X(ipv6_multicast_scope, SETTING, {}) \
    X(ipv4_multicast_interface, SETTING, {}) \
    X(ipv4_multicast_ttl, SETTING, {}) \
    X(peer, SETTING, {}) \
    X(peer_length, SETTING, {}) \
    X(peer_fixed, SETTING, {}) \
    X(tls_setup, SETTING, tls_context_setup) \
    X(tls_verify, SETTING, tls_verify_plain) \
    X(tls_context, SETTING, {}) \
    X(tls_dh_file, SETTING, {}) \
    X(tls_random_file, SETTING, {}) \
    X(tls_flags, SETTING, TLS_VERIFY_PEER) \
    X(tls_key_file, SETTING, {}) \
    X(tls_password, SETTING, {}) \
    X(tls_ca_file, SETTING, {}) \
    X(tls_ca_path, SETTING, {}) \
    X(tls_crl, SETTING, {}) \
    X(zlib_dictionary, SETTING, {}) \
    X(zlib_dictionary_length, SETTING, {}) \
    X(zlib_level, SETTING, 6) \
    X(upcalls, SETTING, &fault_upcalls) \
    X(on_post, CALLBACK, http_write_request) \
    X(on_get, CALLBACK, http_get_default) \
    X(on_put, CALLBACK, http_put_default) \
    X(on_delete, CALLBACK, http_delete_default) \
    X(on_options, CALLBACK, http_method_default) \
    X(on_head, CALLBACK, http_method_default) \
    X(on_form, CALLBACK, nullptr) \
    X(on_header_line, CALLBACK, http_write_line) \
    X(on_response, CALLBACK, http_write_response) \
    X(on_read_head, CALLBACK, http_read_head) \
    X(on_parse_header, CALLBACK, http_parse_header) \
    X(on_soap_header, CALLBACK, nullptr) \
    X(on_connect, CALLBACK, nullptr) \
    X(on_disconnect, CALLBACK, nullptr) \
    X(on_close_socket, CALLBACK, tcp_close_socket) \
    X(on_shutdown_socket, CALLBACK, tcp_shutdown_socket) \
    X(on_open, CALLBACK, tcp_connect) \
    X(on_accept, CALLBACK, tcp_accept_socket) \
    X(on_close, CALLBACK, tcp_disconnect) \
    X(on_send, CALLBACK, tcp_send) \
    X(on_recv, CALLBACK, tcp_recv) \
    X(on_poll, CALLBACK, tcp_peek) \
    X(on_error_text, CALLBACK, nullptr) \
    X(on_find_plugin, CALLBACK, soap_plugin_find) \
    X(on_malloc, CALLBACK, nullptr) \
    X(on_send_prepare_begin, CALLBACK, nullptr) \
    X(on_recv_prepare_begin, CALLBACK, nullptr) \
    X(on_send_prepare, CALLBACK, nullptr) \
    X(on_recv_prepare, CALLBACK, nullptr) \
    X(on_send_prepare_end, CALLBACK, nullptr) \
    X(on_recv_prepare_end, CALLBACK, nullptr) \
    X(on_send_filter, CALLBACK, nullptr) \
    X(on_recv_filter, CALLBACK, nullptr) \
    X(dime_read_open, CALLBACK, nullptr) \
    X(dime_read_close, CALLBACK, nullptr) \
    X(dime_read, CALLBACK, nullptr) \
    X(dime_write_open, CALLBACK, nullptr) \
    X(dime_write_close, CALLBACK, nullptr) \
    X(dime_write, CALLBACK, nullptr) \
    X(mime_read_open, CALLBACK, nullptr) \
    X(mime_read_close, CALLBACK, nullptr) \
    X(mime_read, CALLBACK, nullptr) \
    X(mime_write_open, CALLBACK, nullptr) \
    X(mime_write_close, CALLBACK, nullptr) \
    X(mime_write, CALLBACK, nullptr) \
    X(mode, STATE, {}) \
    X(call_expired, STATE, {}) \
    X(next_id, STATE, {}) \
    X(credentials_passed, STATE, {}) \
    X(in_cdata, STATE, {}) \
    X(has_body, STATE, {}) \
    X(nesting_level, STATE, {}) \
    X(message_count, STATE, {}) \
    X(content_length, STATE, {}) \
    X(buffer, STATE, {}) \
    X(message_text, STATE, {}) \
    X(scratch_text, STATE, {}) \
    X(tag, STATE, {}) \
    X(element_id, STATE, {}) \
    X(element_href, STATE, {}) \
    X(element_type, STATE, {}) \
    X(array_type, STATE, {}) \
    X(array_size, STATE, {}) \
    X(array_offset, STATE, {}) \
    X(tag_length, STATE, {}) \
    X(tag_local, STATE, {}) \
    X(tag_row, STATE, {}) \
    X(prefix_cache, STATE, {}) \
    X(position_count, STATE, {}) \
    X(positions, STATE, {}) \
    X(encoding_flag, STATE, {}) \
    X(must_understand, STATE, {}) \
    X(null_flag, STATE, {}) \
    X(namespace_state, STATE, {}) \
    X(attributes_set, STATE, {}) \
    X(peeked, STATE, {}) \
    X(other_flag, STATE, {}) \
    X(root_flag, STATE, {}) \
    X(allocated, STATE, {}) \
    X(wsu_id_flag, STATE, {}) \
    X(message_part, STATE, PART_OUTSIDE) \
    X(chunk_size, STATE, {}) \
    X(body_received, STATE, {}) \
    X(content_length_given, STATE, {}) \
    X(body_open, STATE, {}) \
    X(body_ended, STATE, {}) \
    X(prepare_held, STATE, {}) \
    X(framing_doubtful, STATE, {}) \
    X(plain_received, STATE, {}) \
    X(attached_received, STATE, {}) \
    X(bytes_copied, STATE, {}) \
    X(memory_held, STATE, {}) \
    X(plain_sent, STATE, {}) \
    X(xml_end_max, STATE, {}) \
    X(exceeded, STATE, {}) \
    X(exceeded_value, STATE, {}) \
    X(endpoint, STATE, {}) \
    X(path, STATE, {}) \
    X(host, STATE, {}) \
    X(peer_address, STATE, {}) \
    X(port, STATE, {}) \
    X(status, STATE, {}) \
    X(error_mode, STATE, {}) \
    X(errno_value, STATE, {}) \
    X(session_host, STATE, {}) \
    X(session_port, STATE, {}) \
    X(zlib_crc, STATE, {}) \
    X(zlib_in, STATE, {}) \
    X(zlib_out, STATE, {}) \
    X(zlib_ratio_in, STATE, {}) \
    X(zlib_ratio_out, STATE, {}) \
    X(prefix_list, MESSAGE, {}) \
    X(block_stack, MESSAGE, {}) \
    X(instance_list, MESSAGE, {}) \
    X(allocation_list, MESSAGE, {}) \
    X(id_table, MESSAGE, {}) \
    X(id_count, MESSAGE, {}) \
    X(id_index, MESSAGE, {}) \
    X(pointer_table, MESSAGE, {}) \
    X(pointer_chains, MESSAGE, {}) \
    X(pointer_chain_mask, MESSAGE, {}) \
    X(pointer_count, MESSAGE, {}) \
    X(pointer_blocks, MESSAGE, {}) \
    X(pointer_block_used, MESSAGE, {}) \
    X(label_buffer, MESSAGE, {}) \
    X(label_size, MESSAGE, {}) \
    X(label_index, MESSAGE, {}) \
    X(tag_resolved, MESSAGE, {}) \
    X(prefix_cache_valid, MESSAGE, {}) \
    X(prefix_cache_list, MESSAGE, {}) \
    X(attribute_list, MESSAGE, {}) \
    X(bare_declarations, MESSAGE, {}) \
    X(error, MESSAGE, {}) \
    X(dime, MESSAGE, {}) \
    X(mime, MESSAGE, {}) \
    X(mtom_list, MESSAGE, {}) \
    X(mtom_index, MESSAGE, {}) \
    X(attachment_stage, MESSAGE, {}) \
    X(store_end, MESSAGE, {}) \
    X(store_space, MESSAGE, {}) \
    X(mark_state, MESSAGE, {}) \
    X(filter_stop, CONNECTION, {}) \
    X(socket, CONNECTION, -1) \
    X(opened_by, CONNECTION, {}) \
    X(socket_abandoned, CONNECTION, {}) \
    X(response_unfinished, CONNECTION, {}) \
    X(socket_accepted, CONNECTION, {}) \
    X(route, CONNECTION, {}) \
    X(buffer_index, CONNECTION, {}) \
    X(buffer_length, CONNECTION, {}) \
    X(look_ahead, CONNECTION, {}) \
    X(chunk_buffer_length, CONNECTION, {}) \
    X(keep_alive, CONNECTION, {}) \
    X(call_deadline, RESOURCE, {}) \
    X(namespaces, RESOURCE, {}) \
    X(local_namespaces, RESOURCE, {}) \
    X(namespace_scope, RESOURCE, {}) \
    X(plugin_list, RESOURCE, {}) \
    X(raw_index, RESOURCE, {}) \
    X(raw_aside, RESOURCE, {}) \
    X(log_paths, RESOURCE, {}) \
    X(log_streams, RESOURCE, {}) \
    X(track_table, RESOURCE, {}) \
    X(track_chains, RESOURCE, {}) \
    X(track_chain_mask, RESOURCE, {}) \
    X(pools, RESOURCE, {}) \
    X(store, RESOURCE, {}) \
    X(head_memory, RESOURCE, {}) \
    X(call_record, RESOURCE, {}) \
    X(tls_bio, RESOURCE, {}) \
    X(tls_connection, RESOURCE, {}) \
    X(tls_session, RESOURCE, {}) \
    X(session_rules, RESOURCE, {}) \
    X(zlib_stream, RESOURCE, {}) \
    X(zlib_state, RESOURCE, {}) \
    X(zlib_buffer, RESOURCE, {}) \
    X(zlib_buffer_length, RESOURCE, {})
// clang-format on

// Gives a field its default.
template <class T> void field_reset(T &field, const std::type_identity_t<T> &value)
{
    field = value;
}
template <class T, std::size_t N> void field_reset(T (&field)[N], std::nullptr_t)
{
    std::memset(static_cast<void *>(field), 0, sizeof field);
}

// Gives a field the value of another context's.
template <class T> void field_copy(T &target, const T &source)
{
    target = source;
}
template <class T, std::size_t N> void field_copy(T (&target)[N], const T (&source)[N])
{
    std::memcpy(static_cast<void *>(target), source, sizeof target);
}

// Points the pointer, id and tracking tables to the empty ones within the record, without freeing what they
// held.
void context_tables_clear(soap *ctx);

// Gives all fields their defaults, without freeing what they held; `state` becomes 0. The virtual table,
// padding and the members of derived classes are left alone.
void context_fields_reset(soap *ctx);

// Gives all callbacks their defaults.
void callbacks_set_defaults(soap *ctx);

// Gives the context a fresh zlib stream; null if memory runs out, which compression finds out when it starts.
void context_zlib_make(soap *ctx);

// The flags as they are before a message; depth and ids start at 0.
void soap_element_state_reset(soap *ctx);

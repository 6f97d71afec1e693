// callbacks.cpp - the one list of the context's replaceable operations and what each is by default.
//
// A context starts with these and gets them back at its end, so that nothing of a plug-in stays behind.
#include "exchange/callbacks.h"

#include <zuv_client_pro/soap_http.h>
#include <zuv_client_pro/soap_plugin.h>
#include <zuv_client_pro/soap_tcp.h>

#define SOAP_CALLBACKS(X)                                                                                    \
    X(on_post, http_write_request)                                                                           \
    X(on_get, http_get_default)                                                                              \
    X(on_put, http_put_default)                                                                              \
    X(on_delete, http_delete_default)                                                                        \
    X(on_options, http_method_default)                                                                       \
    X(on_head, http_method_default)                                                                          \
    X(on_form, nullptr)                                                                                      \
    X(on_header_line, http_write_line)                                                                       \
    X(on_response, http_write_response)                                                                      \
    X(on_read_head, http_read_head)                                                                          \
    X(on_parse_header, http_parse_header)                                                                    \
    X(on_soap_header, nullptr)                                                                               \
    X(on_connect, nullptr)                                                                                   \
    X(on_disconnect, nullptr)                                                                                \
    X(on_close_socket, tcp_close_socket)                                                                     \
    X(on_shutdown_socket, tcp_shutdown_socket)                                                               \
    X(on_open, tcp_connect)                                                                                  \
    X(on_accept, tcp_accept_socket)                                                                          \
    X(on_close, tcp_disconnect)                                                                              \
    X(on_send, tcp_send)                                                                                     \
    X(on_recv, tcp_recv)                                                                                     \
    X(on_poll, tcp_peek)                                                                                     \
    X(on_error_text, nullptr)                                                                                \
    X(on_find_plugin, soap_plugin_find)                                                                      \
    X(on_malloc, nullptr)                                                                                    \
    X(on_send_prepare_begin, nullptr)                                                                        \
    X(on_recv_prepare_begin, nullptr)                                                                        \
    X(on_send_prepare, nullptr)                                                                              \
    X(on_recv_prepare, nullptr)                                                                              \
    X(on_send_prepare_end, nullptr)                                                                          \
    X(on_recv_prepare_end, nullptr)                                                                          \
    X(on_send_filter, nullptr)                                                                               \
    X(on_recv_filter, nullptr)                                                                               \
    X(dime_read_open, nullptr)                                                                               \
    X(dime_read_close, nullptr)                                                                              \
    X(dime_read, nullptr)                                                                                    \
    X(dime_write_open, nullptr)                                                                              \
    X(dime_write_close, nullptr)                                                                             \
    X(dime_write, nullptr)                                                                                   \
    X(mime_read_open, nullptr)                                                                               \
    X(mime_read_close, nullptr)                                                                              \
    X(mime_read, nullptr)                                                                                    \
    X(mime_write_open, nullptr)                                                                              \
    X(mime_write_close, nullptr)                                                                             \
    X(mime_write, nullptr)

void callbacks_set_defaults(soap *ctx)
{
#define SOAP_CALLBACK_DEFAULT(name, function) ctx->name = function;
    SOAP_CALLBACKS(SOAP_CALLBACK_DEFAULT)
#undef SOAP_CALLBACK_DEFAULT
}

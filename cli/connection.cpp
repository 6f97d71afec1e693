// connection.cpp - see connection.h.
#include "connection.h"

#include <cerrno>
#include <charconv>
#include <cmath>
#include <cstdio>
#include <cstdlib>
#include <system_error>

#include <unistd.h>

#include <zuv_client_pro/soap_error.h>
#include <zuv_client_pro/soap_log.h>
#include <zuv_client_pro/soap_tls.h>
#include <zuv_client_pro/soap_xml.h>

#include "call_report.h"
#include "failure.h"
#include "text_files.h"

namespace cli {

namespace {

constexpr double MICROSECONDS_MAX = 2000; // seconds that still fit an int as microseconds
constexpr std::int16_t GZIP = 2;

std::string secret(const std::string &file, const char *variable, const std::string &configured)
{
    if (!file.empty())
        return read_secret(file);
    const char *const value = std::getenv(variable);
    return value == nullptr ? configured : value;
}

const char *text_or_null(const std::string &text)
{
    return text.empty() ? nullptr : text.c_str();
}

// A time limit in the engine's form: seconds, or microseconds as a negative number.
int limit_of(double seconds)
{
    if (seconds > MICROSECONDS_MAX || seconds == std::floor(seconds))
        return static_cast<int>(seconds);
    return -std::max(1, static_cast<int>(seconds * 1e6));
}

// OpenSSL says neither which file it couldn't read nor why.
void require_readable(const char *option, const std::string &path)
{
    if (!path.empty() && access(path.c_str(), R_OK) != 0)
        throw failure(EXIT_FILE, std::string(option) + ": " + printable(path) + ": " +
                                     std::generic_category().message(errno));
}

void split_proxy(const std::string &proxy, std::string &host, int &port)
{
    if (proxy.find('@') != std::string::npos) // not shown: there may be a password in it
        throw failure(EXIT_USAGE,
                      "--proxy: HOST:PORT is wanted; the user is given by --proxy-user, the password by "
                      "--proxy-password-file or ZUV_PROXY_PASSWORD");
    const std::size_t colon = proxy.rfind(':');
    const char *const end = proxy.data() + proxy.size();
    if (colon == std::string::npos || colon == 0 ||
        std::from_chars(proxy.data() + colon + 1, end, port).ptr != end || port < 1 || port > 65535)
        throw failure(EXIT_USAGE, "--proxy: HOST:PORT is wanted, not \"" + printable(proxy) + "\"");
    host = proxy.substr(0, colon);
    if (host.starts_with('[') && host.ends_with(']'))
        host = host.substr(1, host.size() - 2);
}

} // namespace

connection::connection(const connection_options &options)
    : options_(options), password_(secret(options.password_file, "ZUV_PASSWORD", options.password)),
      key_password_(secret(options.key_password_file, "ZUV_KEY_PASSWORD", options.key_password)),
      proxy_password_(secret(options.proxy_password_file, "ZUV_PROXY_PASSWORD", options.proxy_password))
{
    if (!options_.proxy.empty())
        split_proxy(options_.proxy, proxy_host_, proxy_port_);
}

void connection::prepare(soap *ctx) const
{
    ctx->connect_timeout = limit_of(options_.connect_limit);
    ctx->send_timeout = ctx->recv_timeout = limit_of(options_.silence_limit);
    ctx->proxy_host = text_or_null(proxy_host_);
    ctx->proxy_port = proxy_port_;
    if (!options_.proxy_user.empty()) {
        ctx->proxy_user = options_.proxy_user.c_str();
        ctx->proxy_password = proxy_password_.c_str();
    }
    const char *const trace = options_.trace_file == "-" ? "/dev/stdout" : text_or_null(options_.trace_file);
    if (soap_log_set_received(ctx, trace) != SOAP_OK || soap_log_set_sent(ctx, trace) != SOAP_OK)
        throw std::bad_alloc();
    if (options_.trace_times && options_.trace_file == "-")
        throw failure(EXIT_USAGE, "--trace-times: the trace must be a file");
    const std::string times = options_.trace_file + ".times";
    if (options_.trace_times && soap_log_set(ctx, SOAP_LOG_TIMES, times.c_str()) != SOAP_OK)
        throw std::bad_alloc();
    prepare_tls(ctx);
}

// The peer is checked by the library's rules, except for the host name, which is checked strictly here.
void connection::prepare_tls(soap *ctx) const
{
    require_readable("--ca-file", options_.ca_file);
    require_readable("--ca-path", options_.ca_path);
    require_readable("--crl-file", options_.crl_file);
    require_readable("--key-file", options_.key_file);
    unsigned flags = TLS_VERIFY_PEER | TLS_NO_SSLV3 | TLS_NO_TLSV1;
    flags |= options_.no_host_check ? TLS_SKIP_HOST_CHECK : TLS_STRICT_HOST_CHECK;
    if (options_.allow_expired)
        flags |= TLS_ALLOW_EXPIRED;
    if (!options_.ca_file.empty() || !options_.ca_path.empty())
        flags |= TLS_NO_DEFAULT_CA;
    ctx->tls_crl = text_or_null(options_.crl_file);
    if (soap_ssl_client_context(ctx, static_cast<std::uint16_t>(flags), text_or_null(options_.key_file),
                                text_or_null(key_password_), text_or_null(options_.ca_file),
                                text_or_null(options_.ca_path), nullptr) != SOAP_OK) {
        char text[SOAP_TEXT_SIZE] = "";
        throw failure(EXIT_TLS,
                      "TLS can't be set up: " + printable(soap_fault_print_text(ctx, text, sizeof text)));
    }
}

void connection::renew(soap *ctx) const
{
    ctx->auth_user = text_or_null(options_.user);
    ctx->auth_password = options_.user.empty() ? nullptr : password_.c_str();
}

void connection::report(soap *ctx) const
{
    const soap_report *const last = options_.verbose ? soap_call_report(ctx) : nullptr;
    if (last != nullptr)
        std::fputs(call_report(*last).c_str(), stderr);
}

void refuse_user(const std::string &address)
{
    const std::size_t scheme = address.find("://");
    const std::size_t start = scheme == std::string::npos ? 0 : scheme + 3;
    if (address.find('@', start) < address.find('/', start))
        throw failure(EXIT_USAGE, "an address has no user: give one by --user, and the password by "
                                  "--password-file or ZUV_PASSWORD");
}

void prepare_message(soap *ctx, const message_options &options, std::vector<soap_namespace> &rows)
{
    const std::uint32_t mode = MODE_UTF_STRINGS | (options.keep_alive ? MODE_KEEP_ALIVE : 0);
    ctx->input_mode = mode;
    ctx->output_mode =
        mode | (options.chunked ? MODE_CHUNKED : MODE_BUFFERED) | (options.gzip ? MODE_DEFLATE : 0);
    if (options.gzip)
        ctx->zlib_out = GZIP;
    if (!options.soap12)
        return;
    rows.clear();
    for (const soap_namespace *row = ctx->namespaces; row->prefix != nullptr; ++row)
        rows.push_back(*row);
    rows.push_back({nullptr, nullptr, nullptr, nullptr});
    rows.at(0).uri = "http://www.w3.org/2003/05/soap-envelope";
    rows.at(1).uri = "http://www.w3.org/2003/05/soap-encoding";
    if (soap_set_namespaces(ctx, rows.data()) != SOAP_OK)
        throw std::bad_alloc();
}

} // namespace cli

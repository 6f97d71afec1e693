// data_command.cpp - see data_command.h.
#include "data_command.h"

#include <algorithm>
#include <cstdio>
#include <filesystem>
#include <limits>
#include <memory>
#include <optional>
#include <system_error>
#include <utility>

#include <zuv_client_pro/soap_error.h>
#include <zuv_client_pro/soap_http.h>
#include <zuv_client_pro/soap_io.h>
#include <zuv_client_pro/soap_tcp.h>

#include "attachments.h"
#include "connection.h"
#include "failure.h"
#include "fault_report.h"
#include "progress.h"
#include "replaced_file.h"
#include "text_files.h"

namespace cli {

namespace {

constexpr std::size_t STRETCH = 65536; // bytes
constexpr int HTTP_OK = 200;

// One exchange with a data port; the connection is closed at its end.
class transfer {
public:
    explicit transfer(const data_options &options)
        : options_(options), connection_(options.connection), context_(std::make_unique<soap>(MODE_BUFFERED))
    {
        refuse_user(options.address);
        if (!options.address.starts_with("http://") && !options.address.starts_with("https://"))
            throw failure(EXIT_USAGE,
                          "http://... or https://... is wanted, not \"" + printable(options.address) + "\"");
        connection_.prepare(context_.get());
        connection_.renew(context_.get());
    }

    exit_code fetch()
    {
        std::optional<replaced_file> replaced;
        if (options_.file != "-")
            replaced.emplace(options_.file);
        soap *const ctx = context_.get();
        const bool begun = begin(STATUS_GET, 0) == SOAP_OK && soap_receive_begin(ctx) == SOAP_OK;
        const bool whole = begun ? receive_into(replaced ? replaced->stream() : stdout)
                                 : ctx->status == HTTP_OK && ctx->error == SOAP_NO_DATA;
        if (whole && replaced)
            replaced->commit();
        return finish("data get", whole);
    }

    exit_code deliver()
    {
        std::error_code error;
        const std::uintmax_t size = std::filesystem::file_size(options_.file, error);
        const file_handle file(error ? nullptr : std::fopen(options_.file.c_str(), "rb"));
        if (!file)
            fail_file("can't be opened");
        soap *const ctx = context_.get();
        ctx->http_content = options_.type.c_str();
        if (begin(STATUS_POST_FILE, size) != SOAP_OK || !send_from(file.get(), size) ||
            soap_send_finish(ctx) != SOAP_OK)
            return finish("data put", false);
        const bool answered = soap_receive_begin(ctx) == SOAP_OK;
        return finish("data put", answered || (ctx->status == HTTP_OK && ctx->error == SOAP_NO_DATA));
    }

private:
    [[noreturn]] void fail_file(const char *what) const
    {
        cli::fail_file(options_.file == "-" ? "standard output" : options_.file, what);
    }

    int begin(int status, std::uint64_t size)
    {
        soap *const ctx = context_.get();
        soap_reset_call(ctx);
        if (soap_endpoint_check(ctx, options_.address.c_str()) != SOAP_OK || soap_count_begin(ctx) != SOAP_OK)
            return ctx->error;
        ctx->message_count = size;
        if (soap_count_end(ctx) != SOAP_OK)
            return ctx->error;
        return soap_connect_one(ctx, status, options_.address.c_str(), nullptr);
    }

    bool send_from(std::FILE *file, std::uint64_t size)
    {
        progress shown(options_.file, size, true, connection_.quiet());
        char stretch[STRETCH];
        while (size != 0) {
            const std::size_t got = std::fread(
                stretch, 1, static_cast<std::size_t>(std::min<std::uint64_t>(size, sizeof stretch)), file);
            if (got == 0)
                fail_file("has become shorter while it was sent");
            if (soap_send_bytes(context_.get(), stretch, got) != SOAP_OK)
                return false;
            size -= got;
            shown.advance(got);
        }
        return true;
    }

    // The body, framing and compression undone. False if it is cut off.
    bool receive_into(std::FILE *file)
    {
        soap *const ctx = context_.get();
        const bool length_known =
            ctx->content_length_given && (ctx->mode & MODE_IO_MASK) != MODE_CHUNKED && ctx->zlib_in == 0;
        const std::uint64_t whole =
            length_known ? ctx->content_length : std::numeric_limits<std::uint64_t>::max();
        progress shown(options_.address, length_known ? whole : 0, true, connection_.quiet());
        std::uint64_t left = whole;
        while (left != 0 && (ctx->buffer_index < ctx->buffer_length || soap_recv_more(ctx) == SOAP_OK)) {
            const std::size_t got = static_cast<std::size_t>(
                std::min<std::uint64_t>(left, ctx->buffer_length - ctx->buffer_index));
            if (std::fwrite(ctx->buffer + ctx->buffer_index, 1, got, file) != got)
                fail_file("can't be written");
            ctx->buffer_index += got;
            left -= got;
            shown.advance(got);
        }
        if (std::fflush(file) != 0)
            fail_file("can't be written");
        if (length_known && left != 0 && ctx->error == SOAP_OK)
            ctx->error = SOAP_EOF;
        return ctx->error == SOAP_OK && soap_receive_finish(ctx) == SOAP_OK;
    }

    exit_code finish(const char *what, bool succeeded)
    {
        soap *const ctx = context_.get();
        const exit_code code = succeeded ? EXIT_DONE : exit_code_of(ctx);
        if (!succeeded)
            std::fputs(fault_report(ctx, what, options_.address).c_str(), stderr);
        ctx->keep_alive = 0;
        soap_socket_release(ctx);
        connection_.report(ctx);
        return code;
    }

    const data_options &options_;
    connection connection_;
    std::unique_ptr<soap> context_;
};

} // namespace

void data_options::declare(CLI::App &app, bool delivers)
{
    app.add_option("URL", address, "Address of the data, such as a data port's dataURI")->required();
    if (delivers) {
        app.add_option("FILE", file, "File to deliver")->required();
        app.add_option("--type", type, "Its media type")
            ->capture_default_str()
            ->type_name("TYPE")
            ->group("Message");
    } else
        app.add_option("-o,--output", file, "File for the data; without it standard output")
            ->type_name("FILE")
            ->group("Output");
    connection.declare(app);
}

exit_code fetch_data(const data_options &options)
{
    return std::make_unique<transfer>(options)->fetch();
}

exit_code deliver_data(const data_options &options)
{
    return std::make_unique<transfer>(options)->deliver();
}

} // namespace cli

// attachments.cpp - see attachments.h.
#include "attachments.h"

#include <algorithm>
#include <cerrno>
#include <filesystem>
#include <system_error>

#include <zuv_client_pro/soap_attachment.h>
#include <zuv_client_pro/soap_error.h>

#include "failure.h"
#include "text_files.h"

namespace cli {

namespace {

constexpr unsigned short DIME_NO_OPTIONS = 0;
constexpr std::size_t NAME_MAX_LENGTH = 80; // characters of a sender's id in a file name

std::string reason()
{
    return std::generic_category().message(errno);
}

// Removes ",key=value" from the end of a specification; the empty text if it is not there.
std::string take_parameter(std::string &specification, const std::string &key)
{
    const std::size_t at = specification.rfind("," + key + "=");
    if (at == std::string::npos || specification.find(',', at + 1) != std::string::npos)
        return "";
    std::string value = specification.substr(at + key.size() + 2);
    specification.erase(at);
    return value;
}

// A safe file name from what a peer sent: no path, not hidden, no special characters of a shell or terminal.
std::string file_name(unsigned number, const char *id)
{
    std::string name;
    for (const char *c = id == nullptr ? "" : id; *c != '\0' && name.size() < NAME_MAX_LENGTH; ++c) {
        const bool plain = (*c >= 'a' && *c <= 'z') || (*c >= 'A' && *c <= 'Z') || (*c >= '0' && *c <= '9');
        if (plain || *c == '-' || *c == '.')
            name += *c;
        else if (*c != '<' && *c != '>')
            name += '_';
    }
    return std::to_string(number) + (name.empty() ? "" : "-" + name);
}

// True if there is nothing to read: some system files have bytes although their size is 0.
bool is_empty(std::FILE *file)
{
    std::rewind(file);
    return std::fgetc(file) == EOF && std::ferror(file) == 0;
}

} // namespace

attachment_files::attachment_files(const message_options &options, bool quiet)
    : options_(options), quiet_(quiet), folder_(options.save_folder)
{
    for (std::string specification : options.attach) {
        outgoing &one = out_.emplace_back();
        one.id = take_parameter(specification, "id");
        one.type = take_parameter(specification, "type");
        if (one.id.empty())
            one.id = take_parameter(specification, "id");
        if (one.id.empty())
            one.id = "attachment-" + std::to_string(out_.size());
        if (one.type.empty())
            one.type = "application/octet-stream";
        one.path = specification;
        one.name = std::filesystem::path(specification).filename().string();
        one.file.reset(std::fopen(specification.c_str(), "rb"));
        std::error_code error;
        one.size = std::filesystem::is_regular_file(specification, error)
                       ? std::filesystem::file_size(specification, error)
                       : 0;
        if (!one.file || error || !std::filesystem::is_regular_file(specification, error))
            throw failure(EXIT_FILE,
                          specification + ": can't be attached: " + (one.file ? "not a file" : reason()));
        if (!options_.dime && one.id.find_first_of("<>\r\n") == std::string::npos)
            one.id = "<" + one.id + ">";
    }
    std::error_code error;
    if (!folder_.empty() && !std::filesystem::is_directory(folder_, error) &&
        !std::filesystem::create_directories(folder_, error))
        throw failure(EXIT_FILE, folder_ + ": can't be made: " + error.message());
}

void attachment_files::prepare(soap *ctx)
{
    ctx->user = this;
    ctx->mime_read_open = [](soap *c, void *handle, const char *, const char *, const char *) {
        return of(c).begin_reading(c, handle);
    };
    ctx->mime_read = ctx->dime_read = [](soap *c, void *handle, char *buffer, std::size_t length) {
        return of(c).read(*static_cast<outgoing *>(handle), buffer, length);
    };
    ctx->dime_read_open = [](soap *c, void *handle, const char *, const char *, const char *) {
        return of(c).begin_reading(c, handle);
    };
    ctx->mime_read_close =
        ctx->dime_read_close = [](soap *, void *handle) { static_cast<outgoing *>(handle)->shown.reset(); };
    if (folder_.empty())
        return;
    ctx->mime_write_open = [](soap *c, void *, const char *id, const char *type, const char *, int) {
        return of(c).begin_writing(c, id, type);
    };
    ctx->dime_write_open = [](soap *c, const char *id, const char *type, const char *) {
        return of(c).begin_writing(c, id, type);
    };
    ctx->mime_write = ctx->dime_write = [](soap *c, void *handle, const char *data, std::size_t length) {
        return of(c).write(c, *static_cast<incoming *>(handle), data, length);
    };
    ctx->mime_write_close = ctx->dime_write_close = [](soap *c, void *handle) {
        of(c).end_writing(c, *static_cast<incoming *>(handle));
    };
}

void attachment_files::attach(soap *ctx)
{
    if (options_.dime)
        ctx->output_mode |= MODE_DIME;
    else if (!out_.empty() || options_.mime || options_.mtom)
        soap_mime_start(ctx, nullptr, nullptr);
    if (options_.mtom)
        ctx->output_mode |= MODE_MTOM;
    for (outgoing &one : out_) {
        char *const handle =
            one.size == 0 && is_empty(one.file.get()) ? nullptr : reinterpret_cast<char *>(&one);
        const int error = options_.dime
                              ? soap_dime_attach(ctx, handle, one.size, one.type.c_str(), one.id.c_str(),
                                                 DIME_NO_OPTIONS, nullptr)
                              : soap_mime_attach(ctx, handle, one.size, MIME_BINARY, one.type.c_str(),
                                                 one.id.c_str(), nullptr, one.name.c_str());
        if (error != SOAP_OK)
            throw std::bad_alloc();
    }
}

void *attachment_files::begin_reading(soap *ctx, const void *handle)
{
    const auto from =
        std::find_if(out_.begin(), out_.end(), [handle](const outgoing &one) { return &one == handle; });
    if (from == out_.end())
        return soap_attachment_in_memory(ctx); // the bytes of a value
    std::rewind(from->file.get());             // a repeated call sends it again
    from->shown = std::make_unique<progress>(from->name, from->size, true, quiet_);
    return &*from;
}

std::size_t attachment_files::read(outgoing &from, char *buffer, std::size_t length)
{
    const std::size_t got = std::fread(buffer, 1, length, from.file.get());
    if (std::ferror(from.file.get()) != 0)
        problem_ = from.path + ": can't be read: " + reason();
    else if (got == 0 && from.size != 0)
        problem_ = from.path + ": has become shorter while it was sent";
    from.shown->advance(got);
    return got;
}

void *attachment_files::begin_writing(soap *ctx, const char *id, const char *type)
{
    incoming &one = in_.emplace_back();
    one.path = (std::filesystem::path(folder_) / file_name(++count_, id)).string();
    one.description = printable(type == nullptr || *type == '\0' ? "no type given" : type);
    try {
        one.file = std::make_unique<replaced_file>(one.path);
    } catch (const failure &problem) { // not through the library, which throws nothing
        problem_ = problem.what();
        ctx->error = SOAP_USER_ERROR;
        return nullptr;
    }
    one.shown = std::make_unique<progress>(one.path, 0, true, quiet_);
    return &one;
}

int attachment_files::write(soap *ctx, incoming &to, const char *data, std::size_t length)
{
    if (std::fwrite(data, 1, length, to.file->stream()) != length) {
        problem_ = to.path + ": can't be written: " + reason();
        return ctx->error = SOAP_USER_ERROR;
    }
    to.size += length;
    to.shown->advance(length);
    return SOAP_OK;
}

// An attachment that was cut off leaves no file.
void attachment_files::end_writing(const soap *ctx, incoming &to)
{
    to.shown.reset();
    try {
        if (ctx->error == SOAP_OK) {
            to.file->commit();
            to.complete = true;
        }
    } catch (const failure &problem) {
        problem_ = problem.what();
    }
    to.file.reset();
}

std::vector<std::string> attachment_files::saved()
{
    std::vector<std::string> lines;
    for (const incoming &one : in_)
        if (one.complete)
            lines.push_back(one.path + ": " + size_words(one.size) + ", " + one.description);
    in_.clear();
    return lines;
}

} // namespace cli

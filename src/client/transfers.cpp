// transfers.cpp - see transfers.h.
#include "client/transfers.h"

#include <sys/stat.h>

#include <zuv_client_pro/soap_attachment.h>
#include <zuv_client_pro/soap_error.h>
#include <zuv_client_pro/soap_memory.h>

#include "client/engine.h"

namespace zuv {

namespace {

constexpr std::uint32_t TRANSFER_MODES = MODE_IO_MASK | MODE_MTOM | MODE_DIME;

void clear_callbacks(soap *ctx)
{
    ctx->mime_read_open = nullptr;
    ctx->dime_read_open = nullptr;
    ctx->mime_read = ctx->dime_read = nullptr;
    ctx->mime_write_open = nullptr;
    ctx->dime_write_open = nullptr;
    ctx->mime_write = ctx->dime_write = nullptr;
    ctx->mime_write_close = ctx->dime_write_close = nullptr;
}

// Of a received attachment's file. Returns SOAP_USER_ERROR.
int report_unwritable(soap *ctx, const std::string &path)
{
    return soap_fault_receiver(ctx, "can't write the file of an attachment",
                               soap_string_dup(ctx, path.c_str()), SOAP_USER_ERROR);
}

} // namespace

int refuse(soap *ctx, const char *text, const std::string &what)
{
    return soap_fault_sender(ctx, text, soap_string_dup(ctx, what.c_str()), SOAP_USER_ERROR);
}

transfers &transfers::of(soap *ctx)
{
    return static_cast<engine *>(ctx)->carried;
}

int transfers::begin(soap *ctx, attachments &carried)
{
    carried_ = &carried;
    kept_mode = ctx->output_mode;
    outgoing.clear();
    outgoing.reserve(carried.parts_.size());
    const bool in_records = carried.form_ == attachment_form::dime;
    ctx->output_mode |= in_records ? MODE_DIME : carried.form_ == attachment_form::mtom ? MODE_MTOM : 0U;
    set_callbacks(ctx);
    if (!in_records)
        soap_mime_start(ctx, nullptr, nullptr);
    for (const part &each : carried.parts_)
        if (const int code = attach(ctx, each, in_records))
            return code;
    return ctx->error;
}

int transfers::attach(soap *ctx, const part &what, bool in_record)
{
    outgoing.push_back({&what, nullptr, what.read ? what.size : what.bytes.size()});
    sending &made = outgoing.back();
    if (!what.path.empty()) {
        struct stat about = {};
        made.file.reset(std::fopen(what.path.c_str(), "rb"));
        if (made.file == nullptr || fstat(fileno(made.file.get()), &about) != 0 || !S_ISREG(about.st_mode))
            return refuse(ctx, "can't read the file of an attachment", what.path);
        made.total = static_cast<std::uint64_t>(about.st_size);
    }
    if (made.total == UNKNOWN_SIZE)
        ctx->output_mode |= MODE_CHUNKED;
    char *const handle =
        made.total == 0 ? nullptr : reinterpret_cast<char *>(&made); // 0 with a handle: unknown
    const std::uint64_t size = made.total == UNKNOWN_SIZE ? 0 : made.total;
    if (in_record)
        return soap_dime_attach(ctx, handle, size, what.type.c_str(), what.id.c_str(), 0, nullptr);
    char *const id = soap_string_dup(ctx, ("<" + what.id + ">").c_str());
    return id == nullptr ? ctx->error
                         : soap_mime_attach(ctx, handle, size, MIME_BINARY, what.type.c_str(), id, nullptr,
                                            what.description.empty() ? nullptr : what.description.c_str());
}

int transfers::end(soap *ctx, int code)
{
    if (carried_ == nullptr)
        return code;
    carried_ = nullptr;
    ctx->output_mode = (ctx->output_mode & ~TRANSFER_MODES) | (kept_mode & TRANSFER_MODES);
    clear_callbacks(ctx);
    outgoing.clear();
    for (const auto &each : incoming) {
        each->file.reset();
        const std::string &name = each->to.path;
        if (name.empty())
            continue;
        const std::string made = name + ".part";
        if (code != SOAP_OK || !each->whole)
            std::remove(made.c_str());
        else if (std::rename(made.c_str(), name.c_str()) != 0) {
            code = refuse(ctx, "can't write the file of an attachment", name);
            std::remove(made.c_str());
        }
    }
    incoming.clear();
    return code;
}

void *transfers::choose(soap *ctx, const char *id, const char *type, const char *description)
{
    sink to =
        carried_->receiver_
            ? carried_->receiver_({text_or_empty(id), text_or_empty(type), text_or_empty(description), {}})
            : sink();
    if (to.path.empty() && !to.write)
        return soap_attachment_in_memory(ctx);
    auto made = std::make_unique<receiving>();
    made->to = std::move(to);
    if (!made->to.path.empty()) {
        made->file.reset(std::fopen((made->to.path + ".part").c_str(), "wb"));
        if (made->file == nullptr)
            return report_unwritable(ctx, made->to.path), nullptr;
    }
    incoming.push_back(std::move(made));
    return incoming.back().get();
}

// A handle of `attach`; what else is sent as an attachment is in memory.
void *transfers::recognised(soap *ctx, void *handle)
{
    for (sending &each : outgoing)
        if (handle == &each)
            return handle;
    return soap_attachment_in_memory(ctx);
}

std::size_t transfers::read_piece(soap *ctx, void *handle, char *buffer, std::size_t length)
{
    sending &from = *static_cast<sending *>(handle);
    std::size_t count = 0;
    if (from.file != nullptr) {
        count = std::fread(buffer, 1, length, from.file.get());
    } else if (from.what->read) {
        of(ctx).consumed = true;
        count = from.what->read(buffer, length);
    } else {
        count = from.what->bytes.copy(buffer, length, static_cast<std::size_t>(from.done));
    }
    from.done += count;
    if (count != 0 && from.what->on_progress)
        from.what->on_progress(from.done, from.total == UNKNOWN_SIZE ? 0 : from.total);
    return count;
}

int transfers::write_piece(soap *ctx, void *handle, const char *data, std::size_t length)
{
    receiving &into = *static_cast<receiving *>(handle);
    if (into.file != nullptr && std::fwrite(data, 1, length, into.file.get()) != length)
        return report_unwritable(ctx, into.to.path);
    if (into.file == nullptr && !into.to.write(data, length))
        return soap_fault_receiver(ctx, "the function for an attachment doesn't want it", nullptr,
                                   SOAP_USER_ERROR);
    into.done += length;
    if (into.to.on_progress)
        into.to.on_progress(into.done, 0);
    return SOAP_OK;
}

// Values that refer to the attachment find none in memory.
void transfers::end_incoming(soap *ctx, void *handle, soap_attachment *record)
{
    receiving &into = *static_cast<receiving *>(handle);
    into.whole = into.file == nullptr || std::fflush(into.file.get()) == 0;
    if (!into.whole)
        report_unwritable(ctx, into.to.path);
    if (record != nullptr) {
        record->content = nullptr;
        record->size = 0;
    }
}

void transfers::set_callbacks(soap *ctx)
{
    ctx->mime_read_open = [](soap *c, void *handle, const char *, const char *, const char *) {
        return of(c).recognised(c, handle);
    };
    ctx->dime_read_open = [](soap *c, void *handle, const char *, const char *, const char *) {
        return of(c).recognised(c, handle);
    };
    ctx->mime_read = ctx->dime_read = read_piece;
    ctx->mime_write_open = [](soap *c, void *, const char *id, const char *type, const char *description,
                              int) { return of(c).choose(c, id, type, description); };
    ctx->dime_write_open = [](soap *c, const char *id, const char *type, const char *) {
        return of(c).choose(c, id, type, nullptr);
    };
    ctx->mime_write = ctx->dime_write = write_piece;
    ctx->mime_write_close = [](soap *c, void *handle) { end_incoming(c, handle, c->mime.last); };
    ctx->dime_write_close = [](soap *c, void *handle) { end_incoming(c, handle, c->dime.last); };
}

} // namespace zuv

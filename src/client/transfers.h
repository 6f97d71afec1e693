// transfers.h - the attachments of one attempt of a call: sources and targets of their bytes, and the context's
// callbacks for them.
#pragma once

#include <cstdio>
#include <memory>
#include <string>
#include <string_view>
#include <vector>

#include <zuv_client_pro/client_attachment.h>
#include <zuv_client_pro/soap.h>

namespace zuv {

inline const char *text_or_empty(const char *text)
{
    return text != nullptr ? text : "";
}

// Ends a call with SOAP_USER_ERROR before anything is sent, or while attachments are moved. `text` is constant.
int refuse(soap *ctx, const char *text, const std::string &what);

struct closed_file {
    void operator()(std::FILE *file) const { std::fclose(file); }
};
using open_file = std::unique_ptr<std::FILE, closed_file>;

// An attachment on its way out. Its address is the handle that the library passes back.
struct sending {
    const part *what;
    open_file file;
    std::uint64_t total, done = 0;
};

// One on its way in.
struct receiving {
    sink to;
    open_file file;
    std::uint64_t done = 0;
    bool whole = false;
};

struct transfers {
    // Opens files, attaches what is to be sent, and sets modes and callbacks.
    int begin(soap *ctx, attachments &carried);
    // Takes modes and callbacks back. Files that came become those that they are to be, or go; `code` is that
    // of the call. Returns it, or SOAP_USER_ERROR if a file can't become what it is to be.
    int end(soap *ctx, int code);

    bool consumed = false; // a function was asked for bytes of an attachment

private:
    static transfers &of(soap *ctx);
    int attach(soap *ctx, const part &what, bool in_record);
    void *choose(soap *ctx, const char *id, const char *type, const char *description);
    void *recognised(soap *ctx, void *handle);
    static void set_callbacks(soap *ctx);
    static std::size_t read_piece(soap *ctx, void *handle, char *buffer, std::size_t length);
    static int write_piece(soap *ctx, void *handle, const char *data, std::size_t length);
    static void end_incoming(soap *ctx, void *handle, soap_attachment *record);

    std::vector<sending> outgoing;
    std::vector<std::unique_ptr<receiving>> incoming;
    attachments *carried_ = nullptr;
    std::uint32_t kept_mode = 0;
};

} // namespace zuv

// attachments.h - attachments of messages: files that are sent and files that are received, piece by piece.
#pragma once

#include <cstdio>
#include <list>
#include <memory>
#include <string>
#include <vector>

#include <zuv_client_pro/soap.h>

#include "call_options.h"
#include "progress.h"
#include "replaced_file.h"
#include "text_files.h"

namespace cli {

// The attachments of one context's messages. Its callbacks are set by `prepare`; the context must not outlive
// it.
class attachment_files {
public:
    // An empty `save_folder` keeps nothing; otherwise it is created if needed. failure if a file can't be
    // opened.
    attachment_files(const message_options &options, bool quiet);
    attachment_files(const attachment_files &) = delete;
    attachment_files &operator=(const attachment_files &) = delete;

    void prepare(soap *ctx);
    // Sets the form of the next message and attaches the files. std::bad_alloc if the context has no memory
    // for that.
    void attach(soap *ctx);

    // What was saved since the last call of it, a line each; and what went wrong with a file here, empty for
    // nothing.
    std::vector<std::string> saved();
    const std::string &problem() const { return problem_; }

private:
    struct outgoing {
        std::string path, type, id, name;
        unsigned long long size = 0;
        file_handle file;
        std::unique_ptr<progress> shown;
    };
    struct incoming {
        std::string path, description;
        unsigned long long size = 0;
        bool complete = false;
        std::unique_ptr<replaced_file> file;
        std::unique_ptr<progress> shown;
    };
    void *begin_reading(soap *ctx, const void *handle);
    std::size_t read(outgoing &from, char *buffer, std::size_t length);
    void *begin_writing(soap *ctx, const char *id, const char *type);
    int write(soap *ctx, incoming &to, const char *data, std::size_t length);
    void end_writing(const soap *ctx, incoming &to);
    static attachment_files &of(soap *ctx) { return *static_cast<attachment_files *>(ctx->user); }

    std::list<outgoing> out_; // stable addresses: the engine holds them as handles
    std::list<incoming> in_;
    const message_options &options_;
    bool quiet_;
    std::string folder_, problem_;
    unsigned count_ = 0;
};

} // namespace cli

// enclosures.h - attachments that travel with messages: those of a request go into files while they arrive,
// those of an answer come out of files.
//
// Here: the context's callbacks for them, and their limits. Elsewhere: the files (data_files.h), what
// documents say of them (attachments.h), the rest of a request (reception.h).
#pragma once

#include <cstdint>
#include <list>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include <zuv_client_pro/soap.h>

#include "data_files.h"
#include "settings.h"
#include "transfer_encoding.h"

namespace service {

// An attachment that came with the request, out of its transfer encoding: in a file, or in memory if it stood
// before the message or is the value of an element.
struct enclosed_data {
    arriving_file *file; // null: in memory
    const char *content;
    std::uint64_t size;
};

class enclosures {
public:
    enclosures(const settings &config, std::string directory)
        : config_(config), directory_(std::move(directory))
    {}

    // Forgets the previous exchange; files that weren't kept are removed.
    void reset();
    // The request is refused: removes such files now, and those that were kept meanwhile.
    void discard_arrived();
    // What was kept stays: what refers to it is on the disk.
    void confirm_kept() { kept_.clear(); }

    // The form that a request's head names (MODE_DIME, MODE_MIME), and the message itself (MODE_MTOM).
    void set_form(std::uint32_t form) { form_ = form; }
    void add_form(std::uint32_t form) { form_ |= form; }
    bool has_form() const { return form_ != 0; }

    // The callbacks for what arrives, in the forms of DIME and MIME. `write` returns 0 or the code that ends
    // the request, an HTTP status or one of the library's with a fault's text. `encoding` is a
    // soap_mime_encoding.
    void *open(soap *ctx, const char *id, int encoding);
    int write(soap *ctx, void *handle, const char *data, std::size_t length);
    static void close(soap *ctx, void *handle);
    static bool is_in_file(const void *handle)
    {
        return static_cast<const arriving_part *>(handle)->file.has_value();
    }

    // For what is sent: the handle if it is one of a file; the bytes of a value are left to the library.
    void *reopen(soap *ctx, void *handle);
    static std::size_t read(void *handle, char *buffer, std::size_t length);

    bool too_large() const { return too_large_; }

    // What a reference ("cid:...") of the request means; false if nothing does.
    bool find(soap *ctx, const std::string &reference, enclosed_data &found);

    // Keeps it under a name.
    void keep(const enclosed_data &data, std::string_view name);

    // Sends a kept file with the answer, once, with its name as id. False for a request without form, and
    // if too many files are sent already.
    bool enclose(const std::string &name);

    // The modes of the answer, 0 without enclosures; adds the files to a message about to be counted:
    // SOAP_OK or SOAP_OUT_OF_MEMORY.
    std::uint32_t answer_form() const { return outgoing_.empty() ? 0 : form_; }
    int attach_all(soap *ctx);

    const std::string &directory() const { return directory_; }

private:
    struct arriving_part {
        std::unique_ptr<transfer_decoder> decoder; // null: the bytes stay as they are
        std::optional<arriving_file> file;
        std::string memory; // without a file; between calls only, with one
    };
    struct outgoing {
        outgoing(const std::string &directory, const std::string &name)
            : id(name), bracketed_id("<" + name + ">"), file(directory, name)
        {}
        std::string id, bracketed_id;
        kept_file file;
    };

    static void end_decoding(soap *ctx, arriving_part &part);

    const settings &config_;
    std::string directory_;
    std::uint32_t form_ = 0;
    std::uint64_t arrived_bytes_ = 0;
    std::size_t arrived_ = 0; // attachments, in memory or in files
    bool too_large_ = false;
    std::list<arriving_part> arrived_parts_;
    std::vector<std::string> kept_; // names
    std::list<outgoing> outgoing_;
};

} // namespace service

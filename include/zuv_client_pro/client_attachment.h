// client_attachment.h - attachments of a call, both ways: from files, memory and functions, to the same.
//
// Elsewhere: the records and parts on the wire (soap_attachment.h), the calls (client.h).
//
// Always: functions that a host program gives here are called during the call, on its thread, and must not
// throw. Bytes of attachments pass through in pieces; memory use is the same for any size, but for parts that
// are kept in memory.
#pragma once

#include <atomic>
#include <cstdint>
#include <functional>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include <zuv_client_pro/client.h>

namespace zuv {

struct transfers; // of the library

// Called after each piece with the bytes passed so far and the total, 0 if that isn't known.
using progress = std::function<void(std::uint64_t done, std::uint64_t total)>;

constexpr std::uint64_t UNKNOWN_SIZE = ~std::uint64_t{0}; // of part::size

// An attachment to be sent; made by the functions below.
struct part {
    std::string id;                                // of the attachment, without angle brackets
    std::string type = "application/octet-stream"; // media type
    std::string description;                       // sent with MIME; empty: none
    std::string path;                              // the file; empty: `read` or `bytes`
    std::string_view bytes;                        // borrowed: the memory
    // The callback: stores at most `size` bytes and returns their number, 0 at the end.
    std::function<std::size_t(char *buffer, std::size_t size)> read;
    std::uint64_t size = UNKNOWN_SIZE; // bytes that `read` gives; unknown: the message is sent in chunks
    progress on_progress;              // of the sending; may be empty

    // What a member such as protocol__Attachment::dataHandler says to refer to the attachment.
    //   returns  "cid:" and the id
    std::string reference() const { return "cid:" + id; }
};

namespace detail {

// For the functions below.
//   on_progress  of the sending; may be empty
//   returns      an attachment with an id of its own in the process
inline part named_part(progress on_progress)
{
    static std::atomic<unsigned> last{0};
    part made;
    made.id = "part-" + std::to_string(++last);
    made.on_progress = std::move(on_progress);
    return made;
}

} // namespace detail

// An attachment from a file, which is opened when the call begins. A file that can't be opened or read ends
// the call with SOAP_USER_ERROR.
//   path         of the file
//   on_progress  of the sending; may be empty
//   returns      the attachment, with an id of its own in the process
inline part file_part(std::string path, progress on_progress = nullptr)
{
    part made = detail::named_part(std::move(on_progress));
    made.path = std::move(path);
    return made;
}

// An attachment from memory.
//   bytes        borrowed until the call has returned
//   on_progress  of the sending; may be empty
//   returns      as above
inline part memory_part(std::string_view bytes, progress on_progress = nullptr)
{
    part made = detail::named_part(std::move(on_progress));
    made.bytes = bytes;
    return made;
}

// An attachment from a function. A call that has asked it for bytes is never repeated.
//   read         as part::read
//   size         bytes that it gives; UNKNOWN_SIZE: the message is sent in chunks
//   on_progress  of the sending; may be empty
//   returns      as above
inline part callback_part(std::function<std::size_t(char *buffer, std::size_t size)> read,
                          std::uint64_t size = UNKNOWN_SIZE, progress on_progress = nullptr)
{
    part made = detail::named_part(std::move(on_progress));
    made.read = std::move(read);
    made.size = size;
    return made;
}

// Where a received attachment goes; made by the functions below. Without path and function: to memory.
struct sink {
    std::string path; // the file
    // Takes a piece; false ends the call with SOAP_USER_ERROR.
    std::function<bool(const char *data, std::size_t size)> write;
    progress on_progress; // of the receiving; may be empty
};

// To memory, with the result.
//   returns  the sink
inline sink to_memory()
{
    return {};
}
// To a file. The bytes go to a file of the same name with ".part" after it, which takes the name when the
// call has succeeded and is removed otherwise; so what was there before is never left half overwritten.
//   path         of the file
//   on_progress  of the receiving; may be empty
//   returns      the sink
inline sink to_file(std::string path, progress on_progress = nullptr)
{
    sink made;
    made.path = std::move(path);
    made.on_progress = std::move(on_progress);
    return made;
}
// To a function.
//   write        as sink::write
//   on_progress  of the receiving; may be empty
//   returns      the sink
inline sink to_callback(std::function<bool(const char *data, std::size_t size)> write,
                        progress on_progress = nullptr)
{
    sink made;
    made.write = std::move(write);
    made.on_progress = std::move(on_progress);
    return made;
}

// Chooses where a received attachment goes.
using receiver = std::function<sink(const received_part &about)>;

// How attachments are sent. A service answers in the form in which it was asked.
enum class attachment_form : int {
    mtom, // MIME parts that XML refers to (MTOM); xsd__base64Binary members are sent as parts as well
    mime, // MIME parts
    dime  // DIME records
};

// The attachments of one call or several, which extras::carry takes; the header that a program includes for
// them, for client.h does without.
class attachments {
public:
    // Adds one to be sent, with each call that carries this object.
    //   added    the attachment
    //   returns  this object, for the next of these functions
    attachments &send(part added)
    {
        parts_.push_back(std::move(added));
        return *this;
    }
    // Chooses how attachments are sent and asked for: MTOM unless it is called.
    //   chosen   the form
    //   returns  this object
    attachments &form(attachment_form chosen)
    {
        form_ = chosen;
        return *this;
    }
    // Takes the attachments of responses, which are kept in memory otherwise.
    //   chooser  called for each of them
    //   returns  this object
    attachments &receive(receiver chooser)
    {
        receiver_ = std::move(chooser);
        return *this;
    }

private:
    friend struct transfers;
    std::vector<part> parts_;
    receiver receiver_;
    attachment_form form_ = attachment_form::mtom;
};

} // namespace zuv

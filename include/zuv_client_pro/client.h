// client.h - clients of the service ports as objects of today's C++: zuv::profile_client and its like
// (client_ports.h, generated), their options, results and failures.
//
// Elsewhere: options (client_options.h), failures (client_failure.h), members of requests and responses
// (client_document.h), attachments (client_attachment.h, which a host program includes for them), the classes
// of the data, which come with the header of the port, such as protocolProfile.h. There is no second engine
// below: a call is one soap_call on the client's context, a soap.
//
// Always: one client serves one thread and one call at a time, and so do its results until they are moved.
// Nothing here throws but what the standard library throws when memory runs out; it all compiles with
// -fno-exceptions. The header needs C++17.
#pragma once

#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include <zuv_client_pro/client_document.h>
#include <zuv_client_pro/client_failure.h>
#include <zuv_client_pro/client_options.h>
#include <zuv_client_pro/soap_call.h>
#include <zuv_client_pro/soap_report.h>

class protocol__Header;
struct soap_attachment;

namespace zuv {

class attachments; // client_attachment.h
struct engine;     // of the library

// An attachment that was received, or is about to be. Valid during the function that it is passed to, or as
// long as the result that it was asked of.
struct received_part {
    std::string_view id;          // MIME: with its angle brackets
    std::string_view type;        // media type
    std::string_view description; // of MIME
    std::string_view content;     // the bytes; empty for one that went to a file or a function
};

// What a call has besides its request.
class ZUV_CLASS extras {
public:
    extras();
    ~extras();
    extras(const extras &) = delete;
    extras &operator=(const extras &) = delete;
    // The header of the message.
    //   record   borrowed until the call has returned
    //   returns  this object, for the next of these functions
    extras &header(const protocol__Header &record);
    // The document that the call is about: targetURI of the header. With `header` too, the message has a copy
    // of that header with this targetURI.
    //   uri      of the document, copied
    //   returns  this object
    extras &target(std::string_view uri);
    // Allows the call to be repeated where it isn't known whether the request was taken; see retry_policy. For
    // requests that do no harm when they are served twice, such as get.
    //   returns  this object
    extras &repeatable();
    // The attachments that are sent with the request, and where those of the response go.
    //   carried  borrowed until the call has returned
    //   returns  this object
    extras &carry(attachments &carried);

    // No extras.
    //   returns  the same object each time
    static const extras &none();

private:
    friend struct engine;
    const protocol__Header *header_ = nullptr;
    attachments *attachments_ = nullptr;
    std::string target_;
    bool repeatable_ = false;
};

// What every result has, whatever the class of its response.
class ZUV_CLASS outcome {
public:
    // Moves what the call brought. Afterwards it depends neither on the client nor on its thread; `other` is
    // a failure with code 0. Where no memory is left for that, the result stays with its client as it was.
    //   other    the result to move
    //   returns  this result
    outcome(outcome &&other) noexcept;
    outcome &operator=(outcome &&other) noexcept;

    // Whether the call succeeded: the response is there.
    //   true   it is there
    //   false  see `failure`
    explicit operator bool() const { return object_ != nullptr; }

    // Why the call failed.
    //   returns  the failure, valid as long as the result isn't moved; with code 0 if the call succeeded
    const zuv::failure &failure() const { return failure_; }

    // The header block of the response.
    //   returns  a view of it; of nothing if the response has none
    view<protocol__Header> header() const { return header_; }

    // The attachments of the response, in order; those that went to a file or a function are without
    // content.
    //   returns  the attachments, valid as long as the result
    std::vector<received_part> attachments() const;

protected:
    // Makes the call.
    //   from       the client; null if it was moved from
    //   name       of the operation, constant
    //   operation  its type ids
    //   request    an object of its request class
    //   how        what the call has besides
    outcome(engine *from, const char *name, const soap_operation &operation, const void *request,
            const extras &how);
    // Frees what the call brought.
    ~outcome();
    // The response.
    //   returns  the object
    //   null     the call failed
    void *object() const { return object_; }

private:
    friend class client;
    void fail(const char *text, int code, failure_kind kind);
    void run(engine &from, const soap_operation &operation, const void *request, const extras &how);
    void note_failure(engine &from, int code);
    bool detach();
    void adopt(engine *ended);
    void release();
    void take(outcome &other);

    // Where the response is: at first in the client's context; in one of its own when the client makes another
    // call, when the client ends, and when the result is moved.
    engine *from_ = nullptr;
    soap *own_ = nullptr;
    zuv::failure failure_;
    protocol__Header *header_ = nullptr;
    const soap_attachment *parts_ = nullptr, *root_ = nullptr;
    void *object_ = nullptr;
};

// The result of a call: the response with all that it points to, or a failure. It frees the response at its
// end. It is valid after further calls of its client and after the client's end; moved, it may also go to
// another thread. A result that outlives the next call, or is moved, holds a context of its own (about 200
// KB): let results end, or copy out of them what is wanted, before the next call where that matters.
//   T  class of the response
template <class T> class result : public outcome {
public:
    // The response. Of a call that failed: an empty object, which is shared and has every member at its
    // default, so that reading it does no harm.
    //   returns  the response, valid as long as the result
    const T &operator*() const { return *view<T>(get()); }
    const T *operator->() const { return &**this; }
    // The response, to be changed or passed on.
    //   returns  the response
    //   null     the call failed
    T *get() const { return static_cast<T *>(object()); }

private:
    friend class client;
    using outcome::outcome;
};

// What the clients of all service ports have. It is moved, never copied; one with the same settings is made
// of `endpoint` and `settings`.
class ZUV_CLASS client {
public:
    client(const client &) = delete;
    client &operator=(const client &) = delete;
    // Takes over settings and connection. `other` can't call any more: its calls fail with SOAP_USER_ERROR.
    //   other    the client to move
    //   returns  this client
    client(client &&other) noexcept : engine_(std::exchange(other.engine_, nullptr)) {}
    client &operator=(client &&other) noexcept;
    // Closes the connection. A result that is still there stays valid.
    ~client();

    // The endpoint, and what the client was made with. Not to be asked of a client that was moved.
    //   returns  the text, the options; they live as long as the client
    const std::string &endpoint() const;
    const options &settings() const;
    // The trace file.
    //   returns  its path; empty for none
    const std::string &trace_file() const;
    // What happened in the last call, or in the last attempt of one that was repeated: times, bytes, addresses,
    // TLS, what ended it.
    //   returns  the report, valid until the next call; before the first one, and of a client that was moved,
    //            an empty one
    const soap_report &report() const;
    // The context, for settings that options lack, between calls, and for soap_cancel_arm and soap_cancel
    // (soap_report.h), which also ends the pauses between the attempts of a call. Its callbacks of attachments
    // are the client's own.
    //   returns  the context, which is the client's
    //   null     the client was moved
    soap *context();

protected:
    // Makes a client; nothing is sent yet.
    //   to      URL, or several with blanks between them, the next of which is tried while connecting fails
    //   wanted  options; the shorter form takes the defaults
    explicit client(std::string_view to);
    client(std::string_view to, const options &wanted);
    // Makes a call.
    //   T          class of the response
    //   name       of the operation, constant
    //   operation  its type ids
    //   request    an object of its request class
    //   how        what the call has besides
    //   returns    the result
    template <class T>
    result<T> call(const char *name, const soap_operation &operation, const void *request, const extras &how)
    {
        return result<T>(engine_, name, operation, request, how);
    }

private:
    void end();
    engine *engine_;
};

} // namespace zuv

#include <zuv_client_pro/client_ports.h>

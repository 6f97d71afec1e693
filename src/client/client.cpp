// client.cpp - clients and the results of their calls: who owns what a call brought, and for how long.
#include <new>

#include <zuv_client_pro/soap_attachment.h>
#include <zuv_client_pro/soap_envelope.h>
#include <zuv_client_pro/soap_error.h>
#include <zuv_client_pro/soap_log.h>
#include <zuv_client_pro/soap_memory.h>
#include <zuv_client_pro/soap_tcp.h>

#include "client/engine.h"

namespace zuv {

// --- extras ---

extras::extras() = default;
extras::~extras() = default;

extras &extras::header(const protocol__Header &record)
{
    header_ = &record;
    return *this;
}

extras &extras::target(std::string_view uri)
{
    target_ = uri;
    return *this;
}

extras &extras::repeatable()
{
    repeatable_ = true;
    return *this;
}

extras &extras::carry(zuv::attachments &carried)
{
    attachments_ = &carried;
    return *this;
}

const extras &extras::none()
{
    static const extras nothing;
    return nothing;
}

// --- the result of a call ---

outcome::outcome(engine *from, const char *name, const soap_operation &operation, const void *request,
                 const extras &how)
{
    failure_.operation_ = name;
    if (from == nullptr)
        fail("the client was moved to another one", SOAP_USER_ERROR, failure_kind::request);
    else if (from->holder != nullptr && !from->holder->detach())
        fail("no memory to keep the result of the last call", SOAP_OUT_OF_MEMORY, failure_kind::memory);
    else
        run(*from, operation, request, how);
}

void outcome::run(engine &from, const soap_operation &operation, const void *request, const extras &how)
{
    from_ = &from;
    from.holder = this;
    const int code = from.run(operation, request, how, &object_);
    if (code != SOAP_OK)
        note_failure(from, code);
    header_ = from.header != nullptr && object_ != nullptr ? from.header->header : nullptr;
    parts_ = from.dime.list != nullptr ? from.dime.list : from.mime.list;
    root_ = from.mime.root;
}

void outcome::fail(const char *text, int code, failure_kind kind)
{
    failure_.fault_text_ = text;
    failure_.code_ = code;
    failure_.kind_ = kind;
}

// The text of an error may be in a scratch text of the context.
void outcome::note_failure(engine &from, int code)
{
    fail("", code, from.kind());
    failure_.attempts_ = from.attempts;
    failure_.status_ = from.status >= 100 && from.status <= 999 ? from.status
                       : code >= 100 && code <= 999             ? code
                                                                : 0;
    soap_fault_text_fill(&from);
    if (from.fault != nullptr) {
        const char **const text = soap_fault_string_field(&from);
        *text = soap_string_dup(&from, *text);
        failure_.fault_ = from.fault;
        failure_.fault_code_ = text_or_empty(*soap_fault_code_field(&from));
        failure_.fault_text_ = text_or_empty(*text);
        failure_.fault_detail_ = text_or_empty(soap_fault_detail_value(&from));
    }
    from.error = code;
}

// Moves what the call brought to a context of its own; false: memory lacks, and all is as it was.
bool outcome::detach()
{
    auto *const own = new (std::nothrow) soap(0U);
    if (own == nullptr)
        return false;
    soap_log_set_sent(own, nullptr);
    soap_log_set_received(own, nullptr);
    const int code = std::exchange(from_->error, SOAP_OK);
    soap_blocks_move(from_, own);
    const bool moved = std::exchange(from_->error, code) == SOAP_OK;
    if (!moved) {
        delete own;
        return false;
    }
    from_->holder = nullptr;
    from_->discard(); // forgets what pointed there
    from_ = nullptr;
    own_ = own;
    return true;
}

// The client ends, and memory lacks for another context: its own becomes that of the result. What the host
// program's callbacks work on may be gone by then.
void outcome::adopt(engine *ended)
{
    from_ = nullptr;
    ended->holder = nullptr;
    ended->keep_alive = 0;
    soap_socket_release(ended);
    ended->on_disconnect = nullptr;
    ended->on_close = nullptr;
    own_ = ended;
}

void outcome::release()
{
    if (from_ != nullptr) {
        from_->holder = nullptr;
        from_->discard();
        from_ = nullptr;
    }
    delete std::exchange(own_, nullptr);
}

void outcome::take(outcome &other)
{
    if (other.from_ != nullptr && !other.detach()) {
        from_ = std::exchange(other.from_, nullptr);
        from_->holder = this;
    }
    own_ = std::exchange(other.own_, nullptr);
    failure_ = other.failure_;
    other.failure_ = {};
    header_ = std::exchange(other.header_, nullptr);
    parts_ = std::exchange(other.parts_, nullptr);
    root_ = std::exchange(other.root_, nullptr);
    object_ = std::exchange(other.object_, nullptr);
}

outcome::outcome(outcome &&other) noexcept
{
    take(other);
}

outcome &outcome::operator=(outcome &&other) noexcept
{
    if (this != &other) {
        release();
        take(other);
    }
    return *this;
}

outcome::~outcome()
{
    release();
}

std::vector<received_part> outcome::attachments() const
{
    std::vector<received_part> found;
    for (const soap_attachment *part = parts_; part != nullptr; part = part->next)
        if (part != root_)
            found.push_back(
                {text_or_empty(part->id), text_or_empty(part->type), text_or_empty(part->description),
                 std::string_view(part->content,
                                  part->content != nullptr ? static_cast<std::size_t>(part->size) : 0)});
    return found;
}

// --- the client ---

client::client(std::string_view to) : client(to, options()) {}

client::client(std::string_view to, const options &wanted) : engine_(new engine(to, wanted)) {}

client &client::operator=(client &&other) noexcept
{
    if (this != &other) {
        end();
        engine_ = std::exchange(other.engine_, nullptr);
    }
    return *this;
}

client::~client()
{
    end();
}

void client::end()
{
    engine *const ended = std::exchange(engine_, nullptr);
    outcome *const holder = ended != nullptr ? ended->holder : nullptr;
    if (holder != nullptr && !holder->detach())
        holder->adopt(ended);
    else
        delete ended;
}

const std::string &client::endpoint() const
{
    return engine_->url;
}

const options &client::settings() const
{
    return engine_->wanted;
}

const std::string &client::trace_file() const
{
    return engine_->trace;
}

const soap_report &client::report() const
{
    static const soap_report empty = [] {
        soap_report none{};
        none.lookup_time = none.connect_time = none.tls_time = none.first_byte_time = none.total_time = -1;
        none.peer = none.local = none.tls_version = none.tls_cipher = none.certificate_subject =
            none.certificate_issuer = none.certificate_refusal = "";
        return none;
    }();
    const soap_report *const report = engine_ != nullptr ? soap_call_report(engine_) : nullptr;
    return report != nullptr ? *report : empty;
}

soap *client::context()
{
    return engine_;
}

} // namespace zuv

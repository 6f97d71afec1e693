// report_rules.h - what the documents of the report and order ports have in common: their life from open to
// closed.
//
// Elsewhere: what is particular to a port (status_report_port.cpp and its like).
#pragma once

#include <type_traits>

#include "attachments.h"
#include "repository.h"

namespace service {

template <class Document> class report_rules {
public:
    using state = std::remove_pointer_t<decltype(Document::state)>;

    report_rules(call &c, const char *port, const char *kind) : call_(c), repository_(c, port, kind) {}

    repository<Document> &documents() { return repository_; }

    void set_state(Document &document, state s) { document.state = make_value(call_.ctx, s); }

    // Gives a document a new name and keeps it, with the data that came with it.
    Document *keep(Document &request)
    {
        repository_.keep(request, [&] { take_references(call_, request.attachment); });
        return answer(&request);
    }

    // The document comes with the data of its attachments.
    Document *get()
    {
        return answer(repository_.find(target_of(call_)), [](const protocol__Attachment &) { return true; });
    }

    Document *create(Document &request)
    {
        set_state(request, state::open);
        return keep(request);
    }

    // A report is complete once its data is there.
    Document *submit(Document &request)
    {
        settle(request);
        if (!has_target())
            return keep(request);
        attachments before;
        Document *const kept = repository_.change(target_of(call_), [&](Document *held) {
            refuse_ended(*held);
            before = held->attachment;
            take_references(call_, request.attachment, &before);
            request.thisURI = held->thisURI;
            return &request;
        });
        forget_data(call_, before, &request.attachment);
        return answer(kept);
    }

    // Closes or cancels, which can be done once.
    Document *end(state last)
    {
        return answer(repository_.change(target_of(call_), [&](Document *held) {
            refuse_ended(*held);
            set_state(*held, last);
            return held;
        }));
    }

    Document *remove(const Document &request)
    {
        Document *const removed = repository_.remove(target_of(call_, &request.thisURI));
        forget_data(call_, removed->attachment);
        set_state(*removed, state::closed);
        return answer(removed);
    }

    Document *attach(protocol__Attachment *given, const protocol__DataPortPreference *preference)
    {
        return answer(repository_.change(target_of(call_), [&](Document *held) {
            refuse_ended(*held);
            take_attachment(call_, held->attachment, given, preference);
            return held;
        }));
    }

    // A client that wants to try again gets the attachment's data once more.
    Document *note_progress(const protocol__AttachStatusRequest &report)
    {
        const protocol__Attachment *meant = nullptr;
        Document *const changed = repository_.change(target_of(call_), [&](Document *held) {
            meant = &find_attachment(call_, held->attachment, report);
            service::note_progress(call_, held->attachment, report);
            if (held->state != nullptr && *held->state == state::processing)
                settle(*held);
            return held;
        });
        const bool again =
            report.intention != nullptr && *report.intention == protocol__AttachStatusIntention::retry;
        return answer(changed, [&](const protocol__Attachment &a) { return again && &a == meant; });
    }

private:
    // `is_sent` says of an attachment whether its data goes with the answer.
    template <class Predicate> Document *answer(Document *document, const Predicate &is_sent)
    {
        settle_references(call_, document->attachment, is_sent);
        return document;
    }
    Document *answer(Document *document)
    {
        return answer(document, [](const protocol__Attachment &) { return false; });
    }

    bool has_target() const
    {
        const protocol__Header *const header = call_.header;
        return header != nullptr && (header->targetURI != nullptr || header->compoundTargetURI != nullptr);
    }

    void settle(Document &document)
    {
        set_state(document, all_arrived(document.attachment) ? state::complete : state::processing);
    }

    void refuse_ended(const Document &document)
    {
        if (document.state != nullptr &&
            (*document.state == state::closed || *document.state == state::cancelled))
            refuse<protocol__Client_x002eInvalidRequest>(call_.ctx, "The document is closed or cancelled.");
    }

    call &call_;
    repository<Document> repository_;
};

} // namespace service

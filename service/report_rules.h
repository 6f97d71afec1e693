// report_rules.h - what the documents of the report and order ports have in common: their life from open to
// closed.
//
// Elsewhere: what is particular to a port (status_report_port.cpp and its like).
#pragma once

#include <type_traits>

#include "attachments.h"
#include "shelf.h"

namespace service {

template <class Document> class report_rules {
public:
    using state = std::remove_pointer_t<decltype(Document::state)>;

    report_rules(call &c, const char *port, const char *kind) : call_(c), shelf_(c, port, kind) {}

    shelf<Document> &documents() { return shelf_; }

    void set_state(Document &document, state s) { document.state = make_value(call_.ctx, s); }

    Document *get() { return shelf_.find(target_of(call_)); }

    Document *create(Document &request)
    {
        set_state(request, state::open);
        shelf_.keep(request);
        return &request;
    }

    // A report is complete once its data is there.
    Document *submit(Document &request)
    {
        settle(request);
        if (!is_aimed())
            return shelf_.keep(request), &request;
        return shelf_.change(target_of(call_), [&](Document *held) {
            refuse_ended(*held);
            request.thisURI = held->thisURI;
            return &request;
        });
    }

    // Closes or cancels; to be done once.
    Document *end(state last)
    {
        return shelf_.change(target_of(call_), [&](Document *held) {
            refuse_ended(*held);
            set_state(*held, last);
            return held;
        });
    }

    Document *remove(const Document &request)
    {
        Document *const removed = shelf_.take(target_of(call_, &request.thisURI));
        set_state(*removed, state::closed);
        return removed;
    }

    Document *attach(protocol__Attachment *given, const protocol__DataPortPreference *wish)
    {
        return shelf_.change(target_of(call_), [&](Document *held) {
            refuse_ended(*held);
            take_attachment(call_, held->attachment, given, wish);
            return held;
        });
    }

    Document *note_progress(const protocol__AttachStatusRequest &report)
    {
        return shelf_.change(target_of(call_), [&](Document *held) {
            service::note_progress(call_, held->attachment, report);
            if (held->state != nullptr && *held->state == state::processing)
                settle(*held);
            return held;
        });
    }

private:
    bool is_aimed() const
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
    shelf<Document> shelf_;
};

} // namespace service

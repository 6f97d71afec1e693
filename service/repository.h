// repository.h - the documents of one port: named, kept, found, changed, removed.
//
// Here: what the ports' documents have in common (thisURI, state, a row of the store). Elsewhere: their
// contents.
//
// Always: a change is on the disk when a function returns.
#pragma once

#include <string>
#include <vector>

#include "faults.h"
#include "moment.h"
#include "port.h"

namespace service {

// The name that a request's header gives its target, or else the first of `own_names`. A request without
// either is refused.
std::string target_of(const call &c, const std::vector<std::string> *own_names = nullptr);

template <class Document> class repository {
public:
    //   port  name of the port
    //   kind  part of the names given to its documents
    repository(call &c, const char *port, const char *kind) : call_(c), port_(port), kind_(kind) {}

    // Keeps a document, under a new name unless the call keeps names.
    void keep(Document &document)
    {
        keep(document, [] {});
    }

    // The same; `prepare` is called first, within the transaction.
    template <class Prepare> void keep(Document &document, const Prepare &prepare)
    {
        if (call_.keeps_names && !document.thisURI.empty() && !document.thisURI.front().empty())
            document.thisURI.resize(1);
        else
            document.thisURI = {std::string("urn:zuv:") + kind_ + ":" + fresh_uuid()};
        store::writing transaction(call_.documents);
        if (call_.keeps_names && call_.documents.find(port_, document.thisURI.front()))
            refuse<protocol__Client_x002eInvalidInformation>(
                call_.ctx, "There is a document named " + document.thisURI.front() + " already.");
        prepare();
        const std::string xml = call_.codec.write(document, call_.bytes);
        call_.documents.insert(port_, document.thisURI.front(), state_of(document), xml);
        transaction.commit();
    }

    // The document of a name; refused if there is none.
    Document *find(const std::string &uri)
    {
        const std::optional<std::string> xml = call_.documents.find(port_, uri);
        if (!xml)
            refuse_not_found(call_.ctx, uri);
        found_bytes_ = xml->size();
        try {
            return call_.codec.template read<Document>(*xml);
        } catch (const document_error &error) {
            throw store_error("unreadable document " + uri + ": " + error.what());
        }
    }

    // Keeps what `alter` makes of the document: its result, which is also this function's.
    template <class Alter> Document *change(const std::string &uri, Alter alter)
    {
        store::writing transaction(call_.documents);
        Document *const changed = alter(find(uri));
        call_.documents.replace(port_, uri, state_of(*changed),
                                call_.codec.write(*changed, found_bytes_ + call_.bytes));
        transaction.commit();
        return changed;
    }

    // Removes the document; it is this function's result.
    Document *remove(const std::string &uri)
    {
        store::writing transaction(call_.documents);
        Document *const removed = find(uri);
        call_.documents.remove(port_, uri);
        transaction.commit();
        return removed;
    }

private:
    static int state_of(const Document &document)
    {
        return document.state ? static_cast<int>(*document.state) : -1;
    }

    call &call_;
    const char *port_;
    const char *kind_;
    std::uint64_t found_bytes_ = 0; // of the document found last
};

} // namespace service

// recognized_subjects.cpp - see recognized_subjects.h.
#include "recognized_subjects.h"

#include <algorithm>
#include <set>

#include "catalogue.h"
#include "faults.h"
#include "filter.h"
#include "make.h"

namespace service {

namespace {

constexpr std::size_t ROOTS_MAX = 1000; // product collections that one query names

using property = protocol__SubjectProperty;
using collection = protocolUpdateOrder__RecognizedProductCollection;
using collection_query = protocolUpdateOrder__QueryRecognizedProductCollectionsRequest;

// clang-format off
#define SUBJECT_PROPERTIES(X)                                                                               \
    X(type) X(productCollection) X(productCollectionName) X(productCollectionMetaData) X(uuid) X(product)   \
    X(productName) X(productMetaData) X(version) X(versionMetaData) X(level) X(levelMetaData)               \
    X(serviceLevel) X(serviceLevelMetaData) X(platform) X(platformName) X(platformVersion)                  \
    X(platformMetaData) X(serialNumber) X(component) X(componentName) X(fixableComponent)                   \
    X(fixableComponentName) X(fixableComponentVersion) X(systemName) X(hostName) X(hostAddress)             \
    X(partitionId) X(name) X(nameDetails) X(id) X(customerNumber) X(enterpriseNumber) X(country) X(member)  \
    X(reference) X(relationship) X(identity)
#define PLATFORM_PROPERTIES(X)                                                                              \
    X(displayName) X(name) X(version) X(fixPack) X(familyName) X(hardwareName) X(editionName) X(bitWidth)
// clang-format on

protocol__OperatingPlatform &platform_of(soap *ctx, protocol__Identity &subject)
{
    if (subject.operatingPlatform == nullptr)
        subject.operatingPlatform = make<protocol__OperatingPlatform>(ctx);
    return *subject.operatingPlatform;
}

void copy_property(soap *ctx, property wanted, const protocol__Identity &from, protocol__Identity &to)
{
    switch (wanted) {
#define COPY_MEMBER(member)                                                                                  \
    case property::member:                                                                                   \
        to.member = from.member;                                                                             \
        break;
        SUBJECT_PROPERTIES(COPY_MEMBER)
#undef COPY_MEMBER
#define COPY_PLATFORM_MEMBER(member)                                                                         \
    case property::operatingPlatform_##member:                                                               \
        if (from.operatingPlatform != nullptr)                                                               \
            platform_of(ctx, to).member = from.operatingPlatform->member;                                    \
        break;
        PLATFORM_PROPERTIES(COPY_PLATFORM_MEMBER)
#undef COPY_PLATFORM_MEMBER
    }
}

bool is_true(const bool *member)
{
    return member != nullptr && *member;
}

// Answers one query for product collections.
class collection_lister {
public:
    collection_lister(call &c, const collection_query &request)
        : ctx_(c.ctx), work_(c.work.filters), request_(request),
          wanted_(request.includeSubjectProperty.begin(), request.includeSubjectProperty.end()),
          subjects_(known_subjects(is_true(request.includeImplicitExclusions)))
    {}

    std::vector<collection *> flat()
    {
        std::vector<collection *> listed;
        for (const collection_row &row : collections())
            if (collection *const described = describe(row); described != nullptr && !pruned(*described))
                listed.push_back(described);
        return listed;
    }

    // Those at or below the roots, the roots themselves on top.
    std::vector<collection *> nested()
    {
        std::vector<collection *> roots;
        const std::vector<std::string> &wanted = request_.productCollectionHierarchyRoot;
        for (const collection_row &row : collections()) {
            const bool is_root = wanted.empty()
                                     ? row.parent.empty()
                                     : std::find(wanted.begin(), wanted.end(), row.id) != wanted.end();
            if (is_root)
                add_branch(row, roots);
        }
        return roots;
    }

private:
    void add_branch(const collection_row &row, std::vector<collection *> &place)
    {
        collection *const described = describe(row);
        std::vector<collection *> &below =
            described == nullptr ? place : described->recognizedProductCollection;
        for (const collection_row &child : collections())
            if (child.parent == row.id)
                add_branch(child, below);
        if (described != nullptr && !pruned(*described))
            place.push_back(described);
    }

    bool pruned(const collection &described) const
    {
        return is_true(request_.recursivelyPruneEmptyProductCollectionLeaves) &&
               described.recognizedProductCollection.empty() && !has_subjects(*described.productCollection);
    }

    bool has_subjects(const std::string &id) const
    {
        return std::any_of(subjects_.begin(), subjects_.end(), [&](const protocol__Identity *subject) {
            return text_of(subject->productCollection) == id &&
                   subject_passes(work_, request_.subjectInclusionFilter, *subject);
        });
    }

    // Null if the collection doesn't pass the filter.
    collection *describe(const collection_row &row)
    {
        std::string id(row.id), name(row.name);
        protocol__Identity judged;
        judged.productCollection = &id;
        judged.productCollectionName = &name;
        if (!subject_passes(work_, request_.productCollectionInclusionFilter, judged))
            return nullptr;
        auto *const described = make<collection>(ctx_);
        described->productCollection = make_text(ctx_, id);
        described->productCollectionName = make_text(ctx_, name);
        if (is_true(request_.includeSubjects))
            add_subjects(*described);
        return described;
    }

    void add_subjects(collection &described)
    {
        auto *const meta = make<protocolUpdateOrder__RecognizedProductCollectionMetaData>(ctx_);
        for (const protocol__Identity *subject : subjects_)
            if (text_of(subject->productCollection) == *described.productCollection &&
                subject_passes(work_, request_.subjectInclusionFilter, *subject))
                meta->recognizedSubject.push_back(recognized(ctx_, *subject, wanted_));
        if (!meta->recognizedSubject.empty())
            described.recognizedProductCollectionMetaData = meta;
    }

    soap *ctx_;
    filter_work &work_;
    const collection_query &request_;
    const subject_properties wanted_;
    std::vector<const protocol__Identity *> subjects_;
};

} // namespace

std::vector<const protocol__Identity *> known_subjects(bool with_excluded)
{
    std::vector<const protocol__Identity *> subjects;
    std::set<std::string> products;
    for (const update_record *update : the_catalogue().all())
        for (const protocol__Identity *subject : update->subject)
            if ((with_excluded || !is_true(update->implicitExclusion)) &&
                products.insert(text_of(subject->product)).second)
                subjects.push_back(subject);
    return subjects;
}

bool passes(const protocol__Filter *filter, const filter_facts &facts)
{
    if (filter == nullptr)
        return true;
    if (const auto *const of_updates = dynamic_cast<const protocolUpdateOrderFilter__Filter *>(filter))
        return filter_holds(*of_updates, facts);
    if (const auto *const of_reports = dynamic_cast<const protocolPRFilter__Filter *>(filter))
        return filter_holds(*of_reports, facts);
    throw filter_error("the filter does not state its class", false);
}

bool subject_passes(filter_work &work, const protocol__Filter *filter, const protocol__Identity &subject)
{
    filter_facts facts;
    facts.work = &work;
    facts.subjects.push_back(&subject);
    return passes(filter, facts);
}

protocol__RecognizedSubject *recognized(soap *ctx, const protocol__Identity &subject,
                                        const subject_properties &wanted)
{
    auto *const described = make<protocol__RecognizedSubject>(ctx);
    if (wanted.empty())
        static_cast<protocol__Identity &>(*described) = subject;
    else
        for (const property each : wanted)
            copy_property(ctx, each, subject, *described);
    described->soap = ctx;
    described->authorized = make_value(ctx, true);
    return described;
}

protocol__QueryResponse *query_collections(call &c, const collection_query &request)
{
    if (request.productCollectionHierarchyRoot.size() > ROOTS_MAX)
        refuse<protocol__Client_x002eInvalidRequest>(c.ctx, "The query names too many product collections.");
    auto *const response = make<protocolUpdateOrder__QueryRecognizedProductCollectionsResponse>(c.ctx);
    collection_lister lister(c, request);
    response->recognizedProductCollection =
        is_true(request.formProductCollectionHierarchy) ? lister.nested() : lister.flat();
    return response;
}

} // namespace service

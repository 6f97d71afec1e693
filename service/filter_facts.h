// filter_facts.h - what is known about an item that a filter judges, and how the values of one kind are
// collected from it.
//
// Elsewhere: which kind a comparison asks for (filter_tables.h).
#pragma once

#include <string>
#include <vector>

#include <zuv_client_pro/protocol.h>
#include <zuv_client_pro/protocolProblemReport.h>
#include <zuv_client_pro/protocolUpdateOrder.h>

#include "comparison.h"
#include "filter_work.h"

namespace service {

// The item: an update, a problem report, or something smaller described as one of them. Absent parts are
// null.
struct filter_facts {
    filter_work *work = nullptr; // of the request
    std::size_t size = 0;        // bytes of the item's XML, if it isn't the service's own
    std::vector<const protocol__Identity *> subjects;
    const protocolUpdateOrder__UpdateMetaData *update = nullptr;
    const protocolProblemReport__ProblemReportContent *report = nullptr;
    std::vector<const protocol__Attachment *> attachments;
};

filter_facts facts_of(filter_work &work, const protocolUpdateOrder__UpdateMetaData &update);
filter_facts facts_of(filter_work &work, const protocolProblemReport__ProblemReportContent &report,
                      std::size_t size = 0);

// --- gathering ---

inline void gather(values &out, const std::string *text)
{
    if (text != nullptr)
        out.push_back(*text);
}

inline void gather(values &out, const std::vector<std::string> &texts)
{
    out.insert(out.end(), texts.begin(), texts.end());
}

// A member of all items that are there.
template <auto Member, class T> void gather_each(values &out, const std::vector<T *> &items)
{
    for (const T *item : items)
        if (item != nullptr)
            gather(out, item->*Member);
}

// The value of all pairs of a name.
template <class Pair, class Value>
void gather_named(values &out, const std::vector<Pair *> &pairs, const std::string &name,
                  std::string *Value::*value)
{
    for (const Pair *pair : pairs)
        if (pair != nullptr && pair->name != nullptr && *pair->name == name)
            gather(out, pair->*value);
}

// Calls `use` for the records of meta data of one kind: the subjects', and the update's own where it has
// them.
template <class Use> void each_meta(const filter_facts &facts, protocol__ProductCollectionMetaData *, Use use)
{
    for (const protocol__Identity *subject : facts.subjects)
        if (subject->productCollectionMetaData != nullptr)
            use(*subject->productCollectionMetaData);
}

template <class Use> void each_meta(const filter_facts &facts, protocol__ProductMetaData *, Use use)
{
    for (const protocol__Identity *subject : facts.subjects)
        if (subject->productMetaData != nullptr)
            use(*subject->productMetaData);
}

#define SERVICE_EACH_META(Class, member)                                                                     \
    template <class Use> void each_meta(const filter_facts &facts, Class *, Use use)                         \
    {                                                                                                        \
        for (const protocol__Identity *subject : facts.subjects)                                             \
            if (subject->member != nullptr)                                                                  \
                use(*subject->member);                                                                       \
        if (facts.update != nullptr && facts.update->member != nullptr)                                      \
            use(*facts.update->member);                                                                      \
    }
SERVICE_EACH_META(protocol__VersionMetaData, versionMetaData)
SERVICE_EACH_META(protocol__LevelMetaData, levelMetaData)
SERVICE_EACH_META(protocol__ServiceLevelMetaData, serviceLevelMetaData)
#undef SERVICE_EACH_META

template <class Use> void each_meta(const filter_facts &facts, protocolUpdateOrder__UpdateMetaData *, Use use)
{
    if (facts.update != nullptr)
        use(*facts.update);
}

// Meta data of any kind, of the subjects and of the update.
struct any_meta;
template <class Use> void each_meta(const filter_facts &facts, any_meta *, Use use)
{
    each_meta(facts, static_cast<protocol__ProductCollectionMetaData *>(nullptr), use);
    each_meta(facts, static_cast<protocol__ProductMetaData *>(nullptr), use);
    each_meta(facts, static_cast<protocol__VersionMetaData *>(nullptr), use);
    each_meta(facts, static_cast<protocol__LevelMetaData *>(nullptr), use);
    each_meta(facts, static_cast<protocol__ServiceLevelMetaData *>(nullptr), use);
    each_meta(facts, static_cast<protocolUpdateOrder__UpdateMetaData *>(nullptr), use);
}

// A member of the subjects.
template <auto Member> void subject_texts(const filter_facts &facts, values &out)
{
    for (const protocol__Identity *subject : facts.subjects)
        gather(out, subject->*Member);
}

// A member of the subjects' operating platforms.
template <auto Member> void platform_texts(const filter_facts &facts, values &out)
{
    for (const protocol__Identity *subject : facts.subjects)
        if (subject->operatingPlatform != nullptr)
            gather(out, subject->operatingPlatform->*Member);
}

// A member of one kind of meta data.
template <class Meta, auto Member> void meta_texts(const filter_facts &facts, values &out)
{
    each_meta(facts, static_cast<Meta *>(nullptr), [&](const Meta &meta) { gather(out, meta.*Member); });
}

// A member of the ordering codes in one kind of meta data.
template <class Meta, auto Member> void code_texts(const filter_facts &facts, values &out)
{
    each_meta(facts, static_cast<Meta *>(nullptr),
              [&](const Meta &meta) { gather_each<Member>(out, meta.ocCode); });
}

inline void attachable_products(const filter_facts &facts, values &out)
{
    each_meta(facts, static_cast<protocol__ProductMetaData *>(nullptr),
              [&](const protocol__ProductMetaData &meta) {
                  gather_each<&protocol__Identity::product>(out, meta.attachableTo);
              });
}

void language_texts(const filter_facts &facts, values &out);
void language_name_texts(const filter_facts &facts, values &out);
void attribute_name_texts(const filter_facts &facts, values &out);
void attribute_texts(const filter_facts &facts, const std::string &name, values &out);
void descriptor_texts(const filter_facts &facts, values &out);
void attachment_type_texts(const filter_facts &facts, values &out);

template <auto Party, auto Member> void party_texts(const filter_facts &facts, values &out)
{
    if (facts.report != nullptr && facts.report->*Party != nullptr)
        gather(out, (facts.report->*Party)->*Member);
}

template <auto Member> void beneficiary_texts(const filter_facts &facts, values &out)
{
    if (facts.report != nullptr)
        gather_each<Member>(out, facts.report->beneficiary);
}

// All readable text of the item.
std::string running_text(const filter_facts &facts);

} // namespace service

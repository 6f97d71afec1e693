// filter_facts.cpp - see filter_facts.h.
#include "filter_facts.h"

namespace service {

namespace {

void add_subject(filter_facts &facts, const protocol__Identity *subject)
{
    if (subject != nullptr)
        facts.subjects.push_back(subject);
}

void gather_details(values &out, const std::vector<protocol__LanguageDetail *> &details, bool names)
{
    for (const protocol__LanguageDetail *detail : details) {
        if (detail == nullptr)
            continue;
        if (names)
            gather(out, detail->languageName);
        else if (detail->language != nullptr)
            out.push_back(detail->language->value);
    }
}

void append(std::string &text, const values &parts)
{
    for (const std::string_view part : parts)
        text.append(part).append("\n");
}

} // namespace

filter_facts facts_of(filter_work &work, const protocolUpdateOrder__UpdateMetaData &update)
{
    filter_facts facts;
    facts.work = &work;
    facts.update = &update;
    for (const protocol__Identity *subject : update.subject)
        add_subject(facts, subject);
    return facts;
}

filter_facts facts_of(filter_work &work, const protocolProblemReport__ProblemReportContent &report,
                      std::size_t size)
{
    filter_facts facts;
    facts.work = &work;
    facts.size = size;
    facts.report = &report;
    add_subject(facts, report.subject);
    return facts;
}

void language_texts(const filter_facts &facts, values &out)
{
    if (facts.update == nullptr)
        return;
    for (const protocol__Language *language : facts.update->language)
        if (language != nullptr)
            out.push_back(language->value);
    gather_details(out, facts.update->languageDetail, false);
}

void language_name_texts(const filter_facts &facts, values &out)
{
    if (facts.update != nullptr)
        gather_details(out, facts.update->languageDetail, true);
}

void attribute_name_texts(const filter_facts &facts, values &out)
{
    if (facts.update != nullptr)
        gather_each<&protocolUpdateOrder__Attribute::name>(out, facts.update->attribute);
}

void attribute_texts(const filter_facts &facts, const std::string &name, values &out)
{
    if (facts.update != nullptr)
        gather_named(out, facts.update->attribute, name, &protocolUpdateOrder__Attribute::value);
}

void descriptor_texts(const filter_facts &facts, values &out)
{
    for (const protocol__Attachment *attachment : facts.attachments)
        if (attachment->descriptor != nullptr)
            out.push_back(attachment->descriptor->value);
}

void attachment_type_texts(const filter_facts &facts, values &out)
{
    for (const protocol__Attachment *attachment : facts.attachments)
        if (attachment->type != nullptr)
            out.push_back(attachment->type->value);
}

std::string running_text(const filter_facts &facts)
{
    values parts;
    if (const auto *const update = facts.update) {
        for (const std::string *text : {update->updateId, update->name, update->description, update->license})
            gather(parts, text);
        gather(parts, update->category);
        gather_each<&protocolUpdateOrder__Attribute::value>(parts, update->attribute);
    }
    if (const auto *const report = facts.report) {
        for (const std::string *text : {report->title, report->problemDescription, report->impactDescription})
            gather(parts, text);
        gather(parts, report->notes);
        gather_each<&protocol__RichNotes::notes>(parts, report->richNotes);
    }
    for (const protocol__Identity *subject : facts.subjects)
        for (const std::string *text : {subject->productName, subject->productCollectionName,
                                        subject->componentName, subject->platformName, subject->name})
            gather(parts, text);
    std::string text;
    append(text, parts);
    return text;
}

} // namespace service

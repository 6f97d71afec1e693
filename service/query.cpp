// query.cpp - see query.h.
#include "query.h"

#include <algorithm>
#include <functional>
#include <set>

#include <zuv_client_pro/protocolProblemReport.h>
#include <zuv_client_pro/protocolUpdateOrder.h>

#include "catalogue.h"
#include "faults.h"
#include "filter.h"
#include "recognized_subjects.h"

namespace service {

namespace {

constexpr std::size_t REPORTS_MAX = 1000; // in one response
constexpr std::size_t QUERIES_MAX = 100;  // in one request

using report = protocolProblemReport__ProblemReportContent;
using attribute = protocolUpdateOrder__Attribute;

struct category_row {
    const char *name, *description;
};
constexpr category_row CATEGORIES[] = {
    {"critical", "Corrects what may lose data or stop a system"},
    {"security", "Closes a way of attack"},
    {"recommended", "Of use to all"},
    {"optional", "Of use to some"},
    {"pack", "A group of updates"},
};

struct country_row {
    const char *code, *name;
};
constexpr country_row COUNTRIES[] = {{"AT", "Austria"}, {"CH", "Switzerland"},    {"DE", "Germany"},
                                     {"FR", "France"},  {"GB", "United Kingdom"}, {"US", "United States"}};

// --- reports ---

void add_report(call &c, std::vector<report *> &found, report *passing)
{
    if (found.size() == REPORTS_MAX)
        refuse<protocol__Server_x002eDataTooLarge>(c.ctx, "Too many reports match the filter.");
    found.push_back(passing);
}

// A query looks through all documents, and a request may hold many queries.
void spend(call &c, std::uint64_t &left, std::size_t bytes, const char *refused)
{
    if (bytes > left)
        refuse<protocol__Server_x002eDataTooLarge>(c.ctx, refused);
    left -= bytes;
}

// Judges a document without keeping its objects.
bool report_passes(call &c, const protocolPRFilter__Filter *filter, std::string_view xml)
{
    if (filter == nullptr)
        return true;
    c.judged.reset();
    return filter_holds(*filter, facts_of(c.work.filters, *c.judged.read<report>(xml), xml.size()));
}

protocol__QueryResponse *query_reports(call &c, const protocolProblemReport__QueryReportsRequest &request)
{
    auto *const response = make<protocolProblemReport__QueryReportsResponse>(c.ctx);
    c.documents.each(problem_report_port.name, [&](std::string_view xml) {
        spend(c, c.work.read, xml.size(),
              "There are more reports than the queries of one request look through.");
        if (report_passes(c, request.inclusionFilter, xml)) {
            spend(c, c.work.answered, xml.size(), "The reports that pass are too large for one answer.");
            add_report(c, response->problemReport, c.codec.read<report>(xml));
        }
        return true;
    });
    return response;
}

// Problem patterns: the problems that updates are known to correct.
protocol__QueryResponse *query_patterns(call &c,
                                        const protocolProblemReport__QueryPatternReportsRequest &request)
{
    auto *const response = make<protocolProblemReport__QueryPatternReportsResponse>(c.ctx);
    for (const update_record *update : the_catalogue().all())
        for (const protocolUpdateOrder__Corrected *corrected : update->corrected)
            if (corrected->problemReport != nullptr &&
                (request.inclusionFilter == nullptr ||
                 filter_holds(*request.inclusionFilter, facts_of(c.work.filters, *corrected->problemReport))))
                add_report(c, response->problemReport, corrected->problemReport);
    return response;
}

// --- recognized data: each item is judged as an update, or a report, that has nothing else ---

protocol__QueryResponse *query_subjects(call &c, const protocol__QueryRecognizedSubjectsRequest &request)
{
    auto *const response = make<protocol__QueryRecognizedSubjectsResponse>(c.ctx);
    const subject_properties wanted(request.includeSubjectProperty.begin(),
                                    request.includeSubjectProperty.end());
    for (const protocol__Identity *subject : known_subjects(false))
        if (subject_passes(c.work.filters, request.inclusionFilter, *subject))
            response->recognizedSubject.push_back(recognized(c.ctx, *subject, wanted));
    return response;
}

protocol__QueryResponse *query_languages(call &c, const protocol__QueryRecognizedLanguagesRequest &request)
{
    auto *const response = make<protocol__QueryRecognizedLanguagesResponse>(c.ctx);
    std::set<std::string> seen;
    for (const update_record *update : the_catalogue().all()) {
        for (protocol__LanguageDetail *detail : update->languageDetail) {
            update_record judged;
            judged.languageDetail.push_back(detail);
            if (!passes(request.inclusionFilter, facts_of(c.work.filters, judged)) ||
                !seen.insert(detail->language->value).second)
                continue;
            auto *const language = make<protocol__RecognizedLanguage>(c.ctx);
            language->language = detail->language;
            language->languageName = detail->languageName;
            response->recognizedLanguage.push_back(language);
        }
    }
    return response;
}

protocol__QueryResponse *query_countries(call &c, const protocol__QueryRecognizedCountriesRequest &request)
{
    auto *const response = make<protocol__QueryRecognizedCountriesResponse>(c.ctx);
    for (const country_row &row : COUNTRIES) {
        std::string code = row.code;
        protocol__Identity submitter;
        submitter.country = &code;
        report judged;
        judged.submitter = &submitter;
        if (!passes(request.inclusionFilter, facts_of(c.work.filters, judged)))
            continue;
        auto *const country = make<protocol__RecognizedCountry>(c.ctx);
        country->country = make_text(c.ctx, row.code);
        country->countryName = make_text(c.ctx, row.name);
        response->recognizedCountry.push_back(country);
    }
    return response;
}

protocol__QueryResponse *
query_categories(call &c, const protocolUpdateOrder__QueryRecognizedCategoriesRequest &request)
{
    auto *const response = make<protocolUpdateOrder__QueryRecognizedCategoriesResponse>(c.ctx);
    for (const category_row &row : CATEGORIES) {
        update_record judged;
        judged.category.emplace_back(row.name);
        if (!passes(request.inclusionFilter, facts_of(c.work.filters, judged)))
            continue;
        auto *const category = make<protocolUpdateOrder__RecognizedCategory>(c.ctx);
        category->category = make_text(c.ctx, row.name);
        category->description = make_text(c.ctx, row.description);
        response->recognizedCategory.push_back(category);
    }
    return response;
}

protocol__QueryResponse *
query_attributes(call &c, const protocolUpdateOrder__QueryRecognizedAttributesRequest &request)
{
    auto *const response = make<protocolUpdateOrder__QueryRecognizedAttributesResponse>(c.ctx);
    for (const update_record *update : the_catalogue().all()) {
        for (attribute *known : update->attribute) {
            update_record judged;
            judged.attribute.push_back(known);
            if (!passes(request.inclusionFilter, facts_of(c.work.filters, judged)))
                continue;
            auto *const entry = make<protocolUpdateOrder__RecognizedAttribute>(c.ctx);
            entry->attribute = known;
            response->recognizedAttribute.push_back(entry);
        }
    }
    return response;
}

// --- all of them ---

// Calls a query's function if the request is of its class; null otherwise.
template <class Request>
protocol__QueryResponse *answer_as(call &c, const protocol__QueryRequest &request,
                                   protocol__QueryResponse *(*query)(call &c, const Request &request))
{
    const auto *const own = dynamic_cast<const Request *>(&request);
    return own == nullptr ? nullptr : query(c, *own);
}

protocol__QueryResponse *failed(call &c, protocol__Fault *fault)
{
    auto *const response = make<protocol__QueryResponse>(c.ctx);
    response->error.push_back(fault);
    return response;
}

protocol__QueryResponse *answer_known(call &c, const protocol__QueryRequest &request)
{
    protocol__QueryResponse *response = nullptr;
    (response = answer_as(c, request, query_reports)) || (response = answer_as(c, request, query_patterns)) ||
        (response = answer_as(c, request, query_subjects)) ||
        (response = answer_as(c, request, query_languages)) ||
        (response = answer_as(c, request, query_countries)) ||
        (response = answer_as(c, request, query_collections)) ||
        (response = answer_as(c, request, query_categories)) ||
        (response = answer_as(c, request, query_attributes));
    return response;
}

protocol__QueryResponse *answer(call &c, const protocol__QueryRequest &request)
{
    try {
        if (protocol__QueryResponse *const response = answer_known(c, request))
            return response;
        return failed(c, make_fault<protocol__Server_x002eUnsupportedRequest>(
                             c.ctx, "The query does not state its type."));
    } catch (const filter_error &error) {
        return failed(c, fault_of(c.ctx, error));
    } catch (const refusal &refused) {
        return failed(c, refused.fault);
    }
}

} // namespace

protocol__QueryResponses *answer_queries(call &c, const protocol__QueryRequests &requests)
{
    if (requests.queryRequest.size() > QUERIES_MAX)
        refuse<protocol__Client_x002eInvalidRequest>(c.ctx, "The request holds too many queries.");
    auto *const responses = make<protocol__QueryResponses>(c.ctx);
    for (const protocol__QueryRequest *request : requests.queryRequest)
        if (request != nullptr)
            responses->queryResponse.push_back(answer(c, *request));
    return responses;
}

} // namespace service

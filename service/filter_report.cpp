// filter_report.cpp - the filter language for problem reports.
#include "filter_tables.h"

namespace service {

namespace {

using filter_node = protocolPRFilter__FilterNode;

using report = protocolProblemReport__ProblemReportContent;

template <auto Member> void report_texts(const filter_facts &facts, values &out)
{
    if (facts.report != nullptr)
        gather(out, facts.report->*Member);
}

#define SERVICE_FILTER(name)      protocolPRFilter__##name
#define SERVICE_FILTER_TYPE(name) SOAP_TYPE_protocolPRFilter__##name

// clang-format off: one row per line
constexpr comparison_row<filter_node> ROWS[] = {
    SERVICE_COMMON_ROWS,
    SERVICE_TEXT_ROW(SubmitterCustomerNumberComparison, customerNumber,
                     party_texts<&report::submitter, &protocol__Identity::customerNumber>),
    SERVICE_TEXT_ROW(SubmitterCountryComparison, country,
                     party_texts<&report::submitter, &protocol__Identity::country>),
    SERVICE_TEXT_ROW(BeneficiaryCustomerNumberComparison, customerNumber,
                     beneficiary_texts<&protocol__Identity::customerNumber>),
    SERVICE_TEXT_ROW(BeneficiaryCountryComparison, country, beneficiary_texts<&protocol__Identity::country>),
    SERVICE_RUNNING_TEXT_ROW(ReportTextComparison),
    SERVICE_MOMENT_ROW(SubmitDateTimeComparison, submitDateTime, report_texts<&report::submitDateTime>),
    SERVICE_MOMENT_ROW(LastModifiedDateTimeComparison, lastModifiedDateTime,
                       report_texts<&report::lastModifiedDateTime>),
};
// clang-format on

struct report_language {
    using filter_node = protocolPRFilter__FilterNode;
    using and_node = protocolPRFilter__And;
    using or_node = protocolPRFilter__Or;
    using not_node = protocolPRFilter__Not;
    static const comparison_row<filter_node> *find(int type) { return find_row<filter_node>(ROWS, type); }
};

} // namespace

bool filter_holds(const protocolPRFilter__Filter &filter, const filter_facts &facts)
{
    return filter_judge<report_language>(facts).holds(filter.expression);
}

} // namespace service

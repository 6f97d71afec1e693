// filter_test.cpp - filters of updates and of problem reports, as XML, on the catalogue and on reports.
#include <set>
#include <string>

#include <gtest/gtest.h>

#include "catalogue.h"
#include "filter.h"
#include "parsed.h"

using namespace service;

namespace {

// A comparison of the update language: class, operator, then elements in turn with their texts.
std::string node(const std::string &element, const std::string &type, const std::string &content,
                 const std::string &op = {}, const std::string &prefix = "protocolUpdateOrderFilter")
{
    return "<" + prefix + ":" + element + " xsi:type=\"" + prefix + ":" + type + "\"" +
           (op.empty() ? "" : " compareOp=\"" + op + "\"") + ">" + content + "</" + prefix + ":" + element +
           ">";
}

std::string text(const std::string &element, const std::string &value,
                 const std::string &prefix = "protocolUpdateOrderFilter")
{
    return "<" + prefix + ":" + element + ">" + value + "</" + prefix + ":" + element + ">";
}

// The identifiers of the updates that pass, in order, with blanks between them.
std::string passing(const std::string &expression)
{
    const parsed<protocolUpdateOrderFilter__Filter> filter("protocolUpdateOrderFilter:Filter", expression);
    soap ctx;
    filter_work work{&ctx};
    std::string ids;
    for (const update_record *update : the_catalogue().all())
        if (filter_holds(*filter, facts_of(work, *update)))
            ids += (ids.empty() ? "" : " ") + *update->updateId;
    return ids;
}

std::string comparison(const std::string &type, const std::string &op, const std::string &content)
{
    return node("expression", type + "Comparison", content, op);
}

} // namespace

TEST(update_filter, compares_what_the_class_names)
{
    const std::string disk = "FW-100 FW-110 FW-120 BIOS-20 BIOS-30 DRV-5 PACK-2024";
    const std::string data = "DB-10 DB-10-P1 DB-11 PACK-DB PACK-2024";
    const struct {
        const char *type, *op;
        std::string content, ids;
    } rows[] = {
        {"Product", "equal", text("product", "ZX100"), disk},
        {"Product", "notEqual", text("product", "ZX100"), "DB-10 DB-10-P1 DB-11 TOOLS-1 TAPE-7 PACK-DB"},
        {"ProductName", "containsAllWords", text("productName", "array disk"), disk},
        {"ProductMetaDataProductClass", "equal", text("productClass", "array"), disk},
        {"ProductMetaDataOCCode", "endsWithSubstring", text("ocCode", "100"), disk},
        {"ProductMetaDataOCCodeType", "equal", text("type", "order"), disk},
        {"ProductCollectionMetaDataOCCode", "equal", text("ocCode", "OC-1"), disk},
        {"ProductMetaDataAttachableToProduct", "equal", text("attachableToProduct", "SRV-1"), disk},
        {"ProductMetaDataOption", "containsSubstring", text("option", "dual"), disk},
        {"ProductCollection", "equal", text("productCollection", "tape"), "TAPE-7"},
        {"ProductCollectionName", "startsWithSubstring", text("productCollectionName", "Tape"), "TAPE-7"},
        {"Version", "greaterThanOrEqual", text("version", "3"),
         "DB-10 DB-10-P1 DB-11 TOOLS-1 PACK-DB PACK-2024"},
        {"Platform", "equal", text("platform", "zx"), disk.substr(0, disk.size() - 9) + "TAPE-7 PACK-2024"},
        {"Component", "equal", text("component", "engine"), data},
        {"OperatingPlatformBitWidth", "equal", text("bitWidth", "32"), data},
        {"OperatingPlatformFamilyName", "equal", text("familyName", "unix"), disk},
        {"OperatingPlatformVersion", "lessThan", text("version", "4.10"), disk},
        {"UpdateMetaDataName", "containsPhrase", text("name", "firmware 1.2"), "FW-120"},
        {"UpdateMetaDataVersion", "greaterThan", text("version", "9"), "DB-10 DB-10-P1 DB-11"},
        {"UpdateMetaDataLevel", "equal", text("level", "B"), "FW-110"},
        {"UpdateMetaDataStatus", "equal", text("status", "pending"), "TAPE-7"},
        {"UpdateMetaDataType", "equal", text("type", "group"), "PACK-DB PACK-2024"},
        {"Category", "equal", text("category", "critical"), "FW-120 DB-10-P1"},
        {"Language", "equal", text("language", "de"), "FW-120 DB-10"},
        {"LanguageName", "startsWithSubstring", text("languageName", "Fran"), "DB-10"},
        {"AttributeName", "equal", text("name", "reboot"), "DRV-5"},
        {"Attribute", "equal", text("name", "reboot") + text("value", "required"), "DRV-5"},
        {"Attribute", "equal", text("name", "colour") + text("value", "required"), ""},
        {"UpdateMetaDataRestrictionNameValuePair", "greaterThan", text("name", "seats") + text("value", "4"),
         "DB-10"},
        {"VersionMetaDataRestrictionNameValuePair", "equal", text("name", "region") + text("value", "eu"),
         data},
        {"RestrictionNameValuePair", "equal", text("name", "region") + text("value", "eu"), data},
        {"ProductMetaDataNameValuePair", "equal", text("name", "colour") + text("value", "black"), disk},
        {"UpdateMetaDataBase", "equal", text("base", "true"), "FW-100 BIOS-20 DRV-5 DB-10 DB-11 TAPE-7"},
        {"UpdateMetaDataService", "notEqual", text("service", "false"), "FW-100 FW-110 FW-120"},
        {"UpdateMetaDataImplicitExclusion", "equal", text("implicitExclusion", "true"), "TAPE-7"},
        {"ImplicitExclusion", "equal", text("implicitExclusion", "true"), "TAPE-7"},
        {"UpdateMetaDataRestrictionTypeSet", "equal", text("restrictionType", "licence"), "DB-10"},
        {"UpdateMetaDataRestrictionTypeSet", "supersetOf", text("restrictionType", "approval"), "TAPE-7"},
        {"RestrictionTypeSet", "equal",
         text("restrictionType", "export") + text("restrictionType", "licence"), "DB-10"},
        {"ProductCollectionHierarchical", "descendantOf", text("productCollection", "storage"),
         disk.substr(0, disk.size() - 9) + "TAPE-7 PACK-2024"},
        {"ProductCollectionHierarchical", "childOf", text("productCollection", "hardware"), ""},
        {"ProductCollectionHierarchical", "descendantOfOrSelf", text("productCollection", "tape"), "TAPE-7"},
        {"ProductCollectionHierarchical", "siblingOf", text("productCollection", "disk"), "TAPE-7"},
        {"ProductCollectionHierarchical", "ancestorOfOrSelf", text("productCollection", "tape"), "TAPE-7"},
        {"ProductCollectionHierarchical", "parentOf", text("productCollection", "tape"), ""},
        {"MetaDataText", "containsAllWords", text("text", "rebuild FASTER"), "FW-110"},
        {"MetaDataText", "containsAllWords", text("caseSensitive", "true") + text("text", "faster"), ""},
        {"ProductMetaDataNameDateTimePair", "before",
         text("name", "announced") + text("dateTime", "2020-03-02T00:00:00Z"), disk},
        {"ReleaseDateTime", "on", text("releaseDateTime", "2023-03-12T00:00:00Z"), "FW-120 DRV-5"},
        {"ReleaseDateTime", "equal", text("releaseDateTime", "2022-09-01T10:00:00Z"), "DB-10"},
        {"ReleaseDateTime", "after", text("releaseDateTime", "2024-01-31T00:00:00Z"), "TAPE-7"},
        {"ReleaseDateTime", "onOrAfter", text("releaseDateTime", "2024-01-31T00:00:00Z"), "TAPE-7 PACK-2024"},
    };
    for (const auto &r : rows)
        EXPECT_EQ(passing(comparison(r.type, r.op, r.content)), r.ids)
            << r.type << ' ' << r.op << ' ' << r.content;
}

TEST(update_filter, combines_with_and_or_not)
{
    const std::string firmware =
        node("operand", "UpdateMetaDataTypeComparison", text("type", "firmware"), "equal");
    const std::string german = node("operand", "LanguageComparison", text("language", "de"), "equal");
    const std::string not_german = node("operand", "Not", german);
    EXPECT_EQ(passing(node("expression", "And", firmware + german)), "FW-120");
    EXPECT_EQ(passing(node("expression", "Or", firmware + german)), "FW-100 FW-110 FW-120 DB-10 TAPE-7");
    EXPECT_EQ(passing(node("expression", "And", firmware + not_german)), "FW-100 FW-110 TAPE-7");
    std::string many; // a filter may be as wide as it likes, but not as deep
    for (int i = 0; i < 200; ++i)
        many += german;
    EXPECT_EQ(passing(node("expression", "Or", many)), "FW-120 DB-10");
}

TEST(update_filter, refuses_what_it_cannot_judge)
{
    struct row {
        const char *rule;
        std::string expression;
        bool complex;
    };
    std::string deep = node("operand", "CategoryComparison", text("category", "x"), "equal");
    for (unsigned i = 0; i < FILTER_DEPTH_MAX; ++i)
        deep = node("operand", "Not", deep);
    const row rows[] = {
        {"no expression", "", false},
        {"no type", "<protocolUpdateOrderFilter:expression/>", false},
        {"an operator without operand", node("expression", "Not", ""), false},
        {"nothing to compare with", node("expression", "CategoryComparison", "", "equal"), false},
        {"a name is missing", node("expression", "AttributeComparison", text("value", "x"), "equal"), false},
        {"no point in time",
         node("expression", "ReleaseDateTimeComparison", text("releaseDateTime", "soon"), "on"), false},
        {"too deep", node("expression", "Not", deep), true},
    };
    for (const auto &r : rows) {
        try {
            passing(r.expression);
            ADD_FAILURE() << r.rule;
        } catch (const filter_error &error) {
            EXPECT_EQ(error.too_complex, r.complex) << r.rule;
        }
    }
}

// Nodes that refer to each other stand for more nodes than can be looked at.
TEST(update_filter, gives_up_on_expressions_that_grow_without_end)
{
    protocolUpdateOrderFilter__And cycle;
    cycle.operand = {&cycle, &cycle};
    protocolUpdateOrderFilter__Filter filter;
    filter.expression = &cycle;
    soap ctx;
    filter_work work{&ctx};
    EXPECT_THROW(filter_holds(filter, facts_of(work, *the_catalogue().all().front())), filter_error);
    std::string category = "recommended";
    protocolUpdateOrderFilter__CategoryComparison leaf;
    leaf.category = &category;
    protocolUpdateOrderFilter__And level[40];
    for (std::size_t i = 0; i < 39; ++i)
        level[i].operand = {&level[i + 1], &level[i + 1]};
    level[39].operand = {&leaf, &leaf};
    filter.expression = &level[0];
    EXPECT_THROW(filter_holds(filter, facts_of(work, *the_catalogue().all().front())), filter_error);
}

// Every comparison that can be sent has a row: none is taken for a node that does not state what it compares.
TEST(filters, judge_every_comparison_of_both_languages)
{
    soap ctx;
    filter_work work{&ctx};
    const update_record &update = *the_catalogue().all().front();
    const protocolProblemReport__ProblemReportContent report;
    const std::set<std::string> bases = {
        "KeyedStringComparison", "StringComparison",        "BooleanComparison",
        "SetComparison",         "HierarchicalComparison",  "TextComparison",
        "DateTimeComparison",    "KeyedDateTimeComparison", "Comparison"};
    int judged = 0;
    for (int type = 1; type < 900; ++type) {
        const std::string name = soap_type_name(type) == nullptr ? "" : soap_type_name(type);
        const std::string local = name.substr(name.find(':') + 1);
        if (!local.ends_with("Comparison") || bases.contains(local))
            continue;
        const bool of_updates = name.starts_with("protocolUpdateOrderFilter:");
        void *const made = soap_instantiate(&ctx, type, nullptr, nullptr, nullptr);
        protocolUpdateOrderFilter__Filter update_filter;
        protocolPRFilter__Filter report_filter;
        try {
            ++judged;
            if (of_updates) {
                update_filter.expression = static_cast<protocolUpdateOrderFilter__FilterNode *>(made);
                filter_holds(update_filter, facts_of(work, update));
            } else {
                report_filter.expression = static_cast<protocolPRFilter__FilterNode *>(made);
                filter_holds(report_filter, facts_of(work, report));
            }
        } catch (const filter_error &error) { // an empty comparison lacks what it compares with
            EXPECT_EQ(std::string(error.what()).find("does not state"), std::string::npos) << name;
        }
    }
    EXPECT_EQ(judged, 76 + 44) << "comparisons of the two languages, the abstract bases not counted";
}

TEST(report_filter, compares_what_the_class_names)
{
    const std::string p = "protocolPRFilter";
    const parsed<protocolProblemReport__ProblemReportContent> report(
        "protocolProblemReport:ProblemReportContent",
        "<protocol:subject><protocol:product>ZX100</protocol:product></protocol:subject><protocol:submitter>"
        "<protocol:country>AT</protocol:country><protocol:customerNumber>1</protocol:customerNumber>"
        "<protocol:customerNumber>4711</protocol:customerNumber></protocol:submitter><protocol:beneficiary>"
        "<protocol:country>DE</protocol:country></protocol:beneficiary>" +
            text("problemDescription", "It hangs", "protocolProblemReport") +
            text("submitDateTime", "2024-02-03T04:05:06Z", "protocolProblemReport"));
    soap ctx;
    filter_work work{&ctx};
    const struct {
        const char *type, *op;
        std::string content;
        bool holds;
    } rows[] = {
        {"ProductComparison", "equal", text("product", "ZX100", p), true},
        {"ProductComparison", "containsPhrase", text("product", "zx100", p), true},
        {"SubmitterCountryComparison", "equal", text("country", "AT", p), true},
        {"SubmitterCustomerNumberComparison", "equal", text("customerNumber", "4711", p), true},
        {"BeneficiaryCountryComparison", "equal", text("country", "AT", p), false},
        {"BeneficiaryCountryComparison", "notEqual", text("country", "AT", p), true},
        {"ReportTextComparison", "containsAtLeastOneWord", text("text", "stops, hangs", p), true},
        {"SubmitDateTimeComparison", "on", text("submitDateTime", "2024-02-03T23:00:00Z", p), true},
        {"LastModifiedDateTimeComparison", "before", text("lastModifiedDateTime", "2999-01-01T00:00:00Z", p),
         false},
    };
    for (const auto &r : rows) {
        const parsed<protocolPRFilter__Filter> filter(p + ":Filter",
                                                      node("expression", r.type, r.content, r.op, p));
        EXPECT_EQ(filter_holds(*filter, facts_of(work, *report)), r.holds) << r.type << ' ' << r.op;
    }
}

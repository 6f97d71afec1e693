// updates_test.cpp - the catalogue of updates: the operators of the filter languages, filters of updates and of
// problem reports, as XML, and what orders come to.
#include <regex>

#include <zuv_client_pro/protocolUpdateOrderFilter.h>

#include "catalogue.h"
#include "comparison.h"
#include "document.h"
#include "expansion.h"
#include "filter.h"
#include "support/testing.h"

using namespace service;

namespace {

// The element, such as "protocolUpdateOrder:Filter", around a content in which the contract's prefixes are known.
template <class T> class parsed {
public:
    parsed(const std::string &element, const std::string &content)
    {
        std::string xml = "<" + element;
        for (const soap_namespace *row = soap_program_namespaces; row->prefix != nullptr; ++row)
            xml += std::string(" xmlns:") + row->prefix + "=\"" + row->uri + "\"";
        object_ = codec_.read<T>(xml + ">" + content + "</" + element + ">");
    }
    const T &operator*() const { return *object_; }

private:
    service::document_codec codec_{1 << 20, 200};
    T *object_;
};

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

std::string ids(const expansion &found)
{
    std::string text;
    for (const chosen_update &chosen : found.chosen)
        text += (text.empty() ? "" : " ") + *chosen.update->updateId;
    for (const unknown_update &unknown : found.unknown)
        text += (text.empty() ? "?" : " ?") + unknown.id;
    return text;
}

// XML of an order's members: "name=text", with blanks between them.
std::string members(const std::string &words)
{
    const std::regex word("([A-Za-z]+)=([^ <]+)");
    return std::regex_replace(words, word, "<protocolUpdateOrder:$1>$2</protocolUpdateOrder:$1>");
}

TEST(comparison, orders_numbers_within_texts_as_numbers)
{
    const char *const ascending[] = {"",   "1",   "1.0", "1.0.1", "1.2", "1.10", "2",
                                     "10", "10a", "a",   "a2",    "a10", "b"};
    for (std::size_t i = 0; i < std::size(ascending); ++i)
        for (std::size_t j = 0; j < std::size(ascending); ++j) {
            const int sign = compare_naturally(ascending[i], ascending[j]);
            EXPECT_TRUE((sign < 0) == (i < j) && (sign == 0) == (i == j))
                << ascending[i] << " and " << ascending[j] << ": " << sign;
        }
    EXPECT_EQ(compare_naturally("007", "7"), 0);
    EXPECT_LT(compare_naturally("99999999999999999999998", "99999999999999999999999"), 0) << "of any length";
}

TEST(comparison, of_text)
{
    using op = text_operator;
    const std::tuple<const char *, op, values, const char *, bool> rows[] = {
        {"equal to one of several", op::equal, {"a", "b"}, "b", true},
        {"case counts", op::equal, {"A"}, "a", false},
        {"no value is equal to nothing", op::equal, {}, "", false},
        {"not equal means none is equal", op::not_equal, {"a", "b"}, "b", false},
        {"not equal without a value", op::not_equal, {}, "b", true},
        {"less by number", op::less, {"9"}, "10", true},
        {"greater", op::greater, {"1.2"}, "1.10", false},
        {"less or equal", op::less_or_equal, {"3"}, "3", true},
        {"phrase", op::contains_phrase, {"The Disk-Array hangs"}, "disk array", true},
        {"phrase out of order", op::contains_phrase, {"array disk"}, "disk array", false},
        {"phrase of part of a word", op::contains_phrase, {"diskarray"}, "disk", false},
        {"all words in any order", op::contains_all_words, {"array of a disk"}, "disk array", true},
        {"a word is missing", op::contains_all_words, {"disk"}, "disk array", false},
        {"no words to search for", op::contains_all_words, {"disk"}, " - ", false},
        {"other letters", op::contains_all_words, {"\u00DCber Gr\u00F6\u00DFe"}, "gr\u00F6\u00DFe", true},
    };
    for (const auto &[rule, how, held, wanted, holds] : rows)
        EXPECT_EQ(text_holds(how, held, wanted), holds) << rule;
    // In time that grows with the lengths, however much of what is wanted is there.
    const std::string held = repeat_text("a ", 400000), letters = repeat_text("a", 400000);
    for (const op how : {op::contains_phrase, op::contains_all_words})
        EXPECT_FALSE(text_holds(how, {held, held}, repeat_text("a ", 200000) + "b"));
    EXPECT_TRUE(text_holds(op::contains_phrase, {held}, repeat_text("A-", 200000)));
    EXPECT_FALSE(text_holds(op::contains, {letters}, repeat_text("a", 200000) + "b"));
    EXPECT_FALSE(word_search(op::contains_all_words, "disk", true).found_in("Disk"));
    EXPECT_TRUE(word_search(op::contains_all_words, "disk", false).found_in("Disk"));
}

TEST(comparison, of_sets_truth_and_time)
{
    using set = std::set<std::string_view>;
    EXPECT_TRUE(set_holds(set_operator::equal, {"a", "b"}, {"b", "a"}));
    EXPECT_FALSE(set_holds(set_operator::not_equal, {"a"}, {"a"}));
    EXPECT_TRUE(set_holds(set_operator::subset_of, {"a"}, {"a", "b"}));
    EXPECT_TRUE(set_holds(set_operator::subset_of, set(), {"a"})) << "the empty set is a part of any";
    EXPECT_FALSE(set_holds(set_operator::superset_of, {"a"}, {"a", "b"}));

    EXPECT_TRUE(truth_holds(true, false, false));
    EXPECT_TRUE(truth_holds(false, true, false));
    EXPECT_FALSE(truth_holds(false, true, true));

    constexpr std::time_t noon = 1700049600; // 2023-11-15T12:00:00Z
    constexpr std::time_t evening = noon + 6 * 3600, next_day = noon + 86400;
    using op = moment_operator;
    const std::tuple<op, std::time_t, std::time_t, bool> rows[] = {
        {op::equal, noon, evening, false},         {op::on, noon, evening, true},
        {op::on, noon, next_day, false},           {op::not_equal, noon, evening, true},
        {op::not_on, noon, evening, false},        {op::before, noon, evening, true},
        {op::after, noon, evening, false},         {op::on_or_before, evening, noon, true},
        {op::on_or_before, next_day, noon, false}, {op::on_or_after, noon, evening, true}};
    for (const auto &[how, held, wanted, holds] : rows)
        EXPECT_EQ(moment_holds(how, {held}, wanted), holds) << static_cast<int>(how);
    EXPECT_TRUE(moment_holds(op::not_on, {}, noon));
    EXPECT_FALSE(moment_holds(op::before, {}, noon));
}

TEST(update_filter, compares_what_the_class_names)
{
    const std::string disk = "FW-100 FW-110 FW-120 BIOS-20 BIOS-30 DRV-5 PACK-2024";
    const std::string data = "DB-10 DB-10-P1 DB-11 PACK-DB PACK-2024";
    const std::tuple<const char *, const char *, std::string, std::string> rows[] = {
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
    for (const auto &[type, op, content, ids] : rows)
        EXPECT_EQ(passing(comparison(type, op, content)), ids) << type << ' ' << op << ' ' << content;
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
    const std::string many = repeat_text(german, 200); // a filter may be as wide as it likes, but not as deep
    EXPECT_EQ(passing(node("expression", "Or", many)), "FW-120 DB-10");
}

TEST(update_filter, refuses_what_it_cannot_judge)
{
    std::string deep = node("operand", "CategoryComparison", text("category", "x"), "equal");
    for (unsigned i = 0; i < FILTER_DEPTH_MAX; ++i)
        deep = node("operand", "Not", deep);
    const std::tuple<const char *, std::string, bool> rows[] = {
        {"no expression", "", false},
        {"no type", "<protocolUpdateOrderFilter:expression/>", false},
        {"an operator without operand", node("expression", "Not", ""), false},
        {"nothing to compare with", node("expression", "CategoryComparison", "", "equal"), false},
        {"a name is missing", node("expression", "AttributeComparison", text("value", "x"), "equal"), false},
        {"no point in time",
         node("expression", "ReleaseDateTimeComparison", text("releaseDateTime", "soon"), "on"), false},
        {"too deep", node("expression", "Not", deep), true},
    };
    for (const auto &[rule, expression, complex] : rows) {
        try {
            passing(expression);
            ADD_FAILURE() << rule;
        } catch (const filter_error &error) {
            EXPECT_EQ(error.too_complex, complex) << rule;
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
    const std::vector<std::string> bases =
        words("Comparison KeyedStringComparison StringComparison BooleanComparison SetComparison "
              "HierarchicalComparison TextComparison DateTimeComparison KeyedDateTimeComparison");
    int judged = 0;
    for (int type = 1; type < 900; ++type) {
        const std::string name = soap_type_name(type) == nullptr ? "" : soap_type_name(type);
        const std::string local = name.substr(name.find(':') + 1);
        if (!local.ends_with("Comparison") || std::ranges::count(bases, local) != 0)
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
    const std::tuple<const char *, const char *, std::string, bool> rows[] = {
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
    for (const auto &[type, op, content, holds] : rows) {
        const parsed<protocolPRFilter__Filter> filter(p + ":Filter",
                                                      node("expression", type, content, op, p));
        EXPECT_EQ(filter_holds(*filter, facts_of(work, *report)), holds) << type << ' ' << op;
    }
}

TEST(expansion, follows_the_order)
{
    const std::string data = "DB-10 DB-10-P1 DB-11 PACK-DB PACK-2024";
    const std::tuple<const char *, const char *, std::string> rows[] = {
        {"identifiers, each once", "updateId=DRV-5 updateId=FW-100 updateId=DRV-5", "DRV-5 FW-100"},
        {"unknown ones are told once", "updateId=X updateId=FW-100 updateId=X", "FW-100 ?X"},
        {"a category", "updateScope=critical", "FW-120 DB-10-P1"},
        {"a collection", "updateScope=software", data},
        {"ancillaries", "updateScope=tools includeAncillaries=true", "TOOLS-1"},
        {"what is left out implicitly", "updateScope=tape", ""},
        {"unless asked for", "updateScope=tape includeImplicitExclusions=true", "TAPE-7"},
        {"by its kind", "updateScope=tape includeImplicitExclusions=true selectImplicitExclusions=allPending",
         "TAPE-7"},
        {"or by name", "updateId=TAPE-7", "TAPE-7"},
        {"requisites as indicated", "updateId=FW-120 includeRequisites=true", "FW-120 BIOS-20 DRV-5"},
        {"the last that supersede them",
         "updateId=FW-120 includeRequisites=true selectRequisites=lastSupersedingOnly",
         "FW-120 BIOS-30 DRV-5"},
        {"superseding ones", "updateId=FW-100 includeSupersedes=true", "FW-100 FW-110 FW-120"},
        {"the first only", "updateId=FW-100 includeSupersedes=true selectSupersedes=firstSupersedingOnly",
         "FW-100 FW-110"},
        {"the last only, with what it requires",
         "updateId=FW-100 includeSupersedes=true includeRequisites=true selectSupersedes=lastSupersedingOnly",
         "FW-100 FW-120 BIOS-20 DRV-5"},
        {"shared by several",
         "updateId=FW-100 updateId=FW-110 updateId=BIOS-20 includeSupersedes=true "
         "selectSupersedes=sharedSupersedingOnly",
         "FW-100 FW-110 BIOS-20 FW-120"},
        {"superseded ones", "updateId=FW-120 includeSupersedes=true selectSupersedes=allSuperseded",
         "FW-120 FW-110 FW-100"},
        {"patches and replacements", "updateId=DB-10 includePatches=true includeConditionalReplacements=true",
         "DB-10 DB-10-P1 DB-11"},
        {"a group as it is", "updateId=PACK-2024", "PACK-2024"},
        {"a group's members", "updateId=PACK-2024 expandGroups=all",
         "PACK-2024 FW-120 BIOS-30 PACK-DB DB-10 DB-10-P1"},
        {"those of nested groups", "updateId=PACK-2024 expandGroups=nestedGroupsOnly",
         "PACK-2024 DB-10 DB-10-P1"},
        {"a qualifier of another",
         "<protocolUpdateOrder:updateIdQualified>updateId=FW-100 "
         "updateIdQualifier=OTHER</protocolUpdateOrder:updateIdQualified>",
         "?FW-100"},
        {"for a subject",
         "updateScope=all <protocol:subject><protocol:product>ZDB</protocol:product></protocol:subject>",
         data},
    };
    for (const auto &[rule, content, wanted] : rows) {
        soap ctx;
        filter_work work{&ctx};
        const parsed<protocolUpdateOrder__UpdateOrderContent> asked("protocolUpdateOrder:UpdateOrderContent",
                                                                    members(content));
        EXPECT_EQ(ids(expand(work, the_catalogue(), *asked)), wanted) << rule;
    }
}

TEST(expansion, filters_by_the_updates_role)
{
    soap ctx;
    filter_work work{&ctx};
    std::string type = "driver";
    protocolUpdateOrderFilter__UpdateMetaDataTypeComparison drivers;
    drivers.type = &type;
    protocolUpdateOrderFilter__Filter filter;
    filter.expression = &drivers;
    protocolUpdateOrder__UpdateOrderContent o;
    o.inclusionFilter.push_back(&filter);
    EXPECT_TRUE(names_updates(o));
    EXPECT_EQ(ids(expand(work, the_catalogue(), o)), "DRV-5") << "a filter alone is taken over all updates";
    o.updateId = {"FW-120"};
    o.includeRequisites = true;
    EXPECT_EQ(ids(expand(work, the_catalogue(), o)), "");
    filter.scope = {protocolUpdateOrderFilter__FilterScope::requisite};
    EXPECT_EQ(ids(expand(work, the_catalogue(), o)), "FW-120 DRV-5");
    filter.scope = {protocolUpdateOrderFilter__FilterScope::nonrequisite};
    EXPECT_EQ(ids(expand(work, the_catalogue(), o)), "");
    EXPECT_FALSE(names_updates(protocolUpdateOrder__UpdateOrderContent()));
}

TEST(catalogue, is_whole)
{
    const catalogue &offered = the_catalogue();
    for (const update_record *update : offered.all()) {
        SCOPED_TRACE(*update->updateId);
        const auto expect_known = [&](const auto &references) {
            for (const auto *one : references)
                EXPECT_NE(offered.find(*one->updateId, *one->updateIdQualifier), nullptr);
        };
        expect_known(update->requisite);
        expect_known(update->superseding);
        for (const protocol__Identity *subject : update->subject)
            EXPECT_TRUE(collection_is_within(*subject->productCollection, "all"));
        EXPECT_EQ(std::to_string(update_data(*update).size()), *update->size);
    }
}

} // namespace

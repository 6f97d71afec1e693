// filter_tables.h - what the two filter languages have in common: the tree of operators, and the rows that
// say what a comparison class compares.
//
// Always: classes are distinguished by type id, by which a row is found.
#pragma once

#include <algorithm>
#include <optional>
#include <span>

#include "filter.h"
#include "moment.h"

namespace service {

constexpr std::size_t MEMBER_BYTES_MIN = 16; // of XML; so often at most a node looks for something in an item

// A row: judges a node of one class.
template <class Node> struct comparison_row {
    int type;
    bool (*holds)(const Node &node, const filter_facts &facts);
};

// Judges the trees of a language L, which names its classes: filter_node, and_node, or_node, not_node, and
// gives the row of a comparison by `find`.
template <class L> class filter_judge {
public:
    using node = typename L::filter_node;

    explicit filter_judge(const filter_facts &facts) : facts_(facts) {}

    bool holds(const node *expression, unsigned depth = 0)
    {
        if (expression == nullptr)
            throw filter_error("an expression or operand of the filter is missing", false);
        if (depth > FILTER_DEPTH_MAX)
            throw filter_error("the filter is nested too deeply", true);
        facts_.work->spend(NODE_WORK + facts_.size / MEMBER_BYTES_MIN);
        const auto judge = [&](const node *operand) { return holds(operand, depth + 1); };
        if (const auto *const all = dynamic_cast<const typename L::and_node *>(expression))
            return std::all_of(all->operand.begin(), all->operand.end(), judge);
        if (const auto *const some = dynamic_cast<const typename L::or_node *>(expression))
            return std::any_of(some->operand.begin(), some->operand.end(), judge);
        if (const auto *const negated = dynamic_cast<const typename L::not_node *>(expression))
            return !judge(negated->operand);
        if (const comparison_row<node> *const row = L::find(expression->soap_type()))
            return row->holds(*expression, facts_);
        throw filter_error("a node of the filter does not state what it compares", false);
    }

private:
    const filter_facts &facts_;
};

// The row of a type in a table, or null.
template <class Node>
const comparison_row<Node> *find_row(std::span<const comparison_row<Node>> rows, int type)
{
    const auto found =
        std::find_if(rows.begin(), rows.end(), [type](const auto &row) { return row.type == type; });
    return found == rows.end() ? nullptr : &*found;
}

template <class T> const T &demand_operand(const T *operand)
{
    if (operand == nullptr)
        throw filter_error("a comparison of the filter lacks what it compares with", false);
    return *operand;
}

inline void spend_on(const filter_facts &facts, std::string_view text)
{
    facts.work->spend(VALUE_WORK + text.size());
}

// What a comparison compares with: not too long, and its bytes counted.
inline const std::string &demand_text(const filter_facts &facts, const std::string *operand)
{
    const std::string &text = demand_operand(operand);
    if (text.size() > FILTER_TEXT_MAX)
        throw filter_error("a comparison of the filter compares with too long a text", true);
    spend_on(facts, text);
    return text;
}

template <class Texts> const Texts &spend_on_each(const filter_facts &facts, const Texts &texts)
{
    for (const std::string_view text : texts)
        spend_on(facts, text);
    return texts;
}

inline bool texts_hold(const filter_facts &facts, text_operator op, const values &held,
                       const std::string *wanted)
{
    return text_holds(op, spend_on_each(facts, held), demand_text(facts, wanted));
}

// The operators of the languages on text. Their codes differ: here are the common operators in the order of
// each.
inline text_operator common_operator(protocolUpdateOrderFilter__StringCompareOp op)
{
    static_assert(static_cast<int>(protocolUpdateOrderFilter__StringCompareOp::containsAtLeastOneWord) ==
                  static_cast<int>(text_operator::contains_some_word));
    return static_cast<text_operator>(op);
}

inline text_operator common_operator(protocolPRFilter__StringCompareOp op)
{
    constexpr text_operator OPERATORS[] = {
        text_operator::equal,           text_operator::not_equal,          text_operator::less,
        text_operator::greater,         text_operator::less_or_equal,      text_operator::greater_or_equal,
        text_operator::contains_phrase, text_operator::contains_all_words, text_operator::contains_some_word};
    const auto code = static_cast<std::size_t>(op);
    if (code >= std::size(OPERATORS))
        throw filter_error("a comparison of the filter has an unknown operator", false);
    return OPERATORS[code];
}

// --- the families, each for a class C of a language with base class Node ---

// Text: `Values` gathers what is compared with the text in `Wanted`.
template <class Node, class C, auto Wanted, auto Values>
bool compare_texts(const Node &node, const filter_facts &facts)
{
    const auto &comparison = static_cast<const C &>(node);
    values held;
    Values(facts, held);
    return texts_hold(facts, common_operator(comparison.compareOp), held, comparison.*Wanted);
}

// Text picked by a name; Values(facts, name, out).
template <class Node, class C, auto Values>
bool compare_named_texts(const Node &node, const filter_facts &facts)
{
    const auto &comparison = static_cast<const C &>(node);
    values held;
    Values(facts, demand_text(facts, comparison.name), held);
    return texts_hold(facts, common_operator(comparison.compareOp), held, comparison.value);
}

template <class Meta> void restriction_pairs(const filter_facts &facts, const std::string &name, values &out)
{
    each_meta(facts, static_cast<Meta *>(nullptr), [&](const auto &meta) {
        for (const protocol__Restriction *restriction : meta.restriction)
            if (restriction != nullptr)
                gather_named(out, restriction->nameValuePair, name, &protocol__NameValuePair::value);
    });
}

template <class Meta> void named_pairs(const filter_facts &facts, const std::string &name, values &out)
{
    each_meta(facts, static_cast<Meta *>(nullptr), [&](const Meta &meta) {
        gather_named(out, meta.nameValuePair, name, &protocol__NameValuePair::value);
    });
}

template <class Meta> void named_moments(const filter_facts &facts, const std::string &name, values &out)
{
    each_meta(facts, static_cast<Meta *>(nullptr), [&](const auto &meta) {
        if constexpr (requires { meta.nameDateTimePair; })
            gather_named(out, meta.nameDateTimePair, name, &protocol__NameDateTimePair::dateTime);
    });
}

// The mark of implicit exclusion in one kind of meta data: true if any record has it.
template <class Node, class C, class Meta> bool compare_exclusion(const Node &node, const filter_facts &facts)
{
    const auto &comparison = static_cast<const C &>(node);
    bool held = false;
    each_meta(facts, static_cast<Meta *>(nullptr), [&](const auto &meta) {
        held = held || (meta.implicitExclusion != nullptr && *meta.implicitExclusion);
    });
    return truth_holds(static_cast<int>(comparison.compareOp) == 0, held,
                       demand_operand(comparison.implicitExclusion));
}

// The types of the restrictions in one kind of meta data, as a set.
template <class Node, class C, class Meta>
bool compare_restrictions(const Node &node, const filter_facts &facts)
{
    const auto &comparison = static_cast<const C &>(node);
    values held;
    each_meta(facts, static_cast<Meta *>(nullptr),
              [&](const auto &meta) { gather_each<&protocol__Restriction::type>(held, meta.restriction); });
    spend_on_each(facts, held);
    spend_on_each(facts, comparison.restrictionType);
    return set_holds(static_cast<set_operator>(comparison.compareOp), {held.begin(), held.end()},
                     {comparison.restrictionType.begin(), comparison.restrictionType.end()});
}

inline bool moments_hold(const filter_facts &facts, moment_operator op, const values &held,
                         const std::string *wanted)
{
    std::vector<std::time_t> moments;
    for (const std::string_view text : spend_on_each(facts, held))
        if (const auto moment = moment_of(facts.work->ctx, std::string(text)))
            moments.push_back(*moment);
    const auto limit = moment_of(facts.work->ctx, demand_text(facts, wanted));
    if (!limit)
        throw filter_error("a comparison of the filter holds no point in time", false);
    return moment_holds(op, moments, *limit);
}

template <class Node, class C, auto Wanted, auto Values>
bool compare_moments(const Node &node, const filter_facts &facts)
{
    const auto &comparison = static_cast<const C &>(node);
    values held;
    Values(facts, held);
    return moments_hold(facts, static_cast<moment_operator>(comparison.compareOp), held, comparison.*Wanted);
}

template <class Node, class C, class Meta>
bool compare_named_moments(const Node &node, const filter_facts &facts)
{
    const auto &comparison = static_cast<const C &>(node);
    values held;
    named_moments<Meta>(facts, demand_text(facts, comparison.name), held);
    return moments_hold(facts, static_cast<moment_operator>(comparison.compareOp), held, comparison.dateTime);
}

// Words in the item's running text.
template <class Node, class C> bool compare_running_text(const Node &node, const filter_facts &facts)
{
    const auto &comparison = static_cast<const C &>(node);
    constexpr text_operator OPERATORS[] = {text_operator::contains_phrase, text_operator::contains_all_words,
                                           text_operator::contains_some_word};
    const auto code = static_cast<std::size_t>(comparison.compareOp);
    if (code >= std::size(OPERATORS))
        return false;
    const word_search search(OPERATORS[code], demand_text(facts, comparison.text),
                             comparison.caseSensitive != nullptr && *comparison.caseSensitive);
    const std::string text = running_text(facts);
    spend_on(facts, text);
    return search.found_in(text);
}

// --- rows of a table. The language's file defines SERVICE_FILTER(name), its class of that name,
// SERVICE_FILTER_TYPE(name), that class's type id, and filter_node, the base of its classes. Each macro
// stands for the rows without a comma at the end.

#define SERVICE_ROW(name, ...)                                                                               \
    {                                                                                                        \
        SERVICE_FILTER_TYPE(name), __VA_ARGS__                                                               \
    }
#define SERVICE_TEXT_ROW(name, wanted, ...)                                                                  \
    SERVICE_ROW(                                                                                             \
        name, compare_texts<filter_node, SERVICE_FILTER(name), &SERVICE_FILTER(name)::wanted, __VA_ARGS__>)
#define SERVICE_SUBJECT_ROW(Name, member)                                                                    \
    SERVICE_TEXT_ROW(Name##Comparison, member, subject_texts<&protocol__Identity::member>)
#define SERVICE_NAMED_ROW(name, ...)                                                                         \
    SERVICE_ROW(name, compare_named_texts<filter_node, SERVICE_FILTER(name), __VA_ARGS__>)
#define SERVICE_EXCLUSION_ROW(name, Meta)                                                                    \
    SERVICE_ROW(name, compare_exclusion<filter_node, SERVICE_FILTER(name), Meta>)
#define SERVICE_RESTRICTIONS_ROW(name, Meta)                                                                 \
    SERVICE_ROW(name, compare_restrictions<filter_node, SERVICE_FILTER(name), Meta>)
#define SERVICE_NAMED_MOMENT_ROW(name, Meta)                                                                 \
    SERVICE_ROW(name, compare_named_moments<filter_node, SERVICE_FILTER(name), Meta>)
#define SERVICE_MOMENT_ROW(name, wanted, ...)                                                                \
    SERVICE_ROW(                                                                                             \
        name,                                                                                                \
        compare_moments<filter_node, SERVICE_FILTER(name), &SERVICE_FILTER(name)::wanted, __VA_ARGS__>)
#define SERVICE_RUNNING_TEXT_ROW(name)                                                                       \
    SERVICE_ROW(name, compare_running_text<filter_node, SERVICE_FILTER(name)>)

// Comparisons that each kind of meta data has.
#define SERVICE_META_ROWS(Kind)                                                                              \
    SERVICE_NAMED_ROW(Kind##MetaDataRestrictionNameValuePairComparison,                                      \
                      restriction_pairs<protocol__##Kind##MetaData>),                                        \
        SERVICE_NAMED_ROW(Kind##MetaDataNameValuePairComparison, named_pairs<protocol__##Kind##MetaData>),   \
        SERVICE_EXCLUSION_ROW(Kind##MetaDataImplicitExclusionComparison, protocol__##Kind##MetaData),        \
        SERVICE_RESTRICTIONS_ROW(Kind##MetaDataRestrictionTypeSetComparison, protocol__##Kind##MetaData)
#define SERVICE_META_MOMENT_ROW(Kind)                                                                        \
    SERVICE_NAMED_MOMENT_ROW(Kind##MetaDataNameDateTimePairComparison, protocol__##Kind##MetaData)
#define SERVICE_PRODUCT_META_ROW(Name, member)                                                               \
    SERVICE_TEXT_ROW(ProductMetaData##Name##Comparison, member,                                              \
                     meta_texts<protocol__ProductMetaData, &protocol__ProductMetaData::member>)

// Comparisons that both languages have.
#define SERVICE_COMMON_ROWS                                                                                  \
    SERVICE_SUBJECT_ROW(Product, product), SERVICE_SUBJECT_ROW(ProductName, productName),                    \
        SERVICE_SUBJECT_ROW(Version, version), SERVICE_SUBJECT_ROW(Level, level),                            \
        SERVICE_SUBJECT_ROW(ServiceLevel, serviceLevel), SERVICE_SUBJECT_ROW(Platform, platform),            \
        SERVICE_SUBJECT_ROW(PlatformName, platformName),                                                     \
        SERVICE_SUBJECT_ROW(PlatformVersion, platformVersion), SERVICE_SUBJECT_ROW(Component, component),    \
        SERVICE_SUBJECT_ROW(ComponentName, componentName),                                                   \
        SERVICE_PRODUCT_META_ROW(ProductClass, productClass), SERVICE_PRODUCT_META_ROW(Option, option),      \
        SERVICE_TEXT_ROW(ProductMetaDataAttachableToProductComparison, attachableToProduct,                  \
                         attachable_products),                                                               \
        SERVICE_META_ROWS(Product), SERVICE_META_ROWS(Version), SERVICE_META_ROWS(Level),                    \
        SERVICE_META_ROWS(ServiceLevel), SERVICE_META_MOMENT_ROW(Product), SERVICE_META_MOMENT_ROW(Version), \
        SERVICE_META_MOMENT_ROW(Level), SERVICE_META_MOMENT_ROW(ServiceLevel),                               \
        SERVICE_NAMED_ROW(RestrictionNameValuePairComparison, restriction_pairs<any_meta>),                  \
        SERVICE_EXCLUSION_ROW(ImplicitExclusionComparison, any_meta),                                        \
        SERVICE_RESTRICTIONS_ROW(RestrictionTypeSetComparison, any_meta),                                    \
        SERVICE_NAMED_MOMENT_ROW(NameDateTimePairComparison, any_meta)

} // namespace service

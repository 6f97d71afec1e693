// filter_update.cpp - the filter language for updates.
#include "catalogue.h"
#include "filter_tables.h"

namespace service {

namespace {

using filter_node = protocolUpdateOrderFilter__FilterNode;
using update = protocolUpdateOrder__UpdateMetaData;
using platform = protocol__OperatingPlatform;
using collection_meta = protocol__ProductCollectionMetaData;

// Where the item's product collections are in the hierarchy, relative to the one asked for.
bool compare_collections(const filter_node &node, const filter_facts &facts)
{
    const auto &comparison =
        static_cast<const protocolUpdateOrderFilter__ProductCollectionHierarchicalComparison &>(node);
    const std::string &wanted = demand_text(facts, comparison.productCollection);
    values held;
    subject_texts<&protocol__Identity::productCollection>(facts, held);
    return std::any_of(held.begin(), held.end(), [&](std::string_view own) {
        switch (comparison.compareOp) {
        case protocolUpdateOrderFilter__HierarchicalCompareOp::parentOf:
            return collection_parent(wanted) == own;
        case protocolUpdateOrderFilter__HierarchicalCompareOp::ancestorOf:
            return own != wanted && collection_is_within(wanted, own);
        case protocolUpdateOrderFilter__HierarchicalCompareOp::ancestorOfOrSelf:
            return collection_is_within(wanted, own);
        case protocolUpdateOrderFilter__HierarchicalCompareOp::childOf:
            return collection_parent(own) == wanted;
        case protocolUpdateOrderFilter__HierarchicalCompareOp::descendantOf:
            return own != wanted && collection_is_within(own, wanted);
        case protocolUpdateOrderFilter__HierarchicalCompareOp::descendantOfOrSelf:
            return collection_is_within(own, wanted);
        case protocolUpdateOrderFilter__HierarchicalCompareOp::siblingOf:
            return own != wanted && !collection_parent(own).empty() &&
                   collection_parent(own) == collection_parent(wanted);
        }
        return false;
    });
}

// A truth value of the update itself; absent counts as false.
template <class C, auto Wanted, auto Held>
bool compare_update_truth(const filter_node &node, const filter_facts &facts)
{
    const auto &comparison = static_cast<const C &>(node);
    const bool held = facts.update != nullptr && facts.update->*Held != nullptr && *(facts.update->*Held);
    return truth_holds(comparison.compareOp == protocolUpdateOrderFilter__BooleanCompareOp::equal, held,
                       demand_operand(comparison.*Wanted));
}

bool compare_language(const filter_node &node, const filter_facts &facts)
{
    const auto &comparison = static_cast<const protocolUpdateOrderFilter__LanguageComparison &>(node);
    values held;
    language_texts(facts, held);
    return texts_hold(facts, common_operator(comparison.compareOp), held,
                      &demand_operand(comparison.language).value);
}

#define SERVICE_FILTER(name)      protocolUpdateOrderFilter__##name
#define SERVICE_FILTER_TYPE(name) SOAP_TYPE_protocolUpdateOrderFilter__##name

#define PLATFORM_ROW(Name, member)                                                                           \
    SERVICE_TEXT_ROW(OperatingPlatform##Name##Comparison, member, platform_texts<&platform::member>)
#define UPDATE_ROW(Name, member)                                                                             \
    SERVICE_TEXT_ROW(UpdateMetaData##Name##Comparison, member, meta_texts<update, &update::member>)
#define CODE_ROW(name, Meta, member)                                                                         \
    SERVICE_TEXT_ROW(name, member, code_texts<Meta, &protocol__OCCode::member>)
#define TRUTH_ROW(name, member)                                                                              \
    SERVICE_ROW(name,                                                                                        \
                compare_update_truth<SERVICE_FILTER(name), &SERVICE_FILTER(name)::member, &update::member>)

// clang-format off: one row per line
constexpr comparison_row<filter_node> ROWS[] = {
    SERVICE_COMMON_ROWS,
    PLATFORM_ROW(DisplayName, displayName),
    PLATFORM_ROW(Name, name),
    PLATFORM_ROW(Version, version),
    PLATFORM_ROW(FixPack, fixPack),
    PLATFORM_ROW(FamilyName, familyName),
    PLATFORM_ROW(HardwareName, hardwareName),
    PLATFORM_ROW(EditionName, editionName),
    PLATFORM_ROW(BitWidth, bitWidth),
    SERVICE_SUBJECT_ROW(ProductCollection, productCollection),
    SERVICE_SUBJECT_ROW(ProductCollectionName, productCollectionName),
    CODE_ROW(ProductCollectionMetaDataOCCodeComparison, collection_meta, ocCode),
    CODE_ROW(ProductCollectionMetaDataOCCodeTypeComparison, collection_meta, type),
    CODE_ROW(ProductMetaDataOCCodeComparison, protocol__ProductMetaData, ocCode),
    CODE_ROW(ProductMetaDataOCCodeTypeComparison, protocol__ProductMetaData, type),
    UPDATE_ROW(Name, name),
    UPDATE_ROW(Version, version),
    UPDATE_ROW(Level, level),
    UPDATE_ROW(ServiceLevel, serviceLevel),
    UPDATE_ROW(Status, status),
    UPDATE_ROW(Type, type),
    SERVICE_TEXT_ROW(CategoryComparison, category, meta_texts<update, &update::category>),
    SERVICE_ROW(LanguageComparison, compare_language),
    SERVICE_TEXT_ROW(LanguageNameComparison, languageName, language_name_texts),
    SERVICE_TEXT_ROW(AttributeNameComparison, name, attribute_name_texts),
    SERVICE_TEXT_ROW(AttachmentDescriptorComparison, descriptor, descriptor_texts),
    SERVICE_TEXT_ROW(AttachmentTypeComparison, type, attachment_type_texts),
    SERVICE_NAMED_ROW(UpdateMetaDataRestrictionNameValuePairComparison, restriction_pairs<update>),
    SERVICE_META_ROWS(ProductCollection),
    SERVICE_NAMED_ROW(AttributeComparison, attribute_texts),
    SERVICE_EXCLUSION_ROW(UpdateMetaDataImplicitExclusionComparison, update),
    TRUTH_ROW(UpdateMetaDataBaseComparison, base),
    TRUTH_ROW(UpdateMetaDataServiceComparison, service),
    SERVICE_RESTRICTIONS_ROW(UpdateMetaDataRestrictionTypeSetComparison, update),
    SERVICE_ROW(ProductCollectionHierarchicalComparison, compare_collections),
    SERVICE_RUNNING_TEXT_ROW(MetaDataTextComparison),
    SERVICE_MOMENT_ROW(ReleaseDateTimeComparison, releaseDateTime,
                       meta_texts<update, &update::releaseDateTime>),
};
// clang-format on

struct update_language {
    using filter_node = protocolUpdateOrderFilter__FilterNode;
    using and_node = protocolUpdateOrderFilter__And;
    using or_node = protocolUpdateOrderFilter__Or;
    using not_node = protocolUpdateOrderFilter__Not;
    static const comparison_row<filter_node> *find(int type) { return find_row<filter_node>(ROWS, type); }
};

} // namespace

bool filter_holds(const protocolUpdateOrderFilter__Filter &filter, const filter_facts &facts)
{
    return filter_judge<update_language>(facts).holds(filter.expression);
}

} // namespace service

// expansion_test.cpp - what update orders come to.
#include <regex>
#include <string>

#include <gtest/gtest.h>

#include <zuv_client_pro/protocolUpdateOrderFilter.h>

#include "expansion.h"
#include "parsed.h"

using namespace service;

namespace {

using order = protocolUpdateOrder__UpdateOrderContent;

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

} // namespace

TEST(expansion, follows_the_order)
{
    const std::string data = "DB-10 DB-10-P1 DB-11 PACK-DB PACK-2024";
    const struct {
        const char *rule, *asked;
        std::string ids;
    } rows[] = {
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
    for (const auto &r : rows) {
        soap ctx;
        filter_work work{&ctx};
        const parsed<order> asked("protocolUpdateOrder:UpdateOrderContent", members(r.asked));
        EXPECT_EQ(ids(expand(work, the_catalogue(), *asked)), r.ids) << r.rule;
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
    order o;
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
    EXPECT_FALSE(names_updates(order()));
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

// expansion_test.cpp - what update orders come to.
#include <functional>
#include <string>

#include <gtest/gtest.h>

#include <zuv_client_pro/protocolUpdateOrderFilter.h>

#include "expansion.h"
#include "make.h"

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

} // namespace

TEST(Expansion, FollowsTheOrder)
{
    soap ctx;
    const auto yes = [&] { return make_value(&ctx, true); };
    struct row {
        const char *rule;
        std::function<void(order &)> ask;
        const char *ids;
    };
    using requisites = protocolUpdateOrder__SelectRequisites;
    using supersedes = protocolUpdateOrder__SelectSupersedes;
    using exclusions = protocolUpdateOrder__SelectImplicitExclusions;
    using groups = protocolUpdateOrder__ExpandGroups;
    const row rows[] = {
        {"identifiers, each once",
         [](order &o) {
             o.updateId = {"DRV-5", "FW-100", "DRV-5"};
         },
         "DRV-5 FW-100"},
        {"unknown ones are told once",
         [](order &o) {
             o.updateId = {"X", "FW-100", "X"};
         },
         "FW-100 ?X"},
        {"a qualifier of another",
         [&](order &o) {
             auto *const q = make<protocolUpdateOrder__UpdateIdQualified>(&ctx);
             q->updateId = make_text(&ctx, "FW-100");
             q->updateIdQualifier = make_text(&ctx, "OTHER");
             o.updateIdQualified.push_back(q);
         },
         "?FW-100"},
        {"a category", [](order &o) { o.updateScope = {"critical"}; }, "FW-120 DB-10-P1"},
        {"a collection", [](order &o) { o.updateScope = {"software"}; },
         "DB-10 DB-10-P1 DB-11 PACK-DB PACK-2024"},
        {"ancillaries",
         [&](order &o) {
             o.updateScope = {"tools"};
             o.includeAncillaries = yes();
         },
         "TOOLS-1"},
        {"what is left out implicitly", [](order &o) { o.updateScope = {"tape"}; }, ""},
        {"unless asked for",
         [&](order &o) {
             o.updateScope = {"tape"};
             o.includeImplicitExclusions = yes();
         },
         "TAPE-7"},
        {"by its kind",
         [&](order &o) {
             o.updateScope = {"tape"};
             o.includeImplicitExclusions = yes();
             o.selectImplicitExclusions = {exclusions::allPending};
         },
         "TAPE-7"},
        {"or by name", [](order &o) { o.updateId = {"TAPE-7"}; }, "TAPE-7"},
        {"for a subject",
         [&](order &o) {
             o.updateScope = {"all"};
             o.subject = make<protocol__Identity>(&ctx);
             o.subject->product = make_text(&ctx, "ZDB");
         },
         "DB-10 DB-10-P1 DB-11 PACK-DB PACK-2024"},
        {"requisites as indicated",
         [](order &o) {
             o.updateId = {"FW-120"};
             o.includeRequisites = true;
         },
         "FW-120 BIOS-20 DRV-5"},
        {"the last that supersede them",
         [&](order &o) {
             o.updateId = {"FW-120"};
             o.includeRequisites = true;
             o.selectRequisites = make_value(&ctx, requisites::lastSupersedingOnly);
         },
         "FW-120 BIOS-30 DRV-5"},
        {"superseding ones",
         [](order &o) {
             o.updateId = {"FW-100"};
             o.includeSupersedes = true;
         },
         "FW-100 FW-110 FW-120"},
        {"the first only",
         [&](order &o) {
             o.updateId = {"FW-100"};
             o.includeSupersedes = true;
             o.selectSupersedes = make_value(&ctx, supersedes::firstSupersedingOnly);
         },
         "FW-100 FW-110"},
        {"the last only, with what it requires",
         [&](order &o) {
             o.updateId = {"FW-100"};
             o.includeSupersedes = o.includeRequisites = true;
             o.selectSupersedes = make_value(&ctx, supersedes::lastSupersedingOnly);
         },
         "FW-100 FW-120 BIOS-20 DRV-5"},
        {"shared by several",
         [&](order &o) {
             o.updateId = {"FW-100", "FW-110", "BIOS-20"};
             o.includeSupersedes = true;
             o.selectSupersedes = make_value(&ctx, supersedes::sharedSupersedingOnly);
         },
         "FW-100 FW-110 BIOS-20 FW-120"},
        {"superseded ones",
         [&](order &o) {
             o.updateId = {"FW-120"};
             o.includeSupersedes = true;
             o.selectSupersedes = make_value(&ctx, supersedes::allSuperseded);
         },
         "FW-120 FW-110 FW-100"},
        {"patches and replacements",
         [&](order &o) {
             o.updateId = {"DB-10"};
             o.includePatches = o.includeConditionalReplacements = yes();
         },
         "DB-10 DB-10-P1 DB-11"},
        {"a group as it is", [](order &o) { o.updateId = {"PACK-2024"}; }, "PACK-2024"},
        {"a group's members",
         [&](order &o) {
             o.updateId = {"PACK-2024"};
             o.expandGroups = make_value(&ctx, groups::all);
         },
         "PACK-2024 FW-120 BIOS-30 PACK-DB DB-10 DB-10-P1"},
        {"those of nested groups",
         [&](order &o) {
             o.updateId = {"PACK-2024"};
             o.expandGroups = make_value(&ctx, groups::nestedGroupsOnly);
         },
         "PACK-2024 DB-10 DB-10-P1"},
    };
    for (const row &r : rows) {
        order o;
        r.ask(o);
        EXPECT_EQ(ids(expand(&ctx, the_catalogue(), o)), r.ids) << r.rule;
    }
}

TEST(Expansion, FiltersByTheUpdatesRole)
{
    soap ctx;
    std::string type = "driver";
    protocolUpdateOrderFilter__UpdateMetaDataTypeComparison drivers;
    drivers.type = &type;
    protocolUpdateOrderFilter__Filter filter;
    filter.expression = &drivers;
    order o;
    o.inclusionFilter.push_back(&filter);
    EXPECT_TRUE(names_updates(o));
    EXPECT_EQ(ids(expand(&ctx, the_catalogue(), o)), "DRV-5") << "a filter alone is taken over all updates";
    o.updateId = {"FW-120"};
    o.includeRequisites = true;
    EXPECT_EQ(ids(expand(&ctx, the_catalogue(), o)), "");
    filter.scope = {protocolUpdateOrderFilter__FilterScope::requisite};
    EXPECT_EQ(ids(expand(&ctx, the_catalogue(), o)), "FW-120 DRV-5");
    filter.scope = {protocolUpdateOrderFilter__FilterScope::nonrequisite};
    EXPECT_EQ(ids(expand(&ctx, the_catalogue(), o)), "");
    EXPECT_FALSE(names_updates(order()));
}

TEST(Catalogue, IsWhole)
{
    const catalogue &offered = the_catalogue();
    EXPECT_EQ(offered.all().size(), 13u);
    for (const update_record *update : offered.all()) {
        for (const auto *reference : update->requisite)
            EXPECT_NE(offered.find(*reference->updateId, *reference->updateIdQualifier), nullptr)
                << *update->updateId;
        for (const auto *reference : update->superseding)
            EXPECT_NE(offered.find(*reference->updateId, *reference->updateIdQualifier), nullptr)
                << *update->updateId;
        for (const protocol__Identity *subject : update->subject)
            EXPECT_TRUE(collection_is_within(*subject->productCollection, "all")) << *update->updateId;
        EXPECT_EQ(std::to_string(update_data(*update).size()), *update->size);
    }
}

// expansion.cpp - see expansion.h.
//
// The order of the steps: what the order itself names; groups; then patches, conditional replacements and
// superseding updates of that; and finally what all of these require, directly or not.
#include "expansion.h"

#include <algorithm>
#include <set>

#include "filter.h"
#include "make.h"

namespace service {

namespace {

using order = protocolUpdateOrder__UpdateOrderContent;
using scope = protocolUpdateOrderFilter__FilterScope;
using exclusion = protocolUpdateOrder__SelectImplicitExclusions;

// Which updates are selected for a related one; the members of all "select" enumerations, of which two lack
// the first.
enum class selection { as_indicated, all, all_superseding, last, first, shared, all_superseded };

template <class Code> selection selection_of(const Code *code, selection first_code)
{
    return code == nullptr ? selection::as_indicated
                           : static_cast<selection>(static_cast<int>(*code) + static_cast<int>(first_code));
}

bool is_true(const bool *member)
{
    return member != nullptr && *member;
}

bool holds(const updates &list, const update_record *update)
{
    return std::find(list.begin(), list.end(), update) != list.end();
}

using step = updates (catalogue::*)(const update_record &) const;

// All that a relation reaches from an update, nearest first, the update itself not included.
updates closure(const catalogue &offered, const update_record &start, step next)
{
    updates reached = {&start};
    for (std::size_t i = 0; i < reached.size(); ++i)
        for (const update_record *found : (offered.*next)(*reached[i]))
            if (!holds(reached, found))
                reached.push_back(found);
    reached.erase(reached.begin());
    return reached;
}

class expander {
public:
    expander(filter_work &work, const catalogue &offered, const order &o)
        : work_(work), offered_(offered), order_(o)
    {}

    expansion run()
    {
        add_named();
        add_scoped();
        expand_groups();
        const std::vector<chosen_update> bases = result_.chosen;
        if (is_true(order_.includePatches))
            relate(bases, &catalogue::patches, update_role::patch,
                   selection_of(order_.selectPatches, selection::as_indicated));
        if (is_true(order_.includeConditionalReplacements))
            relate(bases, &catalogue::replacements, update_role::replacement,
                   selection_of(order_.selectConditionalReplacements, selection::all));
        if (order_.includeSupersedes)
            add_supersedes(bases);
        if (order_.includeRequisites)
            add_requisites();
        return std::move(result_);
    }

private:
    // --- choosing ---

    static bool concerns(const protocolUpdateOrderFilter__Filter &filter, update_role role)
    {
        return filter.scope.empty() || std::any_of(filter.scope.begin(), filter.scope.end(), [role](scope s) {
                   switch (s) {
                   case scope::all:
                       return true;
                   case scope::base:
                       return role == update_role::base;
                   case scope::requisite:
                       return role == update_role::requisite;
                   case scope::nonrequisite:
                       return role != update_role::requisite;
                   case scope::supersede:
                       return role == update_role::supersede;
                   case scope::conditionalReplacement:
                       return role == update_role::replacement;
                   case scope::patch:
                       return role == update_role::patch;
                   }
                   return false;
               });
    }

    bool passes_filters(const update_record &update, update_role role) const
    {
        filter_facts facts = facts_of(work_, update);
        facts.attachments.push_back(&update_package());
        return std::all_of(order_.inclusionFilter.begin(), order_.inclusionFilter.end(),
                           [&](const auto *filter) {
                               if (filter == nullptr)
                                   return true;
                               work_.spend(filter->scope.size());
                               return !concerns(*filter, role) || filter_holds(*filter, facts);
                           });
    }

    void choose(const update_record *update, update_role role)
    {
        if (seen_.insert(update).second && passes_filters(*update, role))
            result_.chosen.push_back({update, role});
    }

    // --- what the order names ---

    void add_id(const std::string &id, const std::string &qualifier)
    {
        if (const update_record *const found = offered_.find(id, qualifier))
            choose(found, update_role::base);
        else if (unknown_.insert(id + '\n' + qualifier).second)
            result_.unknown.push_back({id, qualifier});
    }

    void add_named()
    {
        for (const std::string &id : order_.updateId)
            add_id(id, {});
        for (const auto *qualified : order_.updateIdQualified)
            if (qualified != nullptr)
                add_id(text_of(qualified->updateId), text_of(qualified->updateIdQualifier));
    }

    // A scope is the word "all", a category, a type or a product collection.
    static bool in_scope(const update_record &update, const std::string &name)
    {
        const auto in_collection = [&](const protocol__Identity *subject) {
            return collection_is_within(text_of(subject->productCollection), name);
        };
        return name == "all" || text_of(update.type) == name ||
               std::find(update.category.begin(), update.category.end(), name) != update.category.end() ||
               std::any_of(update.subject.begin(), update.subject.end(), in_collection);
    }

    // An order for a subject takes what is made for its product or its collection.
    bool suits_subject(const update_record &update) const
    {
        if (order_.subject == nullptr)
            return true;
        const std::string &product = text_of(order_.subject->product);
        const std::string &collection = text_of(order_.subject->productCollection);
        return std::any_of(update.subject.begin(), update.subject.end(),
                           [&](const protocol__Identity *subject) {
                               return (product.empty() || text_of(subject->product) == product) &&
                                      (collection.empty() ||
                                       collection_is_within(text_of(subject->productCollection), collection));
                           });
    }

    bool wanted_in_spite(const update_record &update) const
    {
        if (!is_true(order_.includeImplicitExclusions))
            return false;
        const auto &kinds = order_.selectImplicitExclusions;
        return kinds.empty() || std::any_of(kinds.begin(), kinds.end(), [&](exclusion kind) {
                   switch (kind) {
                   case exclusion::all:
                       return true;
                   case exclusion::allBases:
                       return is_true(update.base);
                   case exclusion::allRestrictions:
                       return !update.restriction.empty();
                   case exclusion::allPending:
                       return text_of(update.status) == "pending";
                   }
                   return false;
               });
    }

    void add_scoped()
    {
        std::vector<std::string> scopes = order_.updateScope;
        const bool by_filter_alone = order_.updateId.empty() && order_.updateIdQualified.empty();
        if (scopes.empty() && by_filter_alone)
            scopes.emplace_back("all");
        const std::set<std::string> distinct(scopes.begin(), scopes.end());
        for (const update_record *update : offered_.all()) {
            const bool left_out = (is_true(update->implicitExclusion) && !wanted_in_spite(*update)) ||
                                  (is_true(update->ancillary) && !is_true(order_.includeAncillaries));
            if (!left_out && suits_subject(*update) &&
                std::any_of(distinct.begin(), distinct.end(),
                            [&](const auto &name) { return in_scope(*update, name); }))
                choose(update, update_role::base);
        }
    }

    void expand_groups()
    {
        if (order_.expandGroups == nullptr || *order_.expandGroups == protocolUpdateOrder__ExpandGroups::none)
            return;
        const bool nested_only = *order_.expandGroups == protocolUpdateOrder__ExpandGroups::nestedGroupsOnly;
        const std::vector<chosen_update> groups = result_.chosen;
        for (const chosen_update &group : groups) {
            const updates direct = offered_.contained(*group.update);
            for (const update_record *member : closure(offered_, *group.update, &catalogue::contained))
                if (!nested_only || !holds(direct, member))
                    choose(member, update_role::base);
        }
    }

    // --- what is added to the updates asked for ---

    // Those selected for `update`; itself, if there is no other.
    updates stand_ins(const update_record *update, selection how, const updates &peers) const
    {
        updates found;
        switch (how) {
        case selection::as_indicated:
            break;
        case selection::all: {
            found = closure(offered_, *update, &catalogue::superseding);
            const updates older = closure(offered_, *update, &catalogue::superseded);
            found.insert(found.end(), older.begin(), older.end());
            found.push_back(update);
            break;
        }
        case selection::all_superseding:
            found = closure(offered_, *update, &catalogue::superseding);
            break;
        case selection::last:
            for (const update_record *newer : closure(offered_, *update, &catalogue::superseding))
                if (offered_.superseding(*newer).empty())
                    found.push_back(newer);
            break;
        case selection::first:
            found = offered_.superseding(*update);
            break;
        case selection::shared:
            for (const update_record *newer : closure(offered_, *update, &catalogue::superseding))
                if (std::count_if(peers.begin(), peers.end(), [&](const update_record *peer) {
                        return holds(closure(offered_, *peer, &catalogue::superseding), newer);
                    }) > 1)
                    found.push_back(newer);
            break;
        case selection::all_superseded:
            found = closure(offered_, *update, &catalogue::superseded);
            break;
        }
        if (found.empty())
            found.push_back(update);
        return found;
    }

    void choose_stand_ins(const updates &related, update_role role, selection how)
    {
        for (const update_record *update : related)
            for (const update_record *taken : stand_ins(update, how, related))
                choose(taken, role);
    }

    void relate(const std::vector<chosen_update> &bases, step relation, update_role role, selection how)
    {
        for (const chosen_update &base : bases)
            choose_stand_ins((offered_.*relation)(*base.update), role, how);
    }

    void add_supersedes(const std::vector<chosen_update> &bases)
    {
        selection how = selection_of(order_.selectSupersedes, selection::all);
        if (order_.selectSupersedes == nullptr)
            how = selection::all_superseding;
        updates related;
        for (const chosen_update &base : bases)
            related.push_back(base.update);
        choose_stand_ins(related, update_role::supersede, how);
    }

    void add_requisites()
    {
        const selection how = selection_of(order_.selectRequisites, selection::as_indicated);
        // NOLINTNEXTLINE(modernize-loop-convert): the list grows in the loop
        for (std::size_t i = 0; i < result_.chosen.size(); ++i)
            choose_stand_ins(offered_.required(*result_.chosen[i].update), update_role::requisite, how);
    }

    filter_work &work_;
    const catalogue &offered_;
    const order &order_;
    expansion result_;
    std::set<const update_record *> seen_;
    std::set<std::string> unknown_;
};

} // namespace

bool names_updates(const order &o)
{
    return !o.updateId.empty() || !o.updateIdQualified.empty() || !o.updateScope.empty() ||
           !o.inclusionFilter.empty();
}

expansion expand(filter_work &work, const catalogue &offered, const order &o)
{
    return expander(work, offered, o).run();
}

const protocol__Attachment &update_package()
{
    struct package {
        protocol__Descriptor descriptor;
        protocol__DataType type;
        protocol__Attachment attachment;
        package()
        {
            descriptor.value = "update.package";
            type.value = "application/octet-stream";
            attachment.descriptor = &descriptor;
            attachment.type = &type;
        }
    };
    static const package only;
    return only.attachment;
}

} // namespace service

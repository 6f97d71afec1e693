// every_class.h - what the tests over all classes have in common: the walk, and messages of objects.
#pragma once

#include "support/memory_wire.h"
#include "support/random_objects.h"
#include "support/testing.h"

namespace random_objects {

// Uses each class of the contract, by its id and entry, and lets go of what that has left in the context.
template <class Use> void for_each_class(memory_wire &ctx, Use use)
{
    int classes = 0;
    for (int id = 1; id <= binding::TYPE_ID_MAX; ++id) {
        const binding::type_entry *const entry = binding::type_entry_of(id);
        if (!entry || entry->kind != binding::type_kind::object || id == SOAP_TYPE_xsd__base64Binary)
            continue;
        ++classes;
        ASSERT_NE(nullptr, row_of(id)) << entry->xml_name;
        use(id, *entry);
        soap_discard_objects(&ctx, nullptr);
        soap_discard_all(&ctx);
    }
    EXPECT_EQ(407, classes);
}

// The message that `put` writes after `mark` has seen its objects; the counting pass before it has the same length.
template <class Mark, class Put> std::string message_of(memory_wire &ctx, Mark mark, Put put)
{
    ctx.sends.clear();
    soap_reset_call(&ctx);
    mark();
    EXPECT_EQ(0, soap_count_begin(&ctx));
    ctx.mode |= MODE_COUNTING;
    EXPECT_EQ(0, put());
    const std::uint64_t counted = ctx.message_count;
    EXPECT_EQ(0, soap_count_end(&ctx) || soap_send_begin(&ctx) || put() || soap_send_finish(&ctx));
    EXPECT_EQ(counted, ctx.sent().size());
    return ctx.sent();
}

} // namespace random_objects

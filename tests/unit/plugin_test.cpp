// plugin_test.cpp - the registry of plug-ins: finding, copying, deleting.
#include "support/testing.h"

namespace {

std::vector<std::string> deleted; // data of deleted plug-ins, in order

void note_deletion(soap *, soap_plugin_record *record)
{
    deleted.push_back(static_cast<const char *>(record->data));
}

int accept_copy(soap *, soap_plugin_record *target, soap_plugin_record *)
{
    target->data = const_cast<char *>("copied");
    return 0;
}

int refuse_copy(soap *, soap_plugin_record *, soap_plugin_record *)
{
    return SOAP_PLUGIN_ERROR;
}

struct wanted {
    const char *id;
    const char *data;
    int (*copy_hook)(soap *, soap_plugin_record *, soap_plugin_record *);
    bool deletes = true;
    int result = 0;
};

int create(soap *, soap_plugin_record *record, void *argument)
{
    const auto *want = static_cast<const wanted *>(argument);
    EXPECT_EQ(record->id, nullptr);
    EXPECT_EQ(record->data, nullptr);
    record->id = want->id;
    record->data = const_cast<char *>(want->data);
    record->copy_hook = want->copy_hook;
    record->delete_hook = want->deletes ? note_deletion : nullptr;
    return want->result;
}

int add(soap *ctx, wanted want)
{
    return soap_register_plugin_arg(ctx, create, &want);
}

class plugin : public testing::Test {
protected:
    void SetUp() override { deleted.clear(); }
};

TEST_F(plugin, the_newest_of_an_id_is_found_by_content)
{
    soap ctx;
    EXPECT_EQ(add(&ctx, {"id", "old", nullptr}), 0);
    EXPECT_EQ(add(&ctx, {"id", "new", nullptr}), 0);
    EXPECT_EQ(add(&ctx, {"other", "x", nullptr}), 0);
    const std::string same_content = "id";
    EXPECT_STREQ(static_cast<char *>(soap_plugin_lookup(&ctx, same_content.c_str())), "new");
    EXPECT_EQ(soap_plugin_lookup(&ctx, "none"), nullptr);
    ctx.on_find_plugin = [](soap *, const char *) -> void * { return const_cast<char *>("hooked"); };
    EXPECT_STREQ(static_cast<char *>(soap_plugin_lookup(&ctx, "none")), "hooked");
    EXPECT_STREQ(static_cast<char *>(soap_plugin_find(&ctx, "other")), "x");
}

TEST_F(plugin, one_that_fails_or_cannot_be_deleted_is_not_kept_others_are_deleted_newest_first)
{
    testing::internal::CaptureStderr();
    {
        soap ctx;
        EXPECT_EQ(add(&ctx, {"a", "a", nullptr, true, 77}), 77);
        EXPECT_EQ(add(&ctx, {"b", "b", nullptr, false}), 0);
        EXPECT_EQ(ctx.plugin_list, nullptr);
        add(&ctx, {"c", "first", nullptr});
        add(&ctx, {"d", "second", nullptr});
    }
    EXPECT_EQ(testing::internal::GetCapturedStderr(), "");
    EXPECT_EQ(deleted, (std::vector<std::string>{"second", "first"}));
}

TEST_F(plugin, a_copy_reverses_them_and_deletes_only_what_it_copied)
{
    soap source;
    add(&source, {"shared", "shared", nullptr});
    add(&source, {"own", "own", accept_copy});
    {
        soap copy(source);
        ASSERT_TRUE(copy.plugin_list != nullptr && copy.plugin_list->next != nullptr);
        EXPECT_STREQ(copy.plugin_list->id, "shared");
        EXPECT_STREQ(copy.plugin_list->next->id, "own");
        EXPECT_STREQ(static_cast<char *>(soap_plugin_lookup(&copy, "own")), "copied");
        EXPECT_STREQ(static_cast<char *>(soap_plugin_lookup(&source, "own")), "own");
    }
    EXPECT_EQ(deleted, std::vector<std::string>{"copied"});
}

TEST_F(plugin, a_refusal_fails_the_copy_without_a_leak)
{
    testing::internal::CaptureStderr();
    {
        soap source;
        add(&source, {"refuses", "r", refuse_copy});
        add(&source, {"copies", "c", accept_copy});
        soap *const made = soap_context_copy(&source);
        EXPECT_EQ(made, nullptr);
        if (made != nullptr)
            soap_context_free(made);
        EXPECT_EQ(deleted, std::vector<std::string>{"copied"}) << "what was built before the refusal";
        soap target;
        soap_engine_done(&target);
        EXPECT_EQ(soap_context_copy(&target, &source), nullptr);
        EXPECT_EQ(target.error, SOAP_PLUGIN_ERROR);
        soap_engine_done(&target);
    }
    EXPECT_EQ(testing::internal::GetCapturedStderr(), "");
    EXPECT_EQ(deleted, (std::vector<std::string>{"copied", "copied", "c", "r"}));
}

TEST_F(plugin, registration_without_memory_gives_its_error)
{
    soap ctx;
    const failing_malloc::scope armed(1, failing_malloc::refuse::all_from);
    EXPECT_EQ(add(&ctx, {"a", "a", nullptr}), SOAP_OUT_OF_MEMORY);
    EXPECT_EQ(ctx.error, SOAP_OUT_OF_MEMORY);
}

} // namespace

// memory_test.cpp - tracked allocation, managed blocks, instances, block stacks, growing text.
#include "support/testing.h"

namespace {

std::string reported(const std::function<void()> &call)
{
    testing::internal::CaptureStderr();
    call();
    return testing::internal::GetCapturedStderr();
}

std::string text_of(const void *address)
{
    char text[32];
    std::snprintf(text, sizeof text, "%p", address);
    return text;
}

const std::string CORRUPTION = "Data corruption in dynamic allocation (see logs)\n";

// Order in which the hook below was called, by type id.
std::vector<int> destroyed;

int note_destruction(soap_instance *instance)
{
    destroyed.push_back(instance->type_id);
    return instance->type_id < 0 ? 1 : 0; // negative: refuses
}

class memory : public testing::Test {
protected:
    void SetUp() override { destroyed.clear(); }

    soap ctx;
};

TEST_F(memory, names_frees_of_blocks_that_are_not_live_and_leaks)
{
    char outside = 0;
    auto *other = new soap;
    void *block = tracked_malloc(other, "from.cpp", 7, 40);
    void *leaked = tracked_malloc(other, "origin.cpp", 123, 16);
    const auto free_in = [&](int line, void *what) { tracked_free(other, "to.cpp", line, what); };
    EXPECT_EQ(reported([&] { free_in(8, block), free_in(8, nullptr); }), "");
    EXPECT_EQ(reported([&] { free_in(9, block); }),
              "to.cpp(9): free(" + text_of(block) + ") double free of pointer malloced at from.cpp(7)\n");
    EXPECT_EQ(reported([&] { free_in(10, &outside); }),
              "to.cpp(10): free(" + text_of(&outside) + ") pointer not malloced\n");
    EXPECT_EQ(reported([&] { delete other; }),
              "origin.cpp(123): malloc() = " + text_of(leaked) +
                  " not freed (memory leak or forgot to call soap_end()?)\n");
    std::free(leaked);
}

TEST_F(memory, remembers_many_blocks_and_a_bounded_number_of_freed_ones)
{
    std::vector<void *> blocks(100000);
    for (void *&block : blocks)
        block = tracked_malloc(&ctx, "a", 1, 24);
    EXPECT_GE(ctx.track_chain_mask + 1, blocks.size()) << "the table grows with its load";
    const std::string all = reported([&] {
        for (void *block : blocks)
            tracked_free(&ctx, "b", 2, block);
        for (void *block : {blocks.front(), blocks.back()})
            tracked_free(&ctx, "c", 3, block);
    });
    EXPECT_EQ(all, "c(3): free(" + text_of(blocks.front()) + ") pointer not malloced\n" + "c(3): free(" +
                       text_of(blocks.back()) + ") double free of pointer malloced at a(1)\n");
}

TEST_F(memory, an_empty_block_is_shared_and_the_hosts_allocator_takes_the_place_of_others)
{
    static char area[16];
    ctx.on_malloc = [](soap *, std::size_t size) -> void * { return size <= sizeof area ? area : nullptr; };
    EXPECT_EQ(soap_block_alloc(&ctx, 16), area);
    EXPECT_EQ(soap_block_alloc(&ctx, 17), nullptr);
    ctx.allocated = 0;
    auto *empty = static_cast<char *>(soap_block_alloc(&ctx, 0));
    EXPECT_STREQ(empty, "");
    EXPECT_EQ(soap_block_alloc(&ctx, 0), empty);
    EXPECT_EQ(ctx.allocation_list, nullptr);
    EXPECT_EQ(ctx.allocated, 0);
    soap_block_free(&ctx, empty);
    std::free(soap_block_alloc(nullptr, 8));
    ctx.on_malloc = nullptr;
    for (std::size_t size = 1; size <= 70; ++size)
        EXPECT_EQ(reinterpret_cast<std::uintptr_t>(soap_block_alloc(&ctx, size)) % 8, 0U) << size;
    EXPECT_EQ(soap_string_dup(&ctx, nullptr), nullptr);
    EXPECT_EQ(soap_string_dup_n(&ctx, nullptr, 3), nullptr);
    EXPECT_EQ(soap_wide_string_dup(&ctx, nullptr), nullptr);
    EXPECT_EQ(std::u32string(soap_wide_string_dup(&ctx, U"\U0001F600x")), U"\U0001F600x");
}

TEST_F(memory, one_byte_into_the_padding_is_harmless_one_past_it_is_reported)
{
    const auto free_in = [](soap *owner, void *block) {
        return reported([&] { soap_block_free(owner, block); });
    };
    static_cast<char *>(soap_block_alloc(&ctx, 3))[5] = 'x'; // spans 8: three bytes of padding
    EXPECT_EQ(free_in(&ctx, nullptr), "");
    EXPECT_EQ(ctx.error, 0);

    soap target;
    void *older = soap_block_alloc(&ctx, 8);
    auto *damaged = static_cast<char *>(soap_block_alloc(&ctx, 6));
    soap_block_alloc(&ctx, 8);
    const char canary = std::exchange(damaged[6], 'x');
    EXPECT_EQ(free_in(&ctx, older), CORRUPTION) << "a search passes the damaged block";
    EXPECT_EQ(reported([&] { soap_blocks_move(&ctx, &target); }), CORRUPTION);
    EXPECT_EQ(target.allocation_list, nullptr);
    ctx.error = 0;
    EXPECT_EQ(free_in(&ctx, nullptr), CORRUPTION);
    EXPECT_EQ(ctx.error, SOAP_CORRUPTION);
    EXPECT_NE(ctx.allocation_list, nullptr) << "the damaged block and the older ones stay";
    damaged[6] = canary;
}

TEST_F(memory, frees_one_block_or_one_instance_by_address_and_then_all_with_the_fields_that_live_there)
{
    void *first = soap_block_alloc(&ctx, 8);
    ctx.action = ctx.auth_user = ctx.mime.boundary = soap_string_dup(&ctx, "a");
    ctx.header = static_cast<SOAP_ENV__Header *>(soap_block_alloc(&ctx, 8));
    ctx.fault = static_cast<SOAP_ENV__Fault *>(soap_block_alloc(&ctx, 8));
    ctx.output_mode = MODE_MIME | MODE_CHUNKED;
    int object = 0;
    soap_instance_register(&ctx, &object, 4, -1, note_destruction);
    soap_block_free(&ctx, first);
    EXPECT_THAT(reported([&] { tracked_free(&ctx, "c", 1, first); }), HasSubstr("double free"));
    EXPECT_TRUE(destroyed.empty());
    soap_block_free(&ctx, &object);
    EXPECT_EQ(destroyed, std::vector<int>{4});
    EXPECT_EQ(ctx.instance_list, nullptr);
    EXPECT_STREQ(ctx.action, "a");
    const std::int64_t held = ctx.memory_held;
    soap_block_free(&ctx, nullptr);
    EXPECT_LT(ctx.memory_held, held) << "blocks that wait are no message's";
    EXPECT_TRUE(!ctx.action && !ctx.auth_user && !ctx.mime.boundary && !ctx.header && !ctx.fault);
    EXPECT_EQ(ctx.output_mode, MODE_CHUNKED);
    EXPECT_EQ(ctx.allocation_list, nullptr);
}

TEST_F(memory, destroys_instances_newest_first_and_names_refusals)
{
    int objects[3];
    soap_instance_register(&ctx, &objects[0], 1, -1, note_destruction);
    soap_instance_register(&ctx, &objects[1], -2, -1, note_destruction);
    soap_instance_register(&ctx, &objects[2], 3, 4, note_destruction);
    EXPECT_EQ(ctx.instance_list->array_size, 4);
    SOAP_ENV__Header header;
    soap_instance_register(&ctx, &header, 9, -1, [](soap_instance *) { return 0; });
    ctx.header = &header;
    ctx.fault = static_cast<SOAP_ENV__Fault *>(soap_block_alloc(&ctx, 8));
    soap_discard_objects(&ctx, &header);
    EXPECT_TRUE(ctx.header == nullptr && ctx.fault != nullptr) << "what is gone alone is forgotten alone";
    EXPECT_EQ(reported([&] { soap_discard_objects(&ctx, nullptr); }),
              "new(object type = -2) = " + text_of(&objects[1]) + " not freed: deletion callback failed\n");
    EXPECT_EQ(destroyed, (std::vector<int>{3, -2, 1}));
    EXPECT_EQ(ctx.fault, nullptr);
}

TEST_F(memory, what_is_taken_out_of_management_is_the_callers)
{
    int object = 0;
    char *text = soap_string_dup(&ctx, "kept");
    soap_instance_register(&ctx, &object, 1, -1, note_destruction);
    EXPECT_EQ(soap_block_unlink(&ctx, text), 0);
    EXPECT_EQ(soap_block_unlink(&ctx, &object), 0);
    EXPECT_EQ(soap_block_unlink(&ctx, text), -1);
    EXPECT_EQ(soap_block_unlink(&ctx, nullptr), -1);
    EXPECT_EQ(soap_block_unlink(nullptr, text), -1);
    EXPECT_EQ(reported([&] {
                  soap_discard_objects(&ctx, nullptr);
                  soap_discard_all(&ctx);
                  soap_engine_done(&ctx);
              }),
              "");
    EXPECT_TRUE(destroyed.empty());
    EXPECT_STREQ(text, "kept");
    std::free(text);
}

TEST_F(memory, blocks_and_instances_move_to_another_context)
{
    auto *source = new soap;
    char *own = soap_string_dup(&ctx, "own");
    char *moved = soap_string_dup(source, "moved");
    soap_instance_register(&ctx, own, 1, -1, note_destruction);
    soap_instance_register(source, moved, 2, -1, note_destruction);
    soap_blocks_move(source, &ctx);
    EXPECT_EQ(reported([&] { delete source; }), "");
    EXPECT_STREQ(moved, "moved");
    EXPECT_TRUE(destroyed.empty());
    soap_discard_objects(&ctx, nullptr);
    EXPECT_EQ(destroyed, (std::vector<int>{1, 2})) << "moved instances come after the target's own";
    EXPECT_EQ(reported([&] { soap_block_free(&ctx, moved); }), "");
    EXPECT_NE(ctx.allocation_list, nullptr) << "the target keeps its own";
    EXPECT_EQ(reported([&] { soap_block_free(&ctx, own); }), "");
    EXPECT_EQ(ctx.allocation_list, nullptr);
}

void append_block(soap *ctx, const char *text)
{
    std::memcpy(soap_block_stack_grow(ctx, nullptr, std::strlen(text)), text, std::strlen(text));
}

TEST_F(memory, a_block_stack_gathers_in_order_and_is_read_oldest_first)
{
    EXPECT_EQ(soap_block_stack_grow(&ctx, nullptr, 8), nullptr) << "there is no stack";
    EXPECT_EQ(soap_block_stack_first(&ctx, nullptr), nullptr);
    EXPECT_EQ(soap_block_stack_next(&ctx, nullptr), nullptr);
    EXPECT_EQ(soap_block_stack_trim(&ctx, nullptr, 0), 0u);
    soap_block_stack_drop(&ctx, nullptr);
    soap_block_stack *lower = soap_block_stack_push(&ctx);
    append_block(&ctx, "below");
    soap_block_stack_push(&ctx);
    append_block(&ctx, "one");
    append_block(&ctx, "fourteen");
    EXPECT_EQ(soap_block_stack_size(&ctx, nullptr), 8u);
    EXPECT_EQ(soap_block_stack_trim(&ctx, nullptr, 4), 7u);
    auto *text = static_cast<char *>(soap_block_stack_save(&ctx, nullptr, nullptr, 0));
    EXPECT_EQ(std::string(text, 7), "onefour");
    EXPECT_EQ(ctx.block_stack, lower);

    soap_block_stack_push(&ctx);
    append_block(&ctx, "first");
    append_block(&ctx, "2nd");
    char target[5];
    EXPECT_EQ(soap_block_stack_save(&ctx, lower, target, 0), target);
    EXPECT_EQ(std::string(target, 5), "below") << "a stack is saved wherever it is";
    EXPECT_EQ(std::string(soap_block_stack_first(&ctx, nullptr), 5), "first");
    EXPECT_EQ(std::string(soap_block_stack_next(&ctx, nullptr), 3), "2nd");
    EXPECT_EQ(ctx.block_stack->total_size, 3u);
    EXPECT_EQ(soap_block_stack_next(&ctx, nullptr), nullptr);
    EXPECT_EQ(soap_block_stack_next(&ctx, nullptr), nullptr);
    soap_block_stack_drop(&ctx, nullptr);
    EXPECT_EQ(ctx.block_stack, nullptr);
}

TEST_F(memory, growing_text_keeps_what_it_has_and_doubles)
{
    const std::string text(200, 'a'), more(1000, 'b');
    EXPECT_EQ(soap_text_buffer_put(&ctx, text.data(), text.size()), 0);
    EXPECT_EQ(soap_text_buffer_put(&ctx, more.data(), more.size()), 0);
    EXPECT_EQ(ctx.label_size, 2048u);
    EXPECT_EQ(std::string(ctx.label_buffer, ctx.label_index), text + more);
    EXPECT_EQ(soap_text_buffer_reset_put(&ctx, "c", 1), 0);
    EXPECT_EQ(soap_text_buffer_reserve(&ctx, 2048), 0);
    EXPECT_EQ(ctx.label_size, 4096u);
    EXPECT_EQ(std::string(ctx.label_buffer, ctx.label_index), "c");
}

TEST_F(memory, sizes_beyond_the_address_space_are_out_of_memory)
{
    soap_block_stack_push(&ctx);
    append_block(&ctx, "x");
    soap_text_buffer_put(&ctx, "x", 1);
    const std::function<bool()> cases[] = {
        [this] { return soap_block_alloc(&ctx, SIZE_MAX) == nullptr; },
        [this] { return soap_block_alloc(&ctx, SIZE_MAX - 1) == nullptr; },
        [this] { return soap_block_alloc(&ctx, SIZE_MAX - 40) == nullptr; },
        [this] { return soap_string_dup_n(&ctx, "", SIZE_MAX) == nullptr; },
        [this] { return soap_block_stack_grow(&ctx, nullptr, SIZE_MAX - sizeof(soap_block)) == nullptr; },
        [this] { return soap_text_buffer_reserve(&ctx, SIZE_MAX) == SOAP_OUT_OF_MEMORY; },
    };
    for (const auto &is_refused : cases) {
        ctx.error = 0;
        EXPECT_TRUE(is_refused());
        EXPECT_EQ(ctx.error, SOAP_OUT_OF_MEMORY);
    }
}

TEST(memory_exhausted, texts_and_gathered_blocks_give_an_error_and_leave_nothing)
{
    int (*const runs[])(soap & ctx) = {
        [](soap &ctx) { return soap_wide_string_dup(&ctx, U"abc") == nullptr ? ctx.error : 0; },
        [](soap &ctx) { return soap_text_buffer_put(&ctx, "abc", 3); },
        [](soap &ctx) {
            const bool saved = soap_block_stack_push(&ctx) && soap_block_stack_grow(&ctx, nullptr, 8) &&
                               soap_block_stack_save(&ctx, nullptr, nullptr, 0);
            return saved ? 0 : ctx.error;
        }};
    for (const auto run : runs)
        EXPECT_EQ(reported([run] {
                      expect_out_of_memory_at_each_allocation(
                          1, [] { return std::make_unique<soap>(); }, run);
                  }),
                  "");
}

TEST(memory_exhausted, a_move_fails_whole_or_not_at_all)
{
    soap source, target;
    for (int i = 0; i < 600; ++i) {
        soap_block_alloc(&source, 8);
        soap_instance_register(&source, &source, i + 1, -1, note_destruction);
    }
    const auto move = [&] { soap_blocks_move(&source, &target); };
    const auto check = [&](bool refused) {
        EXPECT_EQ(source.allocation_list == nullptr, !refused);
        EXPECT_EQ(target.allocation_list == nullptr, refused);
        EXPECT_EQ(source.error, refused ? SOAP_OUT_OF_MEMORY : 0);
        source.error = 0;
    };
    EXPECT_GT(failing_malloc::at_each_allocation(failing_malloc::refuse::one, move, check), 1u);
}

} // namespace

// identity_test.cpp - the pointer table and the forms of writing, the id table and late resolution.
#include <array>

#include "identity/identity.h"
#include "support/memory_wire.h"
#include "support/testing.h"

namespace {

void expect_empty_table(const soap &ctx)
{
    for (const soap_pointer_record *head : ctx.pointer_table)
        ASSERT_EQ(head, nullptr);
}

TEST(pointer_table, finds_objects_by_address_and_type_at_every_size)
{
    soap ctx;
    std::vector<std::array<char, 64>> objects(30000);
    const int count = static_cast<int>(objects.size());
    for (int message = 0; message < 2; message++) {
        for (int i = 0; i < count; i++)
            ASSERT_EQ(soap_pointer_add(&ctx, objects.data() + i, nullptr, 0, 20, nullptr), i + 1);
        for (int i = 0; i < count; i++)
            ASSERT_EQ(soap_pointer_find(&ctx, objects.data() + i, 20, nullptr), i + 1);
        EXPECT_EQ(soap_pointer_find(&ctx, &objects[7], 21, nullptr), 0);
        soap_pointer_table_reset(&ctx);
        ctx.next_id = 0;
        EXPECT_EQ(soap_pointer_find(&ctx, &objects[7], 20, nullptr), 0);
    }
    EXPECT_EQ(ctx.pointer_chains, ctx.pointer_table);
    EXPECT_EQ(ctx.pointer_count, 0U) << "else tables grow with the number of messages";
    expect_empty_table(ctx);
}

TEST(pointer_table, finds_arrays_by_content_and_sizes_wherever_their_holders_are)
{
    struct holder {
        const char *content;
        std::int32_t sizes[2];
    };
    soap ctx;
    ctx.mode = SOAP_XML_GRAPH;
    const char *text = "content";
    holder two_by_three = {text, {2, 3}}, alike = {text, {2, 3}}, other_size = {text, {2, 4}},
           stranger = {text + 1, {2, 3}}, empty = {nullptr, {0, 0}};
    const auto mark = [&ctx](holder &h) { return soap_array_mark_pointer(&ctx, &h, &h, 2, 10); };
    const auto id_of = [&ctx](holder &h, int id) {
        return soap_array_element_id(&ctx, id, h.content, &h, 2, 10);
    };
    EXPECT_EQ(mark(two_by_three), 0);
    EXPECT_EQ(mark(alike), 2);
    EXPECT_EQ(mark(other_size), 0);
    EXPECT_EQ(mark(empty), 1);
    EXPECT_EQ(soap_array_pointer_find(&ctx, &alike, &alike, 2, 10, nullptr), 1);
    EXPECT_EQ(id_of(alike, -1), 1);
    EXPECT_EQ(id_of(other_size, -1), 2);
    EXPECT_EQ(id_of(other_size, 7), 7) << "the id that is asked for";
    EXPECT_EQ(id_of(stranger, -1), 0);
    EXPECT_EQ(id_of(two_by_three, 0), 0);
    // The holders may be gone before the table: a reset must not look at them.
    two_by_three.content = reinterpret_cast<const char *>(8);
    soap_pointer_table_reset(&ctx);
    expect_empty_table(ctx);
}

TEST(mark_pass, enters_an_object_once_and_then_knows_it_is_shared)
{
    soap ctx;
    int shared = 0, single = 0, unseen = 0;
    const auto mark = [&ctx](const int *object, int type) { return soap_mark_pointer(&ctx, object, type); };
    EXPECT_EQ(mark(&shared, 30), 0);
    EXPECT_EQ(mark(&single, 30), 0);
    EXPECT_EQ(mark(&shared, 30), 2);
    EXPECT_EQ(mark(&shared, 30), 2);
    EXPECT_EQ(mark(&shared, 31), 0) << "another type at the same address is another object";
    EXPECT_EQ(mark(nullptr, 30), 1);
    soap_pointer_record *record = nullptr;
    EXPECT_EQ(soap_pointer_find(&ctx, &shared, 30, &record), 1);
    EXPECT_EQ(record->count_mark, 2);
    EXPECT_EQ(record->send_mark, 2);
    ctx.mode = SOAP_XML_TREE;
    EXPECT_EQ(mark(&unseen, 30), 1);
    EXPECT_EQ(soap_pointer_find(&ctx, &unseen, 30, nullptr), 0);
    soap poor;
    soap_pointer_table_reset(&poor);
    int unmarked = 0;
    {
        const failing_malloc::scope armed(1);
        unmarked = soap_mark_pointer(&poor, &shared, 30);
    }
    EXPECT_NE(unmarked, 0) << "a walk without a record would not end on a cycle";
    EXPECT_EQ(poor.error, SOAP_OUT_OF_MEMORY);
    EXPECT_EQ(soap_mark_pointer(&poor, &single, 30), 0);
}

enum style { LITERAL, ENCODED };
enum pass { COUNT, SEND };

class forms : public testing::Test {
protected:
    memory_wire ctx;
    int object = 0;
    soap_pointer_record *record = nullptr;

    void begin(std::int16_t version, style form, std::uint32_t mode, std::int16_t part, pass phase,
               std::int8_t mark)
    {
        soap_call_scratch_free(&ctx);
        ctx.next_id = 0;
        ctx.error = 0;
        ctx.soap_version = version;
        ctx.encoding_style = form == ENCODED ? "" : nullptr;
        ctx.mode = mode | (phase == COUNT ? MODE_COUNTING : 0);
        ctx.message_part = part;
        ctx.namespace_state = 1;
        ctx.encoding_flag = 0;
        ctx.nesting_level = 0;
        ctx.sends.clear();
        soap_pointer_add(&ctx, &object, nullptr, 0, 20, &record);
        record->count_mark = phase == COUNT ? mark : -1;
        record->send_mark = phase == SEND ? mark : -1;
    }
    void expect_mark(pass phase, int mark) const
    {
        EXPECT_EQ(phase == COUNT ? record->count_mark : record->send_mark, mark);
        EXPECT_EQ(phase == COUNT ? record->send_mark : record->count_mark, -1);
    }
    int ref(int id, const void *of) { return soap_element_ref(&ctx, "a:b", id, of, nullptr, 0, "", 20); }
    int multiref() { return soap_multiref_begin(&ctx, &object, nullptr, 0, "a:b", 20); }
};

struct form_case {
    const char *rule;
    std::int16_t version;
    style form;
    std::uint32_t mode;
    std::int16_t part;
    std::int8_t mark;
    int id;     // asked for
    int result; // of soap_element_id
    int mark_after;
    int reference; // result of soap_element_ref; -1: a reference is written
    int ref_mark_after;
};

const form_case FORMS[] = {
    {"tree: the id as given", 1, ENCODED, SOAP_XML_TREE, PART_BODY, 2, -1, -1, 2, 0, 2},
    {"literal 1.1: none", 1, LITERAL, 0, PART_BODY, 2, -1, 0, 2, 0, 2},
    {"encoded 1.1, met once", 1, ENCODED, 0, PART_BODY, 0, -1, -1, 2, 0, 0},
    {"encoded 1.1, shared: a reference from everywhere", 1, ENCODED, 0, PART_BODY, 2, -1, -1, 2, -1, 2},
    {"encoded 1.1, the independent element", 1, ENCODED, 0, PART_BODY, 2, 1, 1, 2, 1, 2},
    {"encoded 1.1, header: single", 1, ENCODED, 0, PART_HEADER, 2, -1, 1, 1, 0, 2},
    {"encoded 1.2, shared: first in full", 2, ENCODED, 0, PART_BODY, 2, -1, 1, 1, 1, 1},
    {"encoded 1.2, shared: then by reference", 2, ENCODED, 0, PART_BODY, 1, -1, 1, 1, -1, 1},
    {"graph, shared: first in full", 1, LITERAL, SOAP_XML_GRAPH, PART_BODY, 2, -1, 1, 1, 1, 1},
    {"graph over encoded 1.1", 1, ENCODED, SOAP_XML_GRAPH, PART_BODY, 2, -1, 1, 1, 1, 1},
};

TEST_F(forms, follow_version_style_and_mode)
{
    for (const form_case &row : FORMS)
        for (const pass phase : {COUNT, SEND}) {
            SCOPED_TRACE(row.rule);
            begin(row.version, row.form, row.mode, row.part, phase, row.mark);
            EXPECT_EQ(soap_element_id(&ctx, row.id, &object, 20), row.result);
            expect_mark(phase, row.mark_after);

            begin(row.version, row.form, row.mode, row.part, phase, row.mark);
            const int asked = row.id > 0 ? row.id : -1;
            const int expected = row.id > 0 && (row.mode & SOAP_XML_TREE) != 0 ? 0 : row.reference;
            EXPECT_EQ(ref(asked, &object), expected);
            EXPECT_EQ(ctx.error, 0);
            expect_mark(phase, row.ref_mark_after);
        }
}

TEST_F(forms, unknown_and_null_objects_have_none)
{
    int stranger = 0;
    begin(2, ENCODED, 0, PART_BODY, SEND, 2);
    EXPECT_EQ(soap_element_id(&ctx, 4, &stranger, 20), 0);
    EXPECT_EQ(soap_element_id(&ctx, -1, &stranger, 20), 0);
    EXPECT_EQ(ref(-1, &stranger), 0);
    EXPECT_EQ(ref(-1, nullptr), -1);
    EXPECT_EQ(ctx.sent(), "") << "an absent value is left out";
    EXPECT_EQ(soap_pointer_is_multi(&ctx, nullptr), 0);
    EXPECT_EQ(soap_pointer_is_single(&ctx, nullptr), 0);
}

TEST_F(forms, an_independent_object_is_begun_once)
{
    begin(2, ENCODED, 0, PART_BODY, SEND, 2);
    EXPECT_EQ(multiref(), 1);
    EXPECT_EQ(ctx.encoding_flag, 1);
    EXPECT_EQ(record->send_mark, 1);
    EXPECT_EQ(multiref(), 0);
    soap_pointer_set_seen(&ctx, &object, 20);
    EXPECT_EQ(record->count_mark, 1);
    begin(1, LITERAL, 0, PART_BODY, SEND, 2);
    EXPECT_EQ(multiref(), 0);
    EXPECT_EQ(ctx.encoding_flag, 0);
}

std::string id_of(std::size_t number)
{
    return "#" + std::to_string(number);
}

// Texts of one bucket, as a hostile sender makes them: the last byte adds its value to the hash.
std::vector<std::string> texts_of_one_bucket(std::size_t count)
{
    std::vector<std::string> texts;
    for (std::size_t i = 0; texts.size() < count; i++) {
        std::string text = id_of(i) + ".!";
        const std::size_t missing = SOAP_ID_HASH_SIZE - soap_id_hash(text.c_str());
        if (missing > '~' - '!')
            continue;
        text.back() = static_cast<char>('!' + missing);
        texts.push_back(text);
    }
    return texts;
}

TEST(id_table, many_ids_of_one_bucket_stay_cheap_and_are_never_mixed_up)
{
    constexpr std::size_t COUNT = 200000;
    soap ctx;
    std::vector<std::string> texts = texts_of_one_bucket(COUNT / 2);
    while (texts.size() < COUNT)
        texts.push_back(id_of(texts.size()));
    std::vector<std::uint64_t> objects(COUNT);
    for (std::size_t i = 0; i < COUNT; i++)
        ASSERT_EQ(
            soap_object_register(&ctx, texts[i].c_str(), &objects[i], 20, 8, 0, nullptr, nullptr, nullptr),
            &objects[i]);
    for (std::size_t i = 0; i < COUNT; i++)
        ASSERT_EQ(soap_id_lookup(&ctx, texts[i].c_str())->ptr, &objects[i]);
    EXPECT_EQ(soap_id_type(&ctx, texts[0].c_str()), 20);
    EXPECT_EQ(soap_forward_resolve(&ctx), 0);
    soap_id_table_reset(&ctx);
    EXPECT_EQ(soap_id_type(&ctx, texts[0].c_str()), 0);
}

struct pair_value {
    std::uint64_t one, two;
};

class id_numbers : public testing::Test {
public:
    soap ctx;

    void *put(const char *id, void *object, int type = 20, std::size_t size = sizeof(pair_value),
              unsigned level = 0)
    {
        return soap_object_register(&ctx, id, object, type, size, level, nullptr, nullptr, nullptr);
    }
    void *refer(const char *id, void *place, int type = 20, std::size_t size = sizeof(pair_value),
                unsigned level = 0)
    {
        return soap_object_forward_ptr(&ctx, id, static_cast<void **>(place), type, size, level);
    }
    void *copy(const char *id, void *place, int type = 20, std::size_t size = sizeof(pair_value),
               soap_copy_hook hook = nullptr, unsigned level = 0)
    {
        return soap_object_forward(&ctx, id, place, 0, type, type, size, level, hook);
    }
};

TEST_F(id_numbers, registering_makes_the_object_if_none_is_given)
{
    EXPECT_NE(put("#a", nullptr), nullptr);
    EXPECT_EQ(ctx.allocated, 1);
    pair_value own = {};
    for (const char *none : {"", static_cast<const char *>(nullptr)}) {
        EXPECT_EQ(put(none, &own), &own);
        EXPECT_EQ(ctx.allocated, 0);
    }
    EXPECT_EQ(soap_id_type(&ctx, ""), 0) << "no id, no entry";
    const auto instantiate = [](soap *c, int, const char *xsi, const char *, std::size_t *size) -> void * {
        *size = 3;
        return std::string(xsi) == "a:t" ? soap_block_alloc(c, 3) : nullptr;
    };
    EXPECT_NE(soap_object_register(&ctx, "#b", nullptr, 20, 99, 0, "a:t", "", instantiate), nullptr);
    EXPECT_EQ(soap_id_lookup(&ctx, "#b")->size, 3U);
}

TEST_F(id_numbers, disagreement_and_repetition_are_errors)
{
    enum action { PUT, COPY, REFER };
    struct step {
        action what;
        int type = 20;
        std::size_t size = sizeof(pair_value);
        soap_copy_hook hook = nullptr;
    };
    const std::tuple<const char *, step, step, int> cases[] = {
        {"two objects", {PUT}, {PUT}, 24},
        {"copy of another type", {PUT}, {COPY, 21}, 26},
        {"copy of another size", {PUT}, {COPY, 20, 8}, 26},
        {"object of another type than a copy's", {COPY}, {PUT, 21}, 26},
        {"object of another size than a hook's", {COPY, 20, 16, soap_copy_bytes}, {PUT, 20, 8}, 26},
        {"pointer to another type", {PUT}, {REFER, 21}, 26},
        {"pointers to two types", {REFER}, {REFER, 21}, 26},
        {"object of another type than a pointer's", {REFER}, {PUT, 21}, 26},
        {"object of another size than a pointer's: allowed", {REFER}, {PUT, 20, 8}, 0},
    };
    for (const auto &[rule, first, second, error] : cases) {
        SCOPED_TRACE(rule);
        soap_id_table_reset(&ctx);
        ctx.error = 0;
        ctx.element_id[0] = '\0';
        pair_value values[2] = {};
        void *places[2] = {};
        const auto run = [&](const step &s, int i) -> const void * {
            return s.what == PUT    ? put("#i", &values[i], s.type, s.size)
                   : s.what == COPY ? copy("#i", &values[i], s.type, s.size, s.hook)
                                    : refer("#i", &places[i], s.type, s.size);
        };
        EXPECT_NE(run(first, 0), nullptr);
        EXPECT_EQ(run(second, 1) != nullptr, error == 0);
        EXPECT_EQ(ctx.error, error);
        EXPECT_STREQ(ctx.element_id, error != 0 ? "#i" : "");
    }
}

TEST_F(id_numbers, pointers_are_filled_through_their_indirections)
{
    for (const bool with_direct : {true, false}) {
        pair_value object = {1, 2};
        void *before[3] = {}, *after[3] = {};
        EXPECT_EQ(refer("#a", &before[1], 20, 16, 1), &before[1]) << "the first reference sets the level";
        EXPECT_NE(refer("#a", &before[2], 20, 16, 2), &before[2]);
        if (with_direct) {
            EXPECT_EQ(refer("#a", &before[0], 20, 16, 0), &before[0]) << "now all others get a cell more";
        }
        EXPECT_EQ(put("#a", &object), &object);
        for (unsigned level = 0; level < 3; level++)
            ASSERT_NE(refer("#a", &after[level], 20, 16, level), nullptr);
        ASSERT_EQ(soap_forward_resolve(&ctx), 0);
        for (void **places : {before, after})
            for (unsigned level = places == before && !with_direct ? 1 : 0; level < 3; level++) {
                void *target = places[level];
                for (unsigned i = 0; i < level; i++)
                    target = *static_cast<void **>(target);
                EXPECT_EQ(target, &object) << "level " << level;
            }
        soap_id_table_reset(&ctx);
    }
}

TEST_F(id_numbers, a_missing_id_is_an_error_unless_it_lies_outside_and_nothing_waits_on)
{
    void *places[5] = {&ctx, &ctx, &ctx, &ctx, &ctx};
    refer("cid:part", &places[0]);
    refer("cid:part", &places[1]);
    EXPECT_EQ(soap_forward_resolve(&ctx), 0);
    EXPECT_EQ(places[0], nullptr);
    EXPECT_EQ(places[1], nullptr);
    refer("#gone", &places[2]);
    copy("#away", &places[3], 1, sizeof(void *));
    copy("#lost", &places[4], 1, sizeof(void *), soap_copy_bytes);
    EXPECT_EQ(soap_forward_has_pending(&ctx, places + 4, places + 5), -1);
    EXPECT_EQ(soap_forward_resolve(&ctx), SOAP_MISSING_ID);
    EXPECT_EQ(ctx.error, SOAP_MISSING_ID);
    EXPECT_TRUE(std::set<std::string>({"gone", "away", "lost"}).contains(ctx.element_id)) << ctx.element_id;
    EXPECT_EQ(places[2], nullptr);
    EXPECT_EQ(places[3], nullptr);
    EXPECT_EQ(soap_forward_has_pending(&ctx, places, places + 5), 0);
}

TEST_F(id_numbers, copies_are_dropped_when_the_level_of_an_id_falls)
{
    pair_value object = {5, 6}, place = {7, 8};
    void *far = nullptr, *near = nullptr;
    refer("#a", &far, 20, sizeof object, 1);
    copy("#a", &place);
    refer("#a", &near);
    put("#a", &object);
    ASSERT_EQ(soap_forward_resolve(&ctx), 0);
    EXPECT_EQ(place.one, 0U);
    EXPECT_EQ(place.two, 8U);
    EXPECT_EQ(near, &object);
    EXPECT_EQ(*static_cast<void **>(far), &object);
}

TEST_F(id_numbers, long_chains_of_copies_are_filled_in_any_order)
{
    constexpr std::size_t COUNT = 100000;
    std::vector<pair_value> values(COUNT);
    ctx.plain_received = COUNT * 20; // bytes of the message: more may be copied for a longer one
    for (std::size_t i = 0; i < COUNT; i++) {
        ASSERT_NE(put(id_of(i).c_str(), &values[i]), nullptr);
        ASSERT_TRUE(i + 1 == COUNT || copy(id_of(i + 1).c_str(), &values[i]) != nullptr);
    }
    values[COUNT - 1] = {11, 12};
    ASSERT_EQ(soap_forward_resolve(&ctx), 0);
    for (const pair_value &value : values)
        ASSERT_EQ(value.two, 12U);
}

TEST_F(id_numbers, what_waits_moves_with_its_block)
{
    constexpr std::size_t COUNT = 6; // elements
    constexpr std::size_t WIDTH = 6; // of 8 bytes: pointer, two of a value, a small value, two of a value
    pair_value object = {5, 6};
    void *fixed[COUNT] = {};
    soap_block_stack *stack = soap_block_stack_push(&ctx);
    const auto pointer_at = [](std::uint64_t *word) { return reinterpret_cast<void **>(word); };
    std::uint64_t *element = nullptr;
    for (std::size_t i = 0; i < COUNT; i++) {
        element = static_cast<std::uint64_t *>(soap_block_stack_grow(&ctx, stack, WIDTH * sizeof *element));
        refer(i % 2 == 0 ? "#p" : "#q", pointer_at(element));
        refer("#p", &fixed[i]); // the chain runs in and out of the blocks
        copy("#p", element + 1);
        copy("#n", element + 3, 1, 4);
        copy("#p", element + 4);
    }
    put("#q", element + 1); // an object within a block moves too
    EXPECT_EQ(soap_forward_has_pending(&ctx, element + 3, element + 4), -1);
    auto *array = static_cast<std::uint64_t *>(soap_block_stack_save(&ctx, stack, nullptr, 1));
    ASSERT_NE(array, nullptr);
    EXPECT_EQ(soap_forward_has_pending(&ctx, array, array + 1), -1);
    std::int32_t number = 9;
    put("#p", &object);
    put("#n", &number, 1, sizeof number);
    ASSERT_EQ(soap_forward_resolve(&ctx), 0);
    for (std::size_t i = 0; i < COUNT; i++) {
        std::uint64_t *moved = array + WIDTH * i;
        void *q = array + WIDTH * (COUNT - 1) + 1;
        EXPECT_EQ(*pointer_at(moved), i % 2 == 0 ? static_cast<void *>(&object) : q) << i;
        EXPECT_EQ(fixed[i], &object);
        EXPECT_EQ(std::memcmp(&moved[1], &object, sizeof object), 0) << i;
        EXPECT_EQ(std::memcmp(&moved[4], &object, sizeof object), 0) << i;
        EXPECT_EQ(std::memcmp(&moved[3], &number, sizeof number), 0) << i;
    }
}

// A message of values, each of its own or a copy of another, and of composites of two values that are copied
// whole. The elements arrive in random order. Graphs of pointers are those of tests/classes/graph_test.cpp.
TEST_F(id_numbers, random_graphs_resolve_as_a_model_does)
{
    struct composite {
        pair_value left, right;
    };
    const auto named = [](char kind, std::size_t i) { return "#" + (kind + std::to_string(i)); };
    for (unsigned seed = 0; seed < 400; seed++) {
        SCOPED_TRACE(seed);
        std::mt19937 random(seed);
        const auto choices = [&random](std::size_t count, std::size_t below) {
            std::vector<std::size_t> list(count);
            std::generate(list.begin(), list.end(), [&] { return random() % below; });
            return list;
        };
        std::vector<pair_value> values(random() % 60 + 1);
        std::vector<composite> composites(random() % 30 + 1), copies(random() % 30);
        const std::size_t count = values.size();
        const auto source = choices(count, count + count / 2 + 1); // from `count` on: a value of its own
        const auto left = choices(composites.size(), count), right = choices(composites.size(), count);
        const auto copied = choices(copies.size(), composites.size());

        std::vector<std::function<bool()>> events;
        for (std::size_t i = 0; i < count; i++)
            events.emplace_back([&, i] {
                if (source[i] >= count)
                    values[i] = {i + 1, i + 1};
                return put(named('v', i).c_str(), &values[i]) &&
                       (source[i] >= count || copy(named('v', source[i]).c_str(), &values[i]));
            });
        for (std::size_t i = 0; i < composites.size(); i++)
            events.emplace_back([&, i] {
                return put(named('c', i).c_str(), &composites[i], 41, sizeof(composite)) &&
                       copy(named('v', left[i]).c_str(), &composites[i].left) &&
                       copy(named('v', right[i]).c_str(), &composites[i].right);
            });
        for (std::size_t i = 0; i < copies.size(); i++)
            events.emplace_back([&, i] {
                return copy(named('c', copied[i]).c_str(), &copies[i], 41, sizeof(composite)) != nullptr;
            });
        std::shuffle(events.begin(), events.end(), random);
        for (const auto &event : events)
            ASSERT_TRUE(event());
        ASSERT_EQ(soap_forward_resolve(&ctx), 0);

        // The model follows the copies to a value of its own; on a cycle there is none, and no place may
        // keep an address.
        const auto expected = [&](std::size_t i) {
            for (std::size_t steps = 0; steps <= count; steps++, i = source[i])
                if (source[i] >= count)
                    return i + 1;
            return std::size_t{0};
        };
        const auto check = [](const pair_value &value, std::size_t number) {
            ASSERT_EQ(value.one, number);
            ASSERT_EQ(value.two, number);
        };
        for (std::size_t i = 0; i < count; i++)
            check(values[i], expected(i));
        for (std::size_t i = 0; i < composites.size(); i++) {
            check(composites[i].left, expected(left[i]));
            check(composites[i].right, expected(right[i]));
        }
        for (std::size_t i = 0; i < copies.size(); i++) {
            const std::size_t l = expected(left[copied[i]]), r = expected(right[copied[i]]);
            check(copies[i].left, r != 0 ? l : 0);
            check(copies[i].right, l != 0 ? r : 0);
        }
        ASSERT_FALSE(HasFailure());
        soap_discard_all(&ctx);
    }
}

TEST_F(id_numbers, every_allocation_may_fail)
{
    constexpr std::size_t COUNT = 3000; // enough for the index of many ids
    std::vector<std::string> ids;
    for (std::size_t i = 0; i < COUNT; i++)
        ids.push_back(id_of(i));
    std::vector<pair_value> values(COUNT);
    std::vector<void *> places(COUNT);
    const auto message = [&] {
        for (std::size_t i = 0; i < COUNT; i++) {
            const char *next = ids[(i + 1) % COUNT].c_str();
            const bool is_copy = i % 7 != 0;
            if (!refer(next, &places[i], 20, 16, i % 3 == 0 ? 1 : 0) || !put(ids[i].c_str(), &values[i]) ||
                (is_copy && !copy(next, &values[i], 20, 16, i % 2 == 0 ? soap_copy_bytes : nullptr)))
                return ctx.error;
        }
        return soap_forward_resolve(&ctx);
    };
    // Each run starts anew: all of the first allocations, then ever fewer of the rest.
    bool refused = true;
    std::size_t nth = 1;
    for (; refused; nth += 1 + nth / 16) {
        int result = 0;
        {
            const failing_malloc::scope armed(nth);
            result = message();
            refused = armed.refused() > 0;
        }
        ASSERT_EQ(result, refused ? SOAP_OUT_OF_MEMORY : 0) << nth;
        ASSERT_EQ(ctx.error, result);
        soap_discard_all(&ctx);
        ctx.error = 0;
    }
    EXPECT_GT(nth, 100U);
}

} // namespace

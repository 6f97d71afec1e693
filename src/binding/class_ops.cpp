// class_ops.cpp - the rules for a whole object: made, marked, written, read, referred to.
//
// Here: what all classes share. Elsewhere: their members (class_rules.h), leaves (member_read.cpp,
// member_write.cpp), dispatch by id (registry.cpp).
#include "binding/class_ops.h"

#include <zuv_client_pro/soap_error.h>
#include <zuv_client_pro/soap_identity.h>
#include <zuv_client_pro/soap_memory.h>
#include <zuv_client_pro/soap_registry.h>
#include <zuv_client_pro/soap_xml.h>

#include "binding/member_read.h"
#include "binding/registry.h"
#include "core/failure.h"
#include "core/instance_pool.h"
#include "core/limits.h"
#include "core/message_store.h"
#include "xml/namespace_scope.h"
#include "xml/tag_view.h"
#include "xml/xml_read.h"
#include "xml/xml_scan.h"

namespace binding {

bool class_descends(const class_ops *derived, const class_ops *base)
{
    while (derived != nullptr && derived != base)
        derived = derived->base;
    return derived != nullptr;
}

bool object_copy_allowed(soap *ctx, std::size_t size, std::size_t content)
{
    memory_charge(ctx, content);
    return copy_charge(ctx, size + content) == SOAP_OK;
}

void *class_instantiate(soap *ctx, const class_ops &ops, int count, const char *xsi_type, std::size_t *size,
                        const class_ops **made)
{
    const class_ops *actual = &ops;
    if (xsi_type != nullptr && *xsi_type) {
        const class_ops *named = class_by_xsi_type(ctx, xsi_type);
        if (named != nullptr && class_descends(named, &ops))
            actual = named;
    }
    soap_instance *entry = count < 0 ? instance_reuse(ctx, actual->type_id) : nullptr;
    if (entry == nullptr) {
        entry = soap_instance_register(ctx, nullptr, actual->type_id, count, soap_delete_object);
        if (entry == nullptr)
            return nullptr;
        entry->object = actual->create(ctx, count);
        if (entry->object == nullptr) {
            // NOLINTNEXTLINE(clang-analyzer-core.NullDereference): no call lacks a context
            return fail_null(ctx, SOAP_OUT_OF_MEMORY);
        }
    }
    const std::size_t bytes = actual->size * static_cast<std::size_t>(count < 0 ? 1 : count);
    memory_charge(ctx, bytes);
    if (size != nullptr)
        *size = bytes;
    if (made != nullptr)
        *made = actual;
    return entry->object;
}

// --- writing ---

namespace {

bool is_empty_text(const class_ops &ops, const void *object)
{
    const std::string *const text = ops.text(const_cast<void *>(object));
    return text != nullptr && text->empty();
}

// Few objects that refer to each other may be written very often: the counting pass must not go on for ever.
bool counted_too_much(const soap *ctx)
{
    return ctx->message_count > ctx->xml_end_max && ctx->xml_end_max != 0 && (ctx->mode & MODE_COUNTING) != 0;
}

// False for an object of a class that a host derived: its own operations may have marks to make, and count how
// often they are called.
bool is_of_library(const class_ops &ops, const void *object)
{
    const std::type_info *const actual = ops.type_info(object);
    if (actual == ops.own_type_info)
        return true;
    const type_entry *const entry = type_entry_of(ops.type_of(object));
    return entry != nullptr && entry->ops != nullptr && entry->ops->own_type_info == actual;
}

} // namespace

int class_out(soap *ctx, const class_ops &ops, const void *object, const char *tag, int id, const char *type)
{
    if (counted_too_much(ctx))
        return limit_exceeded(ctx, "max_message", ctx->max_message);
    if (ops.write_attributes != nullptr && ops.write_attributes(ctx, object))
        return ctx->error;
    const int element_id = soap_element_id(ctx, id, object, ops.type_id);
    if ((ctx->mode & MODE_NULL_STRINGS) && is_empty_text(ops, object))
        return soap_element_null(ctx, tag, element_id, ops.base != nullptr ? ops.xml_type : type);
    if (soap_element_out_begin(ctx, tag, element_id, ops.base != nullptr ? ops.xml_type : type))
        return ctx->error;
    if (ops.write_content(ctx, object, tag))
        return ctx->error;
    return soap_element_out_end(ctx, tag);
}

int class_put(soap *ctx, const class_ops &ops, const void *object, const char *tag, const char *type)
{
    const int id = soap_multiref_begin(ctx, object, nullptr, 0, tag, ops.type_id);
    if (ops.out(object, ctx, tag != nullptr ? tag : ops.xml_type, id, type))
        return ctx->error;
    return soap_put_finish(ctx);
}

int class_pointer_out(soap *ctx, const class_ops &ops, const char *tag, int id, const void *object,
                      const char *type)
{
    if (object != nullptr && (ctx->mode & SOAP_XML_TREE) != 0) {
        if (ctx->mark_state != MARKS_MADE && !is_of_library(ops, object))
            return marks_require(ctx);
        return ops.out(object, ctx, tag, 0, type);
    }
    id = soap_element_ref(ctx, tag, id, object, nullptr, 0, type,
                          object != nullptr ? ops.type_of(object) : ops.type_id);
    return id < 0 ? ctx->error : ops.out(object, ctx, tag, id, type);
}

void class_pointer_mark(soap *ctx, const class_ops &ops, const void *object)
{
    // The object's own id, so that the element that defines it and the references to it agree.
    if (object != nullptr && soap_mark_pointer(ctx, object, ops.type_of(object)) == 0)
        ops.mark(object, ctx);
}

// --- reading ---

namespace {

enum class step { consumed, unknown, failed };

bool strict(const soap *ctx)
{
    return (ctx->mode & MODE_STRICT) != 0;
}

// The tag as the member's reader is to ask for it: not at all (null) if its namespace is the member's, its
// local name being so already. Strict mode has the end tag compared too.
const char *asked_tag(const soap *ctx, const tag_view &held, std::string_view tag, std::string_view local)
{
    const std::size_t prefix = tag.size() - local.size();
    if (prefix == 0 || held.row < 0 || strict(ctx) ||
        !namespace_row_has_prefix(ctx, held.row, tag.data(), prefix - 1))
        return tag.data();
    return nullptr;
}

constexpr std::size_t NO_MEMBER = MEMBERS_MAX;

// The first member with the tag's local name, or NO_MEMBER.
std::size_t first_member(const member_table &members, const tag_view &tag)
{
    std::uint32_t slot = tag_local_hash(tag.local, tag.local_length) & members.slot_mask;
    for (; members.slots[slot] != 0; slot = (slot + 1) & members.slot_mask) {
        const std::size_t index = members.slots[slot] - 1U;
        const std::string_view local = members.entries[index].local;
        if (local.size() == tag.local_length && same_name(local.data(), tag.local, local.size()))
            return index;
    }
    return NO_MEMBER;
}

std::size_t next_member(const member_table &members, std::size_t index)
{
    return members.next_same[index] != 0 ? members.next_same[index] - 1U : NO_MEMBER;
}

// A start tag that is held.
struct member_head {
    tag_view tag;
    std::size_t member; // the first with its local name, or NO_MEMBER
    bool asks_nothing;  // the tag's namespace is known to be that of this member, and needn't be asked for
};

// Gives the held element to the member that it names. The members with its local name are tried in order.
step take_member(soap *ctx, const member_table &members, const member_head &head, void *object,
                 std::uint64_t &seen)
{
    bool asks_nothing = head.asks_nothing;
    for (std::size_t index = head.member; index != NO_MEMBER; index = next_member(members, index)) {
        const member_entry &entry = members.entries[index];
        const std::uint64_t bit = std::uint64_t{1} << index;
        const char *const asked = asks_nothing ? nullptr : asked_tag(ctx, head.tag, entry.tag, entry.local);
        asks_nothing = false;
        if ((seen & bit) != 0)
            continue;
        if (entry.read(ctx, asked, object)) {
            if (entry.single)
                seen |= bit;
            return step::consumed;
        }
        if (ctx->error != SOAP_TAG_MISMATCH)
            return step::failed;
    }
    return step::unknown;
}

// What comes after the member `last`, where NO_MEMBER means the start tag: a number that no other place
// of a class has, well mixed.
std::uint64_t place_after(const member_table &members, std::size_t last)
{
    return (reinterpret_cast<std::uintptr_t>(&members) + (static_cast<std::uint64_t>(last) << 56)) *
           UINT64_C(0x9E3779B97F4A7C15);
}

// The guess at it, or the place for one to make: a free one of its few places, or the first.
tag_guess &guess_of(soap_namespace_scope &scope, std::uint64_t place)
{
    tag_guess *const first = &scope.guesses[place >> (64 - TAG_GUESS_BITS)];
    for (tag_guess *guess = first; guess != first + TAG_GUESS_PROBES; ++guess) {
        if (guess->after == place || guess->after == 0)
            return *guess;
    }
    return *first;
}

constexpr char NO_ROW = '\0'; // no row's prefix is at its address

// Puts right a guess that was wrong twice.
void learn(const soap *ctx, tag_guess &guess, const member_table &members, std::uint64_t place,
           const member_head &head)
{
    if (guess.after == place && !guess.doubtful) {
        guess.doubtful = true;
        return;
    }
    if (head.member == NO_MEMBER || !xml_head_guess(ctx, guess))
        return;
    const member_entry &entry = members.entries[head.member];
    guess.after = place;
    guess.next = static_cast<std::uint8_t>(head.member);
    guess.doubtful = false;
    const bool asks =
        ctx->local_namespaces == nullptr || asked_tag(ctx, head.tag, entry.tag, entry.local) != nullptr;
    guess.row_prefix = asks ? &NO_ROW : ctx->local_namespaces[head.tag.row].prefix;
}

enum class next_thing { element, end_taken, none };

// Holds the next start tag, mostly the one that came after head.member the last time. `may_end`: an end tag in
// its place may be taken at once.
next_thing read_next_head(soap *ctx, const member_table &members, bool may_end, member_head &head)
{
    soap_namespace_scope *const scope = ctx->namespace_scope;
    const std::uint64_t place = place_after(members, head.member);
    tag_guess *const guess = scope != nullptr ? &guess_of(*scope, place) : nullptr;
    if (guess != nullptr && guess->after == place && xml_guessed_head_read(ctx, *guess, &head.tag)) {
        const soap_namespace *const table = ctx->local_namespaces;
        guess->doubtful = false;
        head.member = guess->next;
        head.asks_nothing = head.tag.row >= 0 && table != nullptr &&
                            table[head.tag.row].prefix == guess->row_prefix && !strict(ctx);
        return next_thing::element;
    }
    if (may_end && xml_next_end_read(ctx))
        return next_thing::end_taken;
    if (soap_element_head_read(ctx))
        return next_thing::none;
    head.tag = soap_held_tag(ctx);
    head.member = first_member(members, head.tag);
    head.asks_nothing = false;
    if (guess != nullptr)
        learn(ctx, *guess, members, place, head);
    return next_thing::element;
}

// Reads all elements up to the end of the parent, in any order, and the end tag; `seen` takes the single
// members that were met.
bool read_elements(soap *ctx, const member_table &members, const char *tag, void *object, std::uint64_t &seen)
{
    const bool may_end = tag == nullptr || *tag != '-';
    for (member_head head = {{}, NO_MEMBER, false};;) {
        const next_thing next = read_next_head(ctx, members, may_end, head);
        if (next == next_thing::end_taken)
            return true;
        if (next == next_thing::none)
            return ctx->error == SOAP_NO_TAG && soap_element_in_end(ctx, tag) == 0;
        fail(ctx, SOAP_TAG_MISMATCH);
        const step taken = take_member(ctx, members, head, object, seen);
        if (taken == step::failed)
            return false;
        if (taken == step::unknown && soap_element_skip(ctx))
            return ctx->error == SOAP_NO_TAG && soap_element_in_end(ctx, tag) == 0;
    }
}

bool lacks(const class_ops &ops, const void *object, std::uint64_t seen)
{
    return (ops.members->required & ~seen) != 0 || (ops.holds_minima != nullptr && !ops.holds_minima(object));
}

void *read_by_reference(soap *ctx, const class_ops &ops, const char *tag, void *object)
{
    const bool body = ctx->has_body != 0;
    if (soap_object_forward(ctx, ctx->element_href, object, 0, ops.type_id, 0, ops.size, 0, ops.copy_hook) ==
        nullptr)
        return nullptr;
    if (body && soap_element_in_end(ctx, tag))
        return nullptr;
    if (strict(ctx) && (ops.members->required || ops.members->minima))
        return fail_null(ctx, SOAP_OCCURS);
    return object;
}

// What comes before the content in all forms: the object's identity and its attributes.
bool read_preamble(soap *ctx, const class_ops &ops, void *object)
{
    if (ctx->element_id[0] && soap_object_register(ctx, ctx->element_id, object, ops.type_id, ops.size, 0,
                                                   nullptr, nullptr, nullptr) == nullptr)
        return false;
    return ops.read_attributes == nullptr || ops.read_attributes(ctx, object);
}

} // namespace

void *read_simple_content(soap *ctx, const class_ops &ops, const char *tag, void *object)
{
    if (!read_preamble(ctx, ops, object))
        return nullptr;
    if (ctx->element_href[0])
        return read_by_reference(ctx, ops, tag, object);
    if (!ctx->has_body)
        return object;
    if (!read_text_content(ctx, *ops.text(object)) || soap_element_in_end(ctx, tag))
        return nullptr;
    return object;
}

void *read_members(soap *ctx, const class_ops &ops, const char *tag, void *object)
{
    if (!read_preamble(ctx, ops, object))
        return nullptr;
    if (!ctx->has_body || ctx->element_href[0])
        return read_by_reference(ctx, ops, tag, object);
    return read_further_members(ctx, ops, tag, object);
}

void *read_further_members(soap *ctx, const class_ops &ops, const char *tag, void *object)
{
    std::uint64_t seen = 0;
    if (!read_elements(ctx, *ops.members, tag, object, seen))
        return nullptr;
    if (strict(ctx) && lacks(ops, object, seen))
        return fail_null(ctx, SOAP_OCCURS);
    return object;
}

void *class_in(soap *ctx, const class_ops &ops, const char *tag, void *object)
{
    if (soap_element_in_begin(ctx, tag, static_cast<int>(ops.nillable), nullptr))
        return nullptr;
    const class_ops *actual = &ops;
    if (object == nullptr)
        object = class_instantiate(ctx, ops, -1, ctx->element_type, nullptr, &actual);
    return object != nullptr ? actual->read(ctx, *actual, tag, object) : nullptr;
}

bool independents_read(soap *ctx)
{
    if (soap_read_independents(ctx) == SOAP_TAG_MISMATCH)
        ctx->error = 0;
    return ctx->error == 0;
}

void *class_get(soap *ctx, const class_ops &ops, const char *tag, void *object)
{
    object = class_in(ctx, ops, tag, object);
    return object != nullptr && independents_read(ctx) ? object : nullptr;
}

bool class_new_in(soap *ctx, const class_ops &ops, const char *tag, void **place)
{
    const class_ops *actual = &ops;
    void *object = class_instantiate(ctx, ops, -1, ctx->element_type, nullptr, &actual);
    if (object == nullptr || actual->read(ctx, *actual, tag, object) == nullptr)
        return false;
    *place = object;
    return true;
}

bool class_pointer_in(soap *ctx, const class_ops &ops, const char *tag, void **place)
{
    if (soap_element_in_begin(ctx, tag, 1, nullptr))
        return false;
    *place = nullptr;
    if (!ctx->null_flag && ctx->element_href[0] != '#')
        return class_new_in(ctx, ops, tag, place);
    const bool body = ctx->has_body != 0;
    if (soap_object_forward_ptr(ctx, ctx->element_href, place, ops.type_id, ops.size, 0) == nullptr)
        return false;
    return !body || soap_element_in_end(ctx, tag) == 0;
}

bool read_vector_item_object(soap *ctx, const class_ops &ops, const char *tag, void *vector,
                             std::size_t index, int vector_type, void **object)
{
    if (soap_element_in_begin(ctx, tag, 1, nullptr))
        return false;
    *object = nullptr;
    if (!ctx->null_flag && ctx->element_href[0] != '#')
        return class_new_in(ctx, ops, tag, object);
    const bool body = ctx->has_body != 0;
    // Level 1: what the vector takes is the object's address, which is known before the object is complete.
    if (!ctx->null_flag &&
        (soap_object_forward(ctx, ctx->element_href, vector, index, ops.type_id, vector_type, ops.size, 1,
                             soap_insert_into_vector) == nullptr))
        return false;
    return !body || soap_element_in_end(ctx, tag) == 0;
}

} // namespace binding

// member_read.cpp - leaf operations of reading: texts, enumerations, booleans, items of vectors.
//
// Elsewhere: numbers (values), whole objects (class_ops.cpp).
#include "binding/member_read.h"

#include <bit>
#include <cstring>
#include <string_view>

#include <zuv_client_pro/soap_error.h>
#include <zuv_client_pro/soap_memory.h>
#include <zuv_client_pro/soap_primitive.h>
#include <zuv_client_pro/soap_registry.h>
#include <zuv_client_pro/soap_xml.h>

#include "binding/registry.h"
#include "core/failure.h"
#include "core/instance_pool.h"
#include "core/limits.h"
#include "values/values.h"
#include "xml/xml_text.h"

namespace binding {

namespace {

constexpr int TEXT_TYPE_ID = 8; // all texts held by pointer are of one type to the identity tables
constexpr int BOOLEAN_TYPE_ID = 13;

// Characters that a text holds without a block of its own.
std::size_t text_in_place()
{
    return std::string().capacity();
}

bool ends(soap *ctx, const char *tag, bool body)
{
    return !body || soap_element_in_end(ctx, tag) == 0;
}

// Out of line: texts that wait have had space for their successors as a rule.
[[gnu::noinline]] void assign_to_larger(std::string &text, std::string_view content)
{
    std::string larger;
    larger.reserve(std::bit_ceil(content.size() + 1) -
                   1); // so that it waits where it was found, the next time too
    larger.assign(content);
    text.swap(larger);
}

// Fills a text that idle_texts found.
void assign_to_idle(std::string &text, std::string_view content)
{
    if (content.size() > text.capacity())
        assign_to_larger(text, content);
    else
        text.assign(content);
}

// A new text of the context. Null with SOAP_OUT_OF_MEMORY.
std::string *new_text(soap *ctx, std::string_view content = {})
{
    soap_instance *instance = instance_reuse(ctx, idle_texts(content.size()));
    if (instance == nullptr)
        instance = soap_instance_register(ctx, nullptr, TEXT_TYPE_ID, -1, soap_delete_object);
    if (instance == nullptr)
        return nullptr;
    try {
        auto *text = static_cast<std::string *>(instance->object);
        if (text != nullptr)
            assign_to_idle(*text, content);
        else
            text = new std::string(content);
        memory_charge(ctx, sizeof *text);
        text_charge(ctx, content.size(), text_in_place());
        instance->object = text;
        return text;
    } catch (const std::bad_alloc &) {
        out_of_memory(ctx);
        return nullptr;
    }
}

// What is left of a text whose memory goes to a vector waits to take a text's memory back.
struct idle_shell {
    soap *ctx;
    soap_instance *instance;
    ~idle_shell() { idle_give(ctx, IDLE_SHELLS, instance, sizeof(std::string)); }
};

bool append_text(soap *ctx, std::vector<std::string> &vector, std::string_view content)
{
    vector_charge(ctx, vector);
    text_charge(ctx, content.size(), text_in_place());
    try {
        soap_instance *idle =
            content.size() > text_in_place() ? idle_take(ctx, idle_texts(content.size())) : nullptr;
        if (idle == nullptr) {
            vector.emplace_back(content);
            return true;
        }
        auto *text = static_cast<std::string *>(idle->object);
        const idle_shell shell = {ctx, idle};
        assign_to_idle(*text, content);
        vector.push_back(std::move(*text));
        return true;
    } catch (const std::bad_alloc &) {
        return out_of_memory(ctx);
    }
}

// The text up to the end tag. It lives until the next read.
bool read_characters(soap *ctx, std::string_view &content)
{
    const char *text = nullptr;
    std::size_t length = 0;
    if (!xml_text_in_place(ctx, &text, &length))
        text = soap_text_read(ctx, &length);
    content = {text, length};
    return text != nullptr;
}

bool is_reference(const soap *ctx)
{
    return ctx->element_href[0] == '#';
}

bool mismatch(soap *ctx)
{
    fail(ctx, SOAP_TYPE_MISMATCH);
    return false;
}

bool strict(const soap *ctx)
{
    return (ctx->mode & MODE_STRICT) != 0;
}

// A word of the enumeration, or a number. Numbers past the words are refused in strict mode.
bool parse_code(soap *ctx, const char *text, const enum_table &names, std::int32_t *code)
{
    if (const soap_code_row *row = soap_name_to_row(names.codes, text)) {
        *code = static_cast<std::int32_t>(row->code);
        return true;
    }
    std::int32_t number = 0;
    if (soap_int_parse(ctx, text, &number))
        return false;
    if (strict(ctx) && static_cast<std::uint32_t>(number) >= names.count)
        return mismatch(ctx);
    *code = number;
    return true;
}

bool parse_boolean(soap *ctx, const char *text, bool *value)
{
    if (std::strcmp(text, "true") == 0 || std::strcmp(text, "false") == 0) {
        *value = text[0] == 't';
        return true;
    }
    std::int64_t number = 0;
    if (soap_long_parse(ctx, text, &number))
        return false;
    if (number != 0 && number != 1)
        return mismatch(ctx);
    *value = number == 1;
    return true;
}

// Text of the simple element just begun, up to and with its end tag; null on failure. The text is in
// scratch_text.
template <class Parse> bool read_simple(soap *ctx, const char *tag, Parse parse)
{
    const bool body = ctx->has_body != 0;
    const char *text = soap_simple_value_read(ctx);
    return text && parse(text) && ends(ctx, tag, body);
}

bool holds_tag(soap *ctx)
{
    return ctx->peeked != 0 || soap_element_head_read(ctx) == 0;
}

// The XML type to ask for of the simple value whose tag is held: null, for any, where that of the element
// says nothing.
const char *type_asked(soap *ctx, const char *type)
{
    return !strict(ctx) && type_says_nothing(ctx) ? nullptr : type;
}

bool begins(soap *ctx, const char *tag, int nil_allowed, const char *type)
{
    if (!holds_tag(ctx))
        return false;
    if (ctx->attributes_set != 0)
        type = type_asked(ctx, type);
    return soap_element_in_begin(ctx, tag, nil_allowed, type) == 0;
}

// The element just begun is nil, where there is no pointer to be null: what it was to be stays as it is.
// `done` is the result of reading it.
bool is_nil(soap *ctx, const char *tag, bool *done)
{
    if (ctx->null_flag == 0)
        return false;
    *done = ends(ctx, tag, ctx->has_body != 0);
    return true;
}

bool refers(soap *ctx, const char *tag, void *place, std::size_t size, int type_id, bool body)
{
    return soap_object_forward(ctx, ctx->element_href, place, 0, type_id, 0, size, 0, nullptr) != nullptr &&
           ends(ctx, tag, body);
}

bool registers(soap *ctx, void *object, int type_id, std::size_t size)
{
    return (ctx->element_id[0] == 0) || soap_object_register(ctx, ctx->element_id, object, type_id, size, 0,
                                                             nullptr, nullptr, nullptr) != nullptr;
}

// The element just begun is nil or a reference: the place becomes null, or is filled when the object is
// known.
bool refers_pointer(soap *ctx, const char *tag, void **place, int type_id, std::size_t size)
{
    const bool body = ctx->has_body != 0;
    return soap_object_forward_ptr(ctx, ctx->element_href, place, type_id, size, 0) != nullptr &&
           ends(ctx, tag, body);
}

bool refers_item(soap *ctx, const char *tag, void *vector, std::size_t index, int item_type, std::size_t size,
                 int vector_type)
{
    const bool body = ctx->has_body != 0;
    return soap_object_forward(ctx, ctx->element_href, vector, index, item_type, vector_type, size, 0,
                               soap_insert_into_vector) != nullptr &&
           ends(ctx, tag, body);
}

// Copy hook of a text that a reference late in the message fills.
void copy_text_late(soap *ctx, int, int, void *place, std::size_t, const void *source, std::size_t)
{
    copy_text(ctx, *static_cast<std::string *>(place), *static_cast<const std::string *>(source));
}

} // namespace

bool out_of_memory(soap *ctx)
{
    fail(ctx, SOAP_OUT_OF_MEMORY);
    return false;
}

// --- text ---

bool read_text_content(soap *ctx, std::string &text)
{
    std::string_view content;
    if (!read_characters(ctx, content))
        return false;
    text_charge(ctx, content.size(), text.capacity());
    try {
        text.assign(content);
    } catch (const std::bad_alloc &) {
        return out_of_memory(ctx);
    }
    return true;
}

bool read_text_pointer(soap *ctx, const char *tag, void **place)
{
    std::string_view content;
    if (tag == nullptr && xml_leaf_in_place(ctx, &content))
        return (*place = new_text(ctx, content)) != nullptr;
    if (soap_element_in_begin(ctx, tag, 1, nullptr))
        return false;
    *place = nullptr;
    if (ctx->null_flag || is_reference(ctx))
        return refers_pointer(ctx, tag, place, TEXT_TYPE_ID, sizeof(std::string));
    const bool body = ctx->has_body != 0;
    if (body && !read_characters(ctx, content))
        return false;
    std::string *text = new_text(ctx, content);
    if (text == nullptr || !registers(ctx, text, TEXT_TYPE_ID, sizeof(std::string)))
        return false;
    *place = text;
    return ends(ctx, tag, body);
}

bool read_text_object(soap *ctx, const char *tag, std::string *text)
{
    if (soap_element_in_begin(ctx, tag, 1, nullptr) || !registers(ctx, text, TEXT_TYPE_ID, sizeof *text))
        return false;
    text->clear();
    const bool body = ctx->has_body != 0;
    if (is_reference(ctx)) {
        return soap_object_forward(ctx, ctx->element_href, text, 0, TEXT_TYPE_ID, 0, sizeof *text, 0,
                                   copy_text_late) != nullptr &&
               ends(ctx, tag, body);
    }
    if (body && !ctx->null_flag && !read_text_content(ctx, *text))
        return false;
    return ends(ctx, tag, body);
}

bool read_vector_item_text(soap *ctx, const char *tag, std::vector<std::string> &vector, int vector_type)
{
    std::string_view content;
    if (tag == nullptr && xml_leaf_in_place(ctx, &content))
        return append_text(ctx, vector, content);
    if (soap_element_in_begin(ctx, tag, 1, nullptr))
        return false;
    if (!append_item<std::string>(ctx, vector, nullptr))
        return false;
    if (is_reference(ctx))
        return refers_item(ctx, tag, &vector, vector.size() - 1, TEXT_TYPE_ID, sizeof(std::string),
                           vector_type);
    const bool body = ctx->has_body != 0;
    std::string *shared = nullptr; // an item with an id needs a place that stays: the vector moves its items
    if (ctx->element_id[0]) {
        shared = new_text(ctx);
        if (shared == nullptr || !registers(ctx, shared, TEXT_TYPE_ID, sizeof(std::string)))
            return false;
    }
    if (body && !ctx->null_flag && !read_text_content(ctx, vector.back()))
        return false;
    if (shared != nullptr && !copy_text(ctx, *shared, vector.back()))
        return false;
    return ends(ctx, tag, body);
}

bool copy_text(soap *ctx, std::string &target, const std::string &source)
{
    if (copy_charge(ctx, source.size()) != 0)
        return false;
    text_charge(ctx, source.size(), target.capacity());
    try {
        target = source;
    } catch (const std::bad_alloc &) {
        return out_of_memory(ctx);
    }
    return true;
}

// --- enumerations ---

// The short way of a code that is a word without blanks, in an element without attributes, whole in the
// buffer. False: nothing was consumed.
static bool take_code(soap *ctx, const enum_table &names, std::int32_t *code)
{
    const std::size_t start = ctx->buffer_index;
    const int error = ctx->error;
    std::string_view text;
    if (!xml_leaf_in_place(ctx, &text))
        return false;
    if (text.size() < sizeof ctx->scratch_text) {
        ctx->scratch_text[text.copy(ctx->scratch_text, text.size())] = '\0';
        if (const soap_code_row *row = soap_name_to_row(names.codes, ctx->scratch_text)) {
            *code = static_cast<std::int32_t>(row->code);
            return true;
        }
    }
    ctx->buffer_index = start;
    ctx->peeked = 1;
    ctx->error = error;
    return false;
}

bool read_code_value(soap *ctx, const char *tag, std::int32_t *place, const enum_table &names)
{
    bool done = false;
    if (tag == nullptr && take_code(ctx, names, place))
        return true;
    if (!begins(ctx, tag, 0, names.xml_type) || !registers(ctx, place, names.type_id, sizeof *place))
        return false;
    if (is_nil(ctx, tag, &done))
        return done;
    if (is_reference(ctx))
        return refers(ctx, tag, place, sizeof *place, names.type_id, ctx->has_body != 0);
    return read_simple(ctx, tag, [&](const char *text) { return parse_code(ctx, text, names, place); });
}

bool read_code_pointer(soap *ctx, const char *tag, void **place, const enum_table &names)
{
    std::int32_t known = 0;
    const bool taken = tag == nullptr && take_code(ctx, names, &known);
    if (!taken && !begins(ctx, tag, 1, names.xml_type))
        return false;
    *place = nullptr;
    if (taken) {
        auto *code = static_cast<std::int32_t *>(soap_block_alloc(ctx, sizeof known));
        if (code != nullptr)
            *code = known;
        return (*place = code) != nullptr;
    }
    if (ctx->null_flag || is_reference(ctx))
        return refers_pointer(ctx, tag, place, names.type_id, sizeof(std::int32_t));
    auto *code = static_cast<std::int32_t *>(soap_block_alloc(ctx, sizeof(std::int32_t)));
    if (code == nullptr || !registers(ctx, code, names.type_id, sizeof *code))
        return false;
    *code = 0;
    if (!read_simple(ctx, tag, [&](const char *text) { return parse_code(ctx, text, names, code); }))
        return false;
    *place = code;
    return true;
}

bool read_vector_item_code(soap *ctx, const char *tag, std::int32_t *code, bool *present,
                           const enum_table &names, void *vector, std::size_t index, int vector_type)
{
    bool done = false;
    *present = true;
    if (!begins(ctx, tag, 0, names.xml_type))
        return false;
    if (is_nil(ctx, tag, &done)) {
        *present = false;
        return done;
    }
    *code = 0;
    if (is_reference(ctx))
        return refers_item(ctx, tag, vector, index, names.type_id, sizeof *code, vector_type);
    std::int32_t *shared = nullptr; // as for texts
    if (ctx->element_id[0]) {
        shared = static_cast<std::int32_t *>(soap_block_alloc(ctx, sizeof *shared));
        if (shared == nullptr || !registers(ctx, shared, names.type_id, sizeof *shared))
            return false;
    }
    if (!read_simple(ctx, tag, [&](const char *text) { return parse_code(ctx, text, names, code); }))
        return false;
    if (shared != nullptr)
        *shared = *code;
    return true;
}

bool read_code_attribute(soap *ctx, const char *name, bool required, const enum_table &names,
                         std::int32_t *code, bool *present)
{
    const char *text = soap_attr_get(ctx, name, required ? 1 : 0);
    if (text == nullptr)
        return ctx->error == 0;
    *present = true;
    return parse_code(ctx, text, names, code);
}

// --- booleans and numbers ---

bool read_boolean_value(soap *ctx, const char *tag, bool *place)
{
    bool done = false;
    if (!begins(ctx, tag, 0, "xsd:boolean") || !registers(ctx, place, BOOLEAN_TYPE_ID, sizeof *place))
        return false;
    if (is_nil(ctx, tag, &done))
        return done;
    if (is_reference(ctx)) {
        const bool body = ctx->has_body != 0;
        return soap_object_forward(ctx, ctx->element_href, place, 0, BOOLEAN_TYPE_ID, 0, sizeof *place, 0,
                                   soap_copy_bytes) != nullptr &&
               ends(ctx, tag, body);
    }
    return read_simple(ctx, tag, [&](const char *text) { return parse_boolean(ctx, text, place); });
}

bool read_number_pointer(soap *ctx, const char *tag, void **place, int type_id)
{
    const simple_ops &ops = *type_entries[type_id].simple;
    if (soap_element_in_begin(ctx, tag, 1, nullptr))
        return false;
    *place = nullptr;
    if (ctx->null_flag || is_reference(ctx))
        return refers_pointer(ctx, tag, place, type_id, ops.size);
    soap_tag_unread(ctx);
    *place = ops.in(ctx, tag, nullptr, type_asked(ctx, ops.xml_type));
    return *place != nullptr;
}

bool read_number_value(soap *ctx, const char *tag, void *place, int type_id)
{
    const simple_ops &ops = *type_entries[type_id].simple;
    return holds_tag(ctx) && ops.in(ctx, tag, place, type_asked(ctx, ops.xml_type)) != nullptr;
}

} // namespace binding

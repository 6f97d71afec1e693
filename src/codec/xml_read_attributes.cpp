// xml_read_attributes.cpp - attributes of a start tag: read into the reusable records, then understood.
//
// Here: the attribute loop, values of any size, and the attributes of SOAP and XSI. Elsewhere: the records
// themselves (attributes.cpp), the tag (xml_read.cpp), the prefix stack (namespace_prefix.cpp).
//
// Always: an attribute costs the same however many the element has.
#include <algorithm>
#include <array>
#include <cstring>
#include <string_view>

#include <zuv_client_pro/soap_primitive.h>

#include "codec/attributes.h"
#include "codec/namespace.h"
#include "codec/xml_read.h"

namespace {

constexpr std::size_t VALUE_BYTES_MIN = 64;

constexpr char NEXT_ACTOR[] = "http://schemas.xmlsoap.org/soap/actor/next";
constexpr char NEXT_ROLE[] = "http://www.w3.org/2003/05/soap-envelope/role/next";

// ------------------------------------------------------------------------------------------ records

// Where the attributes of an element go in the list: plain names and declarations come first, so that they
// are understood first.
struct attribute_order {
    soap *ctx;
    soap_attribute **end; // behind the last one

    explicit attribute_order(soap *context) : ctx(context), end(&context->attribute_list) {}

    void put(soap_attribute *record)
    {
        const bool prefixed = std::memchr(record->name, ':', record->name_length) != nullptr;
        const bool moves_end = prefixed || end == &ctx->attribute_list;
        xml_attribute_show(ctx, prefixed ? end : &ctx->attribute_list, record, 1);
        if (moves_end)
            end = &record->next;
    }
};

int store_value(soap *ctx, soap_attribute *record, const char *text, std::size_t length)
{
    if (record->size <= length && xml_attribute_room(ctx, record, std::max(length + 1, VALUE_BYTES_MIN)) != 0)
        return ctx->error;
    std::memcpy(record->value, text, length);
    record->value[length] = '\0';
    record->visible = 2;
    return 0;
}

// ------------------------------------------------------------------------------------------ values

// A byte that a value goes on behind, but not as it stands.
bool is_special(char c)
{
    return c == '&' || c == '\0' || static_cast<unsigned char>(c) >= 0x80;
}

// A reference, the start of a sequence to decode, or a zero byte.
int gather_special(soap *ctx)
{
    if (*input_here(ctx) != '&')
        return text_put_token(ctx, text_token(ctx));
    ctx->buffer_index++;
    const auto code = static_cast<std::uint32_t>(soap_entity_read(ctx));
    return text_put_code(ctx, code);
}

// Gathers a value in the growing text, over refills and references, up to a byte of Stop that is no special
// one.
template <class Stop> int gather_value(soap *ctx)
{
    for (;;) {
        if (!input_ready(ctx))
            return SOAP_EOF;
        const char *here = input_here(ctx);
        const char *stop = Stop::find(here, input_end(ctx));
        if (text_put(ctx, here, static_cast<std::size_t>(stop - here)) != 0)
            return ctx->error;
        input_consume(ctx, stop);
        if (stop == input_end(ctx))
            continue;
        if (!is_special(*stop))
            return 0;
        if (gather_special(ctx) != 0)
            return ctx->error;
    }
}

// A value that stands whole and plain in the buffer is copied once; any other is gathered first.
template <class Stop> int read_value(soap *ctx, soap_attribute *record)
{
    const char *here = input_here(ctx);
    const char *stop = Stop::find(here, input_end(ctx));
    if (stop != input_end(ctx) && !is_special(*stop)) {
        input_consume(ctx, stop);
        return store_value(ctx, record, here, static_cast<std::size_t>(stop - here));
    }
    ctx->label_index = 0;
    const int error = gather_value<Stop>(ctx);
    if (error != 0)
        return error;
    return store_value(ctx, record, ctx->label_index != 0 ? ctx->label_buffer : "", ctx->label_index);
}

int read_quoted(soap *ctx, soap_attribute *record, char quote)
{
    ctx->buffer_index++;
    if (!input_ready(ctx))
        return SOAP_EOF;
    const bool decode = text_needs_decoding(ctx);
    int error;
    if (quote == '"')
        error = decode ? read_value<quoted_decode_stop>(ctx, record) : read_value<quoted_stop>(ctx, record);
    else
        error = decode ? read_value<apos_decode_stop>(ctx, record) : read_value<apos_stop>(ctx, record);
    if (error == 0)
        ctx->buffer_index++;
    return error;
}

int read_unquoted(soap *ctx, soap_attribute *record)
{
    return text_needs_decoding(ctx) ? read_value<unquoted_decode_stop>(ctx, record)
                                    : read_value<unquoted_stop>(ctx, record);
}

// ------------------------------------------------------------------------------------------ the loop

// The prefix that an attribute declares, or null.
const char *declared_prefix(const soap_attribute *record)
{
    const std::string_view name = xml_attribute_name(record);
    if (!name.starts_with("xmlns"))
        return nullptr;
    return name.size() == 5 ? record->name + 5 : record->name[5] == ':' ? record->name + 6 : nullptr;
}

int read_attribute(soap *ctx, attribute_order &order)
{
    char *name = ctx->scratch_text;
    const std::size_t length = xml_name_read<attribute_name_stop>(ctx, name);
    if (length == 0)
        return SOAP_SYNTAX_ERROR;
    soap_attribute *record = xml_attribute_record(ctx, {name, length});
    if (record == nullptr)
        return ctx->error;
    ctx->attributes_set = 1;
    if (record->visible == 0)
        order.put(record);
    record->visible = 1; // the last of one name counts
    if (input_skip_blanks(ctx) != '=')
        return 0;
    ctx->buffer_index++;
    const std::int32_t first = input_skip_blanks(ctx);
    if (first == XML_EOF)
        return SOAP_EOF;
    const int error = first == '"' || first == '\'' ? read_quoted(ctx, record, static_cast<char>(first))
                                                    : read_unquoted(ctx, record);
    if (error != 0)
        return error;
    const char *prefix = declared_prefix(record);
    if (prefix == nullptr)
        return 0;
    return soap_prefix_push_in(ctx, prefix, record->value) != nullptr ? 0 : ctx->error;
}

// ------------------------------------------------------------------------------------------ meaning

bool is_true(const char *value)
{
    return std::strcmp(value, "1") == 0 || std::strcmp(value, "true") == 0;
}

// Copies what fits a text buffer of the context.
void keep_text(char *target, const char *text)
{
    std::size_t length = std::strlen(text);
    if (length > SOAP_TEXT_SIZE - 1)
        length = SOAP_TEXT_SIZE - 1;
    std::memcpy(target, text, length);
    target[length] = '\0';
}

// "#" and a name, as references are entered in the id table.
void keep_reference(char *target, const char *name)
{
    target[0] = '#';
    std::size_t length = std::strlen(name);
    if (length > SOAP_TEXT_SIZE - 2)
        length = SOAP_TEXT_SIZE - 2;
    std::memcpy(target + 1, name, length);
    target[length + 1] = '\0';
}

void keep_array_type(soap *ctx, const char *value)
{
    const char *bracket = std::strrchr(value, '[');
    if (bracket == nullptr || bracket - value > static_cast<std::ptrdiff_t>(SOAP_TEXT_SIZE - 1)) {
        keep_text(ctx->array_type, value);
        return;
    }
    const auto length = static_cast<std::size_t>(bracket - value);
    std::memcpy(ctx->array_type, value, length);
    ctx->array_type[length] = '\0';
    keep_text(ctx->array_size, bracket);
}

// The element is for another actor unless it names this receiver or whoever comes next.
void check_actor(soap *ctx, const char *value, const char *next)
{
    const bool own = ctx->actor != nullptr && std::strcmp(value, ctx->actor) == 0;
    if (!own && std::strcmp(value, next) != 0)
        ctx->other_flag = 1;
}

// An attribute without a prefix that is known by its plain name.
bool apply_plain(soap *ctx, std::string_view name, const char *value)
{
    const bool graph = (ctx->mode & SOAP_XML_GRAPH) != 0;
    if (name == "id" && (graph || (ctx->soap_version > 0 && (ctx->mode & SOAP_XML_TREE) == 0))) {
        keep_reference(ctx->element_id, value);
        return true;
    }
    if (name == "href" && (graph || ctx->soap_version == 1 || (ctx->mode & (MODE_DIME | MODE_MTOM)) != 0)) {
        keep_text(ctx->element_href, value);
        return true;
    }
    if (name == "ref" && ctx->soap_version == 2) {
        keep_reference(ctx->element_href, value);
        return true;
    }
    return false;
}

// What an attribute with a known qualified name does. False: it goes on to the rows below.
using attribute_action = bool (*)(soap *ctx, const char *value);

struct attribute_rule {
    constexpr attribute_rule(const char *rule_name, int applies_in, attribute_action action)
        : name(rule_name), local(xml_local_part(rule_name)), versions(applies_in), apply(action)
    {}

    const char *name;
    std::string_view local; // in `name`
    int versions;           // bit n: applies in SOAP version n (0: none known yet)
    attribute_action apply;
};

constexpr int ANY_VERSION = 7, NO_VERSION = 1, SOAP_1_1 = 2, SOAP_1_2 = 4;

bool apply_nil(soap *ctx, const char *value)
{
    if (!is_true(value))
        return false;
    ctx->null_flag = 1;
    return true;
}

constexpr attribute_rule rules[] = {
    {"xsi:type", ANY_VERSION,
     [](soap *ctx, const char *value) { return keep_text(ctx->element_type, value), true; }},
    {"xsi:null", ANY_VERSION, apply_nil},
    {"xsi:nil", ANY_VERSION, apply_nil},
    {"SOAP-ENC:arrayType", SOAP_1_1,
     [](soap *ctx, const char *value) { return keep_array_type(ctx, value), true; }},
    {"SOAP-ENC:offset", SOAP_1_1,
     [](soap *ctx, const char *value) { return keep_text(ctx->array_offset, value), true; }},
    {"SOAP-ENC:position", SOAP_1_1,
     [](soap *ctx, const char *value) {
         ctx->position_count = static_cast<std::int16_t>(soap_position_parse(value, ctx->positions));
         return true;
     }},
    {"SOAP-ENC:root", SOAP_1_1,
     [](soap *ctx, const char *value) {
         ctx->root_flag = is_true(value) ? 1 : 0;
         return true;
     }},
    {"SOAP-ENV:mustUnderstand", SOAP_1_1 | SOAP_1_2,
     [](soap *ctx, const char *value) {
         if (is_true(value))
             ctx->must_understand = 1;
         return true;
     }},
    {"SOAP-ENV:actor", SOAP_1_1,
     [](soap *ctx, const char *value) { return check_actor(ctx, value, NEXT_ACTOR), true; }},
    {"SOAP-ENC:ref", SOAP_1_2,
     [](soap *ctx, const char *value) { return keep_reference(ctx->element_href, value), true; }},
    {"SOAP-ENC:itemType", SOAP_1_2,
     [](soap *ctx, const char *value) { return keep_text(ctx->array_type, value), true; }},
    {"SOAP-ENC:arraySize", SOAP_1_2,
     [](soap *ctx, const char *value) { return keep_text(ctx->array_size, value), true; }},
    {"SOAP-ENV:role", SOAP_1_2,
     [](soap *ctx, const char *value) { return check_actor(ctx, value, NEXT_ROLE), true; }},
    {"wsdl:required", NO_VERSION,
     [](soap *ctx, const char *value) {
         if (std::strcmp(value, "true") == 0)
             ctx->must_understand = 1;
         return true;
     }},
};

// By first letter: bit n tells that some name which is understood has a local part of n bytes.
constexpr std::size_t LETTERS = 32;
constexpr auto KNOWN_LENGTHS = [] {
    std::array<std::uint32_t, LETTERS> lengths{};
    const auto add = [&lengths](std::string_view local) {
        lengths[static_cast<unsigned char>(local[0]) % LETTERS] |= 1U << local.size();
    };
    for (const std::string_view plain : {"id", "href", "ref"})
        add(plain);
    for (const attribute_rule &rule : rules)
        add(rule.local);
    return lengths;
}();

bool may_be_known(std::string_view local)
{
    return !local.empty() && local.size() < 32 &&
           (KNOWN_LENGTHS[static_cast<unsigned char>(local[0]) % LETTERS] >> local.size() & 1) != 0;
}

void apply_attribute(soap *ctx, const soap_attribute *record)
{
    const std::string_view name = xml_attribute_name(record);
    const std::string_view local = xml_local_part(name);
    if (!may_be_known(local))
        return;
    const bool prefixed = local.size() != name.size();
    if (prefixed ? declared_prefix(record) != nullptr : apply_plain(ctx, name, record->value))
        return;
    const int version = 1 << ctx->soap_version;
    for (const attribute_rule &rule : rules) {
        if (rule.local == local && (rule.versions & version) != 0 &&
            soap_tag_compare(ctx, record->name, rule.name) == 0 && rule.apply(ctx, record->value))
            return;
    }
}

} // namespace

int xml_attributes_read(soap *ctx)
{
    if (ctx->attribute_list != nullptr)
        xml_attributes_hide(ctx);
    attribute_order order(ctx);
    for (int count = 0;; ++count) {
        const std::int32_t byte = input_skip_blanks(ctx);
        if (byte == XML_EOF || byte == '>' || byte == '/')
            return 0;
        const int error = count < SOAP_ATTRIBUTES_MAX ? read_attribute(ctx, order) : SOAP_SYNTAX_ERROR;
        if (error != 0)
            return error;
    }
}

void xml_attributes_apply(soap *ctx)
{
    for (const soap_attribute *p = ctx->attribute_list; p != nullptr; p = p->next) {
        if (p->visible == 2 && p->value != nullptr)
            apply_attribute(ctx, p);
    }
    ctx->error = 0;
}

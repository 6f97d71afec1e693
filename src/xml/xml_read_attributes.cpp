// xml_read_attributes.cpp - attributes of a start tag: read into the reusable records, then understood.
//
// Here: the attribute loop, values of any size, and the attributes of SOAP and XSI. Elsewhere: the records
// themselves (attributes.cpp), the tag (xml_read.cpp), the prefix stack (namespace_prefix.cpp).
//
// Always: an attribute costs the same however many the element has. The declarations of an element that has no
// other attributes are on the prefix stack alone; records are made of them when its attributes are asked for.
#include <algorithm>
#include <array>
#include <climits>
#include <cstring>
#include <string_view>
#include <utility>

#include <zuv_client_pro/soap_error.h>
#include <zuv_client_pro/soap_primitive.h>

#include "xml/attributes.h"
#include "xml/namespace.h"
#include "xml/scan.h"
#include "xml/xml_read.h"

namespace {

constexpr std::size_t VALUE_BYTES_MIN = 64;

constexpr char NEXT_ACTOR[] = "http://schemas.xmlsoap.org/soap/actor/next";
constexpr char NEXT_ROLE[] = "http://www.w3.org/2003/05/soap-envelope/role/next";

// ------------------------------------------------------------------------------------------ records

// Where the attributes of an element go in the list: plain names and declarations come first, so that they
// are understood first.
struct attribute_order {
    soap *ctx;
    soap_attribute **end; // after the last one

    explicit attribute_order(soap *context) : ctx(context), end(&context->attribute_list)
    {
        while (*end != nullptr)
            end = &(*end)->next;
    }

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
    if (record->size <= length &&
        xml_attribute_reserve(ctx, record, std::max(length + 1, VALUE_BYTES_MIN)) != 0)
        return ctx->error;
    std::memcpy(record->value, text, length);
    record->value[length] = '\0';
    record->visible = 2;
    return SOAP_OK;
}

// ------------------------------------------------------------------------------------------ values

// A byte that a value continues after, but not unchanged.
bool is_special(char c)
{
    return c == '&' || is_high(c) || is_control(c);
}

// A reference, the start of a character to decode, or a control character, as UTF-8.
int gather_special(soap *ctx)
{
    std::int32_t token;
    if (*input_here(ctx) == '&') {
        ctx->buffer_index++;
        token = soap_entity_read(ctx);
    } else {
        token = text_token(ctx);
    }
    if (token == XML_EOF)
        return SOAP_EOF;
    char bytes[6];
    return text_put(ctx, bytes, utf8_encode(token_code(token), bytes));
}

// The end of what may be taken unchanged as UTF-8.
template <template <bool> class Stop>
const char *value_end(const soap *ctx, const char *here, const char *end)
{
    const char *const stop = Stop<true>::find(here, end);
    const bool is_utf8 = (ctx->mode & BYTE_MODES) == MODE_UTF_STRINGS;
    return is_utf8 && stop != end && is_high(*stop) ? utf8_stretch_end<Stop>(stop, end) : stop;
}

// Gathers a value in the growing text, over refills and references, up to a byte of Stop that is no special
// one.
template <template <bool> class Stop> int gather_value(soap *ctx)
{
    for (;;) {
        if (!input_ready(ctx))
            return SOAP_EOF;
        const char *here = input_here(ctx);
        const char *stop = value_end<Stop>(ctx, here, input_end(ctx));
        if (text_put(ctx, here, static_cast<std::size_t>(stop - here)) != 0)
            return ctx->error;
        input_consume(ctx, stop);
        if (stop == input_end(ctx))
            continue;
        if (!is_special(*stop))
            return SOAP_OK;
        const int error = gather_special(ctx);
        if (error != 0)
            return error;
    }
}

// Values of these names are names themselves, which stay UTF-8 until their prefixes have been looked up.
bool holds_name(const soap_attribute *record)
{
    const std::string_view local = xml_local_part(xml_attribute_name(record));
    return local == "type" || local == "arrayType" || local == "itemType";
}

// Makes a value of UTF-8 one of Latin-1.
void narrow_value(soap_attribute *record)
{
    record->value[utf8_to_latin1(record->value, std::strlen(record->value))] = '\0';
}

// A value that is whole and plain in the buffer is copied once; any other is gathered first. `names_wide`
// is set if that leaves a name that is UTF-8 where strings are Latin-1.
template <template <bool> class Stop> int read_value(soap *ctx, soap_attribute *record, bool *names_wide)
{
    const char *here = input_here(ctx);
    const char *stop = value_end<Stop>(ctx, here, input_end(ctx));
    if (stop != input_end(ctx) && !is_special(*stop)) {
        input_consume(ctx, stop);
        return store_value(ctx, record, here, static_cast<std::size_t>(stop - here));
    }
    ctx->label_index = 0;
    int error = gather_value<Stop>(ctx);
    if (error == 0)
        error = store_value(ctx, record, ctx->label_index != 0 ? ctx->label_buffer : "", ctx->label_index);
    if (error != 0 || (ctx->mode & MODE_UTF_STRINGS) != 0)
        return error;
    if (holds_name(record))
        *names_wide = true;
    else
        narrow_value(record);
    return SOAP_OK;
}

int read_quoted(soap *ctx, soap_attribute *record, char quote, bool *names_wide)
{
    ctx->buffer_index++;
    if (!input_ready(ctx))
        return SOAP_EOF;
    const int error = quote == '"' ? read_value<quoted_stop>(ctx, record, names_wide)
                                   : read_value<apos_stop>(ctx, record, names_wide);
    if (error == 0)
        ctx->buffer_index++;
    return error;
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

// A declaration that is whole in the buffer, as plain ASCII in quotes.
struct plain_declaration {
    const char *prefix, *prefix_end, *uri, *uri_end;
};

bool find_declaration(const char *here, const char *end, plain_declaration &found)
{
    constexpr std::string_view key = "xmlns";
    if (end - here <= static_cast<std::ptrdiff_t>(key.size()) || !same_name(here, key.data(), key.size()))
        return false;
    const bool named = here[key.size()] == ':';
    found.prefix = here + key.size() + (named ? 1 : 0);
    found.prefix_end = named ? attribute_name_stop<true>::find(found.prefix, end) : found.prefix;
    if (end - found.prefix_end < 3 || found.prefix_end[0] != '=' ||
        (named && found.prefix == found.prefix_end) ||
        found.prefix_end - here >= static_cast<std::ptrdiff_t>(SOAP_TEXT_SIZE))
        return false;
    const char quote = found.prefix_end[1];
    if (quote != '"' && quote != '\'')
        return false;
    found.uri = found.prefix_end + 2;
    found.uri_end =
        quote == '"' ? quoted_stop<true>::find(found.uri, end) : apos_stop<true>::find(found.uri, end);
    return found.uri_end != end && *found.uri_end == quote;
}

// Takes the declarations that come first of all attributes. 0, 20 or 47; `count` rises with each.
int take_declarations(soap *ctx, int &count)
{
    for (plain_declaration found; count < SOAP_ATTRIBUTES_MAX; ++count) {
        const char *here = input_here(ctx);
        while (here != input_end(ctx) && is_blank(static_cast<unsigned char>(*here)))
            ++here;
        if (!find_declaration(here, input_end(ctx), found))
            return SOAP_OK;
        char &end = ctx->buffer[found.uri_end - ctx->buffer];
        const char quote = std::exchange(end, '\0');
        const soap_prefix *record =
            xml_prefix_declare(ctx, {found.prefix, static_cast<std::size_t>(found.prefix_end - found.prefix)},
                               {found.uri, static_cast<std::size_t>(found.uri_end - found.uri)});
        end = quote;
        if (record == nullptr)
            return ctx->error;
        input_consume(ctx, found.uri_end + 1);
        ++ctx->bare_declarations;
    }
    return SOAP_OK;
}

// The end of the tag comes next and is in the buffer.
bool ends_in_buffer(const soap *ctx)
{
    const char *here = input_here(ctx), *const end = input_end(ctx);
    while (here != end && is_blank(static_cast<unsigned char>(*here)))
        ++here;
    return here != end && (*here == '>' || (end - here >= 2 && here[0] == '/' && here[1] == '>'));
}

// Makes attributes of the declarations that have none yet. 0 or 20.
int show_declarations(soap *ctx, attribute_order &order)
{
    const soap_prefix *records[SOAP_ATTRIBUTES_MAX]; // innermost last
    std::size_t left = ctx->bare_declarations;
    const soap_prefix *record = ctx->prefix_list;
    for (std::size_t i = left; i > 0; record = record->next)
        records[--i] = record;
    for (const soap_prefix *const *next = records; left > 0; --left) {
        record = *next++;
        char name[sizeof "xmlns:" + SOAP_TEXT_SIZE] = "xmlns";
        const std::size_t prefix = record->prefix_length;
        name[5] = ':';
        std::memcpy(name + 6, record->prefix, prefix);
        soap_attribute *shown = xml_attribute_record(ctx, {name, prefix != 0 ? prefix + 6 : 5});
        if (shown == nullptr)
            return ctx->error;
        if (shown->visible == 0)
            order.put(shown);
        const char *uri =
            record->uri != nullptr ? record->uri : xml_row_uri(ctx->local_namespaces[record->index]);
        if (store_value(ctx, shown, uri, std::strlen(uri)) != 0)
            return ctx->error;
    }
    ctx->bare_declarations = 0;
    ctx->attributes_set = 1;
    return SOAP_OK;
}

int read_attribute(soap *ctx, attribute_order &order, bool *names_wide)
{
    char *name = ctx->scratch_text;
    const std::size_t length = xml_name_read<attribute_name_stop>(ctx, name);
    if (length == 0)
        return xml_is_refused(ctx) ? ctx->error : static_cast<int>(SOAP_SYNTAX_ERROR);
    soap_attribute *record = xml_attribute_record(ctx, {name, length});
    if (record == nullptr)
        return ctx->error;
    ctx->attributes_set = 1;
    if (record->visible == 0)
        order.put(record);
    record->visible = 1; // the last of one name counts
    if (input_skip_blanks(ctx) != '=')
        return SOAP_OK;
    ctx->buffer_index++;
    const std::int32_t first = input_skip_blanks(ctx);
    if (first == XML_EOF)
        return SOAP_EOF;
    const bool is_quoted = first == '"' || first == '\'';
    const int error = is_quoted ? read_quoted(ctx, record, static_cast<char>(first), names_wide)
                                : read_value<unquoted_stop>(ctx, record, names_wide);
    if (error != 0)
        return error;
    const char *prefix = declared_prefix(record);
    if (prefix == nullptr)
        return SOAP_OK;
    return soap_prefix_push_in(ctx, prefix, record->value) != nullptr ? 0 : ctx->error;
}

// ------------------------------------------------------------------------------------------ meaning

bool is_true(std::string_view value)
{
    return value == "1" || value == "true";
}

// Copies what fits a text buffer of the context, from its first `used` bytes on.
void keep_text(char *target, std::string_view text, std::size_t used = 0)
{
    std::size_t length = text.size();
    if (length > SOAP_TEXT_SIZE - 1 - used)
        length = utf8_whole(text.data(), SOAP_TEXT_SIZE - 1 - used);
    std::memcpy(target + used, text.data(), length);
    target[used + length] = '\0';
}

// "#" and a name, as references are entered in the id table.
void keep_reference(char *target, std::string_view name)
{
    target[0] = '#';
    keep_text(target, name, 1);
}

void keep_array_type(soap *ctx, std::string_view value)
{
    const std::size_t bracket = value.rfind('[');
    if (bracket > SOAP_TEXT_SIZE - 1) { // none, too
        keep_text(ctx->array_type, value);
        return;
    }
    keep_text(ctx->array_type, value.substr(0, bracket));
    keep_text(ctx->array_size, value.substr(bracket));
}

// The element is for another actor unless it names this receiver or whoever comes next.
void check_actor(soap *ctx, std::string_view value, const char *next)
{
    const bool own = ctx->actor != nullptr && value == ctx->actor;
    if (!own && value != next)
        ctx->other_flag = 1;
}

// An attribute without a prefix that is known by its plain name.
bool apply_plain(soap *ctx, std::string_view name, std::string_view value)
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
using attribute_action = bool (*)(soap *ctx, std::string_view value);

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

bool apply_nil(soap *ctx, std::string_view value)
{
    if (!is_true(value))
        return false;
    ctx->null_flag = 1;
    return true;
}

constexpr attribute_rule rules[] = {
    {"xsi:type", ANY_VERSION,
     [](soap *ctx, std::string_view value) { return keep_text(ctx->element_type, value), true; }},
    {"xsi:null", ANY_VERSION, apply_nil},
    {"xsi:nil", ANY_VERSION, apply_nil},
    {"SOAP-ENC:arrayType", SOAP_1_1,
     [](soap *ctx, std::string_view value) { return keep_array_type(ctx, value), true; }},
    {"SOAP-ENC:offset", SOAP_1_1,
     [](soap *ctx, std::string_view value) { return keep_text(ctx->array_offset, value), true; }},
    {"SOAP-ENC:position", SOAP_1_1,
     [](soap *ctx, std::string_view value) {
         ctx->position_count = static_cast<std::int16_t>(soap_position_parse(value.data(), ctx->positions));
         return true;
     }},
    {"SOAP-ENC:root", SOAP_1_1,
     [](soap *ctx, std::string_view value) {
         ctx->root_flag = is_true(value) ? 1 : 0;
         return true;
     }},
    {"SOAP-ENV:mustUnderstand", SOAP_1_1 | SOAP_1_2,
     [](soap *ctx, std::string_view value) {
         if (is_true(value))
             ctx->must_understand = 1;
         return true;
     }},
    {"SOAP-ENV:actor", SOAP_1_1,
     [](soap *ctx, std::string_view value) { return check_actor(ctx, value, NEXT_ACTOR), true; }},
    {"SOAP-ENC:ref", SOAP_1_2,
     [](soap *ctx, std::string_view value) { return keep_reference(ctx->element_href, value), true; }},
    {"SOAP-ENC:itemType", SOAP_1_2,
     [](soap *ctx, std::string_view value) { return keep_text(ctx->array_type, value), true; }},
    {"SOAP-ENC:arraySize", SOAP_1_2,
     [](soap *ctx, std::string_view value) { return keep_text(ctx->array_size, value), true; }},
    {"SOAP-ENV:role", SOAP_1_2,
     [](soap *ctx, std::string_view value) { return check_actor(ctx, value, NEXT_ROLE), true; }},
    {"wsdl:required", NO_VERSION,
     [](soap *ctx, std::string_view value) {
         if (value == "true")
             ctx->must_understand = 1;
         return true;
     }},
};

// The types of these values leave white space around them out of account.
std::string_view without_blanks(std::string_view value)
{
    while (!value.empty() && is_blank(static_cast<unsigned char>(value.front())))
        value.remove_prefix(1);
    while (!value.empty() && is_blank(static_cast<unsigned char>(value.back())))
        value.remove_suffix(1);
    return value;
}

// By first letter: bit n means that some name which is understood has a local part of n bytes.
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
    const std::string_view value = without_blanks(record->value);
    if (prefixed ? declared_prefix(record) != nullptr : apply_plain(ctx, name, value))
        return;
    const int version = 1 << ctx->soap_version;
    for (const attribute_rule &rule : rules) {
        if (rule.local == local && (rule.versions & version) != 0 &&
            soap_tag_compare(ctx, record->name, rule.name) == 0 && rule.apply(ctx, value))
            return;
    }
}

} // namespace

int xml_attributes_read(soap *ctx, bool *names_wide, bool *all_taken)
{
    if (ctx->attribute_list != nullptr)
        xml_attributes_hide(ctx);
    int count = 0;
    if (take_declarations(ctx, count) != 0)
        return ctx->error;
    *all_taken = count != 0 && ctx->attributes_set == 0 && ends_in_buffer(ctx);
    attribute_order order(ctx);
    for (;; ++count) {
        const std::int32_t byte = input_skip_blanks(ctx);
        if (byte == XML_EOF || byte == '>' || byte == '/')
            return SOAP_OK;
        int error = count < SOAP_ATTRIBUTES_MAX ? 0 : SOAP_SYNTAX_ERROR;
        if (error == 0 && ctx->bare_declarations != 0)
            error = show_declarations(ctx, order);
        if (error == 0)
            error = read_attribute(ctx, order, names_wide);
        if (error != 0)
            return error;
    }
}

int xml_attributes_complete(soap *ctx)
{
    if (ctx->bare_declarations == 0)
        return SOAP_OK;
    attribute_order order(ctx);
    return show_declarations(ctx, order);
}

void xml_attributes_apply(soap *ctx, bool names_wide)
{
    for (soap_attribute *p = ctx->attribute_list; p != nullptr; p = p->next) {
        if (p->visible != 2 || p->value == nullptr)
            continue;
        apply_attribute(ctx, p);
        if (names_wide && holds_name(p))
            narrow_value(p);
    }
    ctx->error = 0;
}

int soap_position_parse(const char *text, int *numbers)
{
    int count = 0;
    if (text == nullptr || *text != '[')
        return 0;
    for (const char *at = text + 1; at != nullptr && count < static_cast<int>(SOAP_POSITIONS_MAX);
         at = after_separator(at)) {
        const scanned_integer number = scan_integer(at);
        if (!number.digits || number.as_signed() < INT_MIN || number.as_signed() > INT_MAX)
            break;
        numbers[count++] = static_cast<int>(number.as_signed());
        at = number.end;
    }
    return count;
}

// simple_element.cpp - numbers and times as elements: one form of reader and one of writer for all of them.
//
// Elsewhere: text to values (number.cpp, datetime.cpp), texts, enumerations and booleans (the binding).

#include "values/values.h"

#include <initializer_list>

#include <zuv_client_pro/soap_error.h>
#include <zuv_client_pro/soap_identity.h>
#include <zuv_client_pro/soap_primitive.h>
#include <zuv_client_pro/soap_xml.h>

#include "core/failure.h"
#include "xml/namespace.h"

bool type_says_nothing(soap *ctx)
{
    const char *const type = ctx->element_type;
    if (*type == '\0')
        return false;
    const std::size_t prefix = xml_prefix_of(type).size(); // 0: the default namespace
    const int error_before = ctx->error;
    const bool known = soap_prefix_compare(ctx, type, "xsd", prefix, 3) == 0 ||
                       soap_prefix_compare(ctx, type, "SOAP-ENC", prefix, 8) == 0;
    ctx->error = error_before;
    return known;
}

int type_accept(soap *ctx, const char *type, const char *const *also)
{
    const char *received = ctx->element_type;
    if (*received == '\0' || type == nullptr)
        return SOAP_OK;
    const int error_before = ctx->error;
    bool accepted = soap_tag_compare(ctx, received, type) == 0;
    for (; !accepted && also != nullptr && *also != nullptr; also++)
        accepted = soap_tag_compare(ctx, received, *also) == 0;
    if (accepted) {
        ctx->error = error_before;
        return SOAP_OK;
    }
    soap_tag_unread(ctx);
    fail(ctx, SOAP_TYPE_MISMATCH);
    return -1;
}

int soap_float_type_check(soap *ctx, const char *type)
{
    static constexpr const char *ALSO[] = {":float",
                                           ":double",
                                           ":decimal",
                                           ":integer",
                                           ":positiveInteger",
                                           ":negativeInteger",
                                           ":nonPositiveInteger",
                                           ":nonNegativeInteger",
                                           ":long",
                                           ":int",
                                           ":short",
                                           ":byte",
                                           ":unsignedLong",
                                           ":unsignedInt",
                                           ":unsignedShort",
                                           ":unsignedByte",
                                           nullptr};
    return type_accept(ctx, type, ALSO);
}

int soap_array_type_check(soap *ctx, const char *type)
{
    if (ctx->array_type[0] == '\0')
        return SOAP_OK;
    const int error_before = ctx->error;
    for (const char *accepted : {type, "xsd:anyType", "xsd:ur-type"}) {
        if (soap_tag_compare(ctx, ctx->array_type, accepted) == 0) {
            ctx->error = error_before;
            return SOAP_OK;
        }
    }
    return fail(ctx, SOAP_TAG_MISMATCH);
}

namespace {

// Types that a reader accepts besides its own; a null ends each list.
constexpr const char *OF_DATETIME[] = {":dateTime", nullptr};
constexpr const char *OF_SHORT[] = {":short", ":byte", nullptr};
constexpr const char *OF_LONG[] = {":int", ":short", ":byte", nullptr};
constexpr const char *OF_LONG64[] = {":integer",
                                     ":positiveInteger",
                                     ":negativeInteger",
                                     ":nonPositiveInteger",
                                     ":nonNegativeInteger",
                                     ":long",
                                     ":int",
                                     ":short",
                                     ":byte",
                                     nullptr};
constexpr const char *OF_USHORT[] = {":unsignedShort", ":unsignedByte", nullptr};
constexpr const char *OF_ULONG[] = {":unsignedInt", ":unsignedShort", ":unsignedByte", nullptr};
constexpr const char *OF_ULONG64[] = {
    ":positiveInteger", ":nonNegativeInteger", ":unsignedLong", ":unsignedInt",
    ":unsignedShort",   ":unsignedByte",       nullptr};

template <class Value> using parser = int (*)(soap *, const char *, Value *);

// The value of the element just begun, or the place where its reference will put it. `size` of a reference is
// that of the type, so that a reference to another width is refused.
template <class Value> Value *read_value(soap *ctx, Value *place, int type_id, parser<Value> parse)
{
    place = static_cast<Value *>(soap_object_register(ctx, ctx->element_id, place, type_id, sizeof(Value), 0,
                                                      ctx->element_type, ctx->array_type, nullptr));
    if (place == nullptr)
        return nullptr;
    if (ctx->element_href[0] != '\0')
        return static_cast<Value *>(
            soap_object_forward(ctx, ctx->element_href, place, 0, type_id, 0, sizeof(Value), 0, nullptr));
    const char *text = soap_simple_value_read(ctx);
    return text != nullptr && parse(ctx, text, place) == SOAP_OK ? place : nullptr;
}

template <class Value>
Value *end_value(soap *ctx, const char *tag, Value *place, int type_id, parser<Value> parse)
{
    const bool body = ctx->has_body != 0;
    place = read_value(ctx, place, type_id, parse);
    return place != nullptr && body && soap_element_in_end(ctx, tag) ? nullptr : place;
}

template <class Value>
Value *read_simple(soap *ctx, const char *tag, Value *place, const char *type, int type_id,
                   parser<Value> parse, const char *const *also)
{
    if (soap_element_in_begin(ctx, tag, 0, nullptr) || type_accept(ctx, type, also))
        return nullptr;
    return end_value(ctx, tag, place, type_id, parse);
}

template <class Value>
Value *read_floating(soap *ctx, const char *tag, Value *place, const char *type, int type_id,
                     parser<Value> parse)
{
    if (soap_element_in_begin(ctx, tag, 0, nullptr) || soap_float_type_check(ctx, type))
        return nullptr;
    return end_value(ctx, tag, place, type_id, parse);
}

template <class Value, class Text>
int write_simple(soap *ctx, const char *tag, int id, const Value *place, const char *type, int type_id,
                 Text text)
{
    if (soap_element_out_begin(ctx, tag, soap_element_id(ctx, id, place, type_id), type) ||
        soap_text_write(ctx, text(ctx, *place), 0))
        return ctx->error;
    return soap_element_out_end(ctx, tag);
}

} // namespace

std::int8_t *soap_byte_in(soap *ctx, const char *tag, std::int8_t *place, const char *type, int type_id)
{
    return read_simple<std::int8_t>(ctx, tag, place, type, type_id, soap_byte_parse, nullptr);
}

std::int16_t *soap_short_in(soap *ctx, const char *tag, std::int16_t *place, const char *type, int type_id)
{
    return read_simple<std::int16_t>(ctx, tag, place, type, type_id, soap_short_parse, OF_SHORT);
}

std::int32_t *soap_int_in(soap *ctx, const char *tag, std::int32_t *place, const char *type, int type_id)
{
    return read_simple<std::int32_t>(ctx, tag, place, type, type_id, soap_int_parse, nullptr);
}

std::int64_t *soap_long_in(soap *ctx, const char *tag, std::int64_t *place, const char *type, int type_id)
{
    return read_simple<std::int64_t>(ctx, tag, place, type, type_id, soap_long_parse, OF_LONG);
}

std::int64_t *soap_long64_in(soap *ctx, const char *tag, std::int64_t *place, const char *type, int type_id)
{
    return read_simple<std::int64_t>(ctx, tag, place, type, type_id, soap_long64_parse, OF_LONG64);
}

std::uint8_t *soap_ubyte_in(soap *ctx, const char *tag, std::uint8_t *place, const char *type, int type_id)
{
    return read_simple<std::uint8_t>(ctx, tag, place, type, type_id, soap_ubyte_parse, nullptr);
}

std::uint16_t *soap_ushort_in(soap *ctx, const char *tag, std::uint16_t *place, const char *type, int type_id)
{
    return read_simple<std::uint16_t>(ctx, tag, place, type, type_id, soap_ushort_parse, OF_USHORT);
}

std::uint32_t *soap_uint_in(soap *ctx, const char *tag, std::uint32_t *place, const char *type, int type_id)
{
    return read_simple<std::uint32_t>(ctx, tag, place, type, type_id, soap_uint_parse, nullptr);
}

std::uint64_t *soap_ulong_in(soap *ctx, const char *tag, std::uint64_t *place, const char *type, int type_id)
{
    return read_simple<std::uint64_t>(ctx, tag, place, type, type_id, soap_ulong_parse, OF_ULONG);
}

std::uint64_t *soap_ulong64_in(soap *ctx, const char *tag, std::uint64_t *place, const char *type,
                               int type_id)
{
    return read_simple<std::uint64_t>(ctx, tag, place, type, type_id, soap_ulong64_parse, OF_ULONG64);
}

std::time_t *soap_datetime_in(soap *ctx, const char *tag, std::time_t *place, const char *type, int type_id)
{
    return read_simple<std::time_t>(ctx, tag, place, type, type_id, soap_datetime_parse, OF_DATETIME);
}

float *soap_float_in(soap *ctx, const char *tag, float *place, const char *type, int type_id)
{
    return read_floating<float>(ctx, tag, place, type, type_id, soap_float_parse);
}

double *soap_double_in(soap *ctx, const char *tag, double *place, const char *type, int type_id)
{
    return read_floating<double>(ctx, tag, place, type, type_id, soap_double_parse);
}

int soap_byte_out(soap *ctx, const char *tag, int id, const std::int8_t *place, const char *type, int type_id)
{
    return write_simple(ctx, tag, id, place, type, type_id, soap_long_text);
}

int soap_short_out(soap *ctx, const char *tag, int id, const std::int16_t *place, const char *type,
                   int type_id)
{
    return write_simple(ctx, tag, id, place, type, type_id, soap_long_text);
}

int soap_int_out(soap *ctx, const char *tag, int id, const std::int32_t *place, const char *type, int type_id)
{
    return write_simple(ctx, tag, id, place, type, type_id, soap_long_text);
}

int soap_long_out(soap *ctx, const char *tag, int id, const std::int64_t *place, const char *type,
                  int type_id)
{
    return write_simple(ctx, tag, id, place, type, type_id, soap_long_text);
}

int soap_ubyte_out(soap *ctx, const char *tag, int id, const std::uint8_t *place, const char *type,
                   int type_id)
{
    return write_simple(ctx, tag, id, place, type, type_id, soap_ulong_text);
}

int soap_ushort_out(soap *ctx, const char *tag, int id, const std::uint16_t *place, const char *type,
                    int type_id)
{
    return write_simple(ctx, tag, id, place, type, type_id, soap_ulong_text);
}

int soap_uint_out(soap *ctx, const char *tag, int id, const std::uint32_t *place, const char *type,
                  int type_id)
{
    return write_simple(ctx, tag, id, place, type, type_id, soap_ulong_text);
}

int soap_ulong_out(soap *ctx, const char *tag, int id, const std::uint64_t *place, const char *type,
                   int type_id)
{
    return write_simple(ctx, tag, id, place, type, type_id, soap_ulong_text);
}

int soap_float_out(soap *ctx, const char *tag, int id, const float *place, const char *type, int type_id)
{
    return write_simple(ctx, tag, id, place, type, type_id, soap_float_text);
}

int soap_double_out(soap *ctx, const char *tag, int id, const double *place, const char *type, int type_id)
{
    return write_simple(ctx, tag, id, place, type, type_id, soap_double_text);
}

int soap_datetime_out(soap *ctx, const char *tag, int id, const std::time_t *place, const char *type,
                      int type_id)
{
    return write_simple(ctx, tag, id, place, type, type_id, soap_datetime_text);
}

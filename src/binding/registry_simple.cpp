// registry_simple.cpp - the simple types as dispatch by type id sees them.
#include <zuv_client_pro/soap_identity.h>
#include <zuv_client_pro/soap_memory.h>
#include <zuv_client_pro/soap_primitive.h>

#include "binding/member_read.h"
#include "binding/member_write.h"
#include "binding/registry.h"

namespace binding {

namespace {

constexpr int INT_ID = 1, BYTE_ID = 3, UNSIGNED_INT_ID = 11, UNSIGNED_BYTE_ID = 12, BOOLEAN_ID = 13,
              DOUBLE_ID = 14;

template <class V, V *(*In)(soap *, const char *, V *, const char *, int), int Id>
void *number_in(soap *ctx, const char *tag, void *place, const char *type)
{
    return In(ctx, tag, static_cast<V *>(place), type, Id);
}

template <class V, int (*Out)(soap *, const char *, int, const V *, const char *, int), int Id>
int number_out(soap *ctx, const char *tag, int id, const void *place, const char *type)
{
    return Out(ctx, tag, id, static_cast<const V *>(place), type, Id);
}

void *boolean_in(soap *ctx, const char *tag, void *place, const char *)
{
    auto *value = static_cast<bool *>(place != nullptr ? place : soap_block_alloc(ctx, sizeof(bool)));
    if (value == nullptr)
        return nullptr;
    if (place == nullptr)
        *value = false;
    return read_boolean_value(ctx, tag, value) ? value : nullptr;
}

int boolean_out(soap *ctx, const char *tag, int id, const void *place, const char *type)
{
    return write_boolean(ctx, tag, soap_element_id(ctx, id, place, BOOLEAN_ID),
                         static_cast<const bool *>(place), type);
}

} // namespace

const simple_ops simple_int = {INT_ID, "xsd:int", sizeof(std::int32_t),
                               &number_in<std::int32_t, soap_int_in, INT_ID>,
                               &number_out<std::int32_t, soap_int_out, INT_ID>};
const simple_ops simple_byte = {BYTE_ID, "xsd:byte", sizeof(std::int8_t),
                                &number_in<std::int8_t, soap_byte_in, BYTE_ID>,
                                &number_out<std::int8_t, soap_byte_out, BYTE_ID>};
const simple_ops simple_unsigned_int = {UNSIGNED_INT_ID, "xsd:unsignedInt", sizeof(std::uint32_t),
                                        &number_in<std::uint32_t, soap_uint_in, UNSIGNED_INT_ID>,
                                        &number_out<std::uint32_t, soap_uint_out, UNSIGNED_INT_ID>};
const simple_ops simple_unsigned_byte = {UNSIGNED_BYTE_ID, "xsd:unsignedByte", sizeof(std::uint8_t),
                                         &number_in<std::uint8_t, soap_ubyte_in, UNSIGNED_BYTE_ID>,
                                         &number_out<std::uint8_t, soap_ubyte_out, UNSIGNED_BYTE_ID>};
const simple_ops simple_boolean = {BOOLEAN_ID, "xsd:boolean", sizeof(bool), &boolean_in, &boolean_out};
const simple_ops simple_double = {DOUBLE_ID, "xsd:double", sizeof(double),
                                  &number_in<double, soap_double_in, DOUBLE_ID>,
                                  &number_out<double, soap_double_out, DOUBLE_ID>};

} // namespace binding

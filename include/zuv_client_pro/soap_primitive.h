// soap_primitive.h - simple values: text to numbers, times, bytes and back, and the type checks on reading
// them.
#pragma once

#include <ctime>

#include <zuv_client_pro/soap.h>

// Row of a table of names; a table ends with a row whose name is null.
struct soap_code_row {
    std::int64_t code;
    const char *name;
};

// ---------------------------------------------------------------------------------------------
// Numbers and times.

// Parsers, one for each type. White space and a sign may stand ahead of the digits; nothing may follow them.
//   0         the target holds the value
//   error 4   the text is no such number or is out of the type's range; the target holds what the C library
//   made of
//             it, cut to its width (soap_long64_parse and soap_ulong64_parse: it is unchanged)
// A null text leaves the target as it is and returns ctx->error, which tells why soap_attr_get found none.
// Beyond the type's own range: soap_uint_parse and soap_ulong_parse wrap a negative number and, unless
// reading is strict, take the empty text as 0; soap_long64_parse and soap_ulong64_parse ignore what follows
// the digits and take the nearest value for a number too large.
ZUV_API int soap_byte_parse(soap *ctx, const char *text, std::int8_t *target);
ZUV_API int soap_short_parse(soap *ctx, const char *text, std::int16_t *target);
ZUV_API int soap_int_parse(soap *ctx, const char *text, std::int32_t *target);
ZUV_API int soap_long_parse(soap *ctx, const char *text, std::int64_t *target);
ZUV_API int soap_long64_parse(soap *ctx, const char *text, std::int64_t *target);
ZUV_API int soap_ubyte_parse(soap *ctx, const char *text, std::uint8_t *target);
ZUV_API int soap_ushort_parse(soap *ctx, const char *text, std::uint16_t *target);
ZUV_API int soap_uint_parse(soap *ctx, const char *text, std::uint32_t *target);
ZUV_API int soap_ulong_parse(soap *ctx, const char *text, std::uint64_t *target);
ZUV_API int soap_ulong64_parse(soap *ctx, const char *text, std::uint64_t *target);
// As above for what strtod takes, and for "INF", "-INF" and "NaN" in any case. Where a number stands at the
// start, text behind it is ignored.
ZUV_API int soap_float_parse(soap *ctx, const char *text, float *target);
ZUV_API int soap_double_parse(soap *ctx, const char *text, double *target);

// Reads "2009-01-31T23:59:59", or the forms without "-" or without both "-" and ":", with any fraction
// (dropped) and a zone "Z", "+hh:mm" or "+hhmm". Without a zone the time is local time. Year 1 is read as
// 1970. `target` is in seconds since 1970, -1 for a time that time_t can't hold. 0, or error 4 with the
// target unchanged.
ZUV_API int soap_datetime_parse(soap *ctx, const char *text, std::time_t *target);

// Texts: in scratch_text or constant, valid until its next use. Floating values go through float_format and
// double_format, with a decimal comma made a point; the others have the forms "NaN", "INF", "-INF".
ZUV_API const char *soap_long_text(soap *ctx, std::int64_t value);
ZUV_API const char *soap_ulong_text(soap *ctx, std::uint64_t value);
ZUV_API const char *soap_float_text(soap *ctx, float value);
ZUV_API const char *soap_double_text(soap *ctx, double value);
// UTC with "Z"; "1969-12-31T23:59:59Z" for a time with no calendar date.
ZUV_API const char *soap_datetime_text(soap *ctx, std::time_t seconds);
// Seconds since 1970 of a broken-down UTC time, whose fields are brought to their ranges; -1 if it has none.
ZUV_API std::time_t soap_timegm(std::tm *utc);

// ---------------------------------------------------------------------------------------------
// Bytes.

// Decodes base64 up to "=" or the end; white space is passed over.
//   target    where the bytes go, or null for a managed block that always suffices
//   capacity  bytes at target; decoding stops without an error when they are used up
//   length    out, may be null: bytes decoded
// Returns the bytes, with a terminator if room is left. A null or empty text gives "" (null if ctx->error is
// set) and length 0. Null with error 4 for other characters, with error 20 if memory runs out.
extern "C" ZUV_API const char *soap_base642s(soap *ctx, const char *text, char *target, std::size_t capacity,
                                             int *length);

// Encodes `length` bytes with padding and without line breaks. `target` has (length + 2) / 3 * 4 + 1 bytes,
// or is null for a managed block. The terminated text, or null with error 20. No bytes give the empty text.
extern "C" ZUV_API char *soap_s2base64(soap *ctx, const unsigned char *bytes, char *target, int length);

// Sends bytes as base64 with no line breaks. 0 or the error of sending.
ZUV_API int soap_base64_write(soap *ctx, const unsigned char *bytes, std::size_t length);

// Reads the base64 content of the element just begun, up to its end tag or first child, which is left to be
// read. What follows a "=" is dropped. Returns a managed block with a terminator behind `*length` (may be
// null) bytes; null with error 4 for other characters, 20, or 45 past INT_MAX bytes. Uses the growing text.
ZUV_API unsigned char *soap_base64_inline_read(soap *ctx, int *length);

// As soap_base642s for pairs of hexadecimal digits, which are not checked; a digit left over is dropped. A
// managed block has length / 2 + 1 bytes.
ZUV_API const char *soap_hex_decode(soap *ctx, const char *text, char *target, std::size_t capacity,
                                    int *length);
// As soap_s2base64, in lower case; `target` has 2 * length + 1 bytes.
ZUV_API char *soap_hex_encode(soap *ctx, const unsigned char *bytes, char *target, int length);
// Sends bytes as hexadecimal in upper case. 0 or the error of sending.
ZUV_API int soap_hex_write(soap *ctx, const unsigned char *bytes, std::size_t length);
// As soap_base64_inline_read. Reading ends at the first character that is no digit, what follows is dropped;
// error 4 for a digit without a second one.
ZUV_API unsigned char *soap_hex_inline_read(soap *ctx, int *length);

// ---------------------------------------------------------------------------------------------
// Names.

// Maps the words of a QName list just read to the namespace table: a prefix in scope becomes the table's, or
// "URI" in quotes where the table has none. `target` receives a managed text. A null text returns ctx->error
// and stores nothing. 0, 9 (a prefix without a URI), 20, or 45 (fewer than minimum or more than maximum
// bytes; negative: no bound; or more than may be copied, see soap_forward_resolve).
ZUV_API int soap_qname_read_map(soap *ctx, const char *text, char **target, long minimum, long maximum);

// The way back, for the element about to be begun: words "URI":local get the table's prefix, or one of their
// own, which is declared on the element. The text lies in the growing text (where `text` must not lie) until
// its next use. Null for a null text and, with error 20, if memory runs out.
ZUV_API const char *soap_qname_write_map(soap *ctx, const char *text);

// Look-ups in a table of names. Names are compared exactly; a null name is in no table.
ZUV_API std::int64_t soap_name_to_code(const soap_code_row *table, const char *name, std::int64_t otherwise);
ZUV_API const char *soap_code_to_name(const soap_code_row *table, std::int64_t code); // null if there is none
ZUV_API const soap_code_row *soap_name_to_row(const soap_code_row *table,
                                              const char *name); // null if there is none
// The codes of blank-separated names ORed; 0 if one of them is unknown.
ZUV_API std::int64_t soap_names_to_flags(const soap_code_row *table, const char *text);
// The names of all rows whose bits are set, blank-separated, in scratch_text, cut at its end.
ZUV_API const char *soap_flags_to_names(soap *ctx, const soap_code_row *table, std::int64_t flags);

// ---------------------------------------------------------------------------------------------
// Type checks of the element just begun, and the numbers of encoded arrays.

// 0 if the element has no xsi:type, or one that a floating value can be read from. Otherwise the element is
// given back and the result is -1, error 4. A null type accepts any.
ZUV_API int soap_float_type_check(soap *ctx, const char *type);
// 0 if the element has no array type, or this one or any type; else error 3.
ZUV_API int soap_array_type_check(soap *ctx, const char *type);

// Reads "[n,m]" into `numbers`, which has room for SOAP_POSITIONS_MAX. The count of numbers read.
ZUV_API int soap_position_parse(const char *text, int *numbers);
// Reads the sizes of an array from the end of the text, the last one into the last slot; slots that the text
// doesn't reach stay as they are. The product of the sizes; -1 for an empty text, a negative size, or over
// 1000000 elements.
ZUV_API int soap_array_dims_parse(const char *text, int *sizes, int dimensions);
// The same from the start, less the linear offset that `offset_text` (may be empty or null) gives: the number
// of elements that follow the offset. The offset goes to the caller. -1 as above, and for a negative offset.
ZUV_API int soap_array_dims_offset_parse(const char *text, const char *offset_text, int *offset);
// Linear offset of the position "[n,m]" in an array of these sizes; `offsets` (may be null) receives the
// numbers. -1 for a negative number or a result that no int holds.
ZUV_API int soap_array_offset_parse(const char *text, const int *sizes, int *offsets, int dimensions);

// ---------------------------------------------------------------------------------------------
// Elements of the simple types, one form each: see soap_binding.h for the data classes' use.

// Readers: the element `tag` with its id or reference. `place` may be null (then a managed one is made).
// `type` is the XML type asked for, or null to accept any xsi:type; narrower types are accepted where a
// reader is wide enough. The place, or null: error 3 or 6 and nothing was read, 4 for another type (the
// element is given back) or bad text, 24 and 26 of identity, or an error of reading.
ZUV_API std::int8_t *soap_byte_in(soap *ctx, const char *tag, std::int8_t *place, const char *type,
                                  int type_id);
ZUV_API std::int16_t *soap_short_in(soap *ctx, const char *tag, std::int16_t *place, const char *type,
                                    int type_id);
ZUV_API std::int32_t *soap_int_in(soap *ctx, const char *tag, std::int32_t *place, const char *type,
                                  int type_id);
ZUV_API std::int64_t *soap_long_in(soap *ctx, const char *tag, std::int64_t *place, const char *type,
                                   int type_id);
ZUV_API std::int64_t *soap_long64_in(soap *ctx, const char *tag, std::int64_t *place, const char *type,
                                     int type_id);
ZUV_API std::uint8_t *soap_ubyte_in(soap *ctx, const char *tag, std::uint8_t *place, const char *type,
                                    int type_id);
ZUV_API std::uint16_t *soap_ushort_in(soap *ctx, const char *tag, std::uint16_t *place, const char *type,
                                      int type_id);
ZUV_API std::uint32_t *soap_uint_in(soap *ctx, const char *tag, std::uint32_t *place, const char *type,
                                    int type_id);
ZUV_API std::uint64_t *soap_ulong_in(soap *ctx, const char *tag, std::uint64_t *place, const char *type,
                                     int type_id);
ZUV_API std::uint64_t *soap_ulong64_in(soap *ctx, const char *tag, std::uint64_t *place, const char *type,
                                       int type_id);
ZUV_API float *soap_float_in(soap *ctx, const char *tag, float *place, const char *type, int type_id);
ZUV_API double *soap_double_in(soap *ctx, const char *tag, double *place, const char *type, int type_id);
ZUV_API std::time_t *soap_datetime_in(soap *ctx, const char *tag, std::time_t *place, const char *type,
                                      int type_id);

// Writers: the element with the id that soap_element_id settles and `type` as its xsi:type. 0 or the error of
// sending.
ZUV_API int soap_byte_out(soap *ctx, const char *tag, int id, const std::int8_t *place, const char *type,
                          int type_id);
ZUV_API int soap_short_out(soap *ctx, const char *tag, int id, const std::int16_t *place, const char *type,
                           int type_id);
ZUV_API int soap_int_out(soap *ctx, const char *tag, int id, const std::int32_t *place, const char *type,
                         int type_id);
ZUV_API int soap_long_out(soap *ctx, const char *tag, int id, const std::int64_t *place, const char *type,
                          int type_id);
ZUV_API int soap_ubyte_out(soap *ctx, const char *tag, int id, const std::uint8_t *place, const char *type,
                           int type_id);
ZUV_API int soap_ushort_out(soap *ctx, const char *tag, int id, const std::uint16_t *place, const char *type,
                            int type_id);
ZUV_API int soap_uint_out(soap *ctx, const char *tag, int id, const std::uint32_t *place, const char *type,
                          int type_id);
ZUV_API int soap_ulong_out(soap *ctx, const char *tag, int id, const std::uint64_t *place, const char *type,
                           int type_id);
ZUV_API int soap_float_out(soap *ctx, const char *tag, int id, const float *place, const char *type,
                           int type_id);
ZUV_API int soap_double_out(soap *ctx, const char *tag, int id, const double *place, const char *type,
                            int type_id);
ZUV_API int soap_datetime_out(soap *ctx, const char *tag, int id, const std::time_t *place, const char *type,
                              int type_id);

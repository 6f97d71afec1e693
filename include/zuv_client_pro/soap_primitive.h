// soap_primitive.h - simple values: text to numbers, times, bytes and back, and the type checks on reading
// them.
//
// Elsewhere: strings (soap_xml.h), booleans and enumerations (the data classes). Always: texts returned are
// constant or in scratch_text, valid until its next use, unless a function says otherwise. Blocks are managed
// and live until soap_discard_all. "Errors of sending" are those of soap_io.h, "of reading" those of
// soap_xml.h.
#pragma once

#include <ctime>

#include <zuv_client_pro/soap.h>

// Row of a table of names; a table ends with a row whose name is null.
struct soap_code_row {
    std::int64_t code; // the value
    const char *name;  // its text on the wire
};

// --- numbers and times ---

// Parse an integer, one function for each type. White space and a sign may precede the digits; nothing may
// follow them. Beyond the type's own range: soap_uint_parse and soap_ulong_parse wrap a negative number and,
// unless reading is strict, take the empty text as 0; soap_long64_parse and soap_ulong64_parse ignore what
// follows the digits and take the nearest value for a number too large.
//   text                null: the target is unchanged, and the result is ctx->error, which says why
//                       soap_attr_get found no attribute
//   target              takes the value
//   SOAP_OK
//   SOAP_TYPE_MISMATCH  the text is no such number or is out of the type's range; the target holds what the C
//                       library made of it, cut to its width (soap_long64_parse and soap_ulong64_parse: it is
//                       unchanged)
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
// The same for floating numbers: what strtod accepts, and "INF", "-INF" and "NaN" in any case. Text that
// follows a number is ignored.
//   text                null as above
//   target              takes the value
//   SOAP_OK
//   SOAP_TYPE_MISMATCH  the text is no number
ZUV_API int soap_float_parse(soap *ctx, const char *text, float *target);
ZUV_API int soap_double_parse(soap *ctx, const char *text, double *target);

// Reads "2009-01-31T23:59:59", or the forms without "-" or without both "-" and ":", with any fraction
// (dropped) and a zone "Z", "+hh:mm" or "+hhmm". Without a zone the time is local time. Year 1 is read as
// 1970.
//   text                null as for the numbers
//   target              takes seconds since 1970, -1 for a time that time_t can't hold
//   SOAP_OK
//   SOAP_TYPE_MISMATCH  the text is no such time; the target is unchanged
ZUV_API int soap_datetime_parse(soap *ctx, const char *text, std::time_t *target);

// Text of a number. Floating values are printed by float_format and double_format, with a decimal comma made
// a point; the others have the forms "NaN", "INF", "-INF".
//   value    the number
//   returns  the text
ZUV_API const char *soap_long_text(soap *ctx, std::int64_t value);
ZUV_API const char *soap_ulong_text(soap *ctx, std::uint64_t value);
ZUV_API const char *soap_float_text(soap *ctx, float value);
ZUV_API const char *soap_double_text(soap *ctx, double value);
// Text of a time, UTC with "Z".
//   seconds  since 1970
//   returns  the text; "1969-12-31T23:59:59Z" for a time with no calendar date
ZUV_API const char *soap_datetime_text(soap *ctx, std::time_t seconds);
// Seconds of a broken-down UTC time.
//   utc      its fields are brought to their ranges
//   returns  seconds since 1970
//   -1       it has none
ZUV_API std::time_t soap_timegm(std::tm *utc);

// --- bytes ---

// Decodes base64 up to "=" or the end; white space is ignored.
//   text      null or empty gives "" (null if ctx->error is set) and length 0
//   target    takes the bytes; null: a managed block that always suffices
//   capacity  bytes at target; decoding stops without an error when they are used up
//   length    takes the bytes decoded; may be null
//   returns   the bytes, with a terminator if there is space for it
//   null      SOAP_TYPE_MISMATCH (other characters) or SOAP_OUT_OF_MEMORY in ctx->error
extern "C" ZUV_API const char *soap_base642s(soap *ctx, const char *text, char *target, std::size_t capacity,
                                             int *length);

// Encodes bytes as base64, with padding and without line breaks.
//   bytes    `length` bytes; none give the empty text
//   target   takes (length + 2) / 3 * 4 + 1 bytes; null: a managed block
//   length   bytes
//   returns  the terminated text
//   null     SOAP_OUT_OF_MEMORY in ctx->error
extern "C" ZUV_API char *soap_s2base64(soap *ctx, const unsigned char *bytes, char *target, int length);

// Sends bytes as base64 without line breaks.
//   bytes    `length` bytes
//   length   bytes
//   SOAP_OK
//   returns  otherwise an error of sending
ZUV_API int soap_base64_write(soap *ctx, const unsigned char *bytes, std::size_t length);

// Reads the base64 content of the element just begun, up to its end tag or first child, which is left to be
// read. What follows a "=" is dropped. Uses the growing text.
//   length   takes the number of bytes; may be null
//   returns  a managed block with the bytes and a terminator
//   null     ctx->error: SOAP_TYPE_MISMATCH (other characters), SOAP_OUT_OF_MEMORY, another error of reading,
//            SOAP_LENGTH (past INT_MAX bytes)
ZUV_API unsigned char *soap_base64_inline_read(soap *ctx, int *length);

// As soap_base642s for pairs of hexadecimal digits, which are not checked; a single digit at the end is
// dropped.
//   text      as above
//   target    takes the bytes; null: a managed block of length / 2 + 1 bytes
//   capacity  bytes at target
//   length    takes the bytes decoded; may be null
//   returns   the bytes
//   null      SOAP_OUT_OF_MEMORY in ctx->error
ZUV_API const char *soap_hex_decode(soap *ctx, const char *text, char *target, std::size_t capacity,
                                    int *length);
// As soap_s2base64, as hexadecimal in lower case.
//   bytes    `length` bytes
//   target   takes 2 * length + 1 bytes; null: a managed block
//   length   bytes
//   returns  the terminated text
//   null     SOAP_OUT_OF_MEMORY in ctx->error
ZUV_API char *soap_hex_encode(soap *ctx, const unsigned char *bytes, char *target, int length);
// Sends bytes as hexadecimal in upper case.
//   bytes    `length` bytes
//   length   bytes
//   SOAP_OK
//   returns  otherwise an error of sending
ZUV_API int soap_hex_write(soap *ctx, const unsigned char *bytes, std::size_t length);
// As soap_base64_inline_read, for hexadecimal. Reading ends at the first character that is no digit; what
// follows is dropped.
//   length   takes the number of bytes; may be null
//   returns  a managed block with the bytes and a terminator
//   null     ctx->error: SOAP_TYPE_MISMATCH (a digit without a second one), SOAP_OUT_OF_MEMORY, SOAP_LENGTH
ZUV_API unsigned char *soap_hex_inline_read(soap *ctx, int *length);

// --- names ---

// Maps the words of a QName list just read to the namespace table: a prefix in scope becomes the table's, or
// "URI" in quotes where the table has none. Called during receiving.
//   text                  null: nothing is stored, and the result is ctx->error
//   target                takes a managed text
//   minimum               least bytes of `text`; negative: no bound
//   maximum               most bytes of it; negative: no bound
//   SOAP_OK
//   SOAP_NAMESPACE_ERROR  a prefix without a URI
//   SOAP_OUT_OF_MEMORY
//   SOAP_LENGTH           outside the bounds, or more than may be copied (soap_forward_resolve)
ZUV_API int soap_qname_read_map(soap *ctx, const char *text, char **target, long minimum, long maximum);

// The inverse, for the element about to be begun: words "URI":local get the table's prefix, or one of their
// own, which is declared on the element. Called during sending.
//   text     must not be in the growing text; null gives null
//   returns  the text, in the growing text until its next use
//   null     SOAP_OUT_OF_MEMORY, or SOAP_LENGTH (soap_attr_set, soap_prefix_use), in ctx->error
ZUV_API const char *soap_qname_write_map(soap *ctx, const char *text);

// Code of a name in a table. Names are compared exactly.
//   table      of names
//   name       null is in no table
//   otherwise  what is returned for an unknown name
//   returns    the code
ZUV_API std::int64_t soap_name_to_code(const soap_code_row *table, const char *name, std::int64_t otherwise);
// Name of a code in a table.
//   table    of names
//   code     the value
//   returns  the first row's name
//   null     an unknown code
ZUV_API const char *soap_code_to_name(const soap_code_row *table, std::int64_t code);
// Row of a name in a table.
//   table    of names
//   name     null is in no table
//   returns  the row
//   null     an unknown name
ZUV_API const soap_code_row *soap_name_to_row(const soap_code_row *table, const char *name);
// The codes of names ORed.
//   table    of names
//   text     blank-separated names
//   returns  the codes
//   0        one of the names is unknown
ZUV_API std::int64_t soap_names_to_flags(const soap_code_row *table, const char *text);
// The names of all rows whose bits are set.
//   table    of names
//   flags    codes ORed
//   returns  blank-separated names, cut at the end of scratch_text
ZUV_API const char *soap_flags_to_names(soap *ctx, const soap_code_row *table, std::int64_t flags);

// --- type checks of the element just begun, and the numbers of encoded arrays ---

// Whether a floating value can be read from the element: it has no xsi:type, or a fitting one.
//   type  XML type asked for; null accepts any
//   0     it can
//   -1    it can't: the element is held again, and ctx->error is SOAP_TYPE_MISMATCH
ZUV_API int soap_float_type_check(soap *ctx, const char *type);
// Whether the element is an array of a type: it has no array type, or this one or any type.
//   type               XML type asked for
//   SOAP_OK            it is
//   SOAP_TAG_MISMATCH  it is not
ZUV_API int soap_array_type_check(soap *ctx, const char *type);

// Reads a position "[n,m]".
//   text     the position
//   numbers  takes at most SOAP_POSITIONS_MAX numbers
//   returns  how many were read
ZUV_API int soap_position_parse(const char *text, int *numbers);
// Reads the sizes of an array from the end of the text, the last one into the last slot; slots that the text
// doesn't reach are unchanged.
//   text        the sizes
//   sizes       takes `dimensions` numbers
//   dimensions  slots
//   returns     the product of the sizes
//   -1          an empty text, a negative size, or over 1000000 elements
ZUV_API int soap_array_dims_parse(const char *text, int *sizes, int dimensions);
// The same from the start, less a linear offset.
//   text         the sizes
//   offset_text  the offset; may be empty or null
//   offset       takes the offset
//   returns      the number of elements that follow the offset
//   -1           as above, or a negative offset
ZUV_API int soap_array_dims_offset_parse(const char *text, const char *offset_text, int *offset);
// Linear offset of the position "[n,m]" in an array.
//   text        the position
//   sizes       of the array
//   offsets     takes the numbers; may be null
//   dimensions  of the array
//   returns     the offset
//   -1          a negative number, or a result that no int holds
ZUV_API int soap_array_offset_parse(const char *text, const int *sizes, int *offsets, int dimensions);

// --- elements of the simple types ---

// Read an element, with its id or reference, one function for each type. Called during receiving.
//   tag      as for soap_element_in_begin
//   place    takes the value, at the end of the message if the element refers to another; null: a managed
//            place is made
//   type     XML type asked for, or null to accept any xsi:type; narrower types are accepted where a reader
//            is wide enough
//   type_id  type id of the value
//   returns  the place
//   null     ctx->error: SOAP_TAG_MISMATCH or SOAP_NO_TAG (nothing was read), SOAP_TYPE_MISMATCH (another
//            type: the element is held again; or a text that is no such value), SOAP_NIL (strict mode),
//            SOAP_DUPLICATE_ID, SOAP_ID_CONFLICT, SOAP_OUT_OF_MEMORY, or another error of reading
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

// Write an element, with the id that soap_element_id gives, one function for each type. Called during
// sending.
//   tag      "prefix:local"; one that begins with "-" writes the text alone
//   id       number for an id attribute, negative to look it up
//   place    the value
//   type     value of xsi:type; null or empty: none
//   type_id  type id of the value
//   SOAP_OK
//   returns  otherwise an error of writing (soap_xml.h)
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

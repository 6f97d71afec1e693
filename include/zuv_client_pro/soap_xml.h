// soap_xml.h - XML out and in: elements, attributes, text, namespaces, the SOAP envelope's frame.
//
// Elsewhere: values (soap_primitive.h), identity (soap_identity.h), data classes (soap_binding.h).
// Always: operations return ctx->error (0 on success), readers a pointer or null. Tags are "prefix:local"
// with the prefixes of the namespace table. A tag that begins with "-" stands for no element.
#pragma once

#include <zuv_client_pro/soap.h>

// --- writer ---
//
// Everything goes out through soap_send_bytes at once; a message is written twice when its length must be
// known first, and both passes give the same bytes. Used between soap_count_begin or soap_send_begin and the
// end of the pass.
//
// Every operation returns 0, or the first error met, which then stands in ctx->error: what soap_send_bytes
// gives, SOAP_OUT_OF_MEMORY (attribute records and prefixes), SOAP_UTF_ERROR for text that XML can't carry,
// and from start tags SOAP_LENGTH for more than ctx->max_depth open elements. After an error the message is
// to be given up. Names are written as they stand, without a check.
//
// Common arguments:
//   tag    element name, "prefix:local"; one that begins with "-" stands for no element: only its content is
//   written id     number for the attribute id="_N"; 0 or less writes none type   value of xsi:type; null or
//   empty writes none, as do MODE_NO_TYPE and the Header flag   place of a text: 0 element content, 1
//   attribute value, 2 as 1 with bytes from 128 passed on unchanged
// Byte texts are Latin-1 unless ctx->mode has MODE_UTF_STRINGS; they go out as UTF-8 either way. XML can't
// carry control characters other than tab, line feed and carriage return, surrogates, U+FFFE, U+FFFF, numbers
// above U+10FFFF, and bytes that should be UTF-8 and are not: the counting pass meets them before anything is
// sent; a message that isn't counted (chunks, bare XML) breaks off there, and its connection is closed.

// Envelope: with MODE_MIME the head of its part, with MODE_DIME the header of its record, then the start tag;
// at the end the end tag, CR LF and the record's padding. The counting pass settles the record's size and
// header.
ZUV_API int soap_envelope_out_begin(soap *ctx);
ZUV_API int soap_envelope_out_end(soap *ctx);

// Body: in SOAP 1.1 with the encoding style unless the message is literal (ctx->encoding_style null), with
// MODE_WSU_ID with wsu:Id="Body", whose value then also stands in ctx->element_id.
ZUV_API int soap_body_out_begin(soap *ctx);
ZUV_API int soap_body_out_end(soap *ctx);

// Start tag but for its end: XML declaration (or ctx->xml_prolog) and all namespaces on a message's first
// element, indentation, name, id, type, and what waits in the context: SOAP-ENC:position (null_flag,
// positions), actor or role and mustUnderstand (must_understand), encodingStyle (encoding_flag). Clears
// these.
ZUV_API int soap_element_open(soap *ctx, const char *tag, int id, const char *type);

// Rest of a start tag: the attributes set by soap_attr_set, then ">" (tag null) or the end of an empty
// element.
//   tag  the element's name, or null to leave it open
ZUV_API int soap_element_attrs_close(soap *ctx, const char *tag);

// A whole start tag, and an end tag.
ZUV_API int soap_element_out_begin(soap *ctx, const char *tag, int id, const char *type);
ZUV_API int soap_element_out_end(soap *ctx, const char *tag);

// Empty element with xsi:nil="true", whatever the modes.
ZUV_API int soap_element_empty_nil(soap *ctx, const char *tag);

// A null value: nothing at all, or, with attributes set, an id, MODE_NIL, or a position in SOAP 1.2, an empty
// element, which has xsi:nil="true" unless attributes are set. When left out, null_flag is set for the next
// array item.
ZUV_API int soap_element_null(soap *ctx, const char *tag, int id, const char *type);

// Empty element with one attribute.
ZUV_API int soap_element_empty_attr(soap *ctx, const char *tag, int id, const char *name, const char *value);

// Empty element that refers to the object of number target_id: href="#_N", or SOAP-ENC:ref="_N" in SOAP 1.2.
ZUV_API int soap_element_href(soap *ctx, const char *tag, int id, int target_id);

// One attribute at once, between soap_element_open and soap_element_attrs_close; a null value writes the name
// alone. In canonical output it waits in the table instead, and a declaration (xmlns, xmlns:p) brings its
// prefix into scope.
ZUV_API int soap_attr_write(soap *ctx, const char *name, const char *value);

// Enters an attribute for the next start tag; name and value are copied. The first value set for a name
// stays. Start tags list attributes in reverse order of setting, in canonical output in canonical order. A
// name that begins with
// "-" is ignored; a null value writes the name alone. Also SOAP_LENGTH for more than 32767 attributes.
ZUV_API int soap_attr_set(soap *ctx, const char *name, const char *value, int escape);

// Makes all attributes idle, at the start of a message; in canonical mode frees their records.
ZUV_API void soap_attr_table_reset(soap *ctx);

// Escaped text: terminated, by length, of 32-bit characters (terminated). Also SOAP_UTF_ERROR, see above.
ZUV_API int soap_text_write(soap *ctx, const char *text, int flag);
ZUV_API int soap_text_write_n(soap *ctx, const char *text, std::size_t length, int flag);
ZUV_API int soap_wide_text_write(soap *ctx, const char32_t *text, int flag);

// One code point as UTF-8, 1 to 6 bytes for up to 31 bits; not escaped.
ZUV_API int soap_char_write(soap *ctx, std::uint32_t code);

// Start tag of an encoded array.
//   array_type  as soap_array_type_text gives it; null or empty: an ordinary start tag without type
//   offset      "[n]" of a partly transmitted array, SOAP 1.1 only; null for none
ZUV_API int soap_array_open(soap *ctx, const char *tag, int id, const char *array_type, const char *offset);

// "[n,m]", in ctx->array_size; and "type[n,m]" (SOAP 1.2: "type[n m"), in ctx->array_type, both cut at
// SOAP_TEXT_SIZE - 1 bytes and valid until the buffer's next use. `sizes` and `offsets` have `dimensions`
// numbers; offsets (null for none) are added to the sizes, in SOAP 1.1 only.
ZUV_API const char *soap_array_size_text(soap *ctx, const int *sizes, int dimensions);
ZUV_API const char *soap_array_type_text(soap *ctx, const char *type, const int *sizes, const int *offsets,
                                         int dimensions);

// The element that names an operation's result, in encoded SOAP 1.2; otherwise nothing.
ZUV_API int soap_result_out(soap *ctx, const char *name);

// XML as it stands, in UTF-8 whatever the mode, under a tag of its own: null or one that begins with "-"
// writes the text alone; a prefixed one makes its namespace the default one. A null text writes nothing.
// `type` is not used. Also SOAP_UTF_ERROR, see above.
ZUV_API int soap_literal_write(soap *ctx, const char *tag, char *const *text, const char *type);
ZUV_API int soap_wide_literal_write(soap *ctx, const char *tag, char32_t *const *text, const char *type);

// A string element with reference handling (soap_element_ref): the element, a reference to the text written
// before, or a null value. With MODE_NULL_STRINGS an empty text is a null value.
ZUV_API int soap_string_element_out(soap *ctx, const char *tag, int id, char *const *text, const char *type,
                                    int type_id);
ZUV_API int soap_wide_string_element_out(soap *ctx, const char *tag, int id, char32_t *const *text,
                                         const char *type, int type_id);

// --- namespaces ---
//
// The context works on a copy of its namespace table, whose `received` column it fills. The prefix stack
// holds the prefixes in scope, innermost first, each with the element depth at which it was declared. Its
// records belong to the context and are recycled, so that declarations on every element of a message cost no
// allocation.

// Most prefixes in scope at once; protects memory and the cost of each look-up.
constexpr std::uint32_t SOAP_PREFIXES_MAX = 16384;

// Makes the working copy of ctx->namespaces if there is none, and with it sets soap_version from the table's
// first row: 1 for the SOAP 1.1 envelope namespace, otherwise 2. Does nothing without a table or with a copy
// in place.
//   0; SOAP_OUT_OF_MEMORY
ZUV_API int soap_namespace_table_copy(soap *ctx);

// Frees the working copy with its received URIs. An encoding_style that points into it becomes "".
ZUV_API void soap_namespace_table_drop(soap *ctx);

// Writer: brings a prefix into scope at the current depth.
//   prefix  without a colon; "" for the default namespace; copied
//   uri     copied; null if it is not known yet
//   state   0 known: declared in canonical output where first used; nothing happens if the same pair is in
//   scope
//           1 to be declared by the next soap_element_attrs_close in canonical output; 2 declared already
//   0, also if nothing had to be pushed, or if canonical_exclude names the prefix in canonical output
//   SOAP_LENGTH        more than SOAP_PREFIXES_MAX in scope
//   SOAP_OUT_OF_MEMORY
ZUV_API int soap_prefix_push_out(soap *ctx, const char *prefix, const char *uri, int state);

// Writer, canonical output: marks the prefix of a QName as used by the current element, so that the element
// declares it unless it is in scope. Texts without a colon stand for the default namespace.
//   0, SOAP_LENGTH, SOAP_OUT_OF_MEMORY as above
ZUV_API int soap_prefix_use(soap *ctx, const char *name);

// Reader: brings a declared prefix into scope at the current depth and binds it to a row of the table, by the
// row's URI, its pattern or the URI received earlier. A URI that matches a pattern is kept in the row's
// `received`.
//   prefix, uri  both copied; no null
//   The record: `index` is the row and `uri` null, or -1 and the URI. Valid until soap_prefix_pop reaches its
//   depth. Null on failure, with SOAP_LENGTH (more than SOAP_PREFIXES_MAX in scope) or SOAP_OUT_OF_MEMORY
ZUV_API soap_prefix *soap_prefix_push_in(soap *ctx, const char *prefix, const char *uri);

// Takes the prefixes declared at the current depth or deeper out of scope.
ZUV_API void soap_prefix_pop(soap *ctx);

// Takes all prefixes out of scope: at the start and the end of each message and pass.
ZUV_API void soap_prefix_stack_reset(soap *ctx);

// Frees all that the prefix stack and the namespace table keep from call to call: at the end of a context.
// The working copy of the table must have been dropped.
ZUV_API void soap_namespace_scope_free(soap *ctx);

// Reader: URI that the prefix of a QName (or, without a colon, the default namespace) is bound to.
//   The URI, as received where the table allows several; owned by the context, valid while the prefix is in
//   scope and no further declaration is read. Null if there is none: without error for a name that has no
//   prefix, with SOAP_NAMESPACE_ERROR for a prefix that is not in scope.
ZUV_API const char *soap_namespace_of(soap *ctx, const char *name);

// --- reader ---
//
// A pull reader without a tree. A start tag is read once and held in the context until it is consumed,
// skipped or taken as text; until then every question about it costs no input. Its name is in `tag` (at most
// 1023 bytes, longer names are cut), its attributes in the attribute table, and what the engine itself
// understands of them in element_id, element_href, element_type, array_type, array_size, array_offset,
// positions, null_flag, must_understand, other_flag and root_flag. `has_body` is 0 if it ended in "/>".
//
// Malformed input gives an error or is read leniently (end tags are compared in strict mode only), and
// whatever it is, time grows linearly with it, and stack and tables don't. White space in attributes and line
// ends are kept as they are.
//
// Encodings read are UTF-8 (and US-ASCII), ISO-8859-1 and windows-1252. A message is in the encoding of its
// byte-order mark or XML declaration, whichever comes last; else in ISO-8859-1 with MODE_LATIN1; else in that
// of the charset parameter in the Content-Type of its HTTP head or MIME part; else in UTF-8. The declaration
// overrules the parameter because it comes from what wrote the document, and the parameter often from a
// server's settings. Any other encoding, by declaration, by parameter where there is no declaration, or by
// the mark of UTF-16, is refused by its name: SOAP_UTF_ERROR.
//
// Byte strings are Latin-1, or UTF-8 with MODE_UTF_STRINGS, whatever the message is encoded in; names, and
// the names in element_type and array_type, are UTF-8 always. Without that mode a character above 255 has no
// byte and becomes "?": it is lost. So does, in strings of every kind, a character that XML doesn't allow
// (zero and other control characters, surrogates, U+FFFE, U+FFFF), by itself or as a number in a reference,
// and each sequence of bytes that isn't UTF-8 where UTF-8 is read. In strict mode reading ends there: with
// SOAP_SYNTAX_ERROR for a control character or a reference, with SOAP_UTF_ERROR for such bytes. Only a single
// byte from 128 on, followed by one below, still stands for itself as Latin-1 where strings are Latin-1.
//
// SOAP_EOF stands for the end of input inside a message; where the transport left an error of its own, that
// is returned in its place.

// Most attributes of one element; protects questions about them, which go through all. Reading more is
// SOAP_SYNTAX_ERROR.
constexpr int SOAP_ATTRIBUTES_MAX = 1000;

// Tokens of soap_char_next and soap_char_next_utf8 besides characters. One token can be pushed back in
// ctx->look_ahead; a pushed-back XML_EOF stays.
constexpr std::int32_t XML_EOF = -1;
constexpr std::int32_t XML_START = -2; // "<" of a start tag; the byte after it is unread
constexpr std::int32_t XML_END = -3;   // "</"
constexpr std::int32_t XML_GT = -4;
constexpr std::int32_t XML_QUOTE = -5;
constexpr std::int32_t XML_APOS = -6;
constexpr std::uint32_t XML_REFERENCE = 0x80000000; // ORed to a character that came from a reference

// Next token, with bytes as characters. Comments, instructions and declarations are passed over; inside a
// CDATA section every byte is a character. XML_EOF at the end of input.
ZUV_API std::int32_t soap_char_next(soap *ctx);

// The same with bytes from 128 on decoded by the encoding of the message: a character, or "?" for bytes that
// are none. XML_EOF in strict mode for the latter, with SOAP_UTF_ERROR.
ZUV_API std::int32_t soap_char_next_utf8(soap *ctx);

// Character of a reference whose "&" has been read; "?" for a number that is no character of XML; 127 for a
// name that isn't known, and for an "&" that begins no reference. Markup, blanks and bytes from 128 on end a
// reference that has no ";" and stay unread; so does what comes behind 64 bytes. In strict mode XML_EOF, with
// SOAP_SYNTAX_ERROR, for all but a character.
ZUV_API std::int32_t soap_entity_read(soap *ctx);

// Reads an instruction whose "<?" has been read, up to its first "?". The encoding in an XML declaration
// comes into force: names in either case and either kind of quotes. The byte behind the "?", or XML_EOF; that
// also for an encoding that isn't read, with SOAP_UTF_ERROR and a fault text that quotes it.
ZUV_API std::int32_t soap_pi_read(soap *ctx);

// Reads the next start tag, unless one is held, and holds it. Declarations of elements that have ended go out
// of scope, those of the tag come into it at the current depth.
//   0                    a tag is held
//   SOAP_NO_TAG          something else comes next: text, or an end tag; it stays unread
//   SOAP_SYNTAX_ERROR    no name, an attribute without a name, more than SOAP_ATTRIBUTES_MAX attributes; in
//   strict mode a wrong character or reference
//   SOAP_UTF_ERROR       an encoding that isn't read; in strict mode bytes that aren't UTF-8
//   SOAP_LENGTH          more than SOAP_PREFIXES_MAX declarations in scope
//   SOAP_OUT_OF_MEMORY, SOAP_EOF
ZUV_API int soap_element_head_read(soap *ctx);

// Consumes the next start tag if it is the one asked for; otherwise it stays held.
//   tag          name with the table's prefix; null or "" for any; a name that begins with "-" consumes
//   nothing nil_allowed  0: in strict mode xsi:nil is an error type         name that an xsi:type must equal;
//   null for any 0                    consumed, or a "-" name; an element that has content is open now
//   SOAP_TAG_MISMATCH    another element, or one meant for another actor
//   SOAP_TYPE_MISMATCH, SOAP_NIL    consumed all the same
//   SOAP_LENGTH          more than max_depth open elements
//   and what soap_element_head_read gives
ZUV_API int soap_element_in_begin(soap *ctx, const char *tag, int nil_allowed, const char *type);

// Drops what is left of an open element, a held tag included, and reads its end tag, whose name is in `tag`
// then.
//   tag  name to compare with in strict mode, or null; a name that begins with "-" does nothing
//   0; SOAP_SYNTAX_ERROR (a broken end tag, in strict mode another name); SOAP_LENGTH (more than max_depth
//   open elements in what is dropped); SOAP_EOF
ZUV_API int soap_element_in_end(soap *ctx, const char *tag);

// Drops an element that nobody knows, with all that it holds.
//   0; SOAP_TAG_MISMATCH in strict mode outside the header; SOAP_MUST_UNDERSTAND if it demands that of this
//   receiver; otherwise as soap_element_head_read and soap_element_in_end
ZUV_API int soap_element_skip(soap *ctx);

// Gives back the element just consumed, ahead of any reading of its content: its start tag is held again.
// Does nothing when a tag is held.
ZUV_API void soap_tag_unread(soap *ctx);

// Compares a name that was read (a tag, an attribute's name, the text of a QName) with one that is asked for.
//   asked  null or "" fits all. Without a colon only local names count; with nothing ahead of the colon any
//   namespace
//          fits, with nothing behind it any local name. Else the namespace of `read` must be a row whose
//          prefix is the one asked for, or that one and a "_" and more. Namespaces don't count with
//          MODE_IGNORE_NAMESPACES
//   0; SOAP_TAG_MISMATCH; SOAP_SYNTAX_ERROR, also stored, for a prefix that isn't declared
ZUV_API int soap_tag_compare(soap *ctx, const char *read, const char *asked);

// Compares the first `read_length` and `asked_length` bytes of two names as prefixes, a length of 0 being the
// default namespace.
//   0; SOAP_NAMESPACE_ERROR; SOAP_SYNTAX_ERROR, also stored, for a prefix that isn't declared
ZUV_API int soap_prefix_compare(soap *ctx, const char *read, const char *asked, std::size_t read_length,
                                std::size_t asked_length);

// Case-free pattern compare: 0 on a match. "-" in the pattern matches any character, "*" any run. The text
// ends at its terminator or at a double quote.
ZUV_API int soap_tag_match(const char *text, const char *pattern);

// Value of an attribute of the last start tag; "" for one without a value and for a name that begins with
// "-".
//   occurrence  0 free, 1 required, 2 prohibited; heeded in strict mode only
//   Owned by the attribute table, valid until the next start tag is read. Null if there is none, without
//   error or with SOAP_REQUIRED, and with SOAP_PROHIBITED if there is one.
ZUV_API const char *soap_attr_get(soap *ctx, const char *name, int occurrence);

// Text up to the end tag of the present element, which stays unread. A held start tag is given up: it begins
// the text, as
// "<name attribute=\"value\">" with values as they are, cut to 1023 bytes, and the text is that element with
// what follows it up to the next tag. Elements inside become part of the text.
//   form              0 raw XML as it stands; 1 text with references and sections resolved; 2 the same as a
//   list of
//                     QNames with the table's prefixes (soap_qname_read_map)
//   minimum, maximum  length in characters; no bound if negative
//   Managed. Null on failure: SOAP_LENGTH (out of bounds), SOAP_OUT_OF_MEMORY, for form 2
//   SOAP_NAMESPACE_ERROR, in strict mode SOAP_SYNTAX_ERROR and SOAP_UTF_ERROR
ZUV_API char *soap_string_read(soap *ctx, int form, long minimum, long maximum);

// As soap_string_read with form 1 and no bounds, but leaves the text in label_buffer, terminated, and gives
// its length in bytes; valid until the next use of the growing text. Null on failure: SOAP_OUT_OF_MEMORY, in
// strict mode SOAP_SYNTAX_ERROR and SOAP_UTF_ERROR.
ZUV_API const char *soap_text_read(soap *ctx, std::size_t *length);

// As soap_string_read, as code points. Raw XML (form 0) is decoded and its special characters are escaped
// anew.
ZUV_API char32_t *soap_wide_string_read(soap *ctx, int form, long minimum, long maximum);

// Text of the element last begun, up to the next tag, without white space around it and at most 1023 bytes;
// "" for an empty element. In scratch_text, valid until its next use. Null in strict mode if there is more
// (SOAP_LENGTH), and for SOAP_SYNTAX_ERROR and SOAP_UTF_ERROR.
ZUV_API const char *soap_simple_value_read(soap *ctx);

// Read an element that holds a string.
//   tag      as for soap_element_in_begin; a name that begins with "-" reads the text at hand
//   place    where the managed text goes: null for xsi:nil, "" for an empty element. Null: a managed place is
//   made type, type_id  XML type and type id, for xsi:type, id and href; the place may be filled later, by a
//   reference form, minimum, maximum  as for soap_string_read The place; null on failure with the codes of
//   soap_element_in_begin and soap_string_read, SOAP_LENGTH for an empty element with a minimum, SOAP_NO_TAG
//   for a "-" name and no text, and those of soap_object_register
ZUV_API char **soap_string_element_in(soap *ctx, const char *tag, char **place, const char *type, int type_id,
                                      int form, long minimum, long maximum);
ZUV_API char32_t **soap_wide_string_element_in(soap *ctx, const char *tag, char32_t **place, const char *type,
                                               int type_id, int form, long minimum, long maximum);

// Read whatever is inside an element as raw XML. With a name that begins with "-" the next element itself, or
// the text at hand, is taken. Results as above; SOAP_NO_TAG if an end tag comes next.
ZUV_API char **soap_raw_element_in(soap *ctx, const char *tag, char **place);
ZUV_API char32_t **soap_wide_raw_element_in(soap *ctx, const char *tag, char32_t **place);

// The frame of a SOAP message; each sets message_part. The Envelope's namespace settles soap_version and the
// received namespace of the encoding row. An empty Body has no end.
//   0, or the codes of soap_element_in_begin and soap_element_in_end. soap_envelope_in_begin also
//   SOAP_VERSION_MISMATCH (an Envelope of another namespace), SOAP_OUT_OF_MEMORY, or the response's HTTP
//   status: a success (200) if it holds something else than an Envelope, any other on every failure
ZUV_API int soap_envelope_in_begin(soap *ctx);
ZUV_API int soap_envelope_in_end(soap *ctx);
ZUV_API int soap_body_in_begin(soap *ctx);
ZUV_API int soap_body_in_end(soap *ctx);

// Reads the name of the result element, which SOAP 1.2 has with an encoding style; else does nothing. 0 or an
// error.
ZUV_API int soap_result_check(soap *ctx);

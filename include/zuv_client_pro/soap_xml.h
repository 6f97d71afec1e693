// soap_xml.h - XML out and in: elements, attributes, text, namespaces, the SOAP envelope's frame.
//
// Elsewhere: values (soap_primitive.h), identity (soap_identity.h), data classes (soap_class.h).
//
// Always: tags are "prefix:local" with the prefixes of the namespace table.
#pragma once

#include <zuv_client_pro/soap.h>

// --- writer ---
//
// Everything is sent through soap_send_bytes at once; a message is written twice when its length must be
// known first, and both passes give the same bytes. Used between soap_count_begin or soap_send_begin and the
// end of the pass.
//
// Errors of writing, which every function can give: the errors of sending (soap_io.h), SOAP_OUT_OF_MEMORY
// (attribute records and prefixes), SOAP_UTF_ERROR for text that XML can't carry, and from start tags
// SOAP_LENGTH for more than soap::max_depth open elements. After an error the message is to be given up.
// Names are written as they are, without a check.
//
// Common arguments:
//   tag   element name, "prefix:local"; one that begins with "-" stands for no element: only its content is
//         written
//   id    number for the attribute id="_N"; 0 or less writes none
//   type  value of xsi:type; null or empty writes none, as do MODE_NO_TYPE and the Header
//   flag  place of a text: 0 element content, 1 attribute value, 2 as 1 with bytes from 128 taken for UTF-8
// Byte texts are Latin-1 unless soap::mode has MODE_UTF_STRINGS; they are sent as UTF-8 either way. XML can't
// carry control characters other than tab, line feed and carriage return, surrogates, U+FFFE, U+FFFF, numbers
// above U+10FFFF, and bytes that should be UTF-8 and are not: the counting pass finds them before anything is
// sent; a message that isn't counted (chunks, XML without HTTP) breaks off there, and its connection is closed.

// Starts the Envelope: with MODE_MIME the head of its part, with MODE_DIME the header of its record, then the
// start tag.
//   SOAP_OK
//   returns  otherwise an error of writing
ZUV_API int soap_envelope_out_begin(soap *ctx);
// Ends it: the end tag, CR LF and the record's padding. The counting pass computes the record's size and
// header.
//   SOAP_OK
//   SOAP_DIME_ERROR  counting pass: two attachments have one id, or the XML takes 4 GB or more
//   SOAP_MIME_ERROR  counting pass: two parts have one id
//   returns          otherwise an error of writing
ZUV_API int soap_envelope_out_end(soap *ctx);

// Start and end the Body: in SOAP 1.1 with the encoding style unless the message is literal (encoding_style
// null), with MODE_WSU_ID with wsu:Id="Body", whose value is then also in soap::element_id.
//   SOAP_OK
//   returns  otherwise an error of writing
ZUV_API int soap_body_out_begin(soap *ctx);
ZUV_API int soap_body_out_end(soap *ctx);

// Writes a start tag without its end: XML declaration (or soap::xml_prolog) and all namespaces on a message's
// first element, indentation, name, id, type, and what waits in the context: SOAP-ENC:position (null_flag,
// positions), actor or role and mustUnderstand (must_understand), encodingStyle (encoding_flag). Clears
// these.
//   tag      element name
//   id       see above
//   type     see above
//   SOAP_OK
//   returns  otherwise an error of writing
ZUV_API int soap_element_open(soap *ctx, const char *tag, int id, const char *type);

// Writes the rest of a start tag: the attributes set by soap_attr_set, then ">" or the end of an empty
// element.
//   tag      the element's name, which ends it; null leaves it open
//   SOAP_OK
//   returns  otherwise an error of writing
ZUV_API int soap_element_attrs_close(soap *ctx, const char *tag);

// Write a whole start tag, and an end tag.
//   tag      element name
//   id       see above
//   type     see above
//   SOAP_OK
//   returns  otherwise an error of writing
ZUV_API int soap_element_out_begin(soap *ctx, const char *tag, int id, const char *type);
ZUV_API int soap_element_out_end(soap *ctx, const char *tag);

// Writes an empty element with xsi:nil="true", whatever the modes.
//   tag      element name
//   SOAP_OK
//   returns  otherwise an error of writing
ZUV_API int soap_element_empty_nil(soap *ctx, const char *tag);

// Writes a null value: nothing at all, or, with attributes set, an id, MODE_NIL, or a position in SOAP 1.2,
// an empty element, which has xsi:nil="true" unless attributes are set. When it is left out, null_flag is set
// for the next array item.
//   tag      element name
//   id       see above
//   type     see above
//   SOAP_OK
//   returns  otherwise an error of writing
ZUV_API int soap_element_null(soap *ctx, const char *tag, int id, const char *type);

// Writes an empty element with one attribute.
//   tag      element name
//   id       see above
//   name     of the attribute
//   value    of the attribute; null writes its name alone
//   SOAP_OK
//   returns  otherwise an error of writing
ZUV_API int soap_element_empty_attr(soap *ctx, const char *tag, int id, const char *name, const char *value);

// Writes an empty element that refers to an object: href="#_N", or SOAP-ENC:ref="_N" in SOAP 1.2.
//   tag        element name
//   id         see above
//   target_id  number of the object
//   SOAP_OK
//   returns    otherwise an error of writing
ZUV_API int soap_element_href(soap *ctx, const char *tag, int id, int target_id);

// Writes one attribute at once, between soap_element_open and soap_element_attrs_close. In canonical output
// it waits in the table instead, and a declaration (xmlns, xmlns:p) brings its prefix into scope.
//   name     of the attribute
//   value    null writes the name alone
//   SOAP_OK
//   returns  otherwise an error of writing
ZUV_API int soap_attr_write(soap *ctx, const char *name, const char *value);

// Enters an attribute for the next start tag. The first value set for a name stays. Start tags list
// attributes in reverse order of setting, in canonical output in canonical order.
//   name                copied; one that begins with "-" is ignored
//   value               copied; null writes the name alone
//   escape              flag for soap_text_write
//   SOAP_OK
//   SOAP_OUT_OF_MEMORY
//   SOAP_LENGTH         more than 32767 attributes
ZUV_API int soap_attr_set(soap *ctx, const char *name, const char *value, int escape);

// Makes all attributes idle, at the start of a message; in canonical mode frees their records.
ZUV_API void soap_attr_table_reset(soap *ctx);

// Write text, escaped: terminated, by length, or of 32-bit characters (terminated).
//   text            the text
//   length          bytes
//   flag            see above
//   SOAP_OK
//   SOAP_UTF_ERROR  a character that XML can't carry; the fault names it
//   returns         otherwise an error of sending (soap_io.h)
ZUV_API int soap_text_write(soap *ctx, const char *text, int flag);
ZUV_API int soap_text_write_n(soap *ctx, const char *text, std::size_t length, int flag);
ZUV_API int soap_wide_text_write(soap *ctx, const char32_t *text, int flag);

// Writes one code point as UTF-8, not escaped.
//   code     up to 31 bits, which give 1 to 6 bytes
//   SOAP_OK
//   returns  otherwise an error of sending (soap_io.h)
ZUV_API int soap_char_write(soap *ctx, std::uint32_t code);

// Writes the start tag of an encoded array.
//   tag         element name
//   id          see above
//   array_type  from soap_array_type_text; null or empty: an ordinary start tag without type
//   offset      "[n]" of a partly transmitted array, SOAP 1.1 only; null for none
//   SOAP_OK
//   returns     otherwise an error of writing
ZUV_API int soap_array_open(soap *ctx, const char *tag, int id, const char *array_type, const char *offset);

// Compose "[n,m]" in soap::array_size; and "type[n,m]" (SOAP 1.2: "type[n m") in soap::array_type. Both are
// cut at SOAP_TEXT_SIZE - 1 bytes and valid until the buffer's next use.
//   type        XML type of the items
//   sizes       `dimensions` numbers
//   offsets     `dimensions` numbers, added to the sizes in SOAP 1.1; null for none
//   dimensions  how many
//   returns     the text
ZUV_API const char *soap_array_size_text(soap *ctx, const int *sizes, int dimensions);
ZUV_API const char *soap_array_type_text(soap *ctx, const char *type, const int *sizes, const int *offsets,
                                         int dimensions);

// Writes the element that names an operation's result, in encoded SOAP 1.2; otherwise nothing.
//   name     of the result
//   SOAP_OK
//   returns  otherwise an error of writing
ZUV_API int soap_result_out(soap *ctx, const char *name);

// Write XML as it is, in UTF-8 whatever the mode, under a tag of its own.
//   tag             null or one that begins with "-" writes the text alone; a prefixed one makes its
//                   namespace the default one
//   text            a null text writes nothing
//   type            not used
//   SOAP_OK
//   SOAP_UTF_ERROR  the text is not UTF-8, or holds a character that XML can't carry
//   returns         otherwise an error of writing
ZUV_API int soap_literal_write(soap *ctx, const char *tag, char *const *text, const char *type);
ZUV_API int soap_wide_literal_write(soap *ctx, const char *tag, char32_t *const *text, const char *type);

// Write a string element with reference handling (soap_element_ref): the element, a reference to the text
// written before, or a null value. With MODE_NULL_STRINGS an empty text is a null value.
//   tag      element name
//   id       as for soap_element_ref
//   text     the text
//   type     see above
//   type_id  type id of the text
//   SOAP_OK
//   returns  otherwise an error of writing
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

// Makes the working copy of soap::namespaces if there is none, and with it sets soap_version from the table's
// first row: 1 for the SOAP 1.1 envelope namespace, otherwise 2. Does nothing without a table or with a copy
// in place.
//   SOAP_OK
//   SOAP_OUT_OF_MEMORY
ZUV_API int soap_namespace_table_copy(soap *ctx);

// Frees the working copy with its received URIs. An encoding_style that points into it becomes "".
ZUV_API void soap_namespace_table_drop(soap *ctx);

// Writer: brings a prefix into scope at the current depth. Nothing is pushed for state 0 if the same pair is
// in scope, or if canonical_exclude names the prefix in canonical output.
//   prefix              without a colon; "" for the default namespace; copied
//   uri                 copied; null if it is not known yet
//   state               0 known: declared in canonical output where first used; 1 to be declared by the next
//                       soap_element_attrs_close in canonical output; 2 declared already
//   SOAP_OK
//   SOAP_LENGTH         more than SOAP_PREFIXES_MAX in scope
//   SOAP_OUT_OF_MEMORY
ZUV_API int soap_prefix_push_out(soap *ctx, const char *prefix, const char *uri, int state);

// Writer, canonical output: marks the prefix of a QName as used by the current element, so that the element
// declares it unless it is in scope.
//   name                a QName; without a colon it stands for the default namespace
//   SOAP_OK
//   SOAP_LENGTH         more than SOAP_PREFIXES_MAX in scope
//   SOAP_OUT_OF_MEMORY
ZUV_API int soap_prefix_use(soap *ctx, const char *name);

// Reader: brings a declared prefix into scope at the current depth and binds it to a row of the table, by the
// row's URI, its pattern or the URI received earlier. A URI that matches a pattern is kept in the row's
// `received`.
//   prefix   copied; not null
//   uri      copied; not null
//   returns  the record, valid until soap_prefix_pop reaches its depth: `index` is the row and `uri` null, or
//            -1 and the URI
//   null     ctx->error: SOAP_LENGTH (more than SOAP_PREFIXES_MAX in scope) or SOAP_OUT_OF_MEMORY
ZUV_API soap_prefix *soap_prefix_push_in(soap *ctx, const char *prefix, const char *uri);

// Takes the prefixes declared at the current depth or deeper out of scope.
ZUV_API void soap_prefix_pop(soap *ctx);

// Takes all prefixes out of scope: at the start and the end of each message and pass.
ZUV_API void soap_prefix_stack_reset(soap *ctx);

// Frees all that the prefix stack and the namespace table keep from call to call: at the end of a context.
// The working copy of the table must have been dropped.
ZUV_API void soap_namespace_scope_free(soap *ctx);

// Reader: URI that the prefix of a QName (or, without a colon, the default namespace) is bound to.
//   name     a QName
//   returns  the URI, as received where the table allows several; owned by the context, valid while the
//            prefix is in scope and no further declaration is read
//   null     there is none: without error for a name that has no prefix, with SOAP_NAMESPACE_ERROR in
//            ctx->error for a prefix that is not in scope
ZUV_API const char *soap_namespace_of(soap *ctx, const char *name);

// --- reader ---
//
// A pull reader without a tree, used during receiving. A start tag is read once and held in the context until
// it is consumed, skipped or taken as text; until then every question about it costs no input. Its name is in
// `tag` (at most 1023 bytes, longer names are cut), its attributes in the attribute table, and what the
// engine itself understands of them in element_id, element_href, element_type, array_type, array_size,
// array_offset, positions, null_flag, must_understand, other_flag and root_flag. `has_body` is 0 if it ended
// in "/>".
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
// byte from 128 on, followed by one below, is still itself as Latin-1 where strings are Latin-1.
//
// Errors of reading, which every function can give that needs input: the errors of receiving (soap_io.h),
// SOAP_EOF for the end of input inside a message included; SOAP_SYNTAX_ERROR (no name, an attribute without a
// name, more than SOAP_ATTRIBUTES_MAX attributes; in strict mode a wrong character or reference);
// SOAP_UTF_ERROR (an encoding that isn't read; in strict mode bytes that aren't UTF-8); SOAP_LENGTH (more
// than SOAP_PREFIXES_MAX declarations in scope, or more than soap::max_depth open elements);
// SOAP_OUT_OF_MEMORY.

// Most attributes of one element; protects questions about them, which go through all. More are
// SOAP_SYNTAX_ERROR.
constexpr int SOAP_ATTRIBUTES_MAX = 1000;

// --- tokens of the reader ---
//
// What soap_char_next and soap_char_next_utf8 return besides characters. One token can be pushed back in
// soap::look_ahead; a pushed-back XML_EOF stays.

constexpr std::int32_t XML_EOF = -1;                // end of input
constexpr std::int32_t XML_START = -2;              // "<" of a start tag; the byte after it is unread
constexpr std::int32_t XML_END = -3;                // "</"
constexpr std::int32_t XML_GT = -4;                 // ">"
constexpr std::int32_t XML_QUOTE = -5;              // a double quote
constexpr std::int32_t XML_APOS = -6;               // a single quote
constexpr std::uint32_t XML_REFERENCE = 0x80000000; // ORed to a character that came from a reference

// Next token, with bytes as characters. Comments, instructions and declarations are skipped; inside a CDATA
// section every byte is a character.
//   returns  a character or one of the tokens
//   XML_EOF  end of input; or an error of reading, in ctx->error
ZUV_API std::int32_t soap_char_next(soap *ctx);

// The same with bytes from 128 on decoded by the encoding of the message.
//   returns  a character, "?" for bytes that are none, or one of the tokens
//   XML_EOF  end of input; or an error of reading, in ctx->error
ZUV_API std::int32_t soap_char_next_utf8(soap *ctx);

// Reads a reference whose "&" has been read. Markup, blanks and bytes from 128 on end a reference that has no
// ";" and stay unread; so does what follows 64 bytes.
//   returns  the character; "?" for a number that is no character of XML; 127 for a name that isn't known,
//            and for an "&" that begins no reference
//   XML_EOF  strict mode: for all but a character, with SOAP_SYNTAX_ERROR in ctx->error
ZUV_API std::int32_t soap_entity_read(soap *ctx);

// Reads an instruction whose "<?" has been read, up to its first "?". The encoding in an XML declaration
// comes into force: names in either case and either kind of quotes.
//   returns  the byte after the "?"
//   XML_EOF  end of input; or an encoding that isn't read: SOAP_UTF_ERROR in ctx->error and a fault text that
//            quotes it
ZUV_API std::int32_t soap_pi_read(soap *ctx);

// --- elements of the reader ---

// Reads the next start tag, unless one is held, and holds it. Declarations of elements that have ended go out
// of scope, those of the tag come into it at the current depth.
//   SOAP_OK      a tag is held
//   SOAP_NO_TAG  something else comes next: text, or an end tag; it stays unread
//   returns      otherwise an error of reading
ZUV_API int soap_element_head_read(soap *ctx);

// Consumes the next start tag if it is the one asked for; otherwise it stays held.
//   tag                 name with the table's prefix; null or "" for any; a name that begins with "-"
//                       consumes nothing
//   nil_allowed         0: in strict mode xsi:nil is an error
//   type                name that an xsi:type must equal; null for any
//   SOAP_OK             consumed, or a "-" name; an element that has content is open now
//   SOAP_TAG_MISMATCH   another element, or one meant for another actor
//   SOAP_NO_TAG         no start tag comes next
//   SOAP_TYPE_MISMATCH  another xsi:type, or in strict mode one with an unknown prefix
//   SOAP_NIL            xsi:nil in strict mode
//   SOAP_LENGTH         more than soap::max_depth open elements
//   returns             otherwise an error of reading
ZUV_API int soap_element_in_begin(soap *ctx, const char *tag, int nil_allowed, const char *type);

// Drops what is left of an open element, a held tag included, and reads its end tag, whose name is in `tag`
// then.
//   tag                name to compare with in strict mode, or null; a name that begins with "-" does nothing
//   SOAP_OK
//   SOAP_SYNTAX_ERROR  a broken end tag; in strict mode another name
//   SOAP_LENGTH        more than soap::max_depth open elements in what is dropped
//   returns            otherwise an error of reading
ZUV_API int soap_element_in_end(soap *ctx, const char *tag);

// Drops an unknown element with all its content.
//   SOAP_OK
//   SOAP_NO_TAG           no start tag comes next
//   SOAP_TAG_MISMATCH     strict mode, outside the header
//   SOAP_MUST_UNDERSTAND  it demands to be understood by this receiver
//   returns               otherwise an error of reading
ZUV_API int soap_element_skip(soap *ctx);

// Holds the element just consumed again, before any reading of its content. Does nothing when a tag is held.
ZUV_API void soap_tag_unread(soap *ctx);

// Compares a name that was read (a tag, an attribute's name, the text of a QName) with one that is asked for.
//   read               the name that was read
//   asked              null or "" fits all. Without a colon only local names count; with nothing before the
//                      colon any namespace fits, with nothing after it any local name. Else the namespace of
//                      `read` must be a row whose prefix is the one asked for, or that one followed by "_"
//                      and more. Namespaces don't count with MODE_IGNORE_NAMESPACES
//   SOAP_OK            they are the same
//   SOAP_TAG_MISMATCH  they differ; ctx->error is not set
//   SOAP_SYNTAX_ERROR  a prefix that isn't declared
ZUV_API int soap_tag_compare(soap *ctx, const char *read, const char *asked);

// Compares the beginnings of two names as prefixes.
//   read                  the name that was read
//   asked                 the name asked for
//   read_length           bytes of `read`; 0 is the default namespace
//   asked_length          bytes of `asked`; 0 is the default namespace
//   SOAP_OK               they are the same
//   SOAP_NAMESPACE_ERROR  they differ; ctx->error is not set
//   SOAP_SYNTAX_ERROR     a prefix that isn't declared
ZUV_API int soap_prefix_compare(soap *ctx, const char *read, const char *asked, std::size_t read_length,
                                std::size_t asked_length);

// Compares a text with a pattern, without regard to case.
//   text     ends at its terminator or at a double quote
//   pattern  "-" matches any character, "*" any run
//   0        they match
//   1        they don't
ZUV_API int soap_tag_match(const char *text, const char *pattern);

// Value of an attribute of the last start tag.
//   name        of the attribute, as for soap_tag_compare; one that begins with "-" gives ""
//   occurrence  0 free, 1 required, 2 prohibited; used in strict mode only
//   returns     the value, "" for an attribute without one; owned by the attribute table, valid until the
//               next start tag is read
//   null        ctx->error: SOAP_OK (there is none), SOAP_REQUIRED (there is none) or SOAP_PROHIBITED (there
//               is one)
ZUV_API const char *soap_attr_get(soap *ctx, const char *name, int occurrence);

// --- text of the reader ---

// Reads text up to the end tag of the present element, which stays unread. A held start tag is given up: it
// begins the text, as `<name attribute="value">` with values as they are, cut to 1023 bytes, and the text
// is that element with what follows it up to the next tag. Elements inside become part of the text.
//   form     0 raw XML as it is; 1 text with references and sections resolved; 2 the same as a list of QNames
//            with the table's prefixes (soap_qname_read_map)
//   minimum  least length in characters; negative: no bound
//   maximum  most length in characters; negative: no bound
//   returns  managed text, terminated
//   null     ctx->error: SOAP_LENGTH (out of bounds), SOAP_OUT_OF_MEMORY, for form 2 SOAP_NAMESPACE_ERROR, in
//            strict mode SOAP_SYNTAX_ERROR and SOAP_UTF_ERROR
ZUV_API char *soap_string_read(soap *ctx, int form, long minimum, long maximum);

// As soap_string_read with form 1 and no bounds, into the growing text.
//   length   takes the text's bytes
//   returns  the text in label_buffer, terminated; valid until the next use of the growing text
//   null     ctx->error: SOAP_OUT_OF_MEMORY, in strict mode SOAP_SYNTAX_ERROR and SOAP_UTF_ERROR
ZUV_API const char *soap_text_read(soap *ctx, std::size_t *length);

// As soap_string_read, as code points. Raw XML (form 0) is decoded, and its special characters are escaped
// anew.
//   form     as for soap_string_read
//   minimum  least length in characters; negative: no bound
//   maximum  most length in characters; negative: no bound
//   returns  managed text, terminated
//   null     as for soap_string_read
ZUV_API char32_t *soap_wide_string_read(soap *ctx, int form, long minimum, long maximum);

// Reads the text of the element last begun, up to the next tag, without white space around it and at most
// 1023 bytes.
//   returns  the text in scratch_text, valid until its next use; "" for an empty element
//   null     strict mode, ctx->error: SOAP_LENGTH (there is more), SOAP_SYNTAX_ERROR or SOAP_UTF_ERROR
ZUV_API const char *soap_simple_value_read(soap *ctx);

// Read an element that holds a string.
//   tag      as for soap_element_in_begin; a name that begins with "-" reads the text that comes next
//   place    takes the managed text: null for xsi:nil, "" for an empty element; null: a managed place is
//            made. A reference may fill it later
//   type     XML type, for xsi:type
//   type_id  type id, for id and href
//   form     as for soap_string_read
//   minimum  as for soap_string_read
//   maximum  as for soap_string_read
//   returns  the place
//   null     ctx->error: the errors of soap_element_in_begin, soap_string_read and soap_object_register;
//            SOAP_LENGTH for an empty element with a minimum; SOAP_NO_TAG for a "-" name and no text
ZUV_API char **soap_string_element_in(soap *ctx, const char *tag, char **place, const char *type, int type_id,
                                      int form, long minimum, long maximum);
ZUV_API char32_t **soap_wide_string_element_in(soap *ctx, const char *tag, char32_t **place, const char *type,
                                               int type_id, int form, long minimum, long maximum);

// Read whatever is inside an element as raw XML.
//   tag      as for soap_element_in_begin; with a name that begins with "-" the next element itself, or the
//            text that comes next, is taken
//   place    as for soap_string_element_in
//   returns  the place
//   null     ctx->error: as for soap_string_element_in; SOAP_NO_TAG if an end tag comes next
ZUV_API char **soap_raw_element_in(soap *ctx, const char *tag, char **place);
ZUV_API char32_t **soap_wide_raw_element_in(soap *ctx, const char *tag, char32_t **place);

// --- the frame of a SOAP message ---
//
// Each function sets soap::message_part.

// Reads the start tag of the Envelope, whose namespace determines soap_version and the received namespace of
// the encoding row.
//   SOAP_OK
//   SOAP_VERSION_MISMATCH  an Envelope of another namespace
//   SOAP_UTF_ERROR         an encoding that isn't read
//   SOAP_OUT_OF_MEMORY
//   returns                otherwise the response's HTTP status: a success (200) if it holds something else
//                          than an Envelope, any other on every failure; or the result of
//                          soap_element_in_begin
ZUV_API int soap_envelope_in_begin(soap *ctx);
// Reads its end tag.
//   SOAP_OK
//   returns  otherwise the result of soap_element_in_end
ZUV_API int soap_envelope_in_end(soap *ctx);
// Reads the start tag of the Body.
//   SOAP_OK
//   returns  otherwise the result of soap_element_in_begin
ZUV_API int soap_body_in_begin(soap *ctx);
// Reads its end tag; an empty Body has none.
//   SOAP_OK
//   returns  otherwise the result of soap_element_in_end
ZUV_API int soap_body_in_end(soap *ctx);

// Reads the name of the result element, which SOAP 1.2 has with an encoding style; otherwise does nothing.
//   SOAP_OK
//   returns  otherwise the error of soap_string_element_in
ZUV_API int soap_result_check(soap *ctx);

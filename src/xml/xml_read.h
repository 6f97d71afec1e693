// xml_read.h - start tags, for the reader's own files.
//
// Elsewhere: elements as the public sees them (soap_xml.h), text (xml_text.h).
#pragma once

#include <zuv_client_pro/soap_error.h>

#include "xml/xml_scan.h"
#include "xml/xml_text.h"

// A name up to this many bytes is copied by one block of so many: cheaper than a copy of its exact length.
constexpr std::size_t SHORT_NAME = 64;

// Reads the attributes after a tag's name up to the ">" or "/" that ends them, which stays unread: records
// in the attribute table, declarations on the prefix stack. Those that come first of all attributes have no
// records until others follow; soap::bare_declarations counts them. 0, -1, 5, 20 or 47. `names_wide` is set if values
// that are names are UTF-8 though strings are Latin-1, until they have been applied.
// `all_taken`: there were only such, whole in the buffer and with them the end of the tag.
int xml_attributes_read(soap *ctx, bool *names_wide, bool *all_taken);

// Makes attribute records of the held element's declarations, where none were needed yet: whoever looks at
// the records themselves calls it first. 0 or 20.
int xml_attributes_complete(soap *ctx);

// Sets the context's fields from the attributes that the library itself understands, without the white space
// around them. Clears the error.
void xml_attributes_apply(soap *ctx, bool names_wide);

// Reads a character of a name from 128 on, and appends it to the `kept` bytes of `name` if it fits.
void xml_name_character(soap *ctx, char *name, std::size_t &kept);

// Reads a name up to a byte of the class Stop, which stays unread. Keeps what fits `name` (SOAP_TEXT_SIZE
// bytes), in UTF-8, terminated; the rest is dropped. The kept length.
template <template <bool> class Stop> std::size_t xml_name_read(soap *ctx, char *name)
{
    std::size_t kept = 0;
    while (input_ready(ctx)) {
        const char *here = input_here(ctx);
        const char *stop = Stop<true>::find(here, input_end(ctx));
        const auto found = static_cast<std::size_t>(stop - here);
        if (kept == 0 && found < SHORT_NAME &&
            input_end(ctx) - here >= static_cast<std::ptrdiff_t>(SHORT_NAME) && !is_high(*stop)) {
            std::memcpy(name, here, SHORT_NAME);
            name[found] = '\0';
            input_consume(ctx, stop);
            return found;
        }
        const std::size_t space = SOAP_TEXT_SIZE - 1 - kept;
        const std::size_t taken = found < space ? found : space;
        std::memcpy(name + kept, here, taken);
        kept += taken;
        input_consume(ctx, stop);
        if (stop == input_end(ctx))
            continue;
        if (!is_high(*stop))
            break;
        xml_name_character(ctx, name, kept);
    }
    name[kept] = '\0';
    return kept;
}

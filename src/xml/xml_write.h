// xml_write.h - what the writer's files share: pieces of a start tag and small output helpers.
#pragma once

#include <cstddef>
#include <string_view>

#include "xml/xml_write_fast.h"

inline int xml_put(soap *ctx, std::string_view text)
{
    return soap_send_bytes(ctx, text.data(), text.size());
}

// " name" and, unless `value` is null, the escaped value in quotes. `escape` as the flag of soap_text_write.
int xml_put_attribute(soap *ctx, std::string_view name, const char *value, int escape);

// Canonical output: makes the first `rows` of the table known and has those of canonical_include declared.
int xml_canonical_root(soap *ctx, std::size_t rows);

// Canonical output: enters the declarations that the element needs and puts the attribute table in order.
int xml_canonical_attributes(soap *ctx);

// XML unchanged, as UTF-8. Also 47 for what XML can't carry; the first form sends nothing then.
int xml_put_literal(soap *ctx, std::string_view text);
int xml_put_wide(soap *ctx, const char32_t *text);

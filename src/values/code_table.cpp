// code_table.cpp - tables of names: enumerations and sets of flags.
//
// Always: names are compared exactly; a table ends with a row whose name is null.

#include <algorithm>
#include <cstring>
#include <string_view>

#include <zuv_client_pro/soap_primitive.h>

namespace {

const soap_code_row *row_of(const soap_code_row *table, std::string_view name)
{
    const char first = name.empty() ? '\0' : name[0]; // differs in most names
    for (; table->name != nullptr; table++)
        if (table->name[0] == first && std::strncmp(table->name, name.data(), name.size()) == 0 &&
            table->name[name.size()] == '\0')
            return table;
    return nullptr;
}

bool is_blank(char byte)
{
    return static_cast<unsigned char>(byte) <= ' ';
}

} // namespace

const soap_code_row *soap_name_to_row(const soap_code_row *table, const char *name)
{
    if (name == nullptr)
        return nullptr;
    while (table->name != nullptr && (table->name[0] != name[0] || std::strcmp(table->name, name) != 0))
        table++;
    return table->name != nullptr ? table : nullptr;
}

std::int64_t soap_name_to_code(const soap_code_row *table, const char *name, std::int64_t otherwise)
{
    const soap_code_row *row = soap_name_to_row(table, name);
    return row != nullptr ? row->code : otherwise;
}

const char *soap_code_to_name(const soap_code_row *table, std::int64_t code)
{
    for (; table->name != nullptr; table++)
        if (table->code == code)
            return table->name;
    return nullptr;
}

std::int64_t soap_names_to_flags(const soap_code_row *table, const char *text)
{
    std::int64_t flags = 0;
    while (text != nullptr && *text != '\0') {
        const char *end = text;
        while (!is_blank(*end))
            end++;
        if (end != text) {
            const soap_code_row *row =
                row_of(table, std::string_view(text, static_cast<std::size_t>(end - text)));
            if (row == nullptr)
                return 0;
            flags |= row->code;
        }
        text = *end == '\0' ? end : end + 1;
    }
    return flags;
}

const char *soap_flags_to_names(soap *ctx, const soap_code_row *table, std::int64_t flags)
{
    char *out = ctx->scratch_text;
    char *const end = out + sizeof ctx->scratch_text - 1;
    for (; table->name != nullptr; table++) {
        if (table->code == 0 || (table->code & flags) != table->code)
            continue;
        if (out != ctx->scratch_text && out != end)
            *out++ = ' ';
        const std::size_t count = std::min(std::strlen(table->name), static_cast<std::size_t>(end - out));
        std::memcpy(out, table->name, count);
        out += count;
    }
    *out = '\0';
    return ctx->scratch_text;
}

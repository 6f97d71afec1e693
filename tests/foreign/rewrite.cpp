// rewrite.cpp - reads documents of named classes and writes each out again in plain form, many in one run.
//
// Usage: rewrite <in> <out>. A record of <in> is a line "MODE CLASS TAG LENGTH" and a document of LENGTH
// bytes: MODE is a number of reader's mode bits, TAG the element asked for, "*" for any; CLASS "?" leaves the
// choice to the dispatch by name. A record of <out> is a line "ERROR LENGTH" and the document written. What
// the documents mean is not known here.
#include <iostream>

#include "binding/registry.h"
#include "support/memory_wire.h"

namespace {

// The object, its class in `ops`; null with ctx.error set.
void *read(memory_wire &ctx, const std::string &name, const std::string &tag, const binding::class_ops *&ops)
{
    soap_reset_call(&ctx);
    if (soap_receive_begin(&ctx))
        return nullptr;
    ctx.soap_version = 1;
    int type = soap_type_by_name(name.c_str());
    void *object = nullptr;
    if (name == "?") {
        object = soap_read_element(&ctx, &type);
    } else if (const binding::type_entry *entry = binding::type_entry_of(type)) {
        object = binding::class_in(&ctx, *entry->ops, tag == "*" ? nullptr : tag.c_str(), nullptr);
    } else {
        ctx.error = SOAP_TYPE_MISMATCH;
    }
    if (!object || soap_receive_finish(&ctx))
        return nullptr;
    ops = binding::type_entry_of(type)->ops;
    ops = binding::type_entry_of(ops->type_of(object))->ops;
    return object;
}

int write(memory_wire &ctx, const binding::class_ops &ops, const void *object)
{
    ctx.sends.clear();
    ctx.encoding_style = nullptr;
    soap_reset_call(&ctx);
    ops.mark(object, &ctx);
    if (soap_count_begin(&ctx) || soap_count_end(&ctx) || soap_send_begin(&ctx) ||
        ops.out(object, &ctx, "root", 0, ops.xml_type))
        return ctx.error;
    return soap_send_finish(&ctx);
}

} // namespace

int main(int count, char **arguments)
{
    if (count != 3) {
        std::cerr << "usage: rewrite <in> <out>\n";
        return 2;
    }
    std::ifstream in(arguments[1], std::ios::binary);
    std::ofstream out(arguments[2], std::ios::binary);
    memory_wire ctx;
    soap_set_namespaces(&ctx, soap_program_namespaces);
    std::uint32_t mode = 0;
    std::size_t length = 0;
    unsigned documents = 0;
    for (std::string name, tag; in >> mode >> name >> tag >> length;) {
        std::string document(length, '\0');
        in.get(); // the line's end
        in.read(document.data(), static_cast<std::streamsize>(length));
        ctx.input_mode = mode;
        ctx.output_mode = MODE_BARE_XML | MODE_STORE | (mode & MODE_UTF_STRINGS);
        ctx.piece = [&](std::size_t) { return documents % 3 == 0 ? 1 + documents % 40 : 65536U; };
        ctx.receive("HTTP/1.1 200 OK\r\nContent-Type: text/xml\r\nContent-Length: " + std::to_string(length) +
                    "\r\n\r\n" + document);
        const binding::class_ops *ops = nullptr;
        const void *object = read(ctx, name, tag, ops);
        const int error = object ? write(ctx, *ops, object) : ctx.error;
        const std::string written = error ? "" : ctx.sent();
        out << error << ' ' << written.size() << '\n' << written;
        soap_discard_objects(&ctx, nullptr);
        soap_discard_all(&ctx);
        ++documents;
    }
    return in.eof() && out.flush() ? 0 : 1;
}

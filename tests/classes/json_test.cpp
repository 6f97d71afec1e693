// json_test.cpp - every class as JSON and back: the same object. Elsewhere: which documents are refused, and
// in which words (tests/cli/documents_test.py).

#include "json.h" // of the command line
#include "support/every_class.h"

using namespace random_objects;

namespace {

std::string written(memory_wire &ctx, const binding::class_ops &ops, const void *object)
{
    ctx.encoding_style = nullptr;
    return message_of(
        ctx, [&] { binding::class_pointer_mark(&ctx, ops, object); },
        [&] {
            return binding::class_pointer_out(&ctx, ops, ops.xml_type, -1, object, "") ||
                   soap_put_finish(&ctx);
        });
}

void *read(memory_wire &ctx, const binding::class_ops &ops, const std::string &document)
{
    soap_reset_call(&ctx);
    ctx.receive(document);
    void *object = nullptr;
    if (soap_receive_begin(&ctx) || !binding::class_pointer_in(&ctx, ops, ops.xml_type, &object) ||
        !binding::independents_read(&ctx) || soap_receive_finish(&ctx))
        return nullptr;
    return object;
}

TEST(json, carries_every_class_to_an_equal_object)
{
    memory_wire ctx(0, MODE_BARE_XML | MODE_BUFFERED);
    soap_set_namespaces(&ctx, soap_program_namespaces);
    int classes = 0;
    for_each_class(ctx, [&](int id, const binding::type_entry &entry) {
        const contract::data_class *const type = contract::find_class(entry.xml_name);
        if (type == nullptr)
            return;
        ++classes;
        const bool shares = id % 2 == 0; // half of them share objects, which have ids then
        ctx.output_mode = MODE_BARE_XML | MODE_BUFFERED | (shares ? SOAP_XML_GRAPH : 0);
        source random(&ctx, static_cast<unsigned>(id), shares);
        sharing seen;
        compared = shares ? &seen : nullptr;
        void *const object = made_whole<void>(soap_instantiate(&ctx, id, nullptr, nullptr, nullptr));
        row_of(id)->fill(random, object, 3);
        const std::string xml = written(ctx, *entry.ops, object), json = cli::json_of(xml, *type);
        const std::string again = cli::xml_of(json, *type, "random");
        EXPECT_EQ(json, cli::json_of(again, *type));
        const void *const back = read(ctx, *entry.ops, again);
        // References lead to one object in messages only: what a document of its own is read as counts.
        const void *const meant = shares ? read(ctx, *entry.ops, xml) : object;
        bool same = true;
        met(meant, back, same);
        EXPECT_TRUE(meant && back && row_of(id)->equal(meant, back)) << xml.substr(0, 2000) << "\n"
                                                                     << again.substr(0, 2000);
    });
    compared = nullptr;
    EXPECT_GT(classes, 400);
}

} // namespace

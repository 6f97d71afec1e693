// graph_test.cpp - objects that are shared and that form cycles, in all modes that can carry them: what is
// read back is the same graph. Elsewhere: which object gets an id (identity_test.cpp), classes as trees
// (classes_test.cpp).
#include <regex>

#include "support/every_class.h"

using namespace random_objects;

namespace {

constexpr int DEPTH = 4;
constexpr unsigned GRAPHS = 12; // of each class

struct form {
    const char *name;
    std::int16_t version;
    bool encoded;
    std::uint32_t mode;
};
constexpr form forms[] = {
    {"literal SOAP 1.1, graph mode", 1, false, SOAP_XML_GRAPH},
    {"literal SOAP 1.2, graph mode", 2, false, SOAP_XML_GRAPH},
    {"encoded SOAP 1.1: shared objects after the first", 1, true, 0},
    {"encoded SOAP 1.1, graph mode", 1, true, SOAP_XML_GRAPH},
    {"encoded SOAP 1.2: shared objects where first met", 2, true, 0},
};

class graphs : public testing::Test {
protected:
    int put(const binding::class_ops &ops, const void *object)
    {
        if (soap_envelope_out_begin(&ctx) || soap_body_out_begin(&ctx) ||
            binding::class_pointer_out(&ctx, ops, "root", -1, object, "") || soap_put_finish(&ctx) ||
            soap_body_out_end(&ctx))
            return ctx.error;
        return soap_envelope_out_end(&ctx);
    }

    std::string write(const form &how, std::uint32_t io, const binding::class_ops &ops, const void *object)
    {
        ctx.output_mode = MODE_BARE_XML | io | how.mode;
        soap_set_namespaces(&ctx, namespaces_of(how.version));
        ctx.encoding_style = how.encoded ? "" : nullptr;
        const auto mark = [&] {
            ctx.soap_version = how.version;
            binding::class_pointer_mark(&ctx, ops, object);
        };
        return message_of(ctx, mark, [&] { return put(ops, object); });
    }

    void *read(const binding::class_ops &ops, const std::string &message)
    {
        soap_set_namespaces(&ctx, soap_program_namespaces);
        soap_reset_call(&ctx);
        ctx.receive(message);
        void *object = nullptr;
        if (soap_receive_begin(&ctx) || soap_envelope_in_begin(&ctx) || soap_body_in_begin(&ctx) ||
            !binding::class_pointer_in(&ctx, ops, "root", &object) || !binding::independents_read(&ctx) ||
            soap_body_in_end(&ctx) || soap_envelope_in_end(&ctx) || soap_receive_finish(&ctx))
            return nullptr;
        return object;
    }

    memory_wire ctx;
};

std::size_t references_in(const std::string &message, const form &how)
{
    const std::regex reference(how.version == 1 ? " href=\"#_" : " SOAP-ENC:ref=\"_");
    return static_cast<std::size_t>(
        std::distance(std::sregex_iterator(message.begin(), message.end(), reference), {}));
}

TEST_F(graphs, come_back_with_the_same_sharing)
{
    std::size_t references = 0;
    for_each_class(ctx, [&](int id, const binding::type_entry &entry) {
        for (unsigned seed = 0; seed < GRAPHS; ++seed) {
            source random(&ctx, seed * 1000 + static_cast<unsigned>(id), true);
            void *object = made_whole<void>(soap_instantiate(&ctx, id, nullptr, nullptr, nullptr));
            random.lend(id, object);
            row_of(id)->fill(random, object, DEPTH);
            for (const form &how : forms) {
                const std::uint32_t io = seed % 3 == 0   ? MODE_BUFFERED
                                         : seed % 3 == 1 ? MODE_STORE
                                                         : MODE_DIRECT;
                const std::string message = write(how, io, *entry.ops, object);
                SCOPED_TRACE(entry.xml_name + (", " + (how.name + ("\n" + message.substr(0, 6000)))));
                const void *back = read(*entry.ops, message);
                ASSERT_NE(nullptr, back) << ctx.error << " " << ctx.element_id;
                sharing pairs;
                compared = &pairs;
                bool same;
                met(object, back, same);
                EXPECT_TRUE(row_of(id)->equal(object, back));
                compared = nullptr;
                references += references_in(message, how);
            }
            soap_discard_objects(&ctx, nullptr);
            soap_discard_all(&ctx);
        }
    });
    EXPECT_GT(references, 10U * 407);
}

} // namespace

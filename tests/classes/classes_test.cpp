// classes_test.cpp - every class of the contract: written, valid by its schema, read back, the same.
//
// Nothing here names a class: the registry tells which there are, so that none can be forgotten.
#include <gtest/gtest.h>

#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <utility>

#include <zuv_client_pro/soap_error.h>
#include <zuv_client_pro/soap_xml.h>

#include "support/memory_wire.h"
#include "support/random_objects.h"

using namespace random_objects;

#define CLASS_PARTS(X)                                                                                       \
    X(protocol)                                                                                              \
    X(protocolProfile)                                                                                       \
    X(protocolHTTP)                                                                                          \
    X(protocolProblemReport)                                                                                 \
    X(protocolPRFilter)                                                                                      \
    X(protocolUpdateOrder)                                                                                   \
    X(protocolUpdateOrderFilter)                                                                             \
    X(protocolInventoryReport)                                                                               \
    X(protocolStatusReport)
#define PART(name) const class_row *rows_##name(int type_id);
CLASS_PARTS(PART)
#undef PART

const class_row *random_objects::row_of(int type_id)
{
    const class_row *found = nullptr;
#define PART(name) found = found ? found : rows_##name(type_id);
    CLASS_PARTS(PART)
#undef PART
    return found;
}

namespace {

constexpr int DEPTH = 3;

class every_class : public testing::Test {
protected:
    every_class() : ctx(0, MODE_BARE_XML | MODE_BUFFERED)
    {
        soap_set_namespaces(&ctx, soap_program_namespaces);
    }

    void begin_message(const binding::class_ops &ops, const void *object)
    {
        ctx.sends.clear();
        ctx.encoding_style = nullptr;
        soap_reset_call(&ctx);
        ops.mark(object, &ctx);
    }

    // The object as a document of its own: the element "root" of no namespace bears the type.
    std::string write(const binding::class_ops &ops, const void *object, std::uint32_t mode)
    {
        ctx.output_mode = MODE_BARE_XML | mode;
        begin_message(ops, object);
        EXPECT_EQ(0, soap_count_begin(&ctx));
        std::uint64_t counted = 0;
        if ((mode & MODE_IO_MASK) == MODE_BUFFERED) {
            ctx.mode |= MODE_COUNTING;
            EXPECT_EQ(0, put(ops, object));
            counted = ctx.message_count;
        }
        EXPECT_EQ(0, soap_count_end(&ctx));
        EXPECT_EQ(0, soap_send_begin(&ctx));
        EXPECT_EQ(0, put(ops, object));
        EXPECT_EQ(0, soap_send_finish(&ctx));
        const std::string sent = ctx.sent();
        if (counted != 0 && !(mode & MODE_DEFLATE)) {
            EXPECT_EQ(counted, sent.size()) << ops.xml_type;
        }
        return sent;
    }

    int put(const binding::class_ops &ops, const void *object)
    {
        return ops.out(object, &ctx, "root", 0, ops.xml_type);
    }

    void *read(const binding::class_ops &ops, const std::string &document, std::uint32_t mode)
    {
        ctx.input_mode = mode;
        soap_reset_call(&ctx);
        ctx.receive(document);
        if (soap_receive_begin(&ctx))
            return nullptr;
        ctx.soap_version = 1;
        void *object = binding::class_in(&ctx, ops, "root", nullptr);
        return object && soap_receive_finish(&ctx) == 0 ? object : nullptr;
    }

    std::string first_difference(const binding::class_ops &ops, const void *one, const void *other)
    {
        const std::string wrote = write(ops, one, MODE_BUFFERED), read = write(ops, other, MODE_BUFFERED);
        std::size_t at = 0;
        while (at < wrote.size() && at < read.size() && wrote[at] == read[at])
            ++at;
        const std::size_t from = at < 80 ? 0 : at - 80;
        return "wrote: " + wrote.substr(from, 160) + "\nread:  " + read.substr(from, 160);
    }

    template <class Use> void each_class(Use use)
    {
        int classes = 0;
        for (int id = 1; id <= binding::TYPE_ID_MAX; ++id) {
            const binding::type_entry *entry = binding::type_entry_of(id);
            if (!entry || entry->kind != binding::type_kind::object || id == 10)
                continue;
            ++classes;
            ASSERT_NE(nullptr, row_of(id)) << entry->xml_name;
            use(id, *entry->ops);
            soap_discard_objects(&ctx, nullptr);
            soap_discard_all(&ctx);
        }
        EXPECT_EQ(407, classes);
    }

    memory_wire ctx;
};

TEST_F(every_class, come_back_equal_from_every_framing_and_mode)
{
    const std::uint32_t modes[] = {MODE_BUFFERED,
                                   MODE_STORE,
                                   MODE_DIRECT,
                                   MODE_BUFFERED | SOAP_XML_GRAPH,
                                   MODE_BUFFERED | MODE_NIL,
                                   MODE_BUFFERED | MODE_DEFAULT_NAMESPACE,
                                   MODE_BUFFERED | MODE_CANONICAL};
    each_class([&](int id, const binding::class_ops &ops) {
        source random(&ctx, static_cast<unsigned>(id));
        void *object = soap_instantiate(&ctx, id, nullptr, nullptr, nullptr);
        row_of(id)->fill(random, object, DEPTH);
        for (const std::uint32_t mode : modes) {
            const std::string document = write(ops, object, mode);
            const void *back = read(ops, document, 0);
            ASSERT_NE(nullptr, back) << ops.xml_type << " mode " << std::hex << mode << " error " << std::dec
                                     << ctx.error << "\n"
                                     << document.substr(0, 3000);
            if (mode & MODE_DEFAULT_NAMESPACE)
                continue; // xsi:type goes without a prefix there: a class of another namespace comes back as
                          // its base
            EXPECT_TRUE(row_of(id)->equal(object, back))
                << ops.xml_type << " mode " << std::hex << mode << "\n"
                << first_difference(ops, object, back);
        }
        const void *strict = read(ops, write(ops, object, MODE_BUFFERED), MODE_STRICT);
        EXPECT_NE(nullptr, strict) << ops.xml_type << " in strict mode, error " << ctx.error;
    });
}

// A peer that goes away, or whose message breaks off, at every place that a class can be left at.
TEST_F(every_class, end_in_an_error_wherever_their_bytes_stop)
{
    each_class([&](int id, const binding::class_ops &ops) {
        source random(&ctx, static_cast<unsigned>(id));
        void *object = soap_instantiate(&ctx, id, nullptr, nullptr, nullptr);
        row_of(id)->fill(random, object, 1);
        write(ops, object, MODE_DIRECT);
        const std::vector<std::string> sends = std::exchange(ctx.sends, {});
        std::string came;
        for (std::size_t taken = 0; taken < sends.size(); came += sends[taken++]) {
            if (sends[taken][0] != '<')
                continue;
            ctx.send_limit = taken;
            begin_message(ops, object);
            EXPECT_TRUE(soap_count_begin(&ctx) || soap_count_end(&ctx) || soap_send_begin(&ctx) ||
                        put(ops, object) || soap_send_finish(&ctx));
            EXPECT_EQ(-1, ctx.error);
            EXPECT_TRUE(came == ctx.sent()) << ops.xml_type << " after " << taken << " of " << sends.size();
            EXPECT_EQ(nullptr, read(ops, came, 0));
        }
        ctx.send_limit = std::numeric_limits<std::size_t>::max();
    });
}

// One run of xmllint over all documents, against one schema that imports all namespaces.
TEST_F(every_class, are_valid_by_their_schemas)
{
    if (std::system("xmllint --version >/dev/null 2>&1") != 0)
        GTEST_SKIP() << "xmllint is not installed";
    char pattern[] = "/tmp/zuv-classes-XXXXXX";
    const std::filesystem::path dir = mkdtemp(pattern);
    std::ofstream schema(dir / "all.xsd");
    schema << "<xsd:schema xmlns:xsd=\"http://www.w3.org/2001/XMLSchema\">\n";
    for (const char *part :
         {"common/common", "profile/profile", "problemreport/problemreport", "prfilter/prfilter",
          "updateorder/updateorder", "updateorderfilter/updateorderfilter", "inventoryreport/inventoryreport",
          "statusreport/statusreport", "http/http"}) {
        std::ifstream file(std::string(ZUV_SCHEMA_DIR) + "/" + part + ".xsd");
        const std::string text((std::istreambuf_iterator<char>(file)), {});
        const std::size_t at = text.find("targetNamespace=\"") + 17;
        schema << "<xsd:import namespace=\"" << text.substr(at, text.find('"', at) - at)
               << "\" schemaLocation=\"file://" << ZUV_SCHEMA_DIR << "/" << part << ".xsd\"/>\n";
    }
    schema << "<xsd:element name=\"root\" type=\"xsd:anyType\"/>\n</xsd:schema>\n";
    schema.close();
    each_class([&](int id, const binding::class_ops &ops) {
        if (ops.global_element)
            return; // the type has no name that xsi:type could give
        source random(&ctx, static_cast<unsigned>(id));
        void *object = soap_instantiate(&ctx, id, nullptr, nullptr, nullptr);
        row_of(id)->fill(random, object, DEPTH);
        std::ofstream(dir / (std::to_string(id) + ".xml")) << write(ops, object, MODE_BUFFERED);
    });
    const std::string command = "xmllint --noout --huge --schema " + (dir / "all.xsd").string() + " " +
                                dir.string() + "/*.xml >" + (dir / "said").string() + " 2>&1";
    const int result = std::system(command.c_str());
    std::ifstream said(dir / "said");
    std::string line, complaints;
    for (int lines = 0; lines < 10 && std::getline(said, line);) {
        if (line.find("validates") == std::string::npos) {
            complaints += line.substr(0, 400) + "\n";
            ++lines;
        }
    }
    EXPECT_EQ(0, result) << complaints;
    std::filesystem::remove_all(dir);
}

} // namespace

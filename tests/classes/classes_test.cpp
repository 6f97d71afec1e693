// classes_test.cpp - every class of the contract: written, read back, the same. Elsewhere: valid by its
// schema (tests/foreign, tests/interop). Nothing here names a class: the registry says which there are, so
// that none can be forgotten.

#include <zuv_client_pro/protocolProfile.h>

#include "core/message_store.h"
#include "exchange/request.h"
#include "support/every_class.h"
#include "traits_protocol.h"
#include "traits_protocolProfile.h"

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

    // The object as a document of its own: the element "root" of no namespace has the type.
    std::string write(const binding::class_ops &ops, const void *object, std::uint32_t mode)
    {
        ctx.output_mode = MODE_BARE_XML | mode;
        ctx.encoding_style = nullptr;
        return message_of(
            ctx, [&] { ops.mark(object, &ctx); }, [&] { return put(ops, object); });
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

    memory_wire ctx;
};

TEST_F(every_class, come_back_equal_from_every_framing_and_mode)
{
    for_each_class(ctx, [&](int id, const binding::type_entry &entry) {
        const binding::class_ops &ops = *entry.ops;
        source random(&ctx, static_cast<unsigned>(id));
        void *object = made_whole<void>(soap_instantiate(&ctx, id, nullptr, nullptr, nullptr));
        row_of(id)->fill(random, object, DEPTH);
        for (const std::uint32_t mode :
             {MODE_BUFFERED, MODE_STORE, MODE_DIRECT, MODE_BUFFERED | SOAP_XML_GRAPH,
              MODE_BUFFERED | MODE_NIL, MODE_BUFFERED | MODE_DEFAULT_NAMESPACE,
              MODE_BUFFERED | MODE_CANONICAL}) {
            SCOPED_TRACE(std::string(ops.xml_type) + " mode " + std::to_string(mode));
            const std::string document = write(ops, object, mode);
            const void *back = read(ops, document, 0);
            ASSERT_NE(nullptr, back) << ctx.error << "\n" << document.substr(0, 3000);
            // Without a prefix xsi:type can't name another namespace: such a class comes back as its base.
            if ((mode & MODE_DEFAULT_NAMESPACE) == 0) {
                EXPECT_TRUE(row_of(id)->equal(object, back)) << document.substr(0, 3000) << "\n"
                                                             << write(ops, back, mode).substr(0, 3000);
            }
        }
        const void *strict = read(ops, write(ops, object, MODE_BUFFERED), MODE_STRICT);
        EXPECT_NE(nullptr, strict) << ops.xml_type << " in strict mode, error " << ctx.error;
    });
}

// A peer that goes away, or whose message breaks off, at every place that a class can be left at.
TEST_F(every_class, end_in_an_error_wherever_their_bytes_stop)
{
    for_each_class(ctx, [&](int id, const binding::type_entry &entry) {
        const binding::class_ops &ops = *entry.ops;
        source random(&ctx, static_cast<unsigned>(id));
        void *object = made_whole<void>(soap_instantiate(&ctx, id, nullptr, nullptr, nullptr));
        row_of(id)->fill(random, object, 1);
        write(ops, object, MODE_DIRECT);
        const std::vector<std::string> sends = std::exchange(ctx.sends, {});
        std::string came;
        for (std::size_t taken = 0; taken < sends.size(); came += sends[taken++]) {
            if (sends[taken][0] != '<')
                continue;
            ctx.send_limit = taken;
            ctx.sends.clear();
            soap_reset_call(&ctx);
            ops.mark(object, &ctx);
            EXPECT_TRUE(soap_count_begin(&ctx) || soap_count_end(&ctx) || soap_send_begin(&ctx) ||
                        put(ops, object) || soap_send_finish(&ctx));
            EXPECT_EQ(-1, ctx.error);
            EXPECT_TRUE(came == ctx.sent()) << ops.xml_type << " after " << taken << " of " << sends.size();
            EXPECT_EQ(nullptr, read(ops, came, 0));
        }
        ctx.send_limit = std::numeric_limits<std::size_t>::max();
    });
}

// What a caller sees of a message that was sent: written once, which is the short way, or twice.
struct sent_message {
    int error;
    std::vector<std::string> sends;
    std::string limit, fault;
    std::uint32_t mode;
    int part;
    std::uint64_t count;
    bool operator==(const sent_message &) const = default;
};

class requests : public every_class {
protected:
    static constexpr char HEAD[] = "POST / HTTP/1.1\r\n\r\n";

    // As a call does it. A hook that does nothing makes it go the long way.
    sent_message send(bool once, const binding::class_ops &ops, const void *object, std::uint32_t mode = 0)
    {
        ctx.output_mode = mode;
        ctx.on_send_prepare_begin = once ? nullptr : +[](soap *) { return 0; };
        ctx.sends.clear();
        ctx.socket = 900; // never used: without one a direct message is not buffered
        ctx.encoding_style = nullptr;
        soap_reset_call(&ctx);
        message = {"protocol:root", &ops, object};
        const int error = request_count(&ctx, message) || soap_send_begin(&ctx) ||
                                  soap_send_text(&ctx, HEAD) || request_write(&ctx, message) ||
                                  soap_send_finish(&ctx)
                              ? ctx.error
                              : 0;
        message_store_wipe(&ctx);
        ctx.socket = -1;
        ctx.buffer_index = 0;
        const std::string fault = ctx.fault != nullptr ? text_of(*soap_fault_string_field(&ctx)) : "";
        const std::string limit = ctx.exceeded != nullptr ? ctx.exceeded : "";
        return {error, ctx.sends, limit, fault, ctx.mode, ctx.message_part, ctx.message_count};
    }

    bool same_both_ways(const binding::class_ops &ops, const void *object, std::uint32_t mode = 0)
    {
        const sent_message long_way = send(false, ops, object, mode);
        EXPECT_EQ(0U, message.stored);
        const sent_message short_way = send(true, ops, object, mode);
        EXPECT_TRUE(long_way == short_way)
            << ops.xml_type << " mode " << mode << " errors " << long_way.error << " " << short_way.error
            << " sends " << long_way.sends.size() << " " << short_way.sends.size();
        return message.stored != 0;
    }

    const protocol__Contact *contact_with(std::size_t length)
    {
        name.assign(length, 'x');
        contact.name = &name;
        return &contact;
    }

    request_message message;
    std::string name;
    protocol__Contact contact;
};

TEST_F(requests, written_once_are_those_written_twice)
{
    for_each_class(ctx, [&](int id, const binding::type_entry &entry) {
        const binding::class_ops &ops = *entry.ops;
        source random(&ctx, static_cast<unsigned>(id), id % 2 != 0);
        void *object = made_whole<void>(soap_instantiate(&ctx, id, nullptr, nullptr, nullptr));
        row_of(id)->fill(random, object, DEPTH);
        ctx.max_depth = 40; // those that share hold cycles
        ctx.max_message = 3 * SOAP_STORE_SIZE;
        for (const std::uint32_t mode :
             {0U, MODE_BUFFERED, MODE_INDENT, MODE_NIL, MODE_NO_TYPE, MODE_DEFAULT_NAMESPACE, MODE_CANONICAL,
              MODE_WSU_ID, MODE_NULL_STRINGS | MODE_UTF_STRINGS | SOAP_XML_TREE})
            same_both_ways(ops, object, mode);
        const sent_message whole = send(true, ops, object);
        std::size_t bytes = 0;
        for (const std::string &part : whole.sends)
            bytes += part.size();
        EXPECT_EQ(whole.error == 0 && bytes <= SOAP_STORE_SIZE + sizeof HEAD - 1, message.stored != 0)
            << ops.xml_type;
        for (ctx.send_limit = 0; ctx.send_limit < whole.sends.size(); ++ctx.send_limit)
            same_both_ways(ops, object);
        ctx.send_limit = std::numeric_limits<std::size_t>::max();
        ctx.max_depth = 3;
        same_both_ways(ops, object);
        ctx.max_depth = SOAP_MAX_DEPTH;
    });
}

TEST_F(requests, of_any_length_are_the_same_both_ways)
{
    const binding::class_ops &ops = binding::traits<protocol__Contact>::ops;
    send(true, ops, contact_with(0));
    const std::size_t frame = message.stored, head = sizeof HEAD - 1;
    for (const std::size_t edge : {SOAP_BUFFER_SIZE - head, 2 * SOAP_BUFFER_SIZE - head, SOAP_STORE_SIZE})
        for (std::size_t length = edge - frame - 40; length <= edge - frame + 40; ++length) {
            const bool fits = frame + length <= SOAP_STORE_SIZE;
            ASSERT_EQ(fits, same_both_ways(ops, contact_with(length))) << length;
        }
    for (ctx.max_message = frame - 90; ctx.max_message < frame + 12; ++ctx.max_message)
        same_both_ways(ops, contact_with(10));
    ctx.max_message = 0;
    ctx.max_memory = SOAP_STORE_SIZE - 1;
    EXPECT_FALSE(same_both_ways(ops, contact_with(10))) << "there is no memory for the store";
    ctx.max_memory = 0;
    name = "a\x01";
    EXPECT_FALSE(same_both_ways(ops, &contact));
    EXPECT_EQ(SOAP_UTF_ERROR, ctx.error);
}

// What a host derives from a class: it counts what is called of it.
struct own_contact : protocol__Contact {
    mutable int marked = 0, written = 0;
    void soap_serialize(struct soap *ctx) const override
    {
        ++marked;
        protocol__Contact::soap_serialize(ctx);
    }
    int soap_out(struct soap *ctx, const char *tag, int id, const char *type) const override
    {
        ++written;
        return protocol__Contact::soap_out(ctx, tag, id, type);
    }
};

TEST_F(requests, go_the_long_way_where_a_host_could_see_the_short_one)
{
    const auto expect_long_way = [this](const std::string &rule, std::uint32_t mode, void (*change)(soap &)) {
        memory_wire wire(0, mode);
        soap_set_namespaces(&wire, soap_program_namespaces);
        wire.encoding_style = nullptr;
        soap_reset_call(&wire);
        change(wire);
        request_message asked{"protocol:root", &binding::traits<protocol__Contact>::ops, contact_with(9)};
        EXPECT_EQ(0, request_count(&wire, asked)) << rule;
        EXPECT_EQ(nullptr, wire.store) << rule;
    };
    for (const std::uint32_t mode :
         {MODE_CHUNKED, MODE_STORE, MODE_DEFLATE, SOAP_XML_GRAPH, MODE_MIME, MODE_DIME, MODE_BARE_XML})
        expect_long_way("mode " + std::to_string(mode), mode, [](soap &) {});
    const std::pair<const char *, void (*)(soap &)> cases[] = {
        {"a filter",
         [](soap &c) { c.on_send_filter = [](soap *, const char **, std::size_t *) { return 0; }; }},
        {"a hook at the start", [](soap &c) { c.on_send_prepare_begin = [](soap *) { return 0; }; }},
        {"a hook that sees bytes",
         [](soap &c) { c.on_send_prepare = [](soap *, const char *, std::size_t) { return 0; }; }},
        {"a hook at the end", [](soap &c) { c.on_send_prepare_end = [](soap *) { return 0; }; }},
        {"a hook that connects",
         [](soap &c) { c.on_connect = [](soap *, const char *, const char *, int) { return 0; }; }},
        {"a host's head",
         [](soap &c) {
             c.on_post = [](soap *, const char *, const char *, int, const char *, const char *,
                            std::uint64_t) { return 0; };
         }},
        {"a host's lines",
         [](soap &c) { c.on_header_line = [](soap *, const char *, const char *) { return 0; }; }},
        {"an attachment",
         [](soap &c) { soap_dime_attach(&c, nullptr, 0, "text/plain", "cid:x", 0, nullptr); }},
    };
    for (const auto &[rule, change] : cases)
        expect_long_way(rule, 0, change);
    own_contact own;
    protocolProfile__ProfileContent profile;
    contact_with(3);
    profile.contact = {&contact, &own};
    EXPECT_FALSE(same_both_ways(binding::traits<protocolProfile__ProfileContent>::ops, &profile));
    EXPECT_EQ(2, own.marked) << "once each way";
    EXPECT_EQ(4, own.written) << "counted and sent each way";
}

// Binary content is written in place unless it has an id or a type, which make an attachment of it.
TEST_F(requests, with_binary_content_turn_to_attachments_as_they_did)
{
    unsigned char bytes[] = {1, 2, 3};
    xsd__base64Binary binary;
    binary.content = bytes;
    binary.size = sizeof bytes;
    protocol__Credentials credentials;
    credentials.certificate = &binary;
    const binding::class_ops &ops = binding::traits<protocol__Credentials>::ops;
    EXPECT_TRUE(same_both_ways(ops, &credentials));
    char type[] = "application/pkix-cert";
    binary.type = type;
    EXPECT_FALSE(same_both_ways(ops, &credentials));
    EXPECT_NE(std::string::npos, ctx.sent().find(" href=\"cid:id"));
}

} // namespace

// context_test.cpp - life of a context: reset, discard, end, copies.
#include <fcntl.h>
#include <netinet/in.h>
#include <openssl/ssl.h>
#include <sys/socket.h>
#include <unistd.h>
#include <zuv_client_pro/ProfileSoapBindingProxy.h>

#include "support/testing.h"

namespace {

// The engine reports blocks that are lost or freed twice on standard error.
class context : public testing::Test {
protected:
    void SetUp() override { testing::internal::CaptureStderr(); }
    void TearDown() override { EXPECT_EQ(testing::internal::GetCapturedStderr(), ""); }
};
class context_copy : public context {};

bool is_open(int descriptor)
{
    return fcntl(descriptor, F_GETFD) != -1;
}

TEST_F(context, ends_quietly_and_only_once_and_may_start_again)
{
    {
        soap ctx;
        ctx.on_post = nullptr;
        ctx.on_malloc = [](soap *, std::size_t) -> void * { return nullptr; };
        ctx.credentials_passed = true;
        std::strcpy(ctx.scratch_text, "secret");
        soap_engine_done(&ctx);
        EXPECT_EQ(ctx.state, 0);
        EXPECT_STREQ(ctx.scratch_text, "");
        EXPECT_EQ(ctx.on_post, http_write_request) << "the callbacks are the engine's again";
        EXPECT_EQ(ctx.on_malloc, nullptr);
        soap_engine_done(&ctx);
        soap_discard_all(&ctx);
        soap_discard_objects(&ctx, nullptr);
        soap_block_free(&ctx, nullptr);
        soap_context_init(&ctx);
        EXPECT_EQ(ctx.state, 1);
    }
    soap *const made = soap_context_create(MODE_KEEP_ALIVE, MODE_STORE);
    EXPECT_EQ(made->input_mode, MODE_KEEP_ALIVE);
    EXPECT_EQ(made->output_mode, MODE_STORE);
    soap_context_free(made);
    soap_context_free(nullptr);
    EXPECT_TRUE(is_open(0) && is_open(1));
}

// A class with members where the base's padding lies, deleted through the base.
struct derived : soap {
    derived() : soap(MODE_STRICT) {}
    explicit derived(const soap &other) : soap(other) {}
    ~derived() override { ++ended; }
    static int ended;
    char first_member = 'm';
};
int derived::ended = 0;

TEST_F(context, leaves_derived_classes_alone)
{
    auto made = std::make_unique<derived>();
    made->first_member = 'k';
    soap_engine_done(made.get());
    const soap source(MODE_STORE);
    soap_context_assign(made.get(), &source);
    EXPECT_EQ(made->output_mode, MODE_STORE);
    EXPECT_EQ(made->first_member, 'k');
    soap_context_init(made.get()); // drops what the assignment shared
    EXPECT_EQ(made->first_member, 'k');
    std::unique_ptr<soap> base = std::move(made);
    {
        const derived copy(*base);
        EXPECT_EQ(copy.first_member, 'm');
        EXPECT_EQ(copy.state, 2);
    }
    base.reset();
    EXPECT_EQ(derived::ended, 2);
}

TEST_F(context, reset_clears_the_message_and_keeps_the_connection)
{
    soap ctx(MODE_KEEP_ALIVE, 0);
    const auto message = [&ctx] {
        return std::tuple(ctx.mode, ctx.message_count, ctx.content_length, ctx.dime.chunk_size,
                          ctx.dime.buffer_length, ctx.nesting_level, ctx.error, ctx.peeked, ctx.null_flag,
                          ctx.in_cdata, std::string(ctx.endpoint));
    };
    const auto connection = [&ctx] {
        return std::tuple(ctx.buffer_index, ctx.buffer_length, ctx.keep_alive);
    };
    soap_reset_call(&ctx);
    const auto fresh = message();
    const auto none = connection();
    std::tie(ctx.buffer_index, ctx.buffer_length, ctx.keep_alive) = std::tuple(3, 9, 1);
    const auto kept = connection();
    ctx.mode = MODE_CHUNKED;
    ctx.message_count = ctx.content_length = ctx.dime.chunk_size = ctx.dime.buffer_length = 5;
    ctx.nesting_level = 3;
    ctx.error = 5;
    ctx.peeked = ctx.null_flag = ctx.in_cdata = 1;
    std::strcpy(ctx.endpoint, "http://x");
    soap_reset_call(&ctx);
    EXPECT_EQ(message(), fresh);
    EXPECT_EQ(connection(), kept) << "bytes of a kept connection";
    ctx.keep_alive = 0;
    soap_reset_call(&ctx);
    EXPECT_EQ(connection(), none);
}

TEST_F(context, the_scratch_of_a_call_is_freed_whole)
{
    soap ctx;
    ASSERT_EQ(soap_attr_set(&ctx, "a", "value", 1), 0);
    auto *reference = static_cast<soap_attachment_ref *>(SOAP_MALLOC(&ctx, sizeof(soap_attachment_ref)));
    *reference = {};
    ctx.mtom_list = reference;
    soap_text_buffer_put(&ctx, "x", 1);
    soap_block_stack_push(&ctx);
    soap_block_stack_grow(&ctx, nullptr, 8);
    soap_block_stack_push(&ctx);
    ASSERT_EQ(soap_set_namespaces(&ctx, soap_program_namespaces), 0);
    ctx.local_namespaces[1].received = static_cast<char *>(SOAP_MALLOC(&ctx, 8));
    ctx.encoding_style = ctx.local_namespaces[1].received;
    soap_call_scratch_free(&ctx);
    EXPECT_TRUE(!ctx.attribute_list && !ctx.mtom_list && !ctx.label_buffer && !ctx.block_stack &&
                !ctx.local_namespaces);
    EXPECT_STREQ(ctx.encoding_style, "");
}

TEST_F(context, discard_forgets_instances_that_the_destructor_destroys)
{
    int destroyed = 0;
    const auto count = [](soap_instance *instance) { return ++*static_cast<int *>(instance->object), 0; };
    {
        soap ctx;
        soap_instance_register(&ctx, &destroyed, 1, -1, count);
        soap_discard_all(&ctx);
        EXPECT_EQ(ctx.instance_list, nullptr);
        EXPECT_EQ(destroyed, 0);
        soap_instance_register(&ctx, &destroyed, 1, -1, count);
    }
    EXPECT_EQ(destroyed, 1);
}

TEST_F(context_copy, refuses_what_is_no_context)
{
    soap ended;
    soap_engine_done(&ended);
    soap target(MODE_STRICT);
    EXPECT_EQ(soap_context_copy(&target, &ended), nullptr);
    EXPECT_EQ(soap_context_copy(&target, nullptr), nullptr);
    EXPECT_EQ(soap_context_copy(nullptr, &target), nullptr);
    EXPECT_EQ(soap_context_copy(&ended), nullptr);
    EXPECT_EQ(soap_context_copy(&target, &target), &target);
    EXPECT_EQ(target.state, 1);
    EXPECT_EQ(target.mode, MODE_STRICT) << "left as it was";
    const soap of_ended(ended);
    EXPECT_EQ(of_ended.state, 0);
}

TEST_F(context_copy, keeps_settings_and_shares_nothing_that_is_owned)
{
    soap source(MODE_STRICT, MODE_CHUNKED);
    source.recv_timeout = 7;
    source.error = 5;
    source.auth_user = source.auth_password = source.action = source.http_content =
        soap_string_dup(&source, "managed");
    source.header = static_cast<SOAP_ENV__Header *>(soap_block_alloc(&source, 8));
    soap_text_buffer_put(&source, "x", 1);
    soap_block_stack_push(&source);
    ASSERT_EQ(soap_set_namespaces(&source, soap_program_namespaces), 0);
    soap_log_set_sent(&source, "sent.log");
    source.zlib_buffer = static_cast<char *>(SOAP_MALLOC(&source, 16));
    source.encoding_style = source.local_namespaces[1].received =
        std::strcpy(static_cast<char *>(SOAP_MALLOC(&source, 8)), "urn:in");

    soap copy(source);
    EXPECT_STREQ(copy.encoding_style, "") << "the style went with the table";
    EXPECT_EQ(copy.state, 2);
    EXPECT_EQ(copy.input_mode, MODE_STRICT);
    EXPECT_EQ(copy.recv_timeout, 7);
    EXPECT_STREQ(copy.log_paths[SOAP_LOG_SENT], "sent.log");
    EXPECT_NE(copy.log_paths[SOAP_LOG_SENT], source.log_paths[SOAP_LOG_SENT]);
    EXPECT_NE(copy.local_namespaces, source.local_namespaces);
    EXPECT_NE(copy.zlib_stream, source.zlib_stream);
    EXPECT_EQ(copy.pointer_chains, copy.pointer_table);
    EXPECT_TRUE(!copy.auth_user && !copy.auth_password && !copy.action && !copy.http_content &&
                !copy.header && !copy.label_buffer && !copy.block_stack && !copy.allocation_list &&
                !copy.zlib_buffer);
    soap_text_buffer_put(&copy, "y", 1);
    soap_string_dup(&copy, "its own");
}

TEST_F(context_copy, outlives_its_source_and_keeps_the_tls_context)
{
    auto source = std::make_unique<soap>();
    soap_set_namespaces(source.get(), soap_program_namespaces);
    source->tls_context = SSL_CTX_new(TLS_client_method());
    soap copy(*source);
    soap *const second = soap_context_copy(&copy);
    source.reset();
    EXPECT_STREQ(copy.local_namespaces[0].prefix, "SOAP-ENV");
    soap_reset_call(&copy);
    soap_context_free(second);
    SSL *const connection = SSL_new(copy.tls_context);
    EXPECT_NE(connection, nullptr);
    SSL_free(connection);
}

TEST_F(context_copy, frees_what_its_target_held_and_the_tls_context_that_it_makes)
{
    const soap source;
    std::ptrdiff_t before = 0;
    for (int round = 0; round < 2; ++round) { // the first makes what a process makes but once
        before = failing_malloc::held();
        soap target, copy(source);
        soap_string_dup(&target, "its own");
        soap_log_set_sent(&target, "sent.log");
        EXPECT_EQ(soap_context_copy(&target, &source), &target);
        EXPECT_EQ(soap_context_copy(&target, &source), &target);
        EXPECT_EQ(
            soap_ssl_client_context(&copy, TLS_NO_DEFAULT_CA, nullptr, nullptr, nullptr, nullptr, nullptr),
            0);
    }
    EXPECT_EQ(failing_malloc::held(), before);
}

// A proxy in the middle of its life: connected, the last answer's rest unread, with a fault and a header.
struct busy_proxy {
    busy_proxy() : proxy("http://host/", static_cast<int>(MODE_KEEP_ALIVE))
    {
        EXPECT_EQ(socketpair(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0, ends), 0);
        soap_log_set_sent(&proxy, "/dev/null");
        proxy.socket = ends[0];
        proxy.keep_alive = 1;
        proxy.input_mode |= MODE_TLS;
        proxy.output_mode |= MODE_TLS;
        proxy.response_unfinished = true;
        proxy.buffer_index = 2;
        proxy.buffer_length = 9;
        soap_fault_sender(&proxy, tcp_error_text(&proxy), "detail", 77);
    }
    ~busy_proxy() { close(ends[1]); }

    int ends[2] = {};
    ProfileSoapBindingProxy proxy;
};

void expect_no_connection(const soap &made)
{
    EXPECT_EQ(made.socket, -1);
    EXPECT_EQ(made.keep_alive, 0);
    EXPECT_EQ(made.input_mode, MODE_KEEP_ALIVE);
    EXPECT_EQ(made.output_mode, MODE_KEEP_ALIVE);
    EXPECT_FALSE(made.response_unfinished);
    EXPECT_EQ(made.buffer_index + made.buffer_length, 0u);
    EXPECT_STREQ(made.log_paths[SOAP_LOG_SENT], "/dev/null");
}

TEST_F(context_copy, starts_without_a_connection_however_it_is_made)
{
    using proxy = ProfileSoapBindingProxy;
    using made = std::unique_ptr<soap>;
    static const std::tuple<const char *, made (*)(const proxy &source)> cases[] = {
        {"context of a proxy", [](const proxy &source) { return std::make_unique<soap>(source); }},
        {"proxy of a context",
         [](const proxy &source) -> made {
             return std::make_unique<proxy>(static_cast<const soap &>(source));
         }},
        {"proxy of a proxy", [](const proxy &source) -> made { return std::make_unique<proxy>(source); }},
        {"soap_context_copy",
         [](const proxy &source) {
             auto target = std::make_unique<soap>();
             EXPECT_EQ(soap_context_copy(target.get(), &source), target.get());
             return target;
         }},
    };
    for (const auto &[how, make] : cases) {
        SCOPED_TRACE(how);
        busy_proxy busy;
        {
            const made copy = make(busy.proxy);
            expect_no_connection(*copy);
            EXPECT_NE(copy->log_paths[SOAP_LOG_SENT], busy.proxy.log_paths[SOAP_LOG_SENT]);
            const auto *const as_proxy = dynamic_cast<proxy *>(copy.get());
            EXPECT_TRUE(as_proxy == nullptr || as_proxy->endpoint == nullptr);
        }
        EXPECT_TRUE(is_open(busy.ends[0]));
        EXPECT_EQ(busy.proxy.socket, busy.ends[0]);
    }
}

TEST_F(context_copy, that_moves_takes_all_but_the_connection)
{
    static int closed;
    closed = 0;
    busy_proxy busy;
    busy.proxy.on_close_socket = [](soap *, int socket) { return ++closed, close(socket); };
    const char *const text = soap_string_dup(&busy.proxy, "managed");
    busy.proxy.auth_user = text;
    std::vector<ProfileSoapBindingProxy> proxies;
    proxies.push_back(std::move(busy.proxy));
    EXPECT_EQ(closed, 1);
    EXPECT_FALSE(is_open(busy.ends[0]));
    for (int i = 0; i < 3; ++i)
        proxies.emplace_back("http://other/"); // the vector grows
    expect_no_connection(proxies.front());
    EXPECT_STREQ(proxies.front().endpoint, "http://host/");
    EXPECT_EQ(proxies.front().state, 1) << "an original, not a copy";
    EXPECT_EQ(proxies.front().auth_user, text);
    EXPECT_STREQ(proxies.front().soap_fault_string(), "Operation interrupted or timed out");
    EXPECT_STREQ(proxies.front().soap_fault_detail(), "detail");
    EXPECT_EQ(busy.proxy.socket, -1); // NOLINT(bugprone-use-after-move): as a new one
    EXPECT_EQ(busy.proxy.endpoint, nullptr);
    EXPECT_STREQ(soap_string_dup(&busy.proxy, "serves on"), "serves on");
    proxies.clear();
    EXPECT_EQ(closed, 1);
}

TEST_F(context_copy, serves_the_connection_that_its_source_accepted_and_closes_only_that)
{
    soap service(MODE_KEEP_ALIVE), client;
    ASSERT_GE(soap_bind(&service, "127.0.0.1", 0, 5), 0);
    sockaddr_in address{};
    socklen_t size = sizeof address;
    getsockname(service.master_socket, reinterpret_cast<sockaddr *>(&address), &size);
    for (const bool refused : {false, true}) {
        ASSERT_GE(tcp_connect(&client, "http://x/", "127.0.0.1", ntohs(address.sin_port)), 0);
        ASSERT_GE(soap_accept(&service), 0);
        soap *copy = nullptr;
        if (refused) {
            const failing_malloc::scope armed(4, failing_malloc::refuse::all_from);
            copy = soap_context_copy(&service);
        } else {
            copy = soap_context_copy(&service);
            const ProfileSoapBindingProxy caller(service); // no service's copy
            EXPECT_EQ(caller.socket, -1);
        }
        ASSERT_EQ(copy == nullptr, refused);
        EXPECT_TRUE(is_open(service.socket));
        if (refused) {
            tcp_disconnect(&service);
            continue;
        }
        EXPECT_EQ(copy->socket, service.socket);
        EXPECT_EQ(copy->keep_alive, 1);
        service.socket = -1;
        ASSERT_GE(soap_bind(copy, "127.0.0.1", 0, 1), 0);
        EXPECT_TRUE(is_open(service.master_socket)) << "a copy's own listening leaves the source's alone";
        const int own = copy->master_socket, accepted = copy->socket;
        soap_context_free(copy);
        EXPECT_FALSE(is_open(own));
        EXPECT_FALSE(is_open(accepted));
    }
    EXPECT_TRUE(is_open(service.master_socket));
}

TEST_F(context_copy, and_start_survive_every_refusal)
{
    soap source;
    soap_set_namespaces(&source, soap_program_namespaces);
    const std::function<soap *()> ways[] = {[] { return soap_context_create(); },
                                            [&] { return soap_context_copy(&source); }};
    for (const auto how : {failing_malloc::refuse::one, failing_malloc::refuse::all_from})
        for (const auto &make : ways) {
            soap *made = nullptr;
            const std::size_t refusals = failing_malloc::at_each_allocation(
                how, [&] { made = make(); },
                [&](bool) {
                    soap_context_free(made);
                    made = nullptr;
                });
            EXPECT_GT(refusals, 3u);
        }
}

} // namespace

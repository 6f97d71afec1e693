// tls_setup_test.cpp - the set-up of TLS, and the library's own server side.
#include <future>
#include <openssl/err.h>

#include "support/socket_calls.h"
#include "support/tls_peer.h"

namespace {

using namespace tls_peers;

class tls_setup : public tls_test {};

TEST_F(tls_setup, a_set_up_that_fails_says_why_and_leaves_no_context)
{
    const std::string junk = ca().write("junk.pem", [](std::FILE *file) { std::fputs("junk\n", file); });
    const std::string lone = ca().ca_file(); // a certificate without a key
    const std::string why = ": No such file or directory";
    const std::tuple<const char *, const char *, const char *, const char *, std::string> cases[] = {
        {nullptr, "/nonexistent", nullptr, nullptr, "Can't read CA file: /nonexistent" + why},
        {nullptr, junk.c_str(), nullptr, nullptr, "Can't read CA file: " + junk},
        {"/nonexistent", nullptr, nullptr, nullptr, "Can't read certificate key file: /nonexistent" + why},
        {lone.c_str(), nullptr, nullptr, nullptr, "Can't read key file: " + lone},
        {nullptr, nullptr, nullptr, "/nonexistent", "Can't load randomness: /nonexistent" + why},
        {nullptr, nullptr, "/nonexistent", nullptr, "Can't read DH file: /nonexistent" + why},
        {nullptr, nullptr, "511", nullptr, "Can't read DH file: 511" + why},
        {nullptr, nullptr, junk.c_str(), nullptr, "Can't set DH parameters"},
        {nullptr, nullptr, "8193", nullptr, "Can't set DH parameters"},
    };
    for (const auto &[key, ca, dh, random, detail] : cases) {
        context ctx;
        EXPECT_EQ(soap_ssl_server_context(ctx.get(), TLS_NO_DEFAULT_CA, key, nullptr, ca, nullptr, dh, random,
                                          nullptr),
                  SOAP_TLS_ERROR);
        EXPECT_EQ(ctx.fault_text(), "SSL/TLS error");
        EXPECT_EQ(ctx.fault_detail(), detail);
        EXPECT_EQ(ctx->tls_context, nullptr);
    }
    context ctx;
    ctx->tls_crl = "/nonexistent";
    EXPECT_EQ(set_up_client(ctx), SOAP_TLS_ERROR);
    EXPECT_EQ(ctx.fault_detail(), "Can't read CRL file: /nonexistent" + why);
}

// Answers each request of a connection by one byte.
void answer_each(SSL *connection)
{
    static constexpr char ANSWER[] = "HTTP/1.1 200 OK\r\nContent-Length: 1\r\n\r\nx";
    std::string head;
    for (char byte; SSL_read(connection, &byte, 1) == 1;) {
        head += byte;
        if (!head.ends_with("\r\n\r\n"))
            continue;
        head.clear();
        SSL_write(connection, ANSWER, sizeof ANSWER - 1);
    }
}

// One exchange with such a server, on a kept connection where there is one. The code.
int get(soap *ctx, int port)
{
    soap_reset_call(ctx);
    const std::string url = "https://peer.test:" + std::to_string(port) + "/";
    if (soap_connect_one(ctx, STATUS_GET, url.c_str(), nullptr) == 0 && soap_receive_begin(ctx) == 0) {
        EXPECT_EQ(soap_recv_byte(ctx), 'x');
        soap_receive_finish(ctx);
    }
    return soap_socket_release(ctx);
}

TEST_F(tls_setup, new_rules_take_force_at_the_next_call_of_the_context_that_has_them)
{
    const subject expired{"peer.test", "", -2 * DAY, -DAY};
    const std::string trusted = ca().ca_file();
    const std::tuple<const char *, const subject &, unsigned, unsigned, const char *, int, int> cases[] = {
        {"the same", BY_NAME, VERIFIED, VERIFIED, trusted.c_str(), 0, 0},
        {"expired certificates are refused again", expired, VERIFIED | TLS_ALLOW_EXPIRED, VERIFIED,
         trusted.c_str(), 0, SOAP_TLS_ERROR},
        {"the authority is removed", BY_NAME, VERIFIED, VERIFIED, nullptr, 0, SOAP_TLS_ERROR},
        {"the set-up fails", BY_NAME, VERIFIED, VERIFIED, "/nonexistent", SOAP_TLS_ERROR, SOAP_TLS_ERROR},
    };
    for (const int version : {TLS1_2_VERSION, TLS1_3_VERSION}) {
        for (const auto &[rule, who, first_flags, second_flags, second_ca, set_up, code] : cases) {
            SCOPED_TRACE(std::string(rule) + (version == TLS1_2_VERSION ? ", 1.2" : ", 1.3"));
            std::vector<int> resumed;
            {
                tls_peer server(server_for(who, version), noting(resumed, answer_each), 10);
                context ctx(MODE_KEEP_ALIVE);
                ASSERT_EQ(set_up_client(ctx, first_flags), 0);
                EXPECT_EQ(get(ctx.get(), server.port()), 0) << ctx.fault_text();
                EXPECT_EQ(get(ctx.get(), server.port()), 0);
                soap copy(*ctx.get());
                EXPECT_EQ(soap_ssl_client_context(ctx.get(), static_cast<std::uint16_t>(second_flags),
                                                  nullptr, nullptr, second_ca, nullptr, nullptr),
                          set_up);
                EXPECT_EQ(ctx->socket, -1) << "the kept connection is closed";
                EXPECT_EQ(get(ctx.get(), server.port()), code);
                tcp_disconnect(ctx.get());
                copy.keep_alive = 0;
                EXPECT_EQ(get(&copy, server.port()), 0) << "made before, it keeps the rules that it had";
                tcp_disconnect(&copy);
                ASSERT_EQ(set_up_client(ctx, first_flags), 0);
                EXPECT_EQ(get(ctx.get(), server.port()), 0);
            }
            EXPECT_EQ(resumed, std::vector<int>(code == 0 ? 4 : 3, 0));
        }
    }
}

TEST_F(tls_setup, a_kept_connection_carries_calls_of_its_own_rules_only)
{
    static const struct {
        const char *rule;
        std::vector<int> resumed; // of each connection, whether its session was
        void (*change)(soap &ctx);
        std::uint32_t legacy = 0;
    } cases[] = {
        {"nothing changes", {0}, [](soap &) {}},
        {"nothing is kept but the session", {0, 1}, [](soap &ctx) { tcp_disconnect(&ctx); }},
        {"flags", {0, 1}, [](soap &ctx) { ctx.tls_flags |= TLS_STRICT_HOST_CHECK; }},
        {"flags, as formerly",
         {0},
         [](soap &ctx) { ctx.tls_flags |= TLS_STRICT_HOST_CHECK; },
         LEGACY_ANY_ROUTE},
        {"a TLS context of the host's own",
         {0, 0},
         [](soap &ctx) {
             SSL_CTX_free(ctx.tls_context);
             ctx.tls_context = SSL_CTX_new(TLS_client_method());
             SSL_CTX_load_verify_file(ctx.tls_context, ctx.tls_ca_file);
         }},
    };
    for (const auto &c : cases) {
        SCOPED_TRACE(c.rule);
        std::vector<int> resumed;
        {
            tls_peer server(server_for(BY_NAME), noting(resumed, answer_each), 2);
            context ctx(MODE_KEEP_ALIVE);
            ctx->legacy = c.legacy;
            ASSERT_EQ(set_up_client(ctx), 0);
            EXPECT_EQ(get(ctx.get(), server.port()), 0);
            c.change(*ctx.get());
            EXPECT_EQ(get(ctx.get(), server.port()), 0);
        }
        EXPECT_EQ(resumed, c.resumed);
    }
}

bool come_together(SSL_CTX *one, SSL_CTX *other)
{
    SSL_CTX_set_cipher_list(one, "ALL:@SECLEVEL=0"); // OpenSSL's level alone would refuse the older versions
    SSL_CTX_set_cipher_list(other, "ALL:@SECLEVEL=0");
    const server_connection client(SSL_new(one)), server(SSL_new(other));
    BIO *near = nullptr, *far = nullptr;
    BIO_new_bio_pair(&near, 0, &far, 0);
    SSL_set_bio(client.get(), near, near);
    SSL_set_bio(server.get(), far, far);
    SSL_set_connect_state(client.get());
    SSL_set_accept_state(server.get());
    for (int i = 0; i < 10; ++i) {
        SSL_do_handshake(client.get());
        SSL_do_handshake(server.get());
    }
    ERR_clear_error();
    return SSL_is_init_finished(client.get()) && SSL_is_init_finished(server.get());
}

TEST_F(tls_setup, versions_before_1_2_are_spoken_only_if_the_host_lowers_the_least)
{
    const std::string pair =
        ca().write_pair("old.pem", ca().issue(BY_NAME, server_key()).get(), server_key());
    constexpr unsigned FLAGS[] = {VERIFIED, VERIFIED | TLS_NO_TLSV1 | TLS_STRICT_HOST_CHECK,
                                  TLS_NO_DEFAULT_CA};
    for (const unsigned flags : FLAGS) {
        for (const int version : {TLS1_VERSION, TLS1_1_VERSION, TLS1_2_VERSION, TLS1_3_VERSION}) {
            const auto other = [version](const SSL_METHOD *method) {
                server_context made(SSL_CTX_new(method));
                SSL_CTX_set_min_proto_version(made.get(), TLS1_VERSION);
                SSL_CTX_set_max_proto_version(made.get(), version);
                return made;
            };
            const server_context server = other(TLS_server_method()), client = other(TLS_client_method());
            SSL_CTX_use_certificate(server.get(), ca().issue(BY_NAME, server_key()).get());
            SSL_CTX_use_PrivateKey(server.get(), server_key());
            context ctx, service;
            ASSERT_EQ(set_up_client(ctx, flags), 0);
            ASSERT_EQ(soap_ssl_server_context(service.get(), static_cast<std::uint16_t>(flags), pair.c_str(),
                                              nullptr, ca().ca_file().c_str(), nullptr, nullptr, nullptr,
                                              nullptr),
                      0);
            SSL_CTX_set_verify(service->tls_context, SSL_VERIFY_NONE, nullptr);
            const bool recent = version >= TLS1_2_VERSION;
            SCOPED_TRACE(version);
            EXPECT_EQ(come_together(ctx->tls_context, server.get()), recent);
            EXPECT_EQ(come_together(client.get(), service->tls_context), recent);
            SSL_CTX_set_min_proto_version(ctx->tls_context, TLS1_VERSION);
            const bool without_1_0 = (flags & TLS_NO_TLSV1) != 0;
            EXPECT_EQ(come_together(ctx->tls_context, server.get()), version != TLS1_VERSION || !without_1_0);
            ASSERT_EQ(set_up_client(ctx, flags), 0);
            EXPECT_EQ(come_together(ctx->tls_context, server.get()), recent) << "a new set-up";
        }
    }
}

TEST_F(tls_setup, the_password_callback_needs_room_for_the_terminator)
{
    char buffer[5];
    char password[] = "four";
    EXPECT_EQ(tls_password_callback(buffer, 4, 0, password), 0);
    EXPECT_EQ(tls_password_callback(buffer, 5, 0, password), 4);
    EXPECT_STREQ(buffer, "four");
    EXPECT_EQ(tls_password_callback(buffer, 5, 0, nullptr), 0);
}

int listen_with(context &service, const std::string &pair, unsigned flags = TLS_NO_DEFAULT_CA,
                const char *trusted = nullptr, const char *dh = nullptr)
{
    service->accept_timeout = 10;
    EXPECT_EQ(soap_ssl_server_context(service.get(), static_cast<std::uint16_t>(flags), pair.c_str(), nullptr,
                                      trusted, nullptr, dh, nullptr, "service"),
              0);
    EXPECT_GE(soap_bind(service.get(), "127.0.0.1", 0, 5), 0);
    return loopback::port_of(service->master_socket);
}

struct accept_outcome {
    int result;
    std::string text, detail;
    bool closed;
};

// Runs the library's server for one client, which echoes one byte if the handshake succeeds.
std::future<accept_outcome> serve_one(context &service)
{
    return std::async(std::launch::async, [&service] {
        char byte;
        const bool came = soap_accept(service.get()) >= 0;
        const int result = came ? soap_ssl_accept(service.get()) : -1;
        const accept_outcome outcome{result, service.fault_text(), service.fault_detail(),
                                     service->socket == -1};
        if (result == 0 && tcp_recv(service.get(), &byte, 1) == 1)
            tcp_send(service.get(), &byte, 1);
        tcp_disconnect(service.get());
        return outcome;
    });
}

std::string server_pair()
{
    return ca().write_pair("server.pem", ca().issue(BY_NAME, server_key()).get(), server_key());
}

TEST_F(tls_setup, a_client_certificate_is_asked_for_and_verified)
{
    const certificates::key client_key = certificates::make_key();
    const subject client_name{"client.test", ""};
    const std::string server = server_pair(), trusted = ca().ca_file();
    const std::string good = ca().write_pair("client.pem", ca().issue(client_name, client_key.get()).get(),
                                             client_key.get(), "secret");
    const certificates::certificate own =
        certificates::make(client_name, client_key.get(), nullptr, client_key.get(), 7);
    const std::string unknown = ca().write_pair("unknown.pem", own.get(), client_key.get());
    // The fourth: the host's own verification lets everyone in.
    const std::tuple<const char *, const char *, bool, bool, const char *> cases[] = {
        {good.c_str(), "secret", true, false, nullptr},
        {good.c_str(), "secret", true, true, nullptr},
        {unknown.c_str(), nullptr, false, false,
         "SSL_accept() failed in soap_ssl_accept(): self-signed certificate (at depth 0: "
         "CN=client.test,O=Test)"},
        {unknown.c_str(), nullptr, false, true,
         "SSL certificate presented by peer cannot be verified in soap_ssl_accept()"},
        {nullptr, nullptr, false, false, "SSL_accept() failed in soap_ssl_accept()"},
        {nullptr, nullptr, false, true, "No SSL certificate was presented by the peer in soap_ssl_accept()"}};
    for (const auto &[pair, password, accepted, by_host, detail] : cases) {
        context service, client;
        const int port =
            listen_with(service, server, TLS_REQUIRE_CLIENT_CERT | TLS_NO_DEFAULT_CA, trusted.c_str());
        if (by_host)
            SSL_CTX_set_verify(service->tls_context, SSL_VERIFY_PEER,
                               [](int, X509_STORE_CTX *) { return 1; });
        std::future<accept_outcome> outcome = serve_one(service);
        ASSERT_EQ(soap_ssl_client_context(client.get(), VERIFIED, pair, password, trusted.c_str(), nullptr,
                                          nullptr),
                  0);
        client->recv_timeout = 10;
        ASSERT_GE(open_to(client, port), 0) << client.fault_text();
        EXPECT_EQ(exchange(client, "x"), accepted ? "x" : "");
        tcp_disconnect(client.get());
        const accept_outcome end = outcome.get();
        EXPECT_EQ(end.result, accepted ? 0 : SOAP_TLS_ERROR) << end.text;
        EXPECT_EQ(end.closed, !accepted);
        EXPECT_EQ((service->input_mode & MODE_TLS) != 0, accepted) << "addresses would begin with http:";
        if (!accepted) {
            EXPECT_EQ(end.detail, detail);
        }
    }
    context service, trusting; // by verification of its own
    const int port = listen_with(service, server);
    std::future<accept_outcome> outcome = serve_one(service);
    ASSERT_EQ(soap_ssl_client_context(trusting.get(), VERIFIED, nullptr, nullptr, nullptr, nullptr, nullptr),
              0);
    SSL_CTX_set_verify(trusting->tls_context, SSL_VERIFY_PEER, [](int, X509_STORE_CTX *) { return 1; });
    EXPECT_EQ(open_to(trusting, port), -1);
    EXPECT_TRUE(trusting.fault_detail().starts_with(
        "SSL/TLS certificate presented by peer cannot be verified in tcp_connect()"))
        << trusting.fault_detail();
    outcome.get();
    for (const char *const password : {"wrong", static_cast<const char *>(nullptr)}) {
        context refused;
        EXPECT_EQ(soap_ssl_client_context(refused.get(), VERIFIED, good.c_str(), password, nullptr, nullptr,
                                          nullptr),
                  SOAP_TLS_ERROR)
            << "and no one is asked at the terminal";
        EXPECT_TRUE(refused.fault_detail().starts_with("Can't read key file: /")) << refused.fault_detail();
    }
}

TEST_F(tls_setup, a_server_takes_its_diffie_hellman_group_from_file_or_size)
{
    const certificates::key key(EVP_RSA_gen(2048)); // no DHE suite goes with an elliptic curve
    const std::string server = ca().write_pair("rsa.pem", ca().issue(BY_NAME, key.get()).get(), key.get());
    const std::string file = ca().write("dh.pem", [](std::FILE *out) {
        EVP_PKEY_CTX *generator = EVP_PKEY_CTX_new_from_name(nullptr, "DH", nullptr);
        EVP_PKEY *parameters = nullptr;
        EVP_PKEY_paramgen_init(generator);
        EVP_PKEY_CTX_set_group_name(generator, "ffdhe3072");
        EVP_PKEY_paramgen(generator, &parameters);
        BIO *bio = BIO_new_fp(out, BIO_NOCLOSE);
        PEM_write_bio_Parameters(bio, parameters);
        BIO_free(bio);
        EVP_PKEY_free(parameters);
        EVP_PKEY_CTX_free(generator);
    });
    const std::pair<const char *, int> cases[] = {
        {"512", 2048}, {"2049", 3072}, {file.c_str(), 3072}, {nullptr, 0}};
    for (const auto &[dh, bits] : cases) {
        context service, client;
        client->connect_timeout = 10;
        const int port = listen_with(service, server, TLS_NO_DEFAULT_CA, nullptr, dh);
        std::future<accept_outcome> outcome = serve_one(service);
        ASSERT_EQ(set_up_client(client), 0);
        SSL_CTX_set_max_proto_version(client->tls_context, TLS1_2_VERSION);
        SSL_CTX_set_cipher_list(client->tls_context, "DHE");
        ASSERT_GE(open_to(client, port), 0) << client.fault_text();
        EVP_PKEY *temporary = nullptr;
        ASSERT_EQ(SSL_get_peer_tmp_key(client->tls_connection, &temporary), 1);
        if (bits != 0) {
            EXPECT_EQ(EVP_PKEY_get_bits(temporary), bits) << dh;
        }
        EVP_PKEY_free(temporary);
        EXPECT_EQ(exchange(client, "x"), "x");
        tcp_disconnect(client.get());
        EXPECT_EQ(outcome.get().result, 0);
    }
}

TEST_F(tls_setup, a_server_handshake_without_a_socket_or_a_client_fails)
{
    context service, client;
    EXPECT_EQ(soap_ssl_accept(service.get()), SOAP_TLS_ERROR);
    EXPECT_EQ(service.fault_detail(), "No socket in soap_ssl_accept()");
    ASSERT_GE(tcp_connect(client.get(), "http://x/", "127.0.0.1", listen_with(service, server_pair())), 0);
    ASSERT_EQ(tcp_send(client.get(), "GET / HTTP/1.0\r\n\r\n", 18), 0);
    ASSERT_GE(soap_accept(service.get()), 0);
    EXPECT_EQ(soap_ssl_accept(service.get()), SOAP_TLS_ERROR);
    EXPECT_EQ(service->socket, -1);
    EXPECT_EQ(service.fault_detail(), "SSL_accept() failed in soap_ssl_accept()");
    EXPECT_THAT(service.fault_text(), HasSubstr("http request"));
}

} // namespace

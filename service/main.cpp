// main.cpp - zuv-service: options, and the program's life from listening to the signal that ends it.
#include <csignal>
#include <cstdio>
#include <cstdlib>
#include <exception>
#include <filesystem>
#include <fstream>
#include <optional>
#include <stdexcept>
#include <string>
#include <system_error>
#include <vector>

#include <malloc.h>

#include <CLI/CLI.hpp>

#include <zuv_client_pro/soap_log.h>

#include "catalogue.h"
#include "certificates.h"
#include "port.h"
#include "server.h"

namespace {

constexpr int WRONG_USAGE = 2; // exit status

struct options {
    service::settings config;
    std::vector<std::string> accounts; // "user:password"
    std::string basic_file;            // its first line is the "user:password" that clients must give
    std::string authority;             // directory of a test authority
    std::string port_file;             // gets the port once the service listens
    bool json = false;                 // announce the service's addresses as JSON
};

void declare(CLI::App &app, options &o)
{
    service::settings &s = o.config;
    app.add_option("--host", s.host, "Address to listen on")->capture_default_str();
    app.add_option("--port", s.port, "Port to listen on; 0: any free one")
        ->check(CLI::Range(0, 65535))
        ->take_last()
        ->capture_default_str();
    app.add_option("--database", s.database,
                   "File that keeps the documents; without one they end with the program");
    auto *const user = app.add_option("--user", s.user, "User name that clients must give (HTTP Basic)");
    auto *const password = app.add_option("--password", s.password, "Password that clients must give");
    user->needs(password);
    password->needs(user);
    app.add_option(
           "--basic", o.basic_file,
           "File with the USER:PASSWORD that clients must give; or ZUV_SERVICE_BASIC in the environment")
        ->check(CLI::ExistingFile)
        ->excludes(user);
    app.add_option("--account", o.accounts, "USER:PASSWORD that authenticates; may be given several times");
    app.add_flag("--strict", s.strict,
                 "Refuse requests that hold what the contract does not know, and name it");
    app.add_flag("--indent", s.indent, "Indent the XML of answers");
    app.add_flag("--chunked", s.chunked, "Send answers in chunks");
    app.add_option("--access-log", s.access_log,
                   "File that takes a line for each exchange; -: standard output. Opened again on SIGHUP");
    app.add_option("--rules", s.rules, "JSON file of rules that say how the next calls are answered")
        ->check(CLI::ExistingFile);
    app.add_flag("--control", s.control,
                 "Take such rules from clients on this machine too, at /zuv/v1.0/control, and resets at "
                 "/zuv/v1.0/control/reset");
    app.add_option("--seed", s.seed,
                   "File of a request, or folder of such files, that a store without documents begins with")
        ->check(CLI::ExistingPath);
    auto *const record =
        app.add_option("--record", s.record, "File that takes each call and its answer, a line of JSON each");
    app.add_option("--replay", s.replay, "Such a file: calls get the answers recorded there")
        ->check(CLI::ExistingFile)
        ->excludes(record);
    app.add_option("--trace", s.trace, "File that takes a copy of all bytes received and sent");
    app.add_option("--port-file", o.port_file, "File that takes the port once the service listens");
    app.add_flag("--json", o.json, "Print the addresses of the ports as one line of JSON, in place of words");
    app.add_option("--max-body", s.body_limit, "Largest request, in bytes")->capture_default_str();
    app.add_option("--max-attachments", s.attachment_limit, "Largest attachments of a request, in bytes")
        ->capture_default_str();
    app.add_option("--connections", s.connections, "Connections served at a time")
        ->check(CLI::Range(1, 512))
        ->capture_default_str();
    app.add_option("--request-time", s.request_seconds, "Seconds that a request may take to arrive")
        ->check(CLI::Range(1, 86400))
        ->capture_default_str();
    app.add_option("--idle", s.idle_seconds, "Seconds of silence that end a connection")
        ->check(CLI::Range(1, 86400))
        ->capture_default_str();
}

void split_accounts(options &o)
{
    for (const std::string &account : o.accounts) {
        const std::size_t colon = account.find(':');
        if (colon == std::string::npos)
            throw std::invalid_argument("an account is USER:PASSWORD");
        o.config.accounts.emplace_back(account.substr(0, colon), account.substr(colon + 1));
    }
}

void split_basic(options &o)
{
    std::string line;
    if (!o.basic_file.empty())
        std::getline(std::ifstream(o.basic_file), line);
    else if (const char *const given = std::getenv("ZUV_SERVICE_BASIC");
             given != nullptr && o.config.user.empty())
        line = given;
    else
        return;
    const std::size_t colon = line.find(':');
    if (colon == std::string::npos || colon == 0)
        throw std::invalid_argument("--basic and ZUV_SERVICE_BASIC want USER:PASSWORD");
    o.config.user = line.substr(0, colon);
    o.config.password = line.substr(colon + 1);
}

void declare_tls(CLI::App &app, options &o)
{
    service::settings &s = o.config;
    auto *const tls = app.add_flag("--tls", s.tls, "HTTPS; needs --cert or --make-ca");
    auto *const certificate = app.add_option(
        "--cert", s.certificate, "PEM file of the certificate chain, and of its key without --key");
    certificate->needs(tls);
    app.add_option("--key", s.key, "PEM file of the certificate's key")->needs(certificate);
    app.add_option("--make-ca", o.authority,
                   "Directory in which a test authority and certificates of it for this machine are made, "
                   "unless there")
        ->needs(tls)
        ->excludes(certificate);
    app.add_option("--client-ca", s.client_ca, "PEM file of authorities; clients need a certificate of one")
        ->needs(tls)
        ->check(CLI::ExistingFile);
}

void settle_tls(options &o)
{
    if (!o.config.tls)
        return;
    if (!o.authority.empty()) {
        service::make_authority(o.authority);
        o.config.certificate = o.authority + "/server.pem";
    }
    if (o.config.certificate.empty())
        throw std::invalid_argument("--tls needs --cert or --make-ca");
}

// What is recorded must not be mixed with what else is written.
void check_record(const service::settings &s)
{
    namespace fs = std::filesystem;
    const std::pair<const char *, const std::string &> others[] = {
        {"--database", s.database}, {"--access-log", s.access_log}, {"--rules", s.rules},
        {"--seed", s.seed},         {"--trace", s.trace},           {"--key", s.key},
        {"--cert", s.certificate}};
    for (const auto &[name, path] : others) {
        std::error_code none; // of files that aren't there yet
        if (!s.record.empty() && !path.empty() &&
            (fs::equivalent(s.record, path, none) ||
             fs::weakly_canonical(s.record, none) == fs::weakly_canonical(path, none)))
            throw std::invalid_argument(std::string("--record and ") + name + " name the same file");
    }
}

// A directory for the documents of one run.
class passing_directory {
public:
    passing_directory()
    {
        std::string name = std::filesystem::temp_directory_path() / "zuv-service-XXXXXX";
        if (mkdtemp(name.data()) == nullptr)
            throw std::system_error(errno, std::generic_category(), name);
        path_ = name;
    }
    ~passing_directory()
    {
        std::error_code ignored;
        std::filesystem::remove_all(path_, ignored);
    }
    passing_directory(const passing_directory &) = delete;
    passing_directory &operator=(const passing_directory &) = delete;
    std::string database() const { return path_ / "documents.db"; }

private:
    std::filesystem::path path_;
};

// A reader never sees part of the number.
void write_port_file(const std::string &path, int port)
{
    const std::string unfinished = path + ".new";
    std::ofstream(unfinished) << port << '\n';
    std::filesystem::rename(unfinished, path);
}

// For scripts: one line, before the first request is taken.
void print_json(const std::string &address, int port)
{
    std::string ports;
    for (const service::port *one : service::all_ports()) {
        ports += ports.empty() ? "\"" : ", \"";
        ports.append(one->name).append("\": \"").append(address);
        ports.append(service::SERVICES_PATH).append(one->name).append("\"");
    }
    std::printf("{\"address\": \"%s\", \"port\": %d, \"ports\": {%s}}\n", address.c_str(), port,
                ports.c_str());
}

void announce(const options &o, int port)
{
    if (!o.port_file.empty())
        write_port_file(o.port_file, port);
    const bool v6 = o.config.host.find(':') != std::string::npos;
    const std::string address = std::string(o.config.tls ? "https://" : "http://") +
                                (v6 ? "[" + o.config.host + "]" : o.config.host) + ":" + std::to_string(port);
    if (o.json)
        print_json(address, port);
    else
        std::printf("listening on %s\n", address.c_str());
    std::fflush(stdout);
}

void serve_until_signal(const options &o)
{
    sigset_t ending; // or SIGHUP: blocked in all threads, so that the wait below gets them
    sigemptyset(&ending);
    sigaddset(&ending, SIGINT);
    sigaddset(&ending, SIGTERM);
    if (!o.config.access_log.empty()) // else a hang-up ends the program as usual
        sigaddset(&ending, SIGHUP);
    pthread_sigmask(SIG_BLOCK, &ending, nullptr);

    std::optional<passing_directory> passing;
    service::database place;
    place.path = o.config.database.empty() ? passing.emplace().database() : o.config.database;
    place.data_directory = place.path + "-data";
    service::server server(o.config, place);
    server.start();
    announce(o, server.port());
    int signal = 0;
    while (sigwait(&ending, &signal) == 0 && signal == SIGHUP)
        server.reopen_log();
    server.stop();
}

// Sets from when on freed memory goes back to the system by itself: by default malloc comes to keep up to 64 MB at the
// end of each thread's heap once a block of 32 MB was freed, and malloc_trim leaves those.
void limit_free_memory()
{
    mallopt(M_MMAP_THRESHOLD, 4 << 20); // bytes
    mallopt(M_TRIM_THRESHOLD, 8 << 20);
}

int run(int argc, char **argv)
{
    limit_free_memory();
    g_TraceLogFile[0] = '\0'; // no trace unless asked for
    std::signal(SIGXFSZ,
                SIG_IGN); // a file at its limit is refused, as by a full disk, and the program goes on
    CLI::App app("zuv-service: the reference service of the zuv protocol");
    options o;
    app.set_version_flag("--version", "zuv-service " ZUV_VERSION);
    declare(app, o);
    declare_tls(app, o);
    try {
        app.parse(argc, argv);
    } catch (const CLI::ParseError &error) {
        return app.exit(error) == 0 ? 0 : WRONG_USAGE;
    }
    split_accounts(o);
    split_basic(o);
    settle_tls(o);
    check_record(o.config);
    service::the_catalogue(); // read now, while there is only one thread
    serve_until_signal(o);
    return 0;
}

} // namespace

int main(int argc, char **argv)
{
    try {
        return run(argc, argv);
    } catch (const std::exception &failure) {
        std::fprintf(stderr, "zuv-service: %s\n", failure.what());
        return 1;
    }
}

// call_options.cpp - see call_options.h. The words here are those of --help.
#include "call_options.h"

namespace cli {

void connection_options::declare(CLI::App &app)
{
    app.add_option("--user", user, "User name for HTTP Basic")->type_name("NAME")->group("Credentials");
    app.add_option("--password-file", password_file, "File with its password, or ZUV_PASSWORD")
        ->type_name("FILE")
        ->group("Credentials");
    app.add_option("--ca-file", ca_file, "Trust the certificates in this PEM file, in place of the system's")
        ->type_name("FILE")
        ->group("TLS");
    app.add_option("--ca-path", ca_path, "Trust the certificates in this directory, in place of the system's")
        ->type_name("DIR")
        ->group("TLS");
    app.add_option("--crl-file", crl_file, "Refuse the certificates that this PEM file revokes")
        ->type_name("FILE")
        ->group("TLS");
    app.add_option("--key-file", key_file, "Certificate and key of this side, PEM")
        ->type_name("FILE")
        ->group("TLS");
    app.add_option("--key-password-file", key_password_file,
                   "File with the key's password, or ZUV_KEY_PASSWORD")
        ->type_name("FILE")
        ->group("TLS");
    app.add_flag("--no-host-check", no_host_check, "Take a certificate that is made out to another host")
        ->group("TLS");
    app.add_flag("--allow-expired", allow_expired, "Take an expired certificate")->group("TLS");
    app.add_option("--proxy", proxy, "HTTP proxy")->type_name("HOST:PORT")->group("Connection");
    app.add_option("--proxy-user", proxy_user, "User name at the proxy")
        ->type_name("NAME")
        ->group("Connection");
    app.add_option("--proxy-password-file", proxy_password_file,
                   "File with its password, or ZUV_PROXY_PASSWORD")
        ->type_name("FILE")
        ->group("Connection");
    app.add_option("--connect-limit", connect_limit, "Seconds to connect in; 0: no limit")
        ->check(CLI::Range(0.0, 1e6))
        ->capture_default_str()
        ->type_name("SECONDS")
        ->group("Connection");
    app.add_option("--silence-limit", silence_limit, "Seconds that the service may be silent; 0: no limit")
        ->check(CLI::Range(0.0, 1e6))
        ->capture_default_str()
        ->type_name("SECONDS")
        ->group("Connection");
    CLI::Option *trace =
        app.add_option(
               "--trace", trace_file,
               "Append what goes over the wire to this file, \"-\" for standard output; see zuv trace")
            ->type_name("FILE")
            ->group("Output");
    app.add_flag("--trace-times", trace_times,
                 "Append the times of the trace's bytes to FILE.times beside it")
        ->needs(trace)
        ->group("Output");
    app.add_flag("-v,--verbose", verbose, "Tell what happened: times, bytes, addresses, TLS")
        ->group("Output");
    app.add_flag("-q,--quiet", quiet, "Show no progress")->group("Output");
}

void declare_endpoints(CLI::App &app, std::vector<std::string> &endpoints)
{
    app.add_option("-e,--endpoint", endpoints,
                   "Address of the service; further ones are tried when it can't be reached")
        ->allow_extra_args(false)
        ->take_all()
        ->type_name("URL")
        ->group("Connection");
}

void header_options::declare(CLI::App &app)
{
    app.add_option("-t,--target", target, "URI of the document that the call is about")
        ->type_name("URI")
        ->group("Header");
    app.add_option("--transaction", transaction, "Identifier of the transaction")
        ->type_name("ID")
        ->group("Header");
    app.add_option("--sequence", sequence, "Number of the message in its transaction")
        ->type_name("ID")
        ->group("Header");
    app.add_option("--correlation", correlation, "Identifier that the answer is matched by")
        ->type_name("ID")
        ->group("Header");
    app.add_option("--priority", priority, "Priority, a positive number")
        ->check(CLI::PositiveNumber)
        ->type_name("NUMBER")
        ->group("Header");
    app.add_option("--note", notes, "Readable note; may be repeated")
        ->allow_extra_args(false)
        ->take_all()
        ->type_name("TEXT")
        ->group("Header");
    app.add_option("--credentials", credentials,
                   "protocol:Credentials document for the header; may be repeated")
        ->allow_extra_args(false)
        ->take_all()
        ->type_name("FILE")
        ->group("Header");
    app.add_option("--header", file, "protocol:Header document with whatever else the header holds")
        ->type_name("FILE")
        ->group("Header");
}

void message_options::declare(CLI::App &app)
{
    app.add_flag("--soap12", soap12, "SOAP 1.2 instead of 1.1")->group("Message");
    app.add_flag("--gzip", gzip, "Compress the request")->group("Message");
    app.add_flag("--chunked", chunked, "Send the request in chunks")->group("Message");
    app.add_flag("--keep-alive", keep_alive, "Keep the connection from call to call")->group("Message");
    app.add_option("--repeat", repeat, "Make the call this often, and print how long the calls took")
        ->check(CLI::Range(1U, 100000000U))
        ->type_name("N")
        ->group("Message");
    app.add_option("--action", action, "SOAPAction")->type_name("TEXT")->group("Message");
    app.add_option("--attach", attach, "Attach a file to the message; may be repeated")
        ->allow_extra_args(false)
        ->take_all()
        ->type_name("FILE[,type=TYPE][,id=ID]")
        ->group("Attachments");
    auto *const as_mime =
        app.add_flag("--mime", mime, "A MIME message, as it is with --attach; with or without attachments");
    auto *const as_mtom = app.add_flag("--mtom", mtom, "An MTOM message, a kind of MIME message");
    auto *const as_dime = app.add_flag("--dime", dime, "A DIME message instead");
    as_mime->group("Attachments");
    as_mtom->group("Attachments")->excludes(as_mime);
    as_dime->group("Attachments")->excludes(as_mime)->excludes(as_mtom);
    app.add_option("--save-attachments", save_folder, "Keep the answer's attachments in this directory")
        ->type_name("DIR")
        ->group("Attachments");
}

void call_options::declare(CLI::App &app)
{
    app.add_option("FILE", request_file,
                   "Request document, \"-\" for standard input; without it an empty one is sent");
    declare_endpoints(app, endpoints);
    header.declare(app);
    connection.declare(app);
    message.declare(app);
    app.add_option("-o,--output", output_file, "File for the answer")->type_name("FILE")->group("Output");
    app.add_flag("--json", json, "The answer as JSON instead of XML")->group("Output");
}

} // namespace cli

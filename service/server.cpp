// server.cpp - see server.h.
#include "server.h"

#include <algorithm>
#include <chrono>
#include <cstdio>
#include <fstream>
#include <iterator>
#include <stdexcept>

#include <sys/socket.h>

#include <zuv_client_pro/soap_envelope.h>
#include <zuv_client_pro/soap_error.h>
#include <zuv_client_pro/soap_log.h>
#include <zuv_client_pro/soap_memory.h>
#include <zuv_client_pro/soap_tcp.h>
#include <zuv_client_pro/soap_tls.h>

#include "certificates.h"
#include "connection.h"
#include "data_files.h"
#include "request_target.h"
#include "seed.h"

namespace service {

namespace {

constexpr int BACKLOG = 128;                  // connections that may wait to be accepted
constexpr std::chrono::seconds STOP_LIMIT(5); // time that requests under way get at the end
constexpr std::chrono::milliseconds
    ACCEPT_PAUSE(100); // after a failed accept, for example without free descriptors

std::uint32_t input_mode_of(const settings &config)
{
    const std::uint32_t mode = MODE_KEEP_ALIVE | MODE_UTF_STRINGS;
    return config.strict ? mode | MODE_STRICT : mode;
}

std::uint32_t output_mode_of(const settings &config)
{
    const std::uint32_t mode = MODE_BUFFERED | MODE_KEEP_ALIVE | MODE_UTF_STRINGS;
    return config.indent ? mode | MODE_INDENT : mode;
}

std::string text_of_file(const std::string &path)
{
    std::ifstream file(path, std::ios::binary);
    return {std::istreambuf_iterator<char>(file), {}};
}

// Why listening failed, in the system's words where they are known.
std::string listen_failure(soap *ctx, const settings &config)
{
    const char *const text = *soap_fault_string_field(ctx);
    return "can't listen on " + config.host + " port " + std::to_string(config.port) + ": " +
           (text == nullptr ? "error " + std::to_string(ctx->error) : text);
}

} // namespace

server::server(const settings &config, database &place)
    : config_(config), place_(place), shared_(config), master_(input_mode_of(config), output_mode_of(config))
{
    idle_sessions_.push_back(
        std::make_unique<session>(place, config, shared_)); // an unusable database fails now
    if (!config.rules.empty())
        shared_.rules.add(text_of_file(config.rules));
    store &documents = idle_sessions_.back()->documents;
    open_data_directory(place.data_directory);
    sweep_data(place.data_directory,
               [&documents](std::string_view name) { return documents.data_size(name).has_value(); });
    if (documents.is_empty())
        seed_store(*idle_sessions_.back(), config);
    master_.bind_flags = SO_REUSEADDR;
    master_.wait_with_poll = 1; // the files of many sessions take descriptors beyond those of select
    master_.max_depth = config.depth_limit;
    master_.max_message = config.message_limit();
    master_.max_memory = config.memory_limit();
    master_.recv_timeout = master_.send_timeout = config.idle_seconds;
    if (config.tls)
        set_up_tls(&master_, config);
    if (!config.trace.empty()) {
        soap_log_set_received(&master_, config.trace.c_str());
        soap_log_set_sent(&master_, config.trace.c_str());
    }
    if (soap_bind(&master_, config.host.c_str(), config.port, BACKLOG) < 0)
        throw std::runtime_error(listen_failure(&master_, config));
    port_ = port_of(master_.master_socket);
}

server::~server()
{
    stop();
}

void server::start()
{
    acceptor_ = std::thread([this] { accept_all(); });
}

// ---------------------------------------------------------------------------------------------
// Accepting.

// True once another connection may be served, false at the end.
bool server::wait_for_room(std::unique_lock<std::mutex> &lock)
{
    changed_.wait(lock, [this] {
        return stopping_ || connections_.size() < config_.connections ||
               std::any_of(connections_.begin(), connections_.end(),
                           [](const connection &c) { return c.done; });
    });
    join_finished(lock);
    return !stopping_;
}

void server::accept_all()
{
    std::unique_lock<std::mutex> lock(mutex_);
    while (wait_for_room(lock)) {
        lock.unlock();
        const int accepted = soap_accept(&master_);
        soap *const copy = accepted < 0 ? nullptr : soap_context_copy(&master_);
        if (copy != nullptr)
            master_.socket = -1; // now owned by the copy; without a copy, the next accept would leak it
        else if (accepted >= 0)
            tcp_disconnect(&master_);
        lock.lock();
        if (copy != nullptr)
            open_connection(copy);
        else
            changed_.wait_for(lock, ACCEPT_PAUSE, [this] { return stopping_; });
    }
}

void server::open_connection(soap *copy)
{
    if (stopping_) {
        soap_context_free(copy);
        return;
    }
    auto place = connections_.end();
    try {
        place = connections_.insert(connections_.end(), connection{copy->socket, false, {}});
        place->thread = std::thread([this, copy, place] { serve(copy, place); });
    } catch (const std::exception &) { // neither memory nor a thread to be had: the client may try again
        if (place != connections_.end())
            connections_.erase(place);
        soap_context_free(copy);
    }
}

std::unique_ptr<session> server::acquire_session()
{
    {
        const std::lock_guard<std::mutex> lock(mutex_);
        if (!idle_sessions_.empty()) {
            std::unique_ptr<session> borrowed = std::move(idle_sessions_.back());
            idle_sessions_.pop_back();
            return borrowed;
        }
    }
    return std::make_unique<session>(place_, config_, shared_);
}

void server::serve(soap *copy, std::list<connection>::iterator place)
{
    std::unique_ptr<session> borrowed;
    try {
        borrowed = acquire_session();
        if (!config_.tls || soap_ssl_accept(copy) == SOAP_OK)
            serve_connection(copy, config_, *borrowed);
    } catch (const std::exception &failure) {
        std::fprintf(stderr, "zuv-service: %s\n", failure.what());
    }
    soap_discard_objects(copy, nullptr); // the fault of a handshake that failed
    soap_discard_all(copy);
    soap_context_free(copy);
    const std::lock_guard<std::mutex> lock(mutex_);
    if (borrowed)
        idle_sessions_.push_back(std::move(borrowed));
    place->done = true;
    changed_.notify_all();
}

// Joins the threads that are done.
void server::join_finished(std::unique_lock<std::mutex> &lock)
{
    std::list<connection> ended;
    for (auto place = connections_.begin(); place != connections_.end();) {
        const auto next = std::next(place);
        if (place->done)
            ended.splice(ended.end(), connections_, place);
        place = next;
    }
    lock.unlock();
    for (connection &c : ended)
        c.thread.join();
    lock.lock();
}

// ---------------------------------------------------------------------------------------------
// The end.

// A thread may have closed its socket already: then the number is unused or belongs to another connection,
// which has to end too.
void server::shut_connections(int how)
{
    for (const connection &c : connections_)
        if (!c.done)
            shutdown(c.socket, how);
}

void server::stop()
{
    if (!acceptor_.joinable())
        return;
    std::unique_lock<std::mutex> lock(mutex_);
    stopping_ = true;
    changed_.notify_all();
    shutdown(master_.master_socket, SHUT_RDWR); // wakes the acceptor
    lock.unlock();
    acceptor_.join();
    lock.lock();
    const auto all_done = [this] {
        return std::all_of(connections_.begin(), connections_.end(),
                           [](const connection &c) { return c.done; });
    };
    shut_connections(SHUT_RD);
    if (!changed_.wait_for(lock, STOP_LIMIT, all_done)) {
        shut_connections(SHUT_RDWR);
        changed_.wait(lock, all_done);
    }
    join_finished(lock);
}

} // namespace service

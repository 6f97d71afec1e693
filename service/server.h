// server.h - the listening side: accepts connections and gives each a thread and a copy of the context.
//
// Elsewhere: what happens on a connection (connection.cpp).
#pragma once

#include <atomic>
#include <condition_variable>
#include <list>
#include <memory>
#include <mutex>
#include <string>
#include <thread>
#include <vector>

#include <zuv_client_pro/soap.h>

#include "exchange.h"
#include "settings.h"
#include "shared_state.h"
#include "store.h"

namespace service {

class server {
public:
    // Seeds a store without documents, and starts to listen. Throws std::runtime_error if the address is not
    // available or the seed is wrong, and store_error.
    server(const settings &config, database &place);
    ~server(); // as `stop`

    int port() const { return port_; } // the one in use, with port 0 in the settings too

    // Accepts connections on a thread of its own.
    void start();

    void reopen_log() { shared_.notes.reopen(); }

    // Ends: requests under way get their answers, within STOP_LIMIT, idle connections are closed.
    void stop();

private:
    struct connection {
        int socket;
        bool done = false; // its thread is about to end
        std::thread thread;
    };

    void accept_all();
    bool wait_for_room(std::unique_lock<std::mutex> &lock);
    void open_connection(soap *copy);
    void serve(soap *copy, std::list<connection>::iterator place);
    void join_finished(std::unique_lock<std::mutex> &lock);
    void shut_connections(int how);
    std::unique_ptr<session> acquire_session();

    const settings &config_;
    database &place_;
    shared_state shared_;
    soap master_;
    int port_ = 0;
    std::thread acceptor_;
    std::mutex mutex_; // guards what follows
    std::condition_variable changed_;
    bool stopping_ = false;
    std::list<connection> connections_;
    std::vector<std::unique_ptr<session>> idle_sessions_;
};

} // namespace service

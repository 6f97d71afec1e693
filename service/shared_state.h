// shared_state.h - what all connections of the service share.
#pragma once

#include <mutex>
#include <shared_mutex>

#include "journal.h"
#include "recording.h"
#include "rules.h"
#include "settings.h"

namespace service {

// Calls are carried out side by side, but none while the store is reset.
class reset_gate {
public:
    std::shared_lock<std::shared_mutex> enter()
    {
        const std::lock_guard<std::mutex> turn(queue_);
        return std::shared_lock(gate_);
    }
    std::unique_lock<std::shared_mutex> close() // waits for the calls inside; others wait until it is over
    {
        const std::lock_guard<std::mutex> turn(queue_);
        return std::unique_lock(gate_);
    }

private:
    std::mutex queue_; // without which calls without end could keep a reset from its turn
    std::shared_mutex gate_;
};

struct shared_state {
    explicit shared_state(const settings &config)
        : notes(config.access_log), recorded(config.record), played(config.replay)
    {}
    journal notes;
    rule_book rules;
    recorder recorded;
    recording played;
    reset_gate gate;
};

} // namespace service

// tcp_wait.cpp - see tcp_wait.h; and the wait primitive of soap_tcp.h.
#include "net/tcp_wait.h"

#include <algorithm>
#include <cerrno>
#include <ctime>
#include <sys/select.h>

#include <zuv_client_pro/soap_error.h>
#include <zuv_client_pro/soap_tcp.h>

#include "core/failure.h"
#include "net/call_record.h"
#include "net/tcp_socket.h"

namespace {

constexpr std::int64_t MICROSECONDS = 1000000; // in a second
constexpr tcp_deadline NEVER =
    std::int64_t{100} * 365 * 24 * 3600 * MICROSECONDS; // after the machine's start

std::int64_t microseconds_of(int timeout)
{
    return timeout >= 0 ? timeout * MICROSECONDS : -std::int64_t{timeout};
}

timeval as_timeval(std::int64_t microseconds)
{
    timeval value{};
    value.tv_sec = microseconds / MICROSECONDS;
    value.tv_usec = microseconds % MICROSECONDS;
    return value;
}

// One set of a select call: null for a direction that isn't waited for.
class wait_set {
public:
    wait_set(bool wanted, int socket) : wanted_(wanted), used_(wanted), socket_(socket)
    {
        if (!wanted_)
            return;
        set_ = {};
        FD_SET(socket_, &set_);
    }
    // Another descriptor; -1 is none.
    void add(int other)
    {
        if (other < 0)
            return;
        if (!used_)
            set_ = {};
        FD_SET(other, &set_);
        used_ = true;
    }
    fd_set *get() { return used_ ? &set_ : nullptr; }
    bool ready() const { return wanted_ && FD_ISSET(socket_, &set_); }
    bool has(int other) const { return other >= 0 && FD_ISSET(other, &set_); }

private:
    bool wanted_, used_;
    int socket_;
    fd_set set_;
};

// tcp_wait with the time as select wants it; null: without end. `wake` is a descriptor that ends the waiting
// with EINTR, once, when it is readable; -1: none.
int wait_for(soap *ctx, int socket, int flags, timeval *limit, int wake)
{
    ctx->errno_value = 0;
    if (socket >= FD_SETSIZE) {
        fail(ctx, SOAP_FD_EXCEEDED);
        return -1;
    }
    if (socket < 0) {
        ctx->errno_value = EBADF;
        return -1;
    }
    wait_set readable((flags & WAIT_RECV) != 0, socket);
    readable.add(wake);
    wait_set writable((flags & WAIT_SEND) != 0, socket);
    wait_set exceptional((flags & WAIT_ERROR) != 0, socket);
    const int count =
        select(std::max(socket, wake) + 1, readable.get(), writable.get(), exceptional.get(), limit);
    if (count < 0)
        tcp_save_errno(ctx);
    if (count <= 0)
        return count;
    if (readable.has(wake)) {
        call_wake_clear(ctx);
        ctx->errno_value = EINTR;
        return -1;
    }
    return (readable.ready() ? WAIT_RECV : 0) | (writable.ready() ? WAIT_SEND : 0) |
           (exceptional.ready() ? WAIT_ERROR : 0);
}

int time_is_up(soap *ctx)
{
    ctx->errno_value = 0;
    return 0;
}

} // namespace

int tcp_wait(soap *ctx, int socket, int flags, int timeout)
{
    timeval limit = as_timeval(microseconds_of(timeout));
    return wait_for(ctx, socket, flags, &limit, -1);
}

std::int64_t tcp_clock()
{
    timespec time{};
    clock_gettime(CLOCK_MONOTONIC, &time);
    return time.tv_sec * MICROSECONDS + time.tv_nsec / 1000;
}

tcp_deadline tcp_deadline_of(const soap *ctx, int timeout)
{
    if (timeout == 0)
        return ctx->call_deadline;
    const tcp_deadline own = tcp_clock() + microseconds_of(timeout);
    return ctx->call_deadline == 0 ? own : std::min(own, ctx->call_deadline);
}

bool tcp_is_over(soap *ctx, tcp_deadline deadline)
{
    return tcp_call_is_over(ctx) || (deadline != 0 && tcp_clock() >= deadline);
}

bool tcp_call_is_over(soap *ctx)
{
    ctx->call_expired =
        ctx->call_deadline != 0 && (call_is_cancelled(ctx) || tcp_clock() >= ctx->call_deadline);
    if (ctx->call_expired)
        call_note_ending(ctx, ENDED_BY_CALL_LIMIT);
    return ctx->call_expired;
}

void tcp_call_begin(soap *ctx)
{
    call_record_begin(ctx);
    ctx->call_deadline = call_wake_fd(ctx) >= 0 ? NEVER : 0;
    ctx->call_deadline = tcp_deadline_of(ctx, ctx->call_timeout);
    ctx->call_expired = false;
}

int tcp_wait_until(soap *ctx, int socket, int flags, tcp_deadline deadline)
{
    for (;;) {
        if (tcp_call_is_over(ctx))
            return time_is_up(ctx);
        const std::int64_t left = deadline == 0 ? 0 : std::max<std::int64_t>(deadline - tcp_clock(), 0);
        timeval limit = as_timeval(left);
        const int ready = wait_for(ctx, socket, flags, deadline == 0 ? nullptr : &limit, call_wake_fd(ctx));
        if (ready == 0)
            tcp_call_is_over(ctx); // whose time was it?
        if (ready >= 0 || ctx->errno_value != EINTR)
            return ready;
        if (deadline != 0 && left == 0)
            return time_is_up(ctx);
    }
}

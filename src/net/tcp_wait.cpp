// tcp_wait.cpp - see tcp_wait.h; and the wait primitive of soap_tcp.h.
#include "net/tcp_wait.h"

#include <algorithm>
#include <cerrno>
#include <ctime>
#include <sys/select.h>

#include <zuv_client_pro/soap_error.h>
#include <zuv_client_pro/soap_tcp.h>

#include "core/failure.h"
#include "net/tcp_socket.h"

namespace {

constexpr std::int64_t MICROSECONDS = 1000000; // in a second

std::int64_t clock_time()
{
    timespec time{};
    clock_gettime(CLOCK_MONOTONIC, &time);
    return time.tv_sec * MICROSECONDS + time.tv_nsec / 1000;
}

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

// One set of a select call: null for a way that nobody asked about.
class wait_set {
public:
    wait_set(bool wanted, int socket) : wanted_(wanted), socket_(socket)
    {
        if (!wanted_)
            return;
        FD_ZERO(&set_);
        FD_SET(socket_, &set_);
    }
    fd_set *get() { return wanted_ ? &set_ : nullptr; }
    bool ready() const { return wanted_ && FD_ISSET(socket_, &set_); }

private:
    bool wanted_;
    int socket_;
    fd_set set_;
};

// tcp_wait with the time as select wants it; null: without end.
int wait_for(soap *ctx, int socket, int flags, timeval *limit)
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
    wait_set writable((flags & WAIT_SEND) != 0, socket);
    wait_set exceptional((flags & WAIT_ERROR) != 0, socket);
    const int count = select(socket + 1, readable.get(), writable.get(), exceptional.get(), limit);
    if (count < 0)
        tcp_save_errno(ctx);
    if (count <= 0)
        return count;
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
    return wait_for(ctx, socket, flags, &limit);
}

tcp_deadline tcp_deadline_of(const soap *ctx, int timeout)
{
    if (timeout == 0)
        return ctx->call_deadline;
    const tcp_deadline own = clock_time() + microseconds_of(timeout);
    return ctx->call_deadline == 0 ? own : std::min(own, ctx->call_deadline);
}

bool tcp_is_over(soap *ctx, tcp_deadline deadline)
{
    return tcp_call_is_over(ctx) || (deadline != 0 && clock_time() >= deadline);
}

bool tcp_call_is_over(soap *ctx)
{
    return ctx->call_expired = ctx->call_deadline != 0 && clock_time() >= ctx->call_deadline;
}

void tcp_call_begin(soap *ctx)
{
    ctx->call_deadline = 0;
    ctx->call_deadline = tcp_deadline_of(ctx, ctx->call_timeout);
    ctx->call_expired = false;
}

int tcp_wait_until(soap *ctx, int socket, int flags, tcp_deadline deadline)
{
    for (;;) {
        if (tcp_call_is_over(ctx))
            return time_is_up(ctx);
        const std::int64_t left = deadline == 0 ? 0 : std::max<std::int64_t>(deadline - clock_time(), 0);
        timeval limit = as_timeval(left);
        const int ready = wait_for(ctx, socket, flags, deadline == 0 ? nullptr : &limit);
        if (ready == 0)
            tcp_call_is_over(ctx); // whose time was it?
        if (ready >= 0 || ctx->errno_value != EINTR)
            return ready;
        if (deadline != 0 && left == 0)
            return time_is_up(ctx);
    }
}

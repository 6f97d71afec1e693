// tcp_wait.cpp - see tcp_wait.h; and the wait primitive of soap_tcp.h.
#include "net/tcp_wait.h"

#include <algorithm>
#include <cerrno>
#include <ctime>
#include <poll.h>
#include <sys/select.h>

#include <zuv_client_pro/soap_error.h>
#include <zuv_client_pro/soap_tcp.h>

#include "core/failure.h"
#include "net/call_record.h"
#include "net/tcp_socket.h"

namespace {

constexpr std::int64_t MICROSECONDS = 1000000; // in a second
constexpr tcp_deadline NEVER =
    std::int64_t{50} * 365 * 24 * 3600 * MICROSECONDS; // after the machine's start; 32 bits hold its seconds

std::int64_t microseconds_of(int timeout)
{
    return timeout >= 0 ? timeout * MICROSECONDS : -std::int64_t{timeout};
}

// One set of a select call: null for a direction that isn't waited for. Of its bits those up to `last` are
// defined, the greatest descriptor of the call: select looks at no others.
class wait_set {
public:
    wait_set(bool wanted, int socket, int last) : wanted_(wanted), used_(wanted), socket_(socket), last_(last)
    {
        if (!wanted_)
            return;
        clear();
        set(socket_);
    }
    // Another descriptor; -1 is none.
    void add(int other)
    {
        if (other < 0)
            return;
        if (!used_)
            clear();
        set(other);
        used_ = true;
    }
    fd_set *get() { return used_ ? &set_ : nullptr; }
    bool ready() const { return wanted_ && has(socket_); }
    bool has(int other) const { return other >= 0 && (set_.fds_bits[word(other)] & bit(other)) != 0; }

private:
    // Descriptors are below FD_SETSIZE: wait_for lets no other through.
    static unsigned word(int descriptor) { return static_cast<unsigned>(descriptor) / NFDBITS; }
    static fd_mask bit(int descriptor)
    {
        return static_cast<fd_mask>(1UL << static_cast<unsigned>(descriptor) % NFDBITS);
    }
    void set(int descriptor) { set_.fds_bits[word(descriptor)] |= bit(descriptor); }
    void clear()
    {
        if (last_ < NFDBITS) // the usual case is one word
            set_.fds_bits[0] = 0;
        else
            set_ = {};
    }

    bool wanted_, used_;
    int socket_, last_;
    fd_set set_;
};

constexpr int WOKEN = 8; // besides WAIT_...: the waking descriptor is readable

// What is ready of a socket (WAIT_...) and of the waking one, asked of select; 0 and -1 as of select.
int select_ready(int socket, int flags, const std::int64_t *limit_us, int wake)
{
    const int last = std::max(socket, wake);
    wait_set readable((flags & WAIT_RECV) != 0, socket, last);
    readable.add(wake);
    wait_set writable((flags & WAIT_SEND) != 0, socket, last);
    wait_set exceptional((flags & WAIT_ERROR) != 0, socket, last);
    timeval limit{};
    if (limit_us != nullptr) {
        limit.tv_sec = static_cast<std::time_t>(*limit_us / MICROSECONDS);
        limit.tv_usec = static_cast<suseconds_t>(*limit_us % MICROSECONDS);
    }
    const int count = select(last + 1, readable.get(), writable.get(), exceptional.get(),
                             limit_us != nullptr ? &limit : nullptr);
    if (count <= 0)
        return count;
    return (readable.ready() ? WAIT_RECV : 0) | (writable.ready() ? WAIT_SEND : 0) |
           (exceptional.ready() ? WAIT_ERROR : 0) | (readable.has(wake) ? WOKEN : 0);
}

// The same asked of poll. It reports errors and hang-ups unasked: both make a transfer return at once, so they
// are given as the flags asked for, as select gives them.
int poll_ready(int socket, int flags, const std::int64_t *limit_us, int wake)
{
    const auto events = [flags](int flag, int event) { return (flags & flag) != 0 ? event : 0; };
    pollfd asked[2]{{socket,
                     static_cast<short>(events(WAIT_RECV, POLLIN) | events(WAIT_SEND, POLLOUT) |
                                        events(WAIT_ERROR, POLLPRI)),
                     0},
                    {wake, POLLIN, 0}};
    timespec limit{};
    if (limit_us != nullptr) {
        limit.tv_sec = static_cast<std::time_t>(*limit_us / MICROSECONDS);
        limit.tv_nsec = static_cast<long>(*limit_us % MICROSECONDS * 1000);
    }
    const int count = ppoll(asked, 2, limit_us != nullptr ? &limit : nullptr, nullptr);
    if (count <= 0)
        return count;
    const int found = asked[0].revents;
    if ((found & POLLNVAL) != 0) {
        errno = EBADF;
        return -1;
    }
    int ready = ((found & POLLIN) != 0 ? WAIT_RECV : 0) | ((found & POLLOUT) != 0 ? WAIT_SEND : 0) |
                ((found & POLLPRI) != 0 ? WAIT_ERROR : 0);
    if ((found & (POLLERR | POLLHUP)) != 0)
        ready |= (flags & (WAIT_RECV | WAIT_SEND)) != 0 ? flags & (WAIT_RECV | WAIT_SEND) : WAIT_ERROR;
    return ready | (asked[1].revents != 0 ? WOKEN : 0);
}

// tcp_wait with the time in microseconds; null: without end. `wake` is a descriptor that ends the waiting
// with EINTR, once, when it is readable; -1: none.
int wait_for(soap *ctx, int socket, int flags, const std::int64_t *limit_us, int wake)
{
    ctx->errno_value = 0;
    if (tcp_too_large_to_wait(ctx, std::max(socket, wake))) {
        fail(ctx, SOAP_FD_EXCEEDED);
        return -1;
    }
    if (socket < 0) {
        ctx->errno_value = EBADF;
        return -1;
    }
    const int ready = ctx->wait_with_poll != 0 ? poll_ready(socket, flags, limit_us, wake)
                                               : select_ready(socket, flags, limit_us, wake);
    if (ready < 0)
        tcp_save_errno(ctx);
    if (ready <= 0)
        return ready;
    if ((ready & WOKEN) != 0) {
        call_wake_clear(ctx);
        ctx->errno_value = EINTR;
        return -1;
    }
    return ready;
}

int time_is_up(soap *ctx)
{
    ctx->errno_value = 0;
    return 0;
}

} // namespace

bool tcp_too_large_to_wait(const soap *ctx, int descriptor)
{
    return descriptor >= FD_SETSIZE && ctx->wait_with_poll == 0;
}

int tcp_wait(soap *ctx, int socket, int flags, int timeout)
{
    const std::int64_t limit = microseconds_of(timeout);
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
        const int ready = wait_for(ctx, socket, flags, deadline == 0 ? nullptr : &left, call_wake_fd(ctx));
        if (ready == 0)
            tcp_call_is_over(ctx); // whose time was it?
        if (ready >= 0 || ctx->errno_value != EINTR)
            return ready;
        if (deadline != 0 && left == 0)
            return time_is_up(ctx);
    }
}

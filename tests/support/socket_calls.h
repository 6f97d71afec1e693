// socket_calls.h - counts and bends the socket calls that a test executable makes. Include it in one source
// of the executable: it defines send, recv and the like, which pass on to the system's. The counts and orders
// are those of the calling thread, so a peer's thread in the same test is left alone.
//
// Names that end in ".test" resolve to the loopback: "two.test" to 127.0.0.9 and then 127.0.0.1, "six.test" to ::1
// and then 127.0.0.1, as "localhost" does on most machines, all else to 127.0.0.1. The monotonic clock may be
// faster than the system's, so that a test of time limits takes no time; the wall clock may be set back.
#pragma once

#include <atomic>
#include <cerrno>
#include <climits>
#include <cstdarg>
#include <cstring>
#include <ctime>
#include <dlfcn.h>
#include <fcntl.h>
#include <netdb.h>
#include <string_view>
#include <sys/select.h>
#include <sys/socket.h>
#include <sys/time.h>

namespace socket_calls {

struct call_counts {
    int send, sendto, recv, select, fcntl, connect;
    int waiting; // of send and recv: those that may wait, as far as their flags go
    int clock;   // questions for the monotonic time; no system calls
    int all() const { return send + sendto + recv + select + fcntl; }
};

// Orders: so many of the next calls fail with the error named.
struct failure {
    int times;
    int error;
};

// So many of the next calls of select are interrupted by a signal, each after so much of its time; one with a
// shorter limit ends by that.
struct interruption {
    int times;
    long after_us;
};

inline thread_local call_counts counts{};
inline thread_local failure fail_connect{}, fail_sendto{}, fail_recv{};
inline thread_local interruption interrupt_select{};
inline thread_local long clock_ahead_us = 0, // what CLOCK_MONOTONIC shows more than the system's does
    call_takes_us = 0;                       // what each call of select and recv adds to it
inline std::atomic<long> set_back_s =
    0; // what the wall clock shows less than the system's does, for all threads
inline thread_local bool drips = false, dry = false; // recv gives one byte, and nothing the next time

// Takes all orders back.
inline void reset()
{
    fail_connect = fail_sendto = fail_recv = {};
    interrupt_select = {};
    clock_ahead_us = call_takes_us = 0;
    drips = false;
}

// The result of a call of select that is to be interrupted: 0 or -1.
inline int interrupted(const timeval *limit)
{
    --interrupt_select.times;
    const long left = limit ? limit->tv_sec * 1000000 + limit->tv_usec : LONG_MAX;
    const bool in_time = left > interrupt_select.after_us;
    clock_ahead_us += in_time ? interrupt_select.after_us : left;
    errno = EINTR;
    return in_time ? -1 : 0;
}

inline bool refused(failure &order)
{
    if (order.times == 0)
        return false;
    --order.times;
    errno = order.error;
    return true;
}

template <class Function> Function next(const char *name)
{
    return reinterpret_cast<Function>(dlsym(RTLD_NEXT, name));
}

} // namespace socket_calls

extern "C" {

ssize_t send(int socket, const void *data, size_t length, int flags)
{
    static const auto real = socket_calls::next<decltype(&send)>("send");
    ++socket_calls::counts.send;
    socket_calls::counts.waiting += (flags & MSG_DONTWAIT) == 0;
    return real(socket, data, length, flags);
}

ssize_t sendto(int socket, const void *data, size_t length, int flags, const sockaddr *address,
               socklen_t size)
{
    static const auto real = socket_calls::next<decltype(&sendto)>("sendto");
    ++socket_calls::counts.sendto;
    return socket_calls::refused(socket_calls::fail_sendto)
               ? -1
               : real(socket, data, length, flags, address, size);
}

ssize_t recv(int socket, void *buffer, size_t length, int flags)
{
    static const auto real = socket_calls::next<decltype(&recv)>("recv");
    ++socket_calls::counts.recv;
    socket_calls::clock_ahead_us += socket_calls::call_takes_us;
    socket_calls::counts.waiting += (flags & MSG_DONTWAIT) == 0;
    if (socket_calls::drips && (socket_calls::dry = !socket_calls::dry))
        socket_calls::fail_recv = {1, EAGAIN};
    if (socket_calls::refused(socket_calls::fail_recv))
        return -1;
    return real(socket, buffer, socket_calls::drips && length != 0 ? 1 : length, flags);
}

int select(int count, fd_set *readable, fd_set *writable, fd_set *exceptional, timeval *limit)
{
    static const auto real = socket_calls::next<decltype(&select)>("select");
    ++socket_calls::counts.select;
    socket_calls::clock_ahead_us += socket_calls::call_takes_us;
    if (socket_calls::interrupt_select.times > 0)
        return socket_calls::interrupted(limit);
    return real(count, readable, writable, exceptional, limit);
}

int connect(int socket, const sockaddr *address, socklen_t size)
{
    static const auto real = socket_calls::next<decltype(&connect)>("connect");
    ++socket_calls::counts.connect;
    return socket_calls::refused(socket_calls::fail_connect) ? -1 : real(socket, address, size);
}

int fcntl(int descriptor, int command, ...)
{
    static const auto real = socket_calls::next<int (*)(int, int, ...)>("fcntl");
    ++socket_calls::counts.fcntl;
    va_list arguments;
    va_start(arguments, command);
    const long argument = va_arg(arguments, long);
    va_end(arguments);
    return real(descriptor, command, argument);
}

int clock_gettime(clockid_t clock, timespec *time)
{
    static const auto real = socket_calls::next<decltype(&clock_gettime)>("clock_gettime");
    const int result = real(clock, time);
    if (clock == CLOCK_REALTIME)
        time->tv_sec -= socket_calls::set_back_s;
    if (clock != CLOCK_MONOTONIC)
        return result;
    ++socket_calls::counts.clock;
    time->tv_sec += socket_calls::clock_ahead_us / 1000000;
    time->tv_nsec += socket_calls::clock_ahead_us % 1000000 * 1000;
    time->tv_sec += time->tv_nsec / 1000000000;
    time->tv_nsec %= 1000000000;
    return result;
}

std::time_t time(std::time_t *seconds) noexcept
{
    timespec now{};
    clock_gettime(CLOCK_REALTIME, &now);
    if (seconds != nullptr)
        *seconds = now.tv_sec;
    return now.tv_sec;
}

int gettimeofday(timeval *__restrict now, void *__restrict) noexcept
{
    timespec time{};
    const int result = clock_gettime(CLOCK_REALTIME, &time);
    *now = {time.tv_sec, static_cast<suseconds_t>(time.tv_nsec / 1000)};
    return result;
}

int getaddrinfo(const char *host, const char *service, const addrinfo *hints, addrinfo **list)
{
    static const auto real = socket_calls::next<decltype(&getaddrinfo)>("getaddrinfo");
    const std::string_view name = host ? host : "";
    if (!name.ends_with(".test"))
        return real(host, service, hints, list);
    const char *const first = name == "two.test" ? "127.0.0.9" : name == "six.test" ? "::1" : nullptr;
    if (!first)
        return real("127.0.0.1", service, hints, list);
    const int result = real(first, service, hints, list);
    return result != 0 ? result : real("127.0.0.1", service, hints, &(*list)->ai_next);
}

} // extern "C"

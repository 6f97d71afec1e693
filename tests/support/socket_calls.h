// socket_calls.h - counts and bends the socket calls that a test executable makes.
//
// Include it in one source of the executable: it defines send, recv and the like, which pass on to the
// system's. The counts and orders are those of the calling thread, so a peer's thread in the same test is
// left alone.
//
// Names that end in ".test" resolve to the loopback: "two.test" to 127.0.0.9 and then 127.0.0.1, all else to
// 127.0.0.1.
#pragma once

#include <cerrno>
#include <cstdarg>
#include <cstring>
#include <dlfcn.h>
#include <fcntl.h>
#include <netdb.h>
#include <string_view>
#include <sys/select.h>
#include <sys/socket.h>

namespace socket_calls {

struct call_counts {
    int send, sendto, recv, select, fcntl, connect;
    int waiting; // of send and recv: those that may wait, as far as their flags go
    int all() const { return send + sendto + recv + select + fcntl; }
};

// Orders: so many of the next calls fail with the error named.
struct failure {
    int times;
    int error;
};

inline thread_local call_counts counts{};
inline thread_local failure fail_connect{}, fail_sendto{}, fail_recv{};

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
    socket_calls::counts.waiting += (flags & MSG_DONTWAIT) == 0;
    return socket_calls::refused(socket_calls::fail_recv) ? -1 : real(socket, buffer, length, flags);
}

int select(int count, fd_set *readable, fd_set *writable, fd_set *exceptional, timeval *limit)
{
    static const auto real = socket_calls::next<decltype(&select)>("select");
    ++socket_calls::counts.select;
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

int getaddrinfo(const char *host, const char *service, const addrinfo *hints, addrinfo **list)
{
    static const auto real = socket_calls::next<decltype(&getaddrinfo)>("getaddrinfo");
    const std::string_view name = host ? host : "";
    if (!name.ends_with(".test"))
        return real(host, service, hints, list);
    if (name != "two.test")
        return real("127.0.0.1", service, hints, list);
    const int result = real("127.0.0.9", service, hints, list);
    return result != 0 ? result : real("127.0.0.1", service, hints, &(*list)->ai_next);
}

} // extern "C"

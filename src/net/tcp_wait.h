// tcp_wait.h - private: the time limits of steps and of a whole call, and waiting within them.
//
// Always: limits run on the monotonic clock. A deadline is taken once, when its step begins, so that neither
// signals nor a peer that comes up with one byte after the other put it off. The clock is read only where
// there is a limit.
#pragma once

#include <cstdint>

#include <zuv_client_pro/soap.h>

// When a step must have ended: microseconds of the monotonic clock; 0: no limit.
using tcp_deadline = std::int64_t;

// The present time of that clock.
std::int64_t tcp_clock();

// The end of a step that begins now: after `timeout` (0 none, positive seconds, negative microseconds) or
// with the call, whichever comes first.
tcp_deadline tcp_deadline_of(const soap *ctx, int timeout);

// True if the deadline, or that of the call, has passed.
bool tcp_is_over(soap *ctx, tcp_deadline deadline);

// True if call_timeout has passed, or the call was cancelled. Notes in call_expired whether it is so.
bool tcp_call_is_over(soap *ctx);

// The time of a call begins now, by call_timeout. One that can be cancelled always has a deadline, if need be
// one that never comes: so no transfer of it blocks, and all waiting is done here.
void tcp_call_begin(soap *ctx);

// As tcp_wait, but up to `deadline` and whatever signals arrive. Asks once if the deadline has passed;
// doesn't ask if the call is over.
int tcp_wait_until(soap *ctx, int socket, int flags, tcp_deadline deadline);

// True if waits of this context can't take the descriptor: it doesn't fit a set of select.
bool tcp_too_large_to_wait(const soap *ctx, int descriptor);

// Text of a fault for a step whose time is up: constant, or in message_text.
const char *tcp_timeout_text(soap *ctx);

// engine_run.h - what a call does with its message and its answer, without a network: the work that is
// measured.
#pragma once

#include <string>

#include <zuv_client_pro/soap.h>

#include "binding/class_ops.h"

// Context whose sent bytes are dropped, or kept for a look, and whose received bytes come from memory. Its
// messages hold one object in an element of the Body.
class engine_run : public soap {
public:
    // For problem reports, or for objects of the class in elements of this name.
    engine_run();
    engine_run(const binding::class_ops &object_class, const char *element_name);

    // Marks, counts and sends a message with the object. `way`: MODE_BUFFERED, MODE_CHUNKED or MODE_STORE. The
    // bytes sent, those of heads among them; 0 on a failure.
    std::size_t write(const void *object, std::uint32_t way = MODE_BUFFERED);

    // The same, with the bytes kept.
    std::string written(const void *object);

    // Reads a message. The object lives until release; null on a failure.
    void *read(const std::string &message);
    void release();

private:
    static int take(soap *ctx, const char *data, std::size_t length);
    static std::size_t give(soap *ctx, char *buffer, std::size_t length);

    const binding::class_ops &ops;
    const char *element;
    std::size_t sent = 0;
    std::string *kept = nullptr;
    const char *unread = nullptr;
    std::size_t unread_length = 0;
};

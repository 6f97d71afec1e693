// failure.h - how every layer ends with an error: the one place where a code is set, and the way up to the
// fault that says more than a code.
//
// Elsewhere: the codes and their texts (soap_error.h), the fault record (exchange/fault.cpp).
// Always: a code is set once, where it comes from, and passed on unchanged.
#pragma once

#include <cstddef>

#include <zuv_client_pro/soap.h>
#include <zuv_client_pro/soap_error.h>

// Sets ctx->error and returns it, so that a function can end with `return fail(ctx, SOAP_...)`.
inline int fail(soap *ctx, int error)
{
    // NOLINTNEXTLINE(clang-analyzer-core.NullDereference): no call lacks a context
    return ctx->error = error;
}

// The same for a function that returns a pointer.
inline std::nullptr_t fail_null(soap *ctx, int error)
{
    fail(ctx, error);
    return nullptr;
}

// The end of input where more should come: SOAP_EOF, unless what ended it is in the context already.
inline int fail_at_end(soap *ctx)
{
    return ctx->error == SOAP_OK ? fail(ctx, SOAP_EOF) : ctx->error;
}

// Who is to blame for a fault: the sender of the message, or its receiver.
enum class fault_side { sender, receiver };

// What a fault says; null where it says nothing.
struct fault_texts {
    const char *code;
    const char *text;
    const char *detail;
};

// What the layers below exchange ask of it. The context has one pointer to it, set with the callbacks'
// defaults.
struct soap_upcalls {
    // Makes a fault of borrowed texts (constants or managed memory; `detail` may be null) and returns
    // `error`.
    int (*make_fault)(soap *ctx, fault_side side, const char *text, const char *detail, int error);
    // Of the present fault; an empty one is made where there is none.
    fault_texts (*read_fault)(soap *ctx);
    // Empties the object of an instance and keeps it for its next use (instance_pool.h), if it is of a kind that
    // can have one and there is space. False: it has to be destroyed.
    bool (*recycle)(soap *ctx, soap_instance *instance);
};

// Ends with an error that has texts of its own: as fail(), and the fault has them. `text` and `detail` are
// constants or managed memory; `detail` may be null.
inline int fail_with(soap *ctx, fault_side side, const char *text, const char *detail, int error)
{
    return ctx->upcalls->make_fault(ctx, side, text, detail, error);
}
inline int fail_as_sender(soap *ctx, const char *text, const char *detail, int error)
{
    return fail_with(ctx, fault_side::sender, text, detail, error);
}
inline int fail_as_receiver(soap *ctx, const char *text, const char *detail, int error)
{
    return fail_with(ctx, fault_side::receiver, text, detail, error);
}

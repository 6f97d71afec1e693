// instances.cpp - objects of classes that a context owns, each with the function that destroys it.
//
// Elsewhere: blocks without a destructor, and taking objects out of management (managed_blocks.cpp).
#include "core/memory.h"

#include <cstdio>

#include <zuv_client_pro/soap_error.h>
#include <zuv_client_pro/soap_memory.h>

#include "core/context_state.h"
#include "core/failure.h"
#include "core/instance_pool.h"
#include "core/limits.h"
#include "core/tracking.h"

namespace {

soap_instance *enter_instance(soap *ctx, void *object, int type_id, int array_size,
                              int (*hook)(soap_instance *instance))
{
    soap_instance *instance = ctx->pools->instances.take();
    *instance = {ctx->instance_list, object, type_id, array_size, hook};
    ctx->instance_list = instance;
    memory_charge(ctx, sizeof *instance);
    return instance;
}

} // namespace

// With no idle record at hand. Out of line, so that the usual way saves no registers for it.
[[gnu::noinline]] static soap_instance *
enter_in_new_slab(soap *ctx, void *object, int type_id, int array_size, int (*hook)(soap_instance *instance))
{
    soap_memory_pools *pools = memory_pools(ctx);
    if (pools == nullptr || !pools->instances.reserve(1))
        return fail_null(ctx, SOAP_OUT_OF_MEMORY);
    return enter_instance(ctx, object, type_id, array_size, hook);
}

soap_instance *soap_instance_register(soap *ctx, void *object, int type_id, int array_size,
                                      int (*hook)(soap_instance *instance))
{
    const bool at_hand = ctx->pools != nullptr && ctx->pools->instances.holds_idle();
    return at_hand ? enter_instance(ctx, object, type_id, array_size, hook)
                   : enter_in_new_slab(ctx, object, type_id, array_size, hook);
}

namespace {

// True if the object waits for the next message.
bool keep_instance(soap *ctx, soap_instance *instance)
{
    return instance->array_size < 0 && instance->object != nullptr && ctx->upcalls->recycle(ctx, instance);
}

// The record must be out of the list: a destructor may come back to it.
void destroy_instance(soap *ctx, soap_instance *instance)
{
    if (keep_instance(ctx, instance))
        return;
    if (instance->delete_hook != nullptr && instance->delete_hook(instance) != 0)
        std::fprintf(stderr, "new(object type = %d) = %p not freed: deletion callback failed\n",
                     instance->type_id, instance->object);
    ctx->pools->instances.give(instance);
}

// The context refers to a header and a fault that are `object`, or to any if that is null: no longer.
void forget_envelope_records(soap *ctx, const void *object)
{
    if (object == nullptr || ctx->header == object)
        ctx->header = nullptr;
    if (object == nullptr || ctx->fault == object)
        ctx->fault = nullptr;
}

void destroy_all(soap *ctx)
{
    idle_release_each(idle_release_begin(ctx), [ctx] {
        soap_instance *instance = ctx->instance_list;
        if (instance == nullptr)
            return false;
        ctx->instance_list = instance->next;
        if (instance->next != nullptr) // objects are scattered: the next one comes while this one goes
            __builtin_prefetch(instance->next->object);
        destroy_instance(ctx, instance);
        return true;
    });
    idle_release_end(ctx);
    forget_envelope_records(ctx, nullptr);
}

} // namespace

void soap_discard_objects(soap *ctx, void *object)
{
    if (!context_is_alive(ctx))
        return;
    if (object == nullptr) {
        destroy_all(ctx);
        return;
    }
    idle_release_begin(ctx);
    for (soap_instance **link = &ctx->instance_list; *link != nullptr; link = &(*link)->next) {
        soap_instance *instance = *link;
        if (instance->object == object) {
            forget_envelope_records(ctx, object);
            *link = instance->next;
            destroy_instance(ctx, instance);
            return;
        }
    }
    forget_envelope_records(ctx, nullptr);
}

void instance_records_release(soap *ctx)
{
    while (ctx->instance_list != nullptr) {
        soap_instance *instance = ctx->instance_list;
        ctx->instance_list = instance->next;
        ctx->pools->instances.give(instance);
    }
}

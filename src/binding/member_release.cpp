// member_release.cpp - see member_release.h; and what becomes of a released object as a whole.
#include "binding/member_release.h"

#include <cstring>
#include <new>
#include <utility>

#include <zuv_client_pro/soap_memory.h>
#include <zuv_client_pro/soap_registry.h>

#include "binding/registry.h"
#include "core/instance_pool.h"

namespace binding {

namespace {

constexpr int TEXT_TYPE_ID = 8;
static_assert(TYPE_ID_MAX < IDLE_TEXTS && IDLE_SHELLS == 0);

std::size_t allocated(const std::string &text)
{
    static const std::size_t in_place = std::string().capacity();
    return text.capacity() > in_place ? text.capacity() + 1 : 0;
}

// What a message held, passwords too, is not to be found in memory that waits. Most texts are so short that a
// call would cost more than the stores.
void wipe(std::string &text)
{
    constexpr std::size_t AT_ONCE = 16;
    if (text.capacity() >= AT_ONCE - 1 && text.size() <= AT_ONCE)
        std::memset(text.data(), 0, AT_ONCE);
    else
        std::memset(text.data(), 0, text.size());
}

// An empty text to take another's memory; null if memory runs out.
soap_instance *empty_text(soap *ctx)
{
    soap_instance *shell = idle_take(ctx, IDLE_SHELLS);
    if (shell != nullptr)
        return shell;
    auto *text = new (std::nothrow) std::string;
    shell = text != nullptr ? idle_record(ctx) : nullptr;
    if (shell == nullptr)
        delete text;
    else
        *shell = {nullptr, text, TEXT_TYPE_ID, -1, soap_delete_object};
    return shell;
}

} // namespace

std::size_t release_text(std::string &text)
{
    wipe(text);
    text.clear();
    return allocated(text);
}

// Out of line, so that the many vectors without texts cost next to nothing.
[[gnu::noinline]] static void release_each(soap *owner, std::vector<std::string> &texts)
{
    for (std::string &text : texts)
        release_text(text);
    for (std::size_t i = texts.size(); i-- > 0;) {
        std::string &text = texts[i];
        const std::size_t bytes = sizeof text + allocated(text);
        const int list = idle_texts(text.capacity());
        if (bytes == sizeof text || !idle_has_space(owner, list, bytes))
            continue;
        soap_instance *shell = empty_text(owner);
        if (shell == nullptr)
            return;
        static_cast<std::string *>(shell->object)->swap(text);
        idle_give(owner, list, shell, bytes);
    }
}

void release_texts(soap *owner, std::vector<std::string> &texts)
{
    if (!texts.empty())
        release_each(owner, texts);
}

static bool recycle_text(soap *ctx, soap_instance *instance)
{
    auto &text = *static_cast<std::string *>(instance->object);
    const std::size_t bytes = sizeof text + allocated(text);
    const int list = idle_texts(text.capacity());
    if (!idle_has_space(ctx, list, bytes))
        return false;
    release_text(text);
    idle_give(ctx, list, instance, bytes);
    return true;
}

bool instance_recycle(soap *ctx, soap_instance *instance)
{
    if (instance->delete_hook != soap_delete_object)
        return false;
    if (instance->type_id == TEXT_TYPE_ID)
        return recycle_text(ctx, instance);
    const type_entry *entry = type_entry_of(instance->type_id);
    if (entry == nullptr || entry->kind != type_kind::object || !idle_has_space(ctx, instance->type_id, 1))
        return false;
    const std::size_t bytes = entry->ops->recycle(instance->object, ctx);
    if (!idle_has_bytes(ctx->pools->idle, bytes)) // texts of its vectors wait by now
        return false;
    idle_give(ctx, instance->type_id, instance, bytes);
    return true;
}

} // namespace binding

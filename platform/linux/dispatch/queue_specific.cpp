// Queue-specific values: few a queue, so a list that only grows; readers walk it
// without a lock.
#include <memory>
#include <utility>

#include "platform/linux/dispatch/fork.h"
#include "platform/linux/dispatch/queue_core.h"

namespace dispatch::detail {
namespace {

spin_lock specifics_lock;

}  // namespace

void forks::lock_specifics(moment when) noexcept {
    hold(specifics_lock, when);
}

void queue_core::set_specific(const void* key, void* value, void (*destructor)(void*)) {
    auto fresh = std::unique_ptr<specific>(new specific{key, value, destructor, nullptr});
    void* replaced = nullptr;
    void (*replaced_destructor)(void*) = nullptr;
    {
        scoped_lock guard(specifics_lock);
        specific* entry = specifics_.load(std::memory_order_relaxed);
        while (entry && entry->key != key)
            entry = entry->next;
        if (entry) {
            replaced = entry->value.exchange(value, std::memory_order_acq_rel);
            replaced_destructor = std::exchange(entry->destructor, destructor);
        } else if (value) {
            fresh->next = specifics_.load(std::memory_order_relaxed);
            specifics_.store(fresh.release(), std::memory_order_release);
        }
    }
    if (replaced && replaced_destructor)
        replaced_destructor(replaced);
}

void* queue_core::get_specific(const void* key) const noexcept {
    for (const queue_core* level = this; level; level = level->target_)
        for (const specific* entry = level->specifics_.load(std::memory_order_acquire); entry;
             entry = entry->next)
            if (entry->key == key)
                if (void* value = entry->value.load(std::memory_order_acquire))
                    return value;
    return nullptr;
}

}  // namespace dispatch::detail

#include <cstring>
#include <new>
#include <utility>

#include "platform/linux/dispatch/queue_cells.h"
#include "platform/linux/dispatch/queue_core.h"
#include "plr/base/assert.h"
#include "plr/base/report.h"

namespace dispatch::detail {

static_assert(sizeof(queue_core) <= queue_cell::kCore);

queue_core* queue_core::create(std::string_view label, queue_core* target,
                               std::unique_ptr<pump_core> served) {
    const bool on_pool = !target || target->is_global();
    pump_core* const pump = on_pool ? served.get() : target->pump_;
    auto* made = make(label, on_pool ? nullptr : target, pump,
                      target ? target->level() : priority::normal, false);
    static_cast<void>(served.release());
    if (!on_pool)
        target->retain();
    return made;
}

queue_core* queue_core::make(std::string_view label, queue_core* target, pump_core* pump,
                             priority level, bool global) {
    queue_cell* cell = queue_cells::take();
    char* text = cell->label;
    if (label.size() >= sizeof cell->label) {
        text = new (std::nothrow) char[label.size() + 1];
        if (!text) {
            queue_cells::give(cell);
            throw std::bad_alloc();
        }
    }
    std::memcpy(text, label.data(), label.size());
    text[label.size()] = '\0';
    auto* made =
        ::new (static_cast<void*>(cell->bytes)) queue_core(text, target, pump, level, global);
    cell->begin();
    return made;
}

queue_core* queue_core::global(priority level) noexcept {
    static constexpr const char* kLabels[] = {"global.high", "global.normal", "global.low"};
    static queue_core* const* const queues = [] {
        auto* made = new queue_core*[3];
        for (unsigned i = 0; i < 3; ++i)
            made[i] = make(kLabels[i], nullptr, nullptr, static_cast<priority>(i), true);
        return made;
    }();
    return queues[static_cast<unsigned>(level)];
}

queue_core::queue_core(const char* label, queue_core* target, pump_core* pump, priority level,
                       bool global) noexcept
    : target_(target),
      pump_(pump),
      priority_(level),
      kind_(global ? kGlobal
            : pump ? kPumped
                   : std::uint8_t{0}),
      label_(label) {
    place_.run = &queue_tag;
    place_.owner = this;
}

queue_core::~queue_core() {
    specific* entry = specifics_.load(std::memory_order_acquire);
    while (entry) {
        void* value = entry->value.load(std::memory_order_relaxed);
        if (value && entry->destructor)
            entry->destructor(value);
        delete std::exchange(entry, entry->next);
    }
    if (target_)
        target_->release();
    else
        delete pump_;
    delete statistics();
}

void queue_core::release() noexcept {
    if (is_global())
        return;
    // The only handle has no rival.
    if (handles_.load(std::memory_order_acquire) != 1 &&
        handles_.fetch_sub(1, std::memory_order_acq_rel) != 1)
        return;
    if (is_suspended())
        stop("the last handle of a suspended queue went");
    release_reference();
}

void queue_core::release_reference() noexcept {
    if (references_.load(std::memory_order_acquire) != 1 &&
        references_.fetch_sub(1, std::memory_order_acq_rel) != 1)
        return;
    queue_cell* const cell = queue_cell::of(this);
    cell->end();
    const char* const text = label_;
    this->~queue_core();
    if (text != cell->label)
        delete[] text;
    queue_cells::give(cell);
}

void queue_core::stop(const char* why) const noexcept {
    plr::report("dispatch: queue '%s': %s", label(), why);
    PLR_ASSERT(false, why);
    __builtin_unreachable();
}

// ---- Forks -----------------------------------------------------------------------------

void queue_core::forked() noexcept {
    if (pump_ && !target_)
        pump_->forked();
    walked_.store(false, std::memory_order_relaxed);
    suspension_.fetch_and(~kParked, std::memory_order_relaxed);
    stub_.next.store(nullptr, std::memory_order_relaxed);
    if (!is_current()) {
        references_.store(1, std::memory_order_relaxed);
        begin_list_at(&stub_, nullptr);
        tail_.store(nullptr, std::memory_order_relaxed);
    } else if (!is_global()) {
        // This thread's own: what it runs at present is all there is.
        item* const last = running_.load(std::memory_order_relaxed);
        begin_list_at(last, nullptr);
        last->next.store(nullptr, std::memory_order_relaxed);
        tail_.store(last, std::memory_order_relaxed);
    }
}

}  // namespace dispatch::detail

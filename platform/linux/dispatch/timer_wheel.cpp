#include "platform/linux/dispatch/timer_wheel.h"

#include <algorithm>
#include <bit>

namespace dispatch::detail {

// Hot path: bench/timers_cases.h.
void timer_wheel::insert(wheel_entry& entry, std::int64_t deadline) noexcept {
    entry.deadline_ = deadline;
    place(entry, end::back);
}

void timer_wheel::place(wheel_entry& entry, end where) noexcept {
    const std::int64_t deadline = std::max(entry.deadline_, base_);
    // The lowest bit stands in for "equal", which has no highest bit.
    const auto differing = static_cast<std::uint64_t>(deadline ^ base_) | 1;
    const auto highest = static_cast<unsigned>(std::bit_width(differing) - 1) % 64;
    const unsigned level = highest / kBits;
    const unsigned index = static_cast<unsigned>(deadline >> (level * kBits)) % kSlots;
    const unsigned place = level * kSlots + index;
    const std::uint64_t bit = std::uint64_t{1} << index;
    slot& into = slots_[place];
    entry.place_ = static_cast<std::uint16_t>(place);
    if (occupied_[level] & bit) {
        link(into, entry, where);
        into.earliest = std::min(into.earliest, deadline);
        return;
    }
    entry.next_ = entry.previous_ = nullptr;
    entry.ahead_ = nullptr;
    into.first = into.last = &entry;
    into.earliest = deadline;
    into.added = 1;
    into.from_front = where == end::front;
    into.recent[0] = &entry;
    occupied_[level] |= bit;
    levels_ |= 1u << level;
}

void timer_wheel::link(slot& into, wheel_entry& entry, end where) noexcept {
    const wheel_entry*& place = into.recent[into.added % kAhead];
    entry.ahead_ = into.added < kAhead ? nullptr : place;
    place = &entry;
    ++into.added;
    if (where == end::back) {
        entry.next_ = nullptr;
        entry.previous_ = into.last;
        into.last->next_ = &entry;
        into.last = &entry;
    } else {
        entry.previous_ = nullptr;
        entry.next_ = into.first;
        into.first->previous_ = &entry;
        into.first = &entry;
    }
}

void timer_wheel::remove(wheel_entry& entry) noexcept {
    slot& from = slots_[entry.place_];
    if (entry.next_)
        entry.next_->previous_ = entry.previous_;
    else
        from.last = entry.previous_;
    if (entry.previous_)
        entry.previous_->next_ = entry.next_;
    else
        from.first = entry.next_;
    if (!from.first)
        static_cast<void>(detach(entry.place_));
    entry.place_ = wheel_entry::kNowhere;
}

// Empties a slot; what was in it stays linked.
timer_wheel::slot& timer_wheel::detach(unsigned place) noexcept {
    const unsigned level = place / kSlots;
    occupied_[level] &= ~(std::uint64_t{1} << place % kSlots);
    if (occupied_[level] == 0)
        levels_ &= ~(1u << level);
    return slots_[place];
}

unsigned timer_wheel::first_place() const noexcept {
    const auto level = static_cast<unsigned>(std::countr_zero(levels_));
    return level * kSlots + static_cast<unsigned>(std::countr_zero(occupied_[level]));
}

std::int64_t timer_wheel::earliest() const noexcept {
    return levels_ == 0 ? kNever : slots_[first_place()].earliest;
}

wheel_entry* timer_wheel::take_due(std::int64_t now) noexcept {
    while (levels_ != 0) {
        const unsigned place = first_place();
        const slot& first = slots_[place];
        if (first.earliest > now)
            return nullptr;
        base_ = std::max(base_, first.earliest);
        wheel_entry* entry = first.first;
        if (place < kSlots || (!entry->next_ && entry->deadline_ <= now)) {
            remove(*entry);
            return entry;
        }
        open(place);
    }
    // Nothing is pending: what comes next is near.
    base_ = std::max(base_, now);
    return nullptr;
}

// Moves the entries of the first slot to lower levels, which are all empty: so
// either direction keeps their order.
void timer_wheel::open(unsigned place) noexcept {
    const slot& opened = detach(place);
    const bool forwards = opened.from_front;
    wheel_entry* entry = forwards ? opened.first : opened.last;
    while (entry) {
        wheel_entry* next = forwards ? entry->next_ : entry->previous_;
        __builtin_prefetch(entry->ahead_, 1);
        if (place < kSoon) {
            __builtin_prefetch(entry - 1, 1);
            __builtin_prefetch(entry - 2, 1);
        }
        this->place(*entry, forwards ? end::back : end::front);
        entry = next;
    }
}

void timer_wheel::clear() noexcept {
    while (levels_ != 0)
        for (wheel_entry* each = detach(first_place()).first; each; each = each->next_)
            each->place_ = wheel_entry::kNowhere;
}

void timer_wheel::set_back(std::int64_t now) noexcept {
    if (now >= base_)
        return;
    wheel_entry* all = nullptr;
    wheel_entry* last = nullptr;
    while (levels_ != 0) {
        const slot& emptied = detach(first_place());
        (last ? last->next_ : all) = emptied.first;
        last = emptied.last;
    }
    base_ = std::max<std::int64_t>(now, 0);
    while (all) {
        wheel_entry* next = all->next_;
        place(*all, end::back);
        all = next;
    }
}

}  // namespace dispatch::detail

#pragma once

#include <algorithm>
#include <cstdint>
#include <utility>
#include <vector>

// Entries by the ids of requests. An entry is a movable struct with a member `id`,
// which is not 0 and in the table once; one made without arguments has the id 0.
//
// Owner:   one connection, under its mutex.
// Cost:    a few slots are looked at for each request and reply, whatever ids a
//          peer chooses; no allocation while the number of entries is usual.
namespace vox_link {

// Odd and random: which ids share a place is a secret of this process.
[[nodiscard]] std::uint64_t id_multiplier() noexcept;

template <class Entry>
class id_table {
  public:
    // The entry of `id`, until the table changes; null when there is none.
    [[nodiscard]] Entry* find(std::uint64_t id) noexcept {
        if (used_ == 0 || id == 0)
            return nullptr;
        std::size_t slot = home(id);
        while (slots_[slot].id != id) {
            if (slots_[slot].id == 0)
                return nullptr;
            slot = after(slot);
        }
        return &slots_[slot];
    }
    // `entry.id` is new.
    void insert(Entry entry) {
        if (2 * (used_ + 1) > slots_.size())
            resize(std::max(kFewestSlots, 2 * slots_.size()));
        place(std::move(entry));
        ++used_;
    }
    // Removes and returns the entry of `id`; one with the id 0 when there is none.
    [[nodiscard]] Entry take(std::uint64_t id) {
        Entry* found = find(id);
        if (!found)
            return {};
        Entry taken = std::exchange(*found, Entry{});
        close_gap(static_cast<std::size_t>(found - slots_.data()));
        if (--used_ == 0 && slots_.size() > kSlotsToKeep)
            slots_ = {};
        return taken;
    }
    // Removes all, in the order of their ids.
    [[nodiscard]] std::vector<Entry> take_all() {
        std::vector<Entry> all;
        all.reserve(used_);
        for_each([&all](Entry& entry) { all.push_back(std::move(entry)); });
        slots_ = {};
        used_ = 0;
        std::sort(all.begin(), all.end(),
                  [](const Entry& a, const Entry& b) { return a.id < b.id; });
        return all;
    }
    // Calls `visit` with each, in no order.
    template <class Visit>
    void for_each(Visit visit) {
        for (Entry& slot : slots_) {
            if (slot.id != 0)
                visit(slot);
        }
    }
    [[nodiscard]] std::size_t size() const noexcept { return used_; }

  private:
    static constexpr std::size_t kFewestSlots = 8;
    static constexpr std::size_t kSlotsToKeep = 64;  // held by a connection without requests

    // Ids count up: they must not lie side by side, because a gap among them is
    // closed by looking at all that follow without one (Fibonacci hashing first).
    [[nodiscard]] std::size_t home(std::uint64_t id) const noexcept {
        const std::uint64_t spread = id * 0x9E3779B97F4A7C15u;
        return static_cast<std::size_t>(((spread ^ spread >> 32) * multiplier_) >> 32) &
               (slots_.size() - 1);
    }
    [[nodiscard]] std::size_t after(std::size_t slot) const noexcept {
        return (slot + 1) & (slots_.size() - 1);
    }
    void place(Entry entry) {
        std::size_t slot = home(entry.id);
        while (slots_[slot].id != 0)
            slot = after(slot);
        slots_[slot] = std::move(entry);
    }
    // Entries behind a gap move up when their search would stop at it.
    void close_gap(std::size_t gap) {
        for (std::size_t slot = after(gap); slots_[slot].id != 0; slot = after(slot)) {
            const std::size_t distance_from_home = slot - home(slots_[slot].id);
            const std::size_t distance_from_gap = slot - gap;
            const std::size_t mask = slots_.size() - 1;
            if ((distance_from_home & mask) >= (distance_from_gap & mask)) {
                slots_[gap] = std::exchange(slots_[slot], Entry{});
                gap = slot;
            }
        }
    }
    void resize(std::size_t slots) {
        std::vector<Entry> old = std::exchange(slots_, std::vector<Entry>(slots));
        for (Entry& slot : old) {
            if (slot.id != 0)
                place(std::move(slot));
        }
    }

    const std::uint64_t multiplier_ = id_multiplier();
    std::vector<Entry> slots_;  // open addressing, a power of two
    std::size_t used_ = 0;
};

}  // namespace vox_link

#include "platform/linux/vox/reply_table.h"

#include <algorithm>
#include <utility>

namespace vox_link {
namespace {

constexpr std::size_t kFewestSlots = 8;
constexpr std::size_t kSlotsToKeep = 64;  // held by a connection without requests

}  // namespace

void reply_table::insert(waiting_reply reply) {
    if (2 * (used_ + 1) > slots_.size())
        resize(std::max(kFewestSlots, 2 * slots_.size()));
    place(std::move(reply));
    ++used_;
}

waiting_reply reply_table::take(std::uint64_t id) {
    if (used_ == 0 || id == 0)
        return {};
    std::size_t slot = home(id);
    while (slots_[slot].id != id) {
        if (slots_[slot].id == 0)
            return {};
        slot = after(slot);
    }
    waiting_reply found = std::exchange(slots_[slot], waiting_reply{});
    close_gap(slot);
    if (--used_ == 0 && slots_.size() > kSlotsToKeep)
        slots_ = {};
    return found;
}

std::vector<waiting_reply> reply_table::take_all() {
    std::vector<waiting_reply> all;
    all.reserve(used_);
    for (waiting_reply& slot : slots_) {
        if (slot.id != 0)
            all.push_back(std::move(slot));
    }
    slots_ = {};
    used_ = 0;
    std::sort(all.begin(), all.end(),
              [](const waiting_reply& a, const waiting_reply& b) { return a.id < b.id; });
    return all;
}

void reply_table::place(waiting_reply reply) {
    std::size_t slot = home(reply.id);
    while (slots_[slot].id != 0)
        slot = after(slot);
    slots_[slot] = std::move(reply);
}

// Entries behind a gap move up when their search would stop at it.
void reply_table::close_gap(std::size_t gap) {
    for (std::size_t slot = after(gap); slots_[slot].id != 0; slot = after(slot)) {
        const std::size_t distance_from_home = slot - home(slots_[slot].id);
        const std::size_t distance_from_gap = slot - gap;
        const std::size_t mask = slots_.size() - 1;
        if ((distance_from_home & mask) >= (distance_from_gap & mask)) {
            slots_[gap] = std::exchange(slots_[slot], waiting_reply{});
            gap = slot;
        }
    }
}

void reply_table::resize(std::size_t slots) {
    std::vector<waiting_reply> old = std::exchange(slots_, std::vector<waiting_reply>(slots));
    for (waiting_reply& slot : old) {
        if (slot.id != 0)
            place(std::move(slot));
    }
}

}  // namespace vox_link

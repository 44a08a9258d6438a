#include "platform/linux/vox/send_turn.h"

#include <algorithm>
#include <atomic>
#include <chrono>
#include <utility>
#include <vector>

#include "dispatch/dispatch.h"
#include "platform/linux/vox/lock.h"
#include "platform/linux/vox/now.h"
#include "platform/linux/vox/peer_connection.h"

namespace vox_link {
namespace {

// How long frames wait for others of the turn: 100 µs; with many receivers about
// as long as writing to each of them will take, so that an update to a thousand
// of them is not written before the next one is known.
constexpr std::int64_t kDelay = 100'000;             // ns
constexpr std::int64_t kDelayForEachSender = 1'000;  // ns
constexpr std::chrono::milliseconds kSweep(1);       // and never longer

// The senders of one thread's turns. Others look at it when they wait too long.
struct sender_list {
    mutex lock;
    std::vector<peer_connection*> senders PLR_GUARDED_BY(lock);  // each held
    std::int64_t began PLR_GUARDED_BY(lock) = 0;                 // ns, of the first
};

// All threads' lists. Never destroyed: threads may end late.
struct registry {
    mutex lock;
    std::vector<sender_list*> lists PLR_GUARDED_BY(lock);
    std::atomic<bool> armed{false};  // a sweep will come

    static registry& shared() {
        static auto* const made = new registry;
        return *made;
    }
};

struct registered_list : sender_list {
    registered_list() {
        registry& all = registry::shared();
        const lock_guard guard(all.lock);
        all.lists.push_back(this);
    }
    ~registered_list() {
        registry& all = registry::shared();
        const lock_guard guard(all.lock);
        std::erase(all.lists, this);
    }
};

thread_local send_turn* current = nullptr;
thread_local registered_list own;

void flush_all(const std::vector<peer_connection*>& senders) {
    for (peer_connection* sender : senders) {
        sender->flush_turn();
        sender->unhold();
    }
}

// Moves senders that have waited too long to `late`. Returns whether others wait.
bool take_late(sender_list& list, std::vector<peer_connection*>& late) {
    const lock_guard guard(list.lock);
    if (list.senders.empty())
        return false;
    if (now() - list.began < std::chrono::nanoseconds(kSweep).count())
        return true;
    late.insert(late.end(), list.senders.begin(), list.senders.end());
    list.senders.clear();
    return false;
}

void sweep();

void arm_sweep() {
    if (!registry::shared().armed.exchange(true))
        dispatch::queue::global().after(dispatch::time::after(kSweep),
                                        dispatch::block<void()>([] { sweep(); }));
}

void sweep() {
    registry& all = registry::shared();
    all.armed.store(false);
    std::vector<peer_connection*> late;
    bool others = false;
    {
        const lock_guard guard(all.lock);
        for (sender_list* list : all.lists)
            others = take_late(*list, late) || others;
    }
    if (others)
        arm_sweep();
    flush_all(late);
}

}  // namespace

send_turn::send_turn(dispatch::detail::queue_core* queue) noexcept
    : queue_(queue), outer_(std::exchange(current, this)) {}

send_turn::~send_turn() {
    flush();
    current = outer_;
}

send_turn* send_turn::on(dispatch::detail::queue_core* queue) noexcept {
    return current && current->queue_ == queue ? current : nullptr;
}

void send_turn::add(peer_connection* sender) {
    sender->hold();
    const std::int64_t time = now();
    began_ = began_ == 0 ? time : began_;
    ++senders_;
    {
        const lock_guard guard(own.lock);
        if (own.senders.empty())
            own.began = time;
        own.senders.push_back(sender);
    }
    arm_sweep();
}

void send_turn::flush_if_due() {
    if (began_ == 0)
        return;
    const std::int64_t delay = std::clamp(senders_ * kDelayForEachSender, kDelay,
                                          std::int64_t{std::chrono::nanoseconds(kSweep).count()});
    if (now() - began_ >= delay)
        flush();
}

void send_turn::flush() {
    if (std::exchange(began_, 0) == 0)
        return;
    senders_ = 0;
    thread_local std::vector<peer_connection*> taken;
    {
        const lock_guard guard(own.lock);
        taken.swap(own.senders);
    }
    flush_all(taken);
    taken.clear();
}

}  // namespace vox_link

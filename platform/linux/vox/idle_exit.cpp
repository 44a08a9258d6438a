#include "platform/linux/vox/idle_exit.h"

#include <algorithm>
#include <chrono>
#include <utility>

#include "dispatch/source.h"
#include "platform/linux/vox/lock.h"
#include "platform/linux/vox/now.h"
#include "platform/linux/vox/transactions.h"
#include "plr/base/assert.h"
#include "vox/service.h"

namespace vox_link {

// All participants. Not locked by itself.
class participant_list {
  public:
    void add(idle_participant& one) noexcept {
        one.after_ = std::exchange(first_, &one);
        if (one.after_)
            one.after_->before_ = &one;
        ++changes_;
    }
    void remove(idle_participant& one) noexcept {
        (one.before_ ? one.before_->after_ : first_) = one.after_;
        if (one.after_)
            one.after_->before_ = one.before_;
        ++changes_;
    }
    // How often one came or went.
    [[nodiscard]] std::uint64_t changes() const noexcept { return changes_; }
    [[nodiscard]] idle_participant* first() const noexcept { return first_; }
    [[nodiscard]] static idle_participant* after(const idle_participant& one) noexcept {
        return one.after_;
    }

  private:
    idle_participant* first_ = nullptr;
    std::uint64_t changes_ = 0;
};

namespace {

using std::chrono::nanoseconds;

// While leaving, whether somebody is still to be waited for is asked so often.
constexpr nanoseconds kShortestWait = std::chrono::microseconds(200);
constexpr nanoseconds kLongestWait = std::chrono::milliseconds(50);

class idle_exit {
  public:
    // Never destroyed: connections end at any time.
    static idle_exit& instance() {
        static idle_exit& only = *new idle_exit;
        return only;
    }

    void add(idle_participant& one) {
        const lock_guard guard(lock_);
        participants_.add(one);
    }
    void remove(idle_participant& one) {
        const lock_guard guard(lock_);
        participants_.remove(one);
    }
    void opt_in(nanoseconds idle, const dispatch::queue& queue,
                const dispatch::block<void()>& leave);
    void opt_out();

  private:
    // What changes with everything that happens.
    struct trace {
        std::uint64_t participants = 0;  // came or went
        std::uint64_t messages = 0;      // of those that are there
        std::uint32_t transactions = 0;  // began
        bool operator==(const trace&) const = default;
    };

    void tick();
    void watch() PLR_REQUIRES(lock_);
    [[nodiscard]] bool is_quiet() PLR_REQUIRES(lock_);
    void go_on_leaving() PLR_REQUIRES(lock_);
    [[nodiscard]] bool is_stage_over() PLR_REQUIRES(lock_);
    void wake_after(nanoseconds delay) PLR_REQUIRES(lock_);

    mutex lock_;
    participant_list participants_ PLR_GUARDED_BY(lock_);
    nanoseconds idle_ PLR_GUARDED_BY(lock_){0};  // 0: not opted in
    dispatch::queue queue_ PLR_GUARDED_BY(lock_);
    dispatch::block<void()> leave_ PLR_GUARDED_BY(lock_);  // null: not opted in, or left
    dispatch::source timer_ PLR_GUARDED_BY(lock_);
    trace last_ PLR_GUARDED_BY(lock_);
    std::int64_t quiet_since_ PLR_GUARDED_BY(lock_) = 0;  // ns
    leaving_stage stage_ PLR_GUARDED_BY(lock_) = leaving_stage::none;
    nanoseconds wait_ PLR_GUARDED_BY(lock_) = kShortestWait;
};

// What belongs to no single connection.
bool has_activities() noexcept {
    return vox_transaction_count() > 0 || queued_call::count.load(std::memory_order_acquire) > 0;
}

void idle_exit::opt_in(nanoseconds idle, const dispatch::queue& queue,
                       const dispatch::block<void()>& leave) {
    const lock_guard guard(lock_);
    if (stage_ != leaving_stage::none)
        return;
    idle_ = idle;
    queue_ = queue;
    leave_ = leave;
    quiet_since_ = now();
    queued_call::is_counting.store(true, std::memory_order_relaxed);
    if (!timer_) {
        timer_ = dispatch::source::timer(dispatch::queue::create("vox idle exit"));
        timer_.set_event_handler(dispatch::block<void()>([this] { tick(); }));
        timer_.resume();
    }
    wake_after(idle_ / 2);
}

void idle_exit::opt_out() {
    const lock_guard guard(lock_);
    if (stage_ != leaving_stage::none)
        return;
    idle_ = nanoseconds(0);
    leave_ = nullptr;
    queue_ = {};
    queued_call::is_counting.store(false, std::memory_order_relaxed);
}

void idle_exit::wake_after(nanoseconds delay) {
    timer_.set_timer(dispatch::time::after(delay), dispatch::kOnce);
}

void idle_exit::tick() {
    const lock_guard guard(lock_);
    if (!leave_)
        return;
    if (stage_ == leaving_stage::none)
        watch();
    if (stage_ != leaving_stage::none)
        go_on_leaving();
}

void idle_exit::watch() {
    const std::int64_t time = now();
    if (!is_quiet())
        quiet_since_ = time;
    if (nanoseconds(time - quiet_since_) >= idle_)
        stage_ = leaving_stage::listeners;
    else
        wake_after(idle_ / 2);
}

// Whether nothing waits, and nothing has happened since it was asked last.
bool idle_exit::is_quiet() {
    trace found{participants_.changes(), 0, transactions_begun()};
    bool busy = has_activities();
    for (idle_participant* each = participants_.first(); each; each = participants_.after(*each)) {
        const idle_participant::sight seen = each->look();
        found.messages += seen.passed;
        busy = busy || seen.busy;
    }
    const trace before = std::exchange(last_, found);
    return !busy && found == before;
}

bool idle_exit::is_stage_over() {
    bool over = !has_activities();
    for (idle_participant* each = participants_.first(); each; each = participants_.after(*each))
        over = each->leave(stage_) && over;
    return over;
}

// There is no way back.
void idle_exit::go_on_leaving() {
    if (!is_stage_over()) {
        wake_after(wait_);
        wait_ = std::min(2 * wait_, kLongestWait);
    } else if (stage_ != leaving_stage::everything) {
        stage_ = static_cast<leaving_stage>(static_cast<std::uint8_t>(stage_) + 1);
        wait_ = kShortestWait;
        go_on_leaving();
    } else {
        static_cast<void>(vox_notify_stopping());
        queue_.async(std::exchange(leave_, nullptr));
    }
}

}  // namespace

void idle_participant::enlist() {
    idle_exit::instance().add(*this);
}

void idle_participant::discharge() {
    idle_exit::instance().remove(*this);
}

}  // namespace vox_link

void vox_set_idle_exit(uint32_t idle_ms, const dispatch::queue* queue,
                       const dispatch::block<void()>* leave) {
    vox_link::idle_exit& process = vox_link::idle_exit::instance();
    if (idle_ms == 0) {
        process.opt_out();
        return;
    }
    PLR_ASSERT(queue && *queue && leave && *leave, "idle exit needs a queue and a block");
    process.opt_in(std::chrono::milliseconds(idle_ms), *queue, *leave);
}

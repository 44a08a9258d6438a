#include "dispatch/source.h"

#include <poll.h>
#include <sys/epoll.h>
#include <sys/stat.h>

#include <atomic>
#include <cerrno>
#include <memory>
#include <system_error>

#include "platform/linux/dispatch/io_watch.h"
#include "platform/linux/dispatch/poller.h"
#include "platform/linux/dispatch/pool.h"
#include "platform/linux/dispatch/queue_core.h"
#include "plr/base/assert.h"

namespace dispatch {
namespace detail {

// A source submits one embedded item to its queue whenever there may be
// something to do there; what is to be done is decided on the queue.
//
// References: the handles together hold one, a submitted item holds one, and
// being armed holds one until the end.
class source_core {
  public:
    explicit source_core(const queue& on) noexcept : queue_(on), work_(*this) {}
    virtual ~source_core() = default;
    source_core(const source_core&) = delete;
    source_core& operator=(const source_core&) = delete;

    void retain() noexcept { handles_.fetch_add(1, std::memory_order_relaxed); }
    void release() noexcept {
        if (handles_.fetch_sub(1, std::memory_order_acq_rel) != 1)
            return;
        cancel();
        drop();
    }

    void set_event_handler(block<void()>&& handler) noexcept {
        scoped_lock guard(lock_);
        PLR_ASSERT(!armed_, "handlers are set before the first resume()");
        on_event_ = std::move(handler);
    }
    void set_cancel_handler(block<void()>&& handler) noexcept {
        scoped_lock guard(lock_);
        PLR_ASSERT(!armed_, "handlers are set before the first resume()");
        on_cancel_ = std::move(handler);
    }

    virtual void set_timer(time, std::chrono::nanoseconds) {
        PLR_ASSERT(false, "set_timer() of a source that is no timer");
    }

    void suspend() noexcept { suspensions_.fetch_add(1, std::memory_order_acq_rel); }
    void resume();
    void cancel() noexcept {
        if (!cancelled_.exchange(true, std::memory_order_acq_rel))
            submit_work();
    }
    [[nodiscard]] bool is_cancelled() const noexcept {
        return cancelled_.load(std::memory_order_acquire);
    }
    [[nodiscard]] std::uint64_t data() const noexcept { return data_; }

  protected:
    // Something happened `count` times. Any thread, under the poller's locks.
    void add_events(std::uint64_t count) noexcept {
        if (pending_.fetch_add(count, std::memory_order_acq_rel) == 0)
            submit_work();
    }
    [[nodiscard]] queue_core* target() const noexcept { return queue_.get(); }

    // The first resume(), unless cancelled before; the end, on the queue.
    virtual void arm() PLR_REQUIRES(lock_) = 0;
    virtual void disarm() noexcept PLR_REQUIRES(lock_) = 0;
    // On the queue, after the event handler ran.
    virtual void handled() noexcept {}

    void keep() noexcept { references_.fetch_add(1, std::memory_order_relaxed); }
    void drop() noexcept {
        if (references_.fetch_sub(1, std::memory_order_acq_rel) == 1)
            delete this;
    }

    spin_lock lock_;
    bool armed_ PLR_GUARDED_BY(lock_) = false;

  private:
    struct work : embedded_item {
        explicit work(source_core& owner) noexcept : embedded_item(&work::call), self(owner) {}
        static void call(embedded_item* item) noexcept { static_cast<work*>(item)->self.run(); }
        source_core& self;
    };

    void submit_work() noexcept {
        if (submitted_.exchange(true, std::memory_order_acq_rel))
            return;
        keep();
        submit(target(), &work_);
    }
    void run() noexcept;
    void finish() noexcept;

    const queue queue_;
    std::atomic<std::uint32_t> handles_{1};
    std::atomic<std::uint32_t> references_{1};
    std::atomic<std::uint32_t> suspensions_{1};
    std::atomic<bool> cancelled_{false};
    std::atomic<bool> submitted_{false};
    std::atomic<std::uint64_t> pending_{0};
    work work_;
    // On the queue once armed.
    bool finished_ = false;
    std::uint64_t data_ = 0;
    block<void()> on_event_;
    block<void()> on_cancel_;
};

void source_core::resume() {
    const std::uint32_t before = suspensions_.fetch_sub(1, std::memory_order_acq_rel);
    PLR_ASSERT(before != 0, "more resumes than suspends");
    if (before != 1)
        return;
    {
        scoped_lock guard(lock_);
        if (!is_cancelled() && !armed_) {
            armed_ = true;
            arm();
        }
    }
    if (pending_.load(std::memory_order_acquire) != 0)
        submit_work();
}

void source_core::run() noexcept {
    submitted_.exchange(false, std::memory_order_seq_cst);
    if (is_cancelled()) {
        finish();
    } else if (suspensions_.load(std::memory_order_acquire) == 0) {
        if (const std::uint64_t count = pending_.exchange(0, std::memory_order_acq_rel)) {
            data_ = count;
            if (on_event_)
                on_event_();
            if (!is_cancelled())
                handled();
        }
    }
    drop();
}

void source_core::finish() noexcept {
    if (std::exchange(finished_, true))
        return;
    {
        scoped_lock guard(lock_);
        if (armed_)
            disarm();
    }
    const block<void()> last = std::move(on_cancel_);
    if (last)
        last();
    on_event_ = nullptr;
}

namespace {

class timer_source final : public source_core, timer_entry {
  public:
    explicit timer_source(const queue& on) noexcept
        : source_core(on), timer_entry(&timer_source::fire) {}

    void set_timer(time start, std::chrono::nanoseconds interval) override {
        scoped_lock guard(lock_);
        start_ = start;
        interval_ = interval == kOnce ? 0 : std::max<std::int64_t>(interval.count(), 1);
        if (armed_ && !is_cancelled())
            poller::shared().timers().arm(*this, start_, interval_);
    }

  private:
    static void fire(timer_entry* entry, std::uint64_t firings) noexcept {
        static_cast<timer_source*>(entry)->add_events(firings);
    }
    void arm() override PLR_REQUIRES(lock_) {
        poller::shared().timers().arm(*this, start_, interval_);
        pool::shared().ensure_poller();
    }
    void disarm() noexcept override PLR_REQUIRES(lock_) { poller::shared().timers().disarm(*this); }

    time start_ PLR_GUARDED_BY(lock_) = forever;
    std::int64_t interval_ PLR_GUARDED_BY(lock_) = 0;  // nanoseconds; 0 for once
};

// Readiness is delivered at its edges; the level that users are promised is
// asked for after each call of the handler.
class descriptor_source final : public source_core {
  public:
    descriptor_source(int fd, short events, const queue& on)
        : source_core(on), fd_(fd), events_(events), watch_(*this) {
        struct stat info {};
        if (::fstat(fd, &info) != 0)
            throw std::system_error(errno, std::generic_category(), "fstat");
        always_ready_ = S_ISREG(info.st_mode);
    }

  private:
    struct watch : io_watch {
        explicit watch(descriptor_source& owner) noexcept : io_watch(&watch::call), self(owner) {}
        static void call(io_watch* item) noexcept {
            descriptor_source& self = static_cast<watch*>(item)->self;
            static_cast<void>(item->take_events());
            self.add_events(1);
            if (self.stopped_)
                self.drop();
        }
        descriptor_source& self;
    };

    void arm() override PLR_REQUIRES(lock_) {
        if (always_ready_) {
            add_events(1);
            return;
        }
        keep();  // for the watch
        const std::uint32_t interest = events_ == POLLIN ? EPOLLIN : EPOLLOUT;
        if (const int error = watch_.start(fd_, interest, target()); error != 0) {
            drop();
            throw std::system_error(error, std::generic_category(), "epoll_ctl");
        }
        watching_ = true;
    }
    void disarm() noexcept override PLR_REQUIRES(lock_) {
        if (!watching_)
            return;
        watching_ = false;
        if (watch_.stop())
            drop();
        else
            stopped_ = true;  // the call that still comes drops
    }
    void handled() noexcept override {
        pollfd state{fd_, events_, 0};
        if (always_ready_ || ::poll(&state, 1, 0) > 0)
            add_events(1);
    }

    const int fd_;
    const short events_;
    bool always_ready_ = false;
    bool watching_ = false;
    bool stopped_ = false;  // on the queue
    watch watch_;
};

}  // namespace

void retain(source_core* core) noexcept {
    core->retain();
}
void release(source_core* core) noexcept {
    core->release();
}

}  // namespace detail

source source::adopt(detail::source_core* owned) noexcept {
    source result;
    result.core_ = owned;
    return result;
}

source source::timer(const queue& on) {
    return adopt(new detail::timer_source(on));
}
source source::readable(int fd, const queue& on) {
    return adopt(new detail::descriptor_source(fd, POLLIN, on));
}
source source::writable(int fd, const queue& on) {
    return adopt(new detail::descriptor_source(fd, POLLOUT, on));
}

void source::set_event_handler(block<void()> handler) const {
    core_->set_event_handler(std::move(handler));
}
void source::set_cancel_handler(block<void()> handler) const {
    core_->set_cancel_handler(std::move(handler));
}
void source::set_timer(time start, std::chrono::nanoseconds interval,
                       std::chrono::nanoseconds /*leeway*/) const {
    core_->set_timer(start, interval);
}
void source::suspend() const noexcept {
    core_->suspend();
}
void source::resume() const {
    core_->resume();
}
void source::cancel() const noexcept {
    core_->cancel();
}
bool source::is_cancelled() const noexcept {
    return core_->is_cancelled();
}
std::uint64_t source::data() const noexcept {
    return core_->data();
}

}  // namespace dispatch

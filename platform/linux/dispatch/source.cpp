#include "dispatch/source.h"

#include <poll.h>
#include <sys/epoll.h>
#include <sys/stat.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <cstddef>
#include <new>
#include <system_error>

#include "platform/linux/dispatch/fork.h"
#include "platform/linux/dispatch/poller.h"
#include "platform/linux/dispatch/pool.h"
#include "platform/linux/dispatch/queue_core.h"
#include "platform/linux/dispatch/source_core.h"
#include "src/base/magazines.h"

namespace dispatch {
namespace detail {
namespace {

struct timer_memory;

// Recycled memory for timers, which come and go with each request that has a
// time-out.
struct timer_store {
    static constexpr std::size_t kMagazine = 31;
    [[maybe_unused]] static constexpr std::size_t kDepotMagazines = 64;

    [[maybe_unused]] static void fill(std::array<timer_memory*, kMagazine>& places);
    [[maybe_unused]] static void discard(timer_memory* memory) noexcept;
};
using timer_memories = plr::detail::Magazines<timer_memory, timer_store>;

// What a timer is set to. A class of its own so that it fills up the cache line
// in front of the timer entry.
class timer_setting : public source_core {
  protected:
    using source_core::source_core;
    time start_ PLR_GUARDED_BY(lock_) = forever;
    std::int64_t period_ PLR_GUARDED_BY(lock_) = 0;  // nanoseconds; 0 for once
};

// The timer queue's lock guards its sources too: arming is one lock.
class timer_source final : public timer_setting, timer_entry {
  public:
    explicit timer_source(const queue& on) noexcept
        : timer_setting(on, timers().lock()), timer_entry(&timer_source::fire) {}

    static void* operator new(std::size_t size);
    static void operator delete(void* memory) noexcept;

    void set_timer(time start, std::chrono::nanoseconds interval) override {
        scoped_lock guard(lock_);
        start_ = start;
        period_ = std::max<std::int64_t>(interval.count(), 0);
        if (is(kArmed) && !is_cancelled())
            set();
    }

  private:
    static timer_queue& timers() noexcept { return poller::shared().timers(); }
    static void fire(timer_entry* entry, std::uint64_t firings) noexcept {
        auto* self = static_cast<timer_source*>(entry);
        self->lock_.assert_held();
        self->add_events(firings);
        self->fetch_handler();
    }
    void set() noexcept PLR_REQUIRES(lock_) {
        timers().lock().assert_held();
        timers().arm(*this, start_, period_);
    }
    void arm() override PLR_REQUIRES(lock_) {
        set();
        pool::shared().ensure_poller();
    }
    void disarm() noexcept override PLR_REQUIRES(lock_) {
        timers().lock().assert_held();
        timers().disarm(*this);
    }
};
static_assert(sizeof(timer_source) == 192);

struct alignas(64) timer_memory {
    std::byte bytes[sizeof(timer_source)];
};

void timer_store::fill(std::array<timer_memory*, kMagazine>& places) {
    std::size_t made = 0;
    try {
        for (; made < kMagazine; ++made)
            places[made] = new timer_memory;
    } catch (const std::bad_alloc&) {
        while (made > 0)
            delete places[--made];
        throw;
    }
}
void timer_store::discard(timer_memory* memory) noexcept {
    delete memory;
}

void* timer_source::operator new(std::size_t size) {
    if constexpr (plr::detail::kRecycle)
        return timer_memories::take();
    else
        return ::operator new (size, std::align_val_t{alignof(timer_source)});
}
void timer_source::operator delete(void* memory) noexcept {
    if constexpr (plr::detail::kRecycle)
        timer_memories::give(static_cast<timer_memory*>(memory));
    else
        ::operator delete (memory, std::align_val_t{alignof(timer_source)});
}

constinit spin_lock descriptor_lock;

// Readiness is delivered at its edges; the level that users are promised is
// asked for after each call of the handler.
class descriptor_source final : public source_core {
  public:
    descriptor_source(int fd, short events, const queue& on)
        : source_core(on, descriptor_lock), fd_(fd), events_(events), watch_(*this) {
        struct stat info {};
        if (::fstat(fd, &info) != 0)
            throw std::system_error(errno, std::generic_category(), "fstat");
        always_ready_ = S_ISREG(info.st_mode);
    }

  private:
    struct watch : io_watch {
        explicit watch(descriptor_source& owner) noexcept : io_watch(&watch::call), self(owner) {}
        static void call(io_watch* item) noexcept {
            static_cast<void>(item->take_events());
            static_cast<watch*>(item)->self.ready();
        }
        descriptor_source& self;
    };

    void arm() override PLR_REQUIRES(lock_) {
        if (always_ready_) {
            add_events(1);
            return;
        }
        const std::uint32_t interest = events_ == POLLIN ? EPOLLIN : EPOLLOUT;
        if (const int error = watch_.start(fd_, interest, target()); error != 0)
            throw std::system_error(error, std::generic_category(), "epoll_ctl");
        hold();
        watching_ = true;
    }
    void ready() noexcept {
        if (stopped_)
            return let_go();
        scoped_lock guard(lock_);
        add_events(1);
    }
    void handled() noexcept override {
        pollfd state{fd_, events_, 0};
        if (always_ready_ || ::poll(&state, 1, 0) > 0)
            ready();
    }
    void ended() noexcept override {
        if (!watching_)
            return;
        stopped_ = true;
        if (watch_.stop())
            let_go();  // else the call that still comes does
    }

    const int fd_;
    const short events_;
    bool always_ready_ = false;
    bool watching_ = false;
    bool stopped_ = false;  // on the queue
    watch watch_;
};

// The watch and the source are two items: never at once, also on behalf of a
// concurrent queue.
queue serial(const queue& on) {
    return on.get()->is_global() ? queue::create("descriptor source", on) : on;
}

}  // namespace

void forks::lock_sources(moment when) noexcept {
    hold(descriptor_lock, when);
    hold(timer_memories::depotLock(), when);
}

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
    return adopt(new detail::descriptor_source(fd, POLLIN, detail::serial(on)));
}
source source::writable(int fd, const queue& on) {
    return adopt(new detail::descriptor_source(fd, POLLOUT, detail::serial(on)));
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

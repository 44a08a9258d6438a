#include "plr/concurrency/dispatch_timer_service.h"

#include <cstddef>
#include <utility>

#include "plr/base/assert.h"
#include "plr/concurrency/dispatch_timer.h"
#include "plr/log/log_server.h"

namespace plr {
namespace {

using std::chrono::microseconds;
using std::chrono::nanoseconds;

// Deliberate: so small that no timer is put off to share a wake-up.
constexpr nanoseconds kLeeway{5};

// Clamped to what 64 bits hold.
nanoseconds toNanoseconds(microseconds count) {
    constexpr microseconds kLimit = std::chrono::duration_cast<microseconds>(nanoseconds::max());
    if (count > kLimit)
        return nanoseconds::max();
    if (count < -kLimit)
        return nanoseconds::min();
    return count;
}

// Recycled memory for what is as small as a token with its counts.
template <class T>
struct SmallAllocator {
    using value_type = T;
    SmallAllocator() = default;
    template <class U>
    explicit SmallAllocator(const SmallAllocator<U>&) noexcept {}
    T* allocate(std::size_t count) {
        static_assert(sizeof(T) <= dispatch::detail::kSmallBlock && alignof(T) <= 16);
        PLR_ASSERT(count == 1, "for single objects");
        return static_cast<T*>(dispatch::detail::allocate_small());
    }
    void deallocate(T* unused, std::size_t) noexcept { dispatch::detail::recycle_small(unused); }
    friend bool operator==(SmallAllocator, SmallAllocator) noexcept { return true; }
};

// A handler that holds its own source goes only when the source is cancelled.
struct CancelUnlessKept {
    ~CancelUnlessKept() {
        if (!kept)
            source.cancel();
    }
    const dispatch::source& source;
    bool kept = false;
};

}  // namespace

std::shared_ptr<DispatchTimerService> DispatchTimerService::create(
    std::shared_ptr<LogServer> server) {
    std::shared_ptr<DispatchTimerService> service =
        make_shared_ptr(new DispatchTimerService(std::move(server)));
    service->execute_wrapped([self = service.get()] {
        self->ownQueue_.assertCurrent();
        self->init_sync();
    });
    return service;
}

DispatchTimerService::DispatchTimerService(std::shared_ptr<LogServer> server)
    : SharedLoggable("DispatchTimerService", "timer", std::move(server)) {}
DispatchTimerService::~DispatchTimerService() = default;

std::chrono::steady_clock::time_point DispatchTimerService::now() {
    return std::chrono::steady_clock::time_point(
        nanoseconds(dispatch::time::now(dispatch::clock::monotonic).nanoseconds()));
}

void DispatchTimerService::flush() const {
    execute_wrapped_sync([] {});
}

dispatch::time DispatchTimerService::makeDispatchTime(Time time) const {
    const TimeType type = std::get<TimeType>(time);
    PLR_ASSERT(type == TimeType::Monotonic || type == TimeType::WallClock, "no such TimeType");
    const auto clock =
        type == TimeType::WallClock ? dispatch::clock::wall : dispatch::clock::monotonic;
    return dispatch::time::after(toNanoseconds(std::get<microseconds>(time)), clock);
}

void DispatchTimerService::scheduleAfterImpl(std::string name, Time time, dispatch::queue queue,
                                             dispatch::block<void()> block) {
    execute_wrapped([this, name = std::move(name), time, queue = std::move(queue),
                     block = std::move(block)]() mutable {
        ownQueue_.assertCurrent();
        scheduleAfter_sync(name, time, queue, std::move(block));
    });
}

void DispatchTimerService::scheduleAfter_sync(const std::string& /*name*/, Time time,
                                              const dispatch::queue& queue,
                                              dispatch::block<void()> block) {
    queue.after(makeDispatchTime(time), std::move(block));
}

std::unique_ptr<Timer> DispatchTimerService::createOneShotTimerImpl(std::string name, Time time,
                                                                    dispatch::queue queue,
                                                                    dispatch::block<void()> block) {
    return execute_wrapped_sync([&] {
        ownQueue_.assertCurrent();
        return createOneShotTimer_sync(name, time, queue, std::move(block));
    });
}

std::unique_ptr<Timer> DispatchTimerService::createOneShotTimer_sync(
    const std::string& /*name*/, Time time, const dispatch::queue& queue,
    dispatch::block<void()> block) {
    return createDispatchTimer(queue, makeDispatchTime(time), dispatch::kOnce, std::move(block));
}

std::unique_ptr<Timer> DispatchTimerService::createPeriodicTimerImpl(
    std::string name, Time time, dispatch::queue queue, dispatch::block<void()> block) {
    return execute_wrapped_sync([&] {
        ownQueue_.assertCurrent();
        return createPeriodicTimer_sync(name, time, queue, std::move(block));
    });
}

std::unique_ptr<Timer> DispatchTimerService::createPeriodicTimer_sync(
    const std::string& /*name*/, Time time, const dispatch::queue& queue,
    dispatch::block<void()> block) {
    return createDispatchTimer(queue, makeDispatchTime(time),
                               toNanoseconds(std::get<microseconds>(time)), std::move(block));
}

std::unique_ptr<Timer> DispatchTimerService::createDispatchTimer(
    const dispatch::queue& queue, dispatch::time start, nanoseconds interval,
    dispatch::block<void()> block) const {
    const dispatch::source source = dispatch::source::timer(queue);
    CancelUnlessKept guard{source};
    std::shared_ptr<void> token = std::allocate_shared<bool>(SmallAllocator<bool>(), false);
    const std::weak_ptr<void> observer = token;
    if (interval == dispatch::kOnce)
        source.set_event_handler(dispatch::block<void()>([block = std::move(block), source] {
            block();
            source.cancel();
        }));
    else
        source.set_event_handler(std::move(block));
    source.set_cancel_handler(dispatch::block<void()>([token = std::move(token)] {}));
    source.set_timer(start, interval, kLeeway);
    auto timer = std::make_unique<DispatchTimer>(source, observer);
    guard.kept = true;
    return timer;
}

}  // namespace plr

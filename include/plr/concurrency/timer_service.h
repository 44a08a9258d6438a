#pragma once

#include <chrono>
#include <concepts>
#include <cstdint>
#include <functional>
#include <memory>
#include <stdexcept>
#include <string>
#include <tuple>
#include <type_traits>
#include <utility>

#include "dispatch/block.h"
#include "dispatch/queue.h"
#include "plr/base/export.h"
#include "plr/concurrency/timer.h"
#include "plr/concurrency/timer_delay.h"

namespace plr {

class PLR_EXPORT IllegalTimerParamsException : public std::runtime_error {
  public:
    explicit IllegalTimerParamsException(const char* message);
    ~IllegalTimerParamsException() override;
};

// A TimerService makes timers: calls after a delay, once or again and again, on
// a queue of the caller's choice. Components are given one instead of making
// timers themselves, so that tests can give them another.
//
//   service.runAfter(200ms, queue, [] { … });
//   timer_ = service.startPeriodicTimer(10s, ownQueue_.queue(), whileAlive(…));
//
// Owner:   of the service, the process; of a timer, who asked for it.
// Threads: any; what an implementation excludes it says.
// Queues:  the one given, else the global concurrent one of normal priority.
// Work:    any callable without arguments, a std::function or a dispatch::block.
// Delays:  any std::chrono duration, rounded up to microseconds (TimerDelay);
//          TimerDelay(5min).onWallClock() follows changes of the system time.
// Names:   for diagnostics; may be empty.
class PLR_EXPORT TimerService {
  public:
    TimerService() = default;
    TimerService(const TimerService&) = delete;
    TimerService& operator=(const TimerService&) = delete;

    // Runs `work` once after `delay`. Cannot be withdrawn.
    template <class Work>
    void runAfter(TimerDelay delay, dispatch::queue queue, Work&& work, std::string name = {}) {
        scheduleAfterImpl(std::move(name), delay.time(), std::move(queue),
                          blockOf(std::forward<Work>(work)));
    }
    template <std::invocable Work>
    void runAfter(TimerDelay delay, Work&& work, std::string name = {}) {
        runAfter(delay, dispatch::queue::global(), std::forward<Work>(work), std::move(name));
    }

    // The same as a timer, which can be cancelled.
    template <class Work>
    [[nodiscard]] std::unique_ptr<Timer> startTimer(TimerDelay delay, dispatch::queue queue,
                                                    Work&& work, std::string name = {}) {
        return createOneShotTimerImpl(std::move(name), delay.time(), std::move(queue),
                                      blockOf(std::forward<Work>(work)));
    }
    template <std::invocable Work>
    [[nodiscard]] std::unique_ptr<Timer> startTimer(TimerDelay delay, Work&& work,
                                                    std::string name = {}) {
        return startTimer(delay, dispatch::queue::global(), std::forward<Work>(work),
                          std::move(name));
    }

    // Runs `work` every `period`, first after one. Throws
    // IllegalTimerParamsException for a period of zero or less.
    template <class Work>
    [[nodiscard]] std::unique_ptr<Timer> startPeriodicTimer(TimerDelay period,
                                                            dispatch::queue queue, Work&& work,
                                                            std::string name = {}) {
        throwIfPeriodIsIllegal(period);
        return createPeriodicTimerImpl(std::move(name), period.time(), std::move(queue),
                                       blockOf(std::forward<Work>(work)));
    }
    template <std::invocable Work>
    [[nodiscard]] std::unique_ptr<Timer> startPeriodicTimer(TimerDelay period, Work&& work,
                                                            std::string name = {}) {
        return startPeriodicTimer(period, dispatch::queue::global(), std::forward<Work>(work),
                                  std::move(name));
    }

    // ---- What implementations provide ------------------------------------------------------

    using Time = TimerDelay::Time;

    [[nodiscard]] virtual std::chrono::steady_clock::time_point now() = 0;
    virtual void scheduleAfterImpl(std::string name, Time time, dispatch::queue queue,
                                   dispatch::block<void()> block) = 0;
    [[nodiscard]] virtual std::unique_ptr<Timer> createOneShotTimerImpl(
        std::string name, Time time, dispatch::queue queue, dispatch::block<void()> block) = 0;
    // A period is not checked here: one that is not positive fires once.
    [[nodiscard]] virtual std::unique_ptr<Timer> createPeriodicTimerImpl(
        std::string name, Time time, dispatch::queue queue, dispatch::block<void()> block) = 0;
    // On the global concurrent queue of normal priority.
    virtual void scheduleAfterImpl(std::string name, Time time, std::function<void()> function);
    [[nodiscard]] virtual std::unique_ptr<Timer> createOneShotTimerImpl(
        std::string name, Time time, std::function<void()> function);
    [[nodiscard]] virtual std::unique_ptr<Timer> createPeriodicTimerImpl(
        std::string name, Time time, std::function<void()> function);
    virtual ~TimerService();

    void scheduleAfterImpl(std::string name, Time time, dispatch::block<void()> block);
    [[nodiscard]] std::unique_ptr<Timer> createOneShotTimerImpl(std::string name, Time time,
                                                                dispatch::block<void()> block);
    [[nodiscard]] std::unique_ptr<Timer> createPeriodicTimerImpl(std::string name, Time time,
                                                                 dispatch::block<void()> block);

    // For entry points that take a period. Deliberate: zero only; negative ones
    // pass, and none of the operations above asks.
    void throwIfPeriodIsZero(Time time) const;

  private:
    void throwIfPeriodIsIllegal(const TimerDelay& period) const;

    template <class Work>
    static dispatch::block<void()> blockOf(Work&& work) {
        return dispatch::block<void()>(std::forward<Work>(work));
    }
};

}  // namespace plr

#pragma once

#include <chrono>
#include <memory>
#include <string>

#include "dispatch/source.h"
#include "dispatch/time.h"
#include "plr/base/export.h"
#include "plr/concurrency/timer_service.h"
#include "plr/log/shared_loggable.h"

namespace plr {

class LogServer;

// The TimerService on dispatch timer sources.
//
// Owner:   the std::shared_ptr of create(); requests that are queued keep the
//          service alive. Timers live without it.
// Queue:   "DispatchTimerService" carries out the requests, in their order.
//          Callbacks run on the queues given, never on this one.
// Threads: any; the operations that return a timer wait for the service's queue
//          and must not be called on it.
// Cost:    a timer made and cancelled, bench/timers_cases.h.
class PLR_EXPORT DispatchTimerService final
    : public TimerService,
      public SharedLoggable<DispatchTimerService, LoggerBase<std::shared_ptr<LogServer>>> {
  public:
    // The logger is "timer"; without a server nothing is logged.
    [[nodiscard]] static std::shared_ptr<DispatchTimerService> create(
        std::shared_ptr<LogServer> server);
    ~DispatchTimerService() override;

    [[nodiscard]] std::chrono::steady_clock::time_point now() override;

    // Deadlines of scheduleAfterImpl() count from when the service's queue comes
    // to the request. The name is not used.
    using TimerService::createOneShotTimerImpl;
    using TimerService::createPeriodicTimerImpl;
    using TimerService::scheduleAfterImpl;
    void scheduleAfterImpl(std::string name, Time time, dispatch::queue queue,
                           dispatch::block<void()> block) override;
    [[nodiscard]] std::unique_ptr<Timer> createOneShotTimerImpl(
        std::string name, Time time, dispatch::queue queue, dispatch::block<void()> block) override;
    [[nodiscard]] std::unique_ptr<Timer> createPeriodicTimerImpl(
        std::string name, Time time, dispatch::queue queue, dispatch::block<void()> block) override;

    // When it returns, every request made before has been carried out. Never on
    // the service's queue.
    void flush() const;

    // Now plus `time`, on its clock; dispatch::forever when that is past all times.
    [[nodiscard]] dispatch::time makeDispatchTime(Time time) const;

  private:
    explicit DispatchTimerService(std::shared_ptr<LogServer> server);

    void init_sync() PLR_ON(ownQueue_)
    {}
    void scheduleAfter_sync(const std::string& name, Time time, const dispatch::queue& queue,
                            dispatch::block<void()> block) PLR_ON(ownQueue_);
    std::unique_ptr<Timer> createOneShotTimer_sync(const std::string& name, Time time,
                                                   const dispatch::queue& queue,
                                                   dispatch::block<void()> block) PLR_ON(ownQueue_);
    std::unique_ptr<Timer> createPeriodicTimer_sync(const std::string& name, Time time,
                                                    const dispatch::queue& queue,
                                                    dispatch::block<void()> block)
        PLR_ON(ownQueue_);
    // `interval`: dispatch::kOnce for a timer that cancels itself when it fired.
    std::unique_ptr<Timer> createDispatchTimer(const dispatch::queue& queue, dispatch::time start,
                                               std::chrono::nanoseconds interval,
                                               dispatch::block<void()> block) const;
};

}  // namespace plr

#include "plr/concurrency/timer_service.h"

namespace plr {

using dispatch::block;
using dispatch::queue;

Timer::~Timer() = default;
TimerService::~TimerService() = default;

IllegalTimerParamsException::IllegalTimerParamsException(const char* message)
    : std::runtime_error(message) {}
IllegalTimerParamsException::~IllegalTimerParamsException() = default;

void TimerService::scheduleAfterImpl(std::string name, Time time, block<void()> work) {
    scheduleAfterImpl(std::move(name), time, queue::global(), std::move(work));
}
std::unique_ptr<Timer> TimerService::createOneShotTimerImpl(std::string name, Time time,
                                                            block<void()> work) {
    return createOneShotTimerImpl(std::move(name), time, queue::global(), std::move(work));
}
std::unique_ptr<Timer> TimerService::createPeriodicTimerImpl(std::string name, Time time,
                                                             block<void()> work) {
    return createPeriodicTimerImpl(std::move(name), time, queue::global(), std::move(work));
}

void TimerService::scheduleAfterImpl(std::string name, Time time, std::function<void()> function) {
    scheduleAfterImpl(std::move(name), time, block<void()>(std::move(function)));
}
std::unique_ptr<Timer> TimerService::createOneShotTimerImpl(std::string name, Time time,
                                                            std::function<void()> function) {
    return createOneShotTimerImpl(std::move(name), time, block<void()>(std::move(function)));
}
std::unique_ptr<Timer> TimerService::createPeriodicTimerImpl(std::string name, Time time,
                                                             std::function<void()> function) {
    return createPeriodicTimerImpl(std::move(name), time, block<void()>(std::move(function)));
}

void TimerService::throwIfPeriodIsZero(Time time) const {
    if (std::get<std::chrono::microseconds>(time).count() == 0)
        throw IllegalTimerParamsException(
            "Cannot set up a period of 0 time; that would be insane!");
}

void TimerService::throwIfPeriodIsIllegal(const TimerDelay& period) const {
    throwIfPeriodIsZero(period.time());
    if (std::get<std::chrono::microseconds>(period.time()).count() < 0)
        throw IllegalTimerParamsException("Cannot set up a negative period");
}

}  // namespace plr

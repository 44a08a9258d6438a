#include "src/log/log_forks.h"

#include <pthread.h>

#include <mutex>
#include <vector>

#include "plr/base/thread_annotations.h"
#include "src/log/log_delivery.h"
#include "src/log/log_message_lock.h"

namespace plr::log_forks {
namespace {

struct Registry {
    std::mutex lock;
    std::vector<LogDelivery*> deliveries;
};

Registry& registry();

void before() PLR_NO_THREAD_SAFETY_ANALYSIS {
    registry().lock.lock();
    for (LogDelivery* each : registry().deliveries)
        each->beforeFork();
    detail::logMessageLock().lock();
}

void inParent() PLR_NO_THREAD_SAFETY_ANALYSIS {
    detail::logMessageLock().unlock();
    for (LogDelivery* each : registry().deliveries)
        each->afterForkInParent();
    registry().lock.unlock();
}

void inChild() PLR_NO_THREAD_SAFETY_ANALYSIS {
    detail::logMessageLock().unlock();
    for (LogDelivery* each : registry().deliveries)
        each->afterForkInChild();
    registry().lock.unlock();
}

// Made behind the first queue: queues' handlers are there before these, so that a
// fork takes these locks first, as everybody else does. Never destroyed.
Registry& registry() {
    static Registry* const instance = [] {
        ::pthread_atfork(&before, &inParent, &inChild);
        return new Registry;
    }();
    return *instance;
}

}  // namespace

void add(LogDelivery& delivery) {
    const std::lock_guard guard(registry().lock);
    registry().deliveries.push_back(&delivery);
}

void remove(LogDelivery& delivery) noexcept {
    const std::lock_guard guard(registry().lock);
    std::erase(registry().deliveries, &delivery);
}

}  // namespace plr::log_forks

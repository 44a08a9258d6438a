#include "platform/linux/dispatch/fork.h"

#include <pthread.h>

#include "platform/linux/dispatch/deputy.h"
#include "platform/linux/dispatch/poller.h"
#include "platform/linux/dispatch/pool.h"
#include "platform/linux/dispatch/queue_cells.h"
#include "platform/linux/dispatch/queue_core.h"

namespace dispatch::detail::forks {
namespace {

// In the order in which they are taken elsewhere.
void lock_all(moment when) noexcept {
    lock_dump(when);
    lock_sources(when);
    poller::shared().at_fork(when);
    lock_specifics(when);
    lock_queues(when);
    pool::shared().at_fork(when);
    lock_items(when);
}

void before() noexcept {
    lock_all(moment::before);
}
void in_parent() noexcept {
    lock_all(moment::after);
}

void in_child() noexcept {
    lock_all(moment::after);
    pool::shared().forked();
    deputy::forked();
    forget_watchdog();
    queue_cells::for_each([](queue_core& each) { each.forked(); });
    poller::shared().forked();
}

}  // namespace

void expect() noexcept {
    // Out of memory: then a child may only call exec.
    [[maybe_unused]] static const int added = ::pthread_atfork(&before, &in_parent, &in_child);
}

}  // namespace dispatch::detail::forks

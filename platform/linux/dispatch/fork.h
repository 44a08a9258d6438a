#pragma once

#include "plr/base/thread_annotations.h"

// What a fork does with the services of this folder (see queue.h): before it, no
// other thread is left in the middle of what locks protect; the child begins with
// the queues it has, without work, workers and descriptors of the parent.
namespace dispatch::detail::forks {

// Called when the first queue or the pool is made: the handlers are there from
// then on (POSIX pthread_atfork). Whoever has a queue may then add handlers of his
// own, whose locks a fork takes before those of this folder.
void expect() noexcept;

// Of the files that have locks of their own.
enum class moment { before, after };
void lock_dump(moment when) noexcept;
void lock_sources(moment when) noexcept;
void lock_specifics(moment when) noexcept;
void lock_items(moment when) noexcept;
void lock_queues(moment when) noexcept;
// In the child.
void forget_watchdog() noexcept;

// To be called with what has lock() and unlock().
template <class Lock>
void hold(Lock& lock, moment when) noexcept PLR_NO_THREAD_SAFETY_ANALYSIS {
    if (when == moment::before)
        lock.lock();
    else
        lock.unlock();
}

}  // namespace dispatch::detail::forks

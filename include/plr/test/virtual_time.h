#pragma once

#include <chrono>
#include <string_view>

#include "dispatch/pump.h"
#include "dispatch/queue.h"
#include "plr/test/manual_calendar.h"
#include "plr/test/manual_clock.h"

// VirtualTime lets time pass when a test says so, and not otherwise: every timer of the
// process, whoever set it, waits for advance(), and an hour takes no longer than the
// work that is due in it.
//
//   plr::test::VirtualTime time;
//   const auto poller = Poller::create(plr::DispatchTimerService::create(nullptr));
//   time.advance(10min);
//   // what the poller does every minute was done ten times
//
// Owner:   the test. One at a time; what has set timers goes before it does.
// Threads: one, which is no worker: it runs the work of createQueue()'s queues.
// Queues:  any. Those of createQueue() stand still but for settle() and advance(), so
//          that a test sees every state in between; ordinary ones go on by themselves,
//          and are waited for.
// Order:   timers fire by their deadlines, one deadline after the other; all that
//          follows from one is done before the next. A periodic timer fires each time.
// Clocks:  monotonic, boot and wall move together; plr::Clock and the times of log
//          messages with them. stepWallClock() sets the date, as an operator does.
// Limits:  waits that end at a time (group::wait(), poll(2), another process) take real
//          time. settle() waits for what threads of the pool do, and for messages
//          between the ends of Vox connections in this process; not for other threads.
namespace plr::test {

class VirtualTime {
  public:
    // Throws what dispatch::pump does.
    VirtualTime();
    VirtualTime(const VirtualTime&) = delete;
    VirtualTime& operator=(const VirtualTime&) = delete;
    // Runs what waits on createQueue()'s queues; they are ordinary ones from then on.
    ~VirtualTime();

    // Time that has passed since the start.
    [[nodiscard]] std::chrono::nanoseconds elapsed() const { return clock_.elapsed(); }

    // A serial queue that the test runs by hand.
    [[nodiscard]] dispatch::queue createQueue(std::string_view label) const;

    // Runs what can run now, until nothing is left. Throws std::runtime_error when that
    // does not end within kBound (waiting.h).
    void settle();
    // The same, then lets `by` pass. Throws as settle() does.
    void advance(std::chrono::nanoseconds by);
    // The wall clock alone, forwards or backwards; and settles.
    void stepWallClock(std::chrono::nanoseconds by);

  private:
    void step(std::chrono::nanoseconds by);

    ManualCalendar calendar_;
    ManualClock clock_;
    const dispatch::pump pump_;
};

}  // namespace plr::test

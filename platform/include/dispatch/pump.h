#pragma once

#include <string_view>

#include "dispatch/queue.h"
#include "plr/base/export.h"

// A pump is a serial queue that no worker of the pool runs: one thread of the
// program does, when it wants to. That is how work reaches the thread of a foreign
// event loop, which watches the pump's descriptor; and how a test runs queues by
// hand. main_queue.h has the process's own pump, glib.h and sd_event.h the glue for
// two event loops.
//
//   dispatch::pump pump("ui");
//   const auto queue = dispatch::queue::create("model", pump.queue());  // runs there, too
//   queue.async([] { … });
//   pump.process();
//
// Owner:   whoever made it, on the thread that serves it. Its queue may outlive it.
// Threads: the first thread that calls process() or run() serves the pump, and only
//          that one may; another stops the process with a message that names the
//          queue. descriptor(), queue() and stop() on any thread.
// Order:   as on every serial queue. Queues with the pump's queue as their target run
//          here too; so do the timers, sources, groups and connections on all these.
// Sync:    sync() onto these queues runs its work on the serving thread while the
//          caller waits for it. The serving thread itself, outside of their work,
//          serves the pump until its turn has come.
// Cost:    the descriptor is written once when work comes to an idle pump, and for
//          each further batch.
//
// Work waits while nobody serves the pump, however long: sync() waits as well.
namespace dispatch {

namespace detail {
class pump_core;
}

class pump {
  public:
    // Throws std::bad_alloc, or std::system_error when there is no descriptor to be had.
    PLR_EXPORT explicit pump(std::string_view label);
    pump(pump&& other) noexcept = default;
    pump& operator=(pump&& other) = delete;
    // Runs what waits, until nothing does; the queue is an ordinary one of the pool
    // from then on.
    PLR_EXPORT ~pump();

    [[nodiscard]] const dispatch::queue& queue() const noexcept { return queue_; }

    // Readable (poll(2)) while work waits for process(). Lent: for waiting only, and
    // the pump's lifetime.
    [[nodiscard]] PLR_EXPORT int descriptor() const noexcept;

    // Runs what waits, at most some hundred pieces of work. Returns whether more
    // does; the descriptor is readable then. Called from the pump's own work, as by
    // an event loop inside of it, it runs nothing.
    PLR_EXPORT bool process() const;

    // For a thread without an event loop: serves until stop(), which ends one run(),
    // the next one if none is under way. Not from the pump's own work.
    PLR_EXPORT void run() const;
    PLR_EXPORT void stop() const noexcept;

  private:
    dispatch::queue queue_;
};

}  // namespace dispatch

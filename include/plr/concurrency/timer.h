#pragma once

#include "plr/base/export.h"

namespace plr {

// A Timer is what the owner of a timer keeps: the timer lives exactly as long.
//
// Owner:   whoever asked a TimerService for it, through std::unique_ptr.
//          Destruction cancels.
// Threads: one at a time, the owner's.
class PLR_EXPORT Timer {
  public:
    Timer() = default;
    Timer(const Timer&) = delete;
    Timer& operator=(const Timer&) = delete;
    virtual ~Timer();

    // No further calls. One that was submitted to its queue already may still
    // run, unless this is called on that queue. Again: nothing.
    virtual void cancel() = 0;
    // Whether nothing will come any more: a one-shot timer that has fired, or a
    // timer that was cancelled.
    [[nodiscard]] virtual bool isExpired() const = 0;
};

}  // namespace plr

#pragma once

#include <memory>

#include "dispatch/source.h"
#include "plr/base/export.h"
#include "plr/concurrency/timer.h"

namespace plr {

// The timer of a dispatch timer source.
class PLR_EXPORT DispatchTimer final : public Timer, public dispatch::detail::from_store {
  public:
    // Takes over a source that is set up, and resumes it, which arms it. The
    // source's cancel handler is what keeps the object of `token` alive: once it
    // is gone, so is the timer.
    DispatchTimer(dispatch::source source, std::weak_ptr<void> token);
    ~DispatchTimer() override;

    void cancel() override;
    [[nodiscard]] bool isExpired() const override;

  private:
    dispatch::source source_;  // null once cancelled
    std::weak_ptr<void> token_;
};

}  // namespace plr

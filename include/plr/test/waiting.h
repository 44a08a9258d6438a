#pragma once

#include <unistd.h>

#include <chrono>
#include <semaphore>

#include "dispatch/queue.h"

// Waiting for events in tests: always for something, never longer than a bound
// that only a fault exceeds. Any thread.
namespace plr::test {

inline constexpr std::chrono::seconds kBound{60};

// A counting event. signal() on any thread; wait() true once it came.
class Event {
  public:
    void signal() { count_.release(); }
    [[nodiscard]] bool wait() { return count_.try_acquire_for(kBound); }

  private:
    std::counting_semaphore<> count_{0};
};

// Everything submitted to `queue` before has run.
inline void drain(const dispatch::queue& queue) {
    queue.sync([] {});
}

// Whether `condition` came true in time: for what no event tells.
template <class Condition>
[[nodiscard]] bool eventually(Condition condition) {
    const auto end = std::chrono::steady_clock::now() + kBound;
    while (!condition()) {
        if (std::chrono::steady_clock::now() > end)
            return false;
        ::usleep(1000);
    }
    return true;
}

}  // namespace plr::test

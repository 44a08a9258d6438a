#pragma once

#include <chrono>

#include "plr/base/export.h"

// How long a RestModule waits before it connects to its service again.
//
// The n-th attempt in a row that did not reach the service is followed by a pause
// of initial * 2^(n-1), at most `maximum`, of which a random share of up to
// `jitter` is taken off, so that the clients of a service that was restarted do
// not all come at once. The first attempt after a loss waits for a random part
// of `initial`. The service counts as reached once it has answered.
namespace plr {

struct ReconnectPolicy {
    std::chrono::milliseconds initial{50};      // positive
    std::chrono::milliseconds maximum{10'000};  // `initial` to one day
    double jitter = 0.5;                        // 0 to 1
};

namespace rest {

// Throws std::invalid_argument for a policy that is out of these ranges.
PLR_EXPORT void requireValid(const ReconnectPolicy& policy);

// The pause behind `failures` attempts in a row that did not reach the service;
// 0 after the loss of one that was reached. `random`: 0 to 1.
[[nodiscard]] PLR_EXPORT std::chrono::nanoseconds pauseAfter(unsigned failures,
                                                             const ReconnectPolicy& policy,
                                                             double random) noexcept;

}  // namespace rest
}  // namespace plr

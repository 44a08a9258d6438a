#pragma once

#include <chrono>

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
    std::chrono::milliseconds maximum{10'000};  // at least `initial`
    double jitter = 0.5;                        // 0 to 1
};

}  // namespace plr

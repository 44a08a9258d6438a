#include "plr/rest/reconnect_policy.h"

#include <algorithm>
#include <stdexcept>

namespace plr::rest {

void requireValid(const ReconnectPolicy& policy) {
    const bool valid = policy.initial.count() > 0 && policy.maximum >= policy.initial &&
                       policy.maximum <= std::chrono::hours(24) && policy.jitter >= 0 &&
                       policy.jitter <= 1;  // which not-a-number is not
    if (!valid)
        throw std::invalid_argument("a ReconnectPolicy is out of range");
}

std::chrono::nanoseconds pauseAfter(unsigned failures, const ReconnectPolicy& policy,
                                    double random) noexcept {
    std::chrono::nanoseconds pause = policy.initial;
    double share = random;
    if (failures > 0) {
        for (unsigned n = 1; n < failures && pause < policy.maximum; ++n)
            pause = std::min<std::chrono::nanoseconds>(pause * 2, policy.maximum);
        share = 1 - policy.jitter * random;
    }
    return std::chrono::duration_cast<std::chrono::nanoseconds>(pause * share);
}

}  // namespace plr::rest

#include "plr/concurrency/dispatch_timer.h"

#include <utility>

namespace plr {

static_assert(sizeof(DispatchTimer) <= dispatch::detail::kSmallBlock);

DispatchTimer::DispatchTimer(dispatch::source source, std::weak_ptr<void> token)
    : source_(std::move(source)), token_(std::move(token)) {
    source_.resume();
}

DispatchTimer::~DispatchTimer() {
    DispatchTimer::cancel();
}

void DispatchTimer::cancel() {
    if (const dispatch::source ended = std::exchange(source_, {}))
        ended.cancel();
}

bool DispatchTimer::isExpired() const {
    return !source_ || token_.expired();
}

}  // namespace plr

#include "plr/test/virtual_time.h"

#include <poll.h>

#include <algorithm>
#include <stdexcept>

#include "plr/test/waiting.h"

namespace plr::test {
namespace {

using std::chrono::nanoseconds;

bool isReadable(const dispatch::pump& pump) {
    pollfd state{pump.descriptor(), POLLIN, 0};
    return ::poll(&state, 1, 0) == 1;
}

// Until the next timer on any clock, at most `most`.
nanoseconds untilNextTimer(nanoseconds most) {
    for (const auto clock :
         {dispatch::clock::monotonic, dispatch::clock::boot, dispatch::clock::wall}) {
        const dispatch::time next = dispatch::next_timer(clock);
        if (!next.is_forever())
            most = std::min(
                most, nanoseconds(next.nanoseconds() - dispatch::time::now(clock).nanoseconds()));
    }
    return std::max(most, nanoseconds::zero());
}

}  // namespace

VirtualTime::VirtualTime() : pump_("virtual time") {}
VirtualTime::~VirtualTime() = default;

dispatch::queue VirtualTime::createQueue(std::string_view label) const {
    return dispatch::queue::create(label, pump_.queue());
}

void VirtualTime::settle() {
    const auto end = std::chrono::steady_clock::now() + kBound;
    do {
        clock_.step(nanoseconds::zero());  // timers that were set to the past
        calendar_.step(nanoseconds::zero());
        while (pump_.process() && std::chrono::steady_clock::now() < end) {
        }
        if (!dispatch::wait_until_quiet(end - std::chrono::steady_clock::now()))
            throw std::runtime_error("VirtualTime: the process does not come to rest");
    } while (isReadable(pump_) || untilNextTimer(nanoseconds(1)) == nanoseconds::zero());
}

void VirtualTime::advance(nanoseconds by) {
    settle();
    for (nanoseconds next; (next = untilNextTimer(by)) < by; by -= next)
        step(next);
    step(by);
}

void VirtualTime::stepWallClock(nanoseconds by) {
    calendar_.step(by);
    settle();
}

void VirtualTime::step(nanoseconds by) {
    clock_.step(by);
    calendar_.step(by);
    settle();
}

}  // namespace plr::test

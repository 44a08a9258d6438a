#include "plr/concurrency/clock.h"

#include <ctime>

#include "dispatch/calendar.h"
#include "kel/kel.h"

namespace plr {
namespace {

constexpr std::uint64_t kNanosecondsPerSecond = 1'000'000'000;

constexpr int kErrorPriority = 3;  // RFC 5424

[[gnu::cold, gnu::noinline]] void complain(int error) noexcept {
    const auto code = static_cast<std::uintptr_t>(static_cast<unsigned>(error));
    kel_log(kErrorPriority, "Failed to get time, %p\n", reinterpret_cast<void*>(code));
}

}  // namespace

// Hot path: each log message reads the clock.
std::uint64_t Clock::now_in_nanoseconds() noexcept {
    static const dispatch::calendar& calendar = dispatch::calendar::shared();
    std::timespec now{};
    if (const int error = calendar.read(now); error != 0) [[unlikely]] {
        complain(error);
        return 0;
    }
    return static_cast<std::uint64_t>(now.tv_sec) * kNanosecondsPerSecond +
           static_cast<std::uint64_t>(now.tv_nsec);
}

}  // namespace plr

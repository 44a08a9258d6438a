#include "platform/linux/vox/complaint.h"

#include <cstdint>

#include "dispatch/time.h"
#include "platform/linux/vox/lock.h"
#include "plr/base/report.h"

namespace vox_link {
namespace {

constexpr unsigned kLinesPerSecond = 10;
constexpr std::int64_t kSecond = 1'000'000'000;

struct line_budget {
    mutex lock;
    std::int64_t second_began PLR_GUARDED_BY(lock) = 0;
    unsigned lines PLR_GUARDED_BY(lock) = 0;
    unsigned left_out PLR_GUARDED_BY(lock) = 0;
};

// Never destroyed: connections may end while the process exits.
line_budget& budget() {
    static auto* const shared = new line_budget;
    return *shared;
}

// Whether one more line may go out now; `left_out` is to be told with it.
bool admit(unsigned& left_out) {
    line_budget& shared = budget();
    const std::int64_t now = dispatch::time::now().nanoseconds();
    const lock_guard guard(shared.lock);
    if (shared.lines == 0 || now - shared.second_began >= kSecond) {
        shared.second_began = now;
        shared.lines = 0;
    }
    if (shared.lines >= kLinesPerSecond) {
        ++shared.left_out;
        return false;
    }
    ++shared.lines;
    left_out = shared.left_out;
    shared.left_out = 0;
    return true;
}

}  // namespace

void complain(const std::string& line) {
    unsigned left_out = 0;
    if (!admit(left_out))
        return;
    if (left_out > 0)
        plr::report("vox: %u more lines like these were left out", left_out);
    plr::report("vox: %s", line.c_str());
}

}  // namespace vox_link

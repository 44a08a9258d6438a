#include "platform/linux/vox/id_table.h"

#include <sys/random.h>

#include "plr/base/assert.h"

namespace vox_link {

std::uint64_t id_multiplier() noexcept {
    static const std::uint64_t drawn = [] {
        std::uint64_t word = 0;
        const ssize_t got = getrandom(&word, sizeof word, 0);
        PLR_ASSERT(got == sizeof word, "getrandom failed");
        return word | 1;
    }();
    return drawn;
}

}  // namespace vox_link

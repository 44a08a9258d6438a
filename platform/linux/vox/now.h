#pragma once

#include <cstdint>

#include "dispatch/time.h"

namespace vox_link {

// Monotonic nanoseconds.
inline std::int64_t now() noexcept {
    return dispatch::time::now().nanoseconds();
}

}  // namespace vox_link

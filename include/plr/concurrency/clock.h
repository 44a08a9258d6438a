#pragma once

#include <cstdint>

#include "plr/base/export.h"

// The time of day, as log messages carry it.
namespace plr {

class PLR_EXPORT Clock {
  public:
    // Nanoseconds since 1970-01-01T00:00:00Z by the calendar clock, which may be
    // set while the process runs (dispatch/calendar.h). 0 when the clock cannot
    // be read, which the system log is told. Any thread.
    [[nodiscard]] static std::uint64_t now_in_nanoseconds() noexcept;
};

}  // namespace plr

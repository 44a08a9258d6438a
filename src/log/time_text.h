#pragma once

#include <cstddef>
#include <cstdint>
#include <ctime>
#include <string_view>

#include "plr/log/log_message.h"

// Renders the times of log records: "2026-11-21 15:06:43.123456+01:00", a date
// and time of RFC 3339 with a space for the "T" (section 5.6).
//
// Threads: one at a time.
// Cost:    the system is asked for the offset from UTC once for each second that
//          shows up; within a second only six digits change.
namespace plr {

class TimeText {
  public:
    enum class Zone : std::uint8_t { Local, Utc };
    static constexpr std::size_t kLength = 32;
    // Where the time of day, with microseconds, stands in it.
    static constexpr std::size_t kTimeOfDay = 11;
    static constexpr std::size_t kTimeOfDayLength = 15;

    static constexpr Zone zone(bool utc) noexcept { return utc ? Zone::Utc : Zone::Local; }

    explicit TimeText(Zone zone) noexcept;

    // Keep: with the offset that was known last, which is async-signal-safe.
    enum class Offset : std::uint8_t { Ask, Keep };

    // Lent until the next call.
    [[nodiscard]] std::string_view render(TimeStamp time, Offset offset = Offset::Ask) noexcept;

  private:
    void renderSecond(std::int64_t second, Offset offset) noexcept;
    void askOffset(std::int64_t second) noexcept;

    const Zone zone_;
    std::int64_t second_ = 0;  // the one that text_ shows, since 1970
    long offset_ = 0;          // seconds east of UTC
    char text_[kLength + 1] = "0000-00-00 00:00:00.000000+00:00";
};

}  // namespace plr

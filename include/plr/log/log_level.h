#pragma once

#include <cstdint>
#include <iosfwd>

#include "plr/base/export.h"

// The severity scale. Values are compared as numbers, stored in configurations
// and sent to other processes; the gaps between them are free for levels that a
// configuration brings, which are ordered among the named ones. Plain data: any
// thread.
namespace plr {

enum class LogLevel : std::uint8_t {
    Unset = 0,   // no setting here: the inherited one applies
    Always = 1,  // lets everything through
    Trace = 10,
    Debug = 20,
    Info = 40,
    Notice = 50,
    Warn = 70,
    Error = 80,
    Fatal = 100,
    Never = 255,  // stops everything
};

// "Unset", "Always", "Trace" … "Never"; "???" for a value without a name.
// Static, NUL-terminated.
[[nodiscard]] PLR_EXPORT const char* asString(LogLevel level) noexcept;

// The first letter of Trace, Debug, Info, Notice, Warn, Error and Fatal; '?' for
// every other value.
[[nodiscard]] PLR_EXPORT char asChar(LogLevel level) noexcept;

// Writes asString().
PLR_EXPORT std::ostream& operator<<(std::ostream& stream, LogLevel level);

// `base`, overridden by `override` where that is set. Nothing overrides Never.
[[nodiscard]] constexpr LogLevel combine(LogLevel base, LogLevel override) noexcept {
    return override == LogLevel::Unset || base == LogLevel::Never ? base : override;
}

// The more restrictive of the two: the greater number.
[[nodiscard]] constexpr LogLevel max(LogLevel first, LogLevel second) noexcept {
    return static_cast<std::uint8_t>(first) < static_cast<std::uint8_t>(second) ? second : first;
}

}  // namespace plr

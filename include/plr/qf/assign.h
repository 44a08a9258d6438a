#pragma once

#include <cstdint>
#include <string>
#include <vector>

#include "plr/base/export.h"
#include "qf/qf.h"

// assign(out, value): Qf values read strictly, by their type, into native ones.
//
// Result: whether `out` was written. A null value, and a number that does not
//         fit without loss, leave it as it is.
// Owner:  values are lent.
// Errors: a value of another type than the overload's is a programming error,
//         which ends the process; the overload for any value tells types apart.
// Threads: any.
namespace plr::qf {

// Numbers, read in the Qf number type of the target's width. 2.5 is no int, 300
// no signed char, -1 no unsigned int, 0.1 no float.
[[nodiscard]] PLR_EXPORT bool assign(signed char& out, QfNumberRef value);
[[nodiscard]] PLR_EXPORT bool assign(short& out, QfNumberRef value);
[[nodiscard]] PLR_EXPORT bool assign(int& out, QfNumberRef value);
[[nodiscard]] PLR_EXPORT bool assign(long& out, QfNumberRef value);
[[nodiscard]] PLR_EXPORT bool assign(long long& out, QfNumberRef value);
[[nodiscard]] PLR_EXPORT bool assign(unsigned char& out, QfNumberRef value);
[[nodiscard]] PLR_EXPORT bool assign(unsigned short& out, QfNumberRef value);
[[nodiscard]] PLR_EXPORT bool assign(unsigned int& out, QfNumberRef value);
[[nodiscard]] PLR_EXPORT bool assign(unsigned long& out, QfNumberRef value);
[[nodiscard]] PLR_EXPORT bool assign(float& out, QfNumberRef value);
[[nodiscard]] PLR_EXPORT bool assign(double& out, QfNumberRef value);

[[nodiscard]] PLR_EXPORT bool assign(bool& out, QfBooleanRef value);

// Text in UTF-8, a NUL within it too.
[[nodiscard]] PLR_EXPORT bool assign(std::string& out, QfStringRef value);
// The error's description.
[[nodiscard]] PLR_EXPORT bool assign(std::string& out, QfErrorRef value);
// The URL's string. Either flag gives the same: a URL has one form here, the
// one that it was made from.
[[nodiscard]] PLR_EXPORT bool assign(std::string& out, QfURLRef value, bool flag);
// A string, an error or a URL (flag false); false for any other type.
[[nodiscard]] PLR_EXPORT bool assign(std::string& out, const void* value);
// The time as the platform's date formatter renders it, in local time. `time`:
// seconds since 1970-01-01T00:00:00Z; false when it is none, or out of the
// calendar's range. A null locale is "C".
[[nodiscard]] PLR_EXPORT bool assign(std::string& out, double time, QfLocaleRef locale,
                                     QfDateFormatterStyle dateStyle,
                                     QfDateFormatterStyle timeStyle);

[[nodiscard]] PLR_EXPORT bool assign(std::vector<std::uint8_t>& out, QfDataRef value);

}  // namespace plr::qf

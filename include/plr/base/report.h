#pragma once

#include "plr/base/export.h"

// The report hook: where the library itself says what it cannot return to
// anybody, such as a peer that broke the wire protocol. One call is one line,
// without a line feed. Standard error by default.
namespace plr {

using ReportHook = void (*)(const char* line) noexcept;

// Replaces the hook; null restores the default. Returns the previous one.
// Any thread. The hook itself may be called on any thread, several at once.
PLR_EXPORT ReportHook setReportHook(ReportHook hook) noexcept;

// Formats one line (at most 1023 bytes, longer ones are cut) and hands it to
// the hook. Does not allocate. Any thread. Keeps errno.
[[gnu::format(printf, 1, 2)]] PLR_EXPORT void report(const char* format, ...) noexcept;

}  // namespace plr

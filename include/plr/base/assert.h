#pragma once

#include "plr/base/export.h"

// The library's assertion hook. Programming errors that cannot be returned to
// the caller end here: it reports "file:line: reason" through the report hook
// (report.h) and aborts. Any thread. Never returns.
extern "C" [[noreturn]] PLR_EXPORT void __PLAssertTrigger(const char* reason, const char* file,
                                                          int line) noexcept;

// Stops the process with `reason` unless `condition` holds; in every build.
#define PLR_ASSERT(condition, reason)                        \
    do {                                                     \
        if (!(condition)) [[unlikely]]                       \
            __PLAssertTrigger((reason), __FILE__, __LINE__); \
    } while (false)

// The same for checks that are too dear for users' builds: debug builds only.
#ifdef PLR_DEBUG
#define PLR_DEBUG_ASSERT(condition, reason) PLR_ASSERT(condition, reason)
#else
#define PLR_DEBUG_ASSERT(condition, reason) static_cast<void>(0)
#endif

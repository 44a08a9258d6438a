#include "plr/base/assert.h"

#include <cstdlib>

#include "plr/base/report.h"

extern "C" void __PLAssertTrigger(const char* reason, const char* file, int line) noexcept {
    plr::report("%s:%d: %s", file, line, reason);
    std::abort();
}

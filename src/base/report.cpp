#include "plr/base/report.h"

#include <unistd.h>

#include <atomic>
#include <cerrno>
#include <cstdarg>
#include <cstdio>
#include <cstring>

namespace plr {
namespace {

void writeToStandardError(const char* line) noexcept {
    // One write, so that lines of several threads and processes stay whole.
    char text[1040];
    const int length = std::snprintf(text, sizeof text, "pelorin: %s\n", line);
    if (length > 0)
        static_cast<void>(!::write(STDERR_FILENO, text, static_cast<std::size_t>(length)));
}

std::atomic<ReportHook> hook{&writeToStandardError};

}  // namespace

ReportHook setReportHook(ReportHook replacement) noexcept {
    return hook.exchange(replacement ? replacement : &writeToStandardError);
}

void report(const char* format, ...) noexcept {
    const int savedErrno = errno;
    char line[1024];
    va_list arguments;
    va_start(arguments, format);
    std::vsnprintf(line, sizeof line, format, arguments);
    va_end(arguments);
    hook.load()(line);
    errno = savedErrno;
}

}  // namespace plr

#include <unistd.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <cstdarg>
#include <cstdio>
#include <mutex>
#include <shared_mutex>
#include <string_view>
#include <type_traits>

#include "Pelorin"

namespace {

void writeToStandardError(void* /*context*/, const char* function, const char* text) {
    // One write, so that lines of several threads and processes stay whole.
    std::array<char, 1200> line;
    const bool ended = std::string_view(text).ends_with('\n');
    const int length =
        std::snprintf(line.data(), line.size(), "%s: %s%s", function, text, ended ? "" : "\n");
    if (length > 0)
        static_cast<void>(!::write(STDERR_FILENO, line.data(),
                                   std::min(static_cast<std::size_t>(length), line.size() - 1)));
}

struct Registration {
    PelorinDebugDelegate delegate = &writeToStandardError;
    void* context = nullptr;
};

// Callers of the delegate share `delegate`; who replaces the delegate waits for them.
// All go through `gate`, at which he keeps new callers back: a shared mutex alone lets
// them pass by him for ever.
struct Locks {
    std::mutex gate;
    std::shared_mutex delegate;
};
// Threads may print until the process ends: nothing of it is ever torn down.
constinit Locks locks;
static_assert(std::is_trivially_destructible_v<Locks>);

std::shared_lock<std::shared_mutex> share() {
    const std::lock_guard pass(locks.gate);
    return std::shared_lock(locks.delegate);
}
constinit Registration registration;

// A delegate that prints is covered by the share its caller holds; a second one could
// wait behind somebody who waits for the first.
thread_local bool insideDelegate = false;

}  // namespace

extern "C" {

void PelorinDebugSetDelegate(PelorinDebugDelegate delegate, void* context) {
    const std::lock_guard pass(locks.gate);
    const std::lock_guard lock(locks.delegate);
    registration = delegate ? Registration{delegate, context} : Registration{};
}

void PelorinDebugPrint(const char* function, const char* format, ...) {
    const int savedErrno = errno;
    std::array<char, 1024> text;
    va_list arguments;
    va_start(arguments, format);
    std::vsnprintf(text.data(), text.size(), format, arguments);
    va_end(arguments);
    if (insideDelegate) {
        registration.delegate(registration.context, function, text.data());
    } else {
        const auto lock = share();
        insideDelegate = true;
        registration.delegate(registration.context, function, text.data());
        insideDelegate = false;
    }
    errno = savedErrno;
}

}  // extern "C"

#pragma once

#include <memory>

#include "plr/base/export.h"

// What was logged before the process crashes still reaches the writers that can
// write in a crash (the file, console and system-log writers can).
//
//     plr::drainLogsOnCrash(server);
//
// From then on SIGABRT (so also abort(), failed assertions, std::terminate and
// uncaught exceptions), SIGBUS, SIGFPE, SIGILL, SIGSEGV, SIGSYS and SIGTRAP first
// stop the server's writers queue between two messages, then write what waits
// there, in logging order, to the descriptors that the writers have open: with
// async-signal-safe calls only (POSIX signal-safety(7)). Then the signal takes the
// course it would have taken without this: the handler that was there before, a
// core dump, the end of the process.
//
// What a crash can lose:
//  - everything after SIGKILL, and after the power goes;
//  - messages logged by other threads while the crash is handled; those threads
//    stay in log() until the process ends;
//  - what waits in log() itself: when the crash hits a thread that is adding a
//    message, or happens while memory is so damaged that the list of messages
//    cannot be read, the drain gives up;
//  - what a writer does with a message when the crash hits it there: that one
//    message may be missing its end, or appear twice;
//  - all, when a stack overflows on a thread without an alternate signal stack
//    (sigaltstack(2)): the thread that calls this function gets one.
// A handler that another library installs later for the same signals goes first,
// and this one only runs if that one calls it.
namespace plr {

class LogServer;

// Keeps the server for the rest of the process. Up to 8 servers; more are left
// out. Any thread; the first call installs the handlers.
PLR_EXPORT void drainLogsOnCrash(const std::shared_ptr<LogServer>& server);

}  // namespace plr

#pragma once

#include <pthread.h>
#include <signal.h>

#include <initializer_list>

namespace dispatch::detail {

// Starts a thread that nobody joins, with signals blocked: they are for the
// program's own threads. What a thread brings on itself by a fault stays open, so
// that the program's handlers see it. Returns 0 or an error number.
inline int start_detached(void* (*function)(void*) noexcept, void* context) noexcept {
    sigset_t all;
    sigset_t before;
    sigfillset(&all);
    for (const int fault : {SIGABRT, SIGBUS, SIGFPE, SIGILL, SIGSEGV, SIGSYS, SIGTRAP})
        sigdelset(&all, fault);
    ::pthread_sigmask(SIG_SETMASK, &all, &before);
    pthread_attr_t attributes;
    ::pthread_attr_init(&attributes);
    ::pthread_attr_setdetachstate(&attributes, PTHREAD_CREATE_DETACHED);
    pthread_t thread;
    const int error = ::pthread_create(&thread, &attributes, function, context);
    ::pthread_attr_destroy(&attributes);
    ::pthread_sigmask(SIG_SETMASK, &before, nullptr);
    return error;
}

}  // namespace dispatch::detail

#pragma once

#include <pthread.h>

#include <csignal>
#include <ctime>

namespace plr {

// Keeps write(2) from ending the process: SIGPIPE, of a reader that is gone, and
// SIGXFSZ, of a file at the limit of its size, are blocked for a scope, and taken
// back when a write has raised one.
class SignalBlock {
  public:
    explicit SignalBlock(int signal) noexcept {
        ::sigemptyset(&blocked_);
        ::sigaddset(&blocked_, signal);
        ::pthread_sigmask(SIG_BLOCK, &blocked_, &before_);
        ours_ = ::sigismember(&before_, signal) == 0;
    }
    SignalBlock(const SignalBlock&) = delete;
    SignalBlock& operator=(const SignalBlock&) = delete;
    ~SignalBlock() {
        if (ours_)
            ::pthread_sigmask(SIG_SETMASK, &before_, nullptr);
    }
    // A write has failed for the signal's reason.
    void takeBack() noexcept {
        const timespec now{};
        if (ours_)
            ::sigtimedwait(&blocked_, nullptr, &now);
    }

  private:
    sigset_t blocked_;
    sigset_t before_;
    bool ours_;
};

}  // namespace plr

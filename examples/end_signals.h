#pragma once

#include <signal.h>
#include <unistd.h>

#include <atomic>

namespace radio {

// SIGINT and SIGTERM, waited for instead of handled. Made first thing in main(),
// so that every later thread inherits the blocked signals.
class EndSignals {
  public:
    EndSignals() noexcept {
        sigemptyset(&signals_);
        sigaddset(&signals_, SIGINT);
        sigaddset(&signals_, SIGTERM);
        pthread_sigmask(SIG_BLOCK, &signals_, nullptr);
    }

    // Returns the exit status when one has come, or raise() was called.
    [[nodiscard]] int wait() const noexcept {
        int signal = 0;
        sigwait(&signals_, &signal);
        return status_;
    }
    // Ends wait(). Any thread.
    void raise(int status) noexcept {
        status_ = status;
        ::kill(::getpid(), SIGTERM);
    }

  private:
    sigset_t signals_{};
    std::atomic<int> status_ = 0;
};

}  // namespace radio

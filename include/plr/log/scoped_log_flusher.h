#pragma once

#include <chrono>
#include <memory>

#include "plr/base/export.h"

// A ScopedLogFlusher waits at the end of its scope until a server's writers have
// passed on what was logged: the last thing in main(), for instance.
namespace plr {

class LogServer;

class PLR_EXPORT ScopedLogFlusher {
  public:
    static constexpr std::chrono::milliseconds DEFAULT_FLUSH_TIMEOUT{5000};

    // No server: nothing happens. Not on one of the server's queues.
    explicit ScopedLogFlusher(const std::shared_ptr<LogServer>& server);
    ScopedLogFlusher(const std::shared_ptr<LogServer>& server, std::chrono::milliseconds timeout);
    ScopedLogFlusher(const ScopedLogFlusher&) = delete;
    ScopedLogFlusher& operator=(const ScopedLogFlusher&) = delete;
    // Waits `timeout` at most; a flush that takes longer is abandoned.
    ~ScopedLogFlusher();

  private:
    const std::shared_ptr<LogServer> server_;
    const std::chrono::milliseconds timeout_;
};

}  // namespace plr

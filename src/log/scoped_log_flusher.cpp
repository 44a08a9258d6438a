#include "plr/log/scoped_log_flusher.h"

#include "plr/log/log_server.h"

namespace plr {

ScopedLogFlusher::ScopedLogFlusher(const std::shared_ptr<LogServer>& server)
    : ScopedLogFlusher(server, DEFAULT_FLUSH_TIMEOUT) {}

ScopedLogFlusher::ScopedLogFlusher(const std::shared_ptr<LogServer>& server,
                                   std::chrono::milliseconds timeout)
    : server_(server), timeout_(timeout) {}

ScopedLogFlusher::~ScopedLogFlusher() {
    if (server_)
        static_cast<void>(server_->flush().wait(dispatch::time::after(timeout_)));
}

}  // namespace plr

#pragma once

#include <memory>
#include <string>

#include "plr/base/export.h"
#include "plr/log/log_level.h"

namespace vox {
class dict;
}

// TrackedLogger is how a log server reaches a logger: it sends the level of the
// logger's domain and asks for what configurations list.
//
// Owner:   whoever owns the logger; the server holds it weakly, from its
//          registration until some later registration at the same domain.
// Threads: the server calls on its own queue, and once on the thread that
//          registers the logger; so implementations return soon and do not
//          wait for the server.
namespace plr {

class LogServer;

class PLR_EXPORT TrackedLogger {
  public:
    TrackedLogger() = default;
    TrackedLogger(const TrackedLogger&) = default;
    TrackedLogger& operator=(const TrackedLogger&) = default;
    virtual ~TrackedLogger();

    // The level of the logger's domain, now and whenever it changes.
    virtual void updateTrackedConfig(LogLevel level) = 0;
    // A configuration; ignored here.
    virtual void updateTrackedConfig(const vox::dict& config);
    [[nodiscard]] virtual std::string getTrackedLoggerName() const = 0;
    // The logger's own level, Unset for none.
    [[nodiscard]] virtual LogLevel getTrackedLogLevel() const = 0;

    // Has the server track `logger` at `domain`, components joined by ".".
    // Nothing happens without a server. Any thread.
    static void registerLoggerToServer(const std::shared_ptr<LogServer>& server,
                                       const std::string& domain,
                                       std::shared_ptr<TrackedLogger> logger);
};

}  // namespace plr

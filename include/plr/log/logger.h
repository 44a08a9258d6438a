#pragma once

#include <memory>
#include <string>

#include "dispatch/queue.h"
#include "plr/base/export.h"
#include "plr/concurrency/shared_synchronizable.h"
#include "plr/log/logger_base.h"
#include "plr/log/tracked_logger.h"

// A Logger is tracked by its server: its level follows the server's
// configuration while the program runs. For objects that do not derive from
// SharedLoggable.
//
// Owner:   the std::shared_ptr that create() returns; the server holds it weakly.
// Queue:   the one given; level changes arrive there.
// Threads: logging on any thread; domain, name and server never change.
namespace plr {

class PLR_EXPORT Logger final : public LoggerBase<std::shared_ptr<LogServer>>,
                                public TrackedLogger,
                                public SharedSynchronizable<Logger> {
  public:
    // The context's name is the domain; `name`, NUL-terminated, tells loggers of
    // one domain apart. Registers with the server, if there is one: a level that
    // the server has for the domain is in force once the queue has run.
    [[nodiscard]] static std::shared_ptr<Logger> create(const dispatch::queue& queue,
                                                        const std::shared_ptr<LogServer>& server,
                                                        const char* name, TrelContext context);
    ~Logger() override;

    [[nodiscard]] const std::string& getName() const noexcept { return name_; }

    // Sets the inherited level, on the logger's queue. Any thread.
    void updateTrackedConfig(LogLevel level) override;
    using TrackedLogger::updateTrackedConfig;
    [[nodiscard]] std::string getTrackedLoggerName() const override;
    [[nodiscard]] LogLevel getTrackedLogLevel() const override;

  private:
    Logger(const dispatch::queue& queue, const std::shared_ptr<LogServer>& server, const char* name,
           TrelContext context);

    const std::string name_;
};

}  // namespace plr

#pragma once

#include <memory>
#include <string>
#include <utility>

#include "plr/log/logger_base.h"
#include "plr/log/tracked_logger.h"

// Loggable<T> gives T, a class that owns a queue and is held by
// std::shared_ptr, a logger that the log server tracks. Most classes derive
// from SharedLoggable<T> instead, which has the queue as well.
//
// Owner:   T, which derives from it.
// Threads: logging on any thread. A level change is in force at once, without a
//          turn on T's queue.
namespace plr {

template <class T, class LoggerType = LoggerBase<std::shared_ptr<LogServer>>>
class Loggable : public TrackedLogger {
  public:
    // For helpers that log in this object's name.
    [[nodiscard]] const LoggerType& logger() const noexcept { return logger_; }

    void updateTrackedConfig(LogLevel level) override { logger_.setInheritedLogLevel(level); }
    using TrackedLogger::updateTrackedConfig;
    // The name that was given for the logger.
    [[nodiscard]] std::string getTrackedLoggerName() const override {
        return logger_.getLogDomain();
    }
    [[nodiscard]] LogLevel getTrackedLogLevel() const override {
        return logger_.getLocalLogLevel();
    }

  protected:
    // `loggerName`, NUL-terminated, is the logger's domain and the category of its
    // trace-log handle. Without a server nothing is logged.
    Loggable(const char* loggerName, std::shared_ptr<LogServer> server)
        : logger_(TrelContext("pelorin", loggerName), std::move(server)) {}

    // What T's own members log with: if (enabled(level)) forceLog(level, …).
    [[nodiscard]] bool enabled(LogLevel level) const noexcept { return logger_.enabled(level); }
    void forceLog(LogLevel level, LogMessageBuffer&& buffer) const {
        logger_.forceLog(level, std::move(buffer));
    }
    // The logger's own level; Unset leaves it to the domain.
    void setLogLevel(LogLevel level) noexcept { logger_.setLogLevel(level); }

    // Registers the logger, if there is a server. The object is owned already.
    // Called before anybody else can reach the object, on any thread.
    void connectToLogServer_sync() {
        std::shared_ptr<TrackedLogger> self(static_cast<T&>(*this).shared_from_this(), this);
        registerLoggerToServer(logger_.getLogServer(), logger_.getLogDomain(), std::move(self));
    }

  private:
    LoggerType logger_;
};

}  // namespace plr

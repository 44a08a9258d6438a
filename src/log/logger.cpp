#include "plr/log/logger.h"

#include <utility>

namespace plr {

std::shared_ptr<Logger> Logger::create(const dispatch::queue& queue,
                                       const std::shared_ptr<LogServer>& server, const char* name,
                                       TrelContext context) {
    std::shared_ptr<Logger> logger =
        make_shared_ptr(new Logger(queue, server, name, std::move(context)));
    registerLoggerToServer(server, logger->getLogDomain(), logger);
    return logger;
}

Logger::Logger(const dispatch::queue& queue, const std::shared_ptr<LogServer>& server,
               const char* name, TrelContext context)
    : LoggerBase(std::move(context), server), SharedSynchronizable(queue), name_(name) {}

Logger::~Logger() = default;

void Logger::updateTrackedConfig(LogLevel level) {
    execute_wrapped([this, level] { setInheritedLogLevel(level); });
}

std::string Logger::getTrackedLoggerName() const {
    return name_;
}

LogLevel Logger::getTrackedLogLevel() const {
    return getLocalLogLevel();
}

}  // namespace plr

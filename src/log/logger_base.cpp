#include "plr/log/logger_base.h"

#include <utility>

#include "plr/concurrency/clock.h"
#include "plr/log/log_message.h"
#include "plr/log/log_message_buffer.h"
#include "plr/log/log_server.h"

namespace plr {

using ServerLogger = LoggerBase<std::shared_ptr<LogServer>>;

ServerLogger::LoggerBase(TrelContext context, std::shared_ptr<LogServer> server)
    : LoggerCommonBase(std::move(context)), server_(std::move(server)) {
    // Deliberate: the handle stays, the reference that came with it does not.
    trel_release(getTrelHandle());
}

ServerLogger::LoggerBase(const std::string& domain, std::shared_ptr<LogServer> server)
    : LoggerCommonBase(domain, nullptr), server_(std::move(server)) {}

std::shared_ptr<LogMessage> ServerLogger::buildMessage(LogLevel level,
                                                       LogMessageBuffer&& buffer) const {
    return LogMessage::create(static_cast<TimeStamp>(Clock::now_in_nanoseconds()), level,
                              getLogDomain(), std::move(buffer));
}

void ServerLogger::forceLog(LogLevel level, LogMessageBuffer&& buffer) const {
    if (server_)
        server_->log(buildMessage(level, std::move(buffer)));
}

}  // namespace plr

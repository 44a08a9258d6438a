#include "plr/log/static_logger.h"

#include <utility>

#include "plr/log/log_server.h"

namespace plr {

StaticLogger::StaticLogger() : LoggerBase(std::string(), nullptr) {}

StaticLogger::StaticLogger(const std::string& domain, std::shared_ptr<LogServer> server)
    : LoggerBase(domain, std::move(server)) {
    updateLogLevel();
}

StaticLogger::StaticLogger(TrelContext context, std::shared_ptr<LogServer> server)
    : LoggerBase(std::move(context), std::move(server)) {
    updateLogLevel();
}

StaticLogger::StaticLogger(const LoggerBase& other) : LoggerBase(other) {
    updateLogLevel();
}

void StaticLogger::updateLogLevel() {
    if (getLogServer())
        setInheritedLogLevel(getLogServer()->getCurrentLogLevel(getLogDomain()));
}

}  // namespace plr

#include "plr/log/tracked_logger.h"

#include "plr/log/log_server.h"

namespace plr {

TrackedLogger::~TrackedLogger() = default;

void TrackedLogger::updateTrackedConfig(const vox::dict&) {}

void TrackedLogger::registerLoggerToServer(const std::shared_ptr<LogServer>& server,
                                           const std::string& domain,
                                           std::shared_ptr<TrackedLogger> logger) {
    if (server)
        server->registerLogger(domain, logger);
}

}  // namespace plr

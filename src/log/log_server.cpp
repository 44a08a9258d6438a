#include "plr/log/log_server.h"

#include <utility>

#include "plr/log/log_message.h"
#include "plr/log/log_writer.h"
#include "plr/log/memory_buffered_log_writer.h"
#include "plr/log/tracked_logger.h"
#include "src/log/level_table.h"
#include "src/log/log_delivery.h"

namespace plr {

std::shared_ptr<LogServer> LogServer::create(const std::string& name) {
    return create(name, nullptr);
}

std::shared_ptr<LogServer> LogServer::create(
    const std::string& name, std::unique_ptr<MemoryBufferedLogWriter> startupBuffer) {
    return make_shared_ptr(new LogServer(name, std::move(startupBuffer)));
}

LogServer::LogServer(const std::string& name,
                     std::unique_ptr<MemoryBufferedLogWriter> startupBuffer)
    : SharedSynchronizable("logmaster::" + name),
      name_(name),
      levels_(std::make_unique<LevelTable>()),
      tree_(std::string()),
      delivery_(std::make_unique<LogDelivery>(*this, name, std::move(startupBuffer))) {
    tree_.updateParentLogLevel(LogLevel::Info);
}

LogServer::~LogServer() = default;

void LogServer::start() {
    execute_wrapped_sync([this] {
        ownQueue_.assertCurrent();
        commitLevels_sync();
        delivery_->flushStartupMessages();
    });
}

void LogServer::log(std::shared_ptr<LogMessage> message) {
    if (message)
        delivery_->log(std::move(message));
}

void LogServer::addWriter(std::shared_ptr<LogWriter> writer) {
    if (writer)
        delivery_->addWriter(std::move(writer));
}

void LogServer::registerLogger(const std::string& domain,
                               const std::shared_ptr<TrackedLogger>& logger) {
    if (const LogLevel level = getCurrentLogLevel(domain); level != LogLevel::Unset)
        logger->updateTrackedConfig(level);
    execute_wrapped([this, domain, logger] {
        ownQueue_.assertCurrent();
        tree_.insertAt(domain, logger);
    });
}

void LogServer::tidyUp(const std::string& domain) {
    execute_wrapped([this, domain] {
        ownQueue_.assertCurrent();
        tree_.tidyUpAt(domain);
    });
}

LogLevel LogServer::getCurrentLogLevel(const std::string& domain) const {
    return levels_->lookUp(domain);
}

LogLevel LogServer::getCurrentLogLevelSlow(const std::string& domain) const {
    return execute_wrapped_sync([this, &domain] {
        ownQueue_.assertCurrent();
        return tree_.getLogLevelAt(domain);
    });
}

void LogServer::updateConfig(vox::dict config) {
    execute_wrapped([this, config = std::move(config)] {
        ownQueue_.assertCurrent();
        updateConfig_sync(config);
    });
}

void LogServer::updateConfig_sync(const vox::dict& config) {
    if (const vox::dict levels = config[config_key::kDomainLogLevels])
        tree_.updateLogLevels(levels);
    commitLevels_sync();
}

void LogServer::commitLevels_sync() {
    levels_->replace(tree_.commitConfigUpdate());
}

vox::dict LogServer::getConfig() const {
    return execute_wrapped_sync([this] {
        ownQueue_.assertCurrent();
        vox::dict config = vox::dict::create();
        fillLoggerFullConfig_sync(config);
        fillLogWriterFullConfig_sync(config);
        return config;
    });
}

vox::dict LogServer::getSimpleConfig() const {
    return execute_wrapped_sync([this] {
        ownQueue_.assertCurrent();
        vox::dict config = vox::dict::create();
        fillLoggerSimpleConfig_sync(config);
        fillLogWriterSimpleConfig_sync(config);
        return config;
    });
}

void LogServer::fillLogWriterFullConfig_sync(vox::dict& config) const {
    config[config_key::kLogWriters] = delivery_->describeWriters(LogDelivery::Report::Full);
}

void LogServer::fillLogWriterSimpleConfig_sync(vox::dict& config) const {
    config[config_key::kLogWriters] = delivery_->describeWriters(LogDelivery::Report::Simple);
}

void LogServer::fillLoggerFullConfig_sync(vox::dict& config) const {
    tree_.getFullConfig(config);
}

void LogServer::fillLoggerSimpleConfig_sync(vox::dict& config) const {
    tree_.getSimpleConfig(config);
}

dispatch::group LogServer::flush() const {
    const dispatch::group flushed;
    delivery_->flush(dispatch::group_session(flushed));
    return flushed;
}

void LogServer::debugFlush() const {
    execute_wrapped_sync([this] { delivery_->debugFlush(); });
}

void LogServer::close() {
    delivery_->close();
}

void LogServer::limitPending(std::size_t messages, WhenFull policy) {
    delivery_->limitPending(messages, policy);
}

}  // namespace plr

#include "plr/log/log_writer.h"

namespace plr {

LogWriter::~LogWriter() = default;

void LogWriter::write(const LogMessage& /*message*/) {}

void LogWriter::write(std::shared_ptr<LogMessage> message) {
    write(*message);
}

void LogWriter::flush(dispatch::group_session /*session*/) {}

vox::object LogWriter::getSimpleConfig() {
    return getFullConfig();
}

vox::object LogWriter::getFullConfig() {
    return vox::object();
}

void BatchLogWriter::endBatch() {}

void BatchLogWriter::flushInCrash() noexcept {}

void BatchLogWriter::writeInCrash(const LogMessage& /*message*/) noexcept {}

}  // namespace plr

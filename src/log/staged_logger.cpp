#include "plr/log/staged_logger.h"

#include <utility>

namespace plr {

StagedLogger::~StagedLogger() {
    if (!staged_.empty())
        LoggerBase::forceLog(stagedLevel_, std::move(staged_));
}

void StagedLogger::forceLog(LogLevel level, LogMessageBuffer&& buffer) const {
    stagedLevel_ = max(level, stagedLevel_);
    if (!staged_.empty() && !buffer.empty())
        staged_.appendChar('\n');
    staged_.merge(std::move(buffer));
}

}  // namespace plr

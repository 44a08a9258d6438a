#pragma once

#include "plr/base/export.h"
#include "plr/log/log_message_buffer.h"
#include "plr/log/static_logger.h"

// A StagedLogger collects lines and sends them as one message when it ends, at
// the highest level among them.
//
// Owner:   one scope.
// Threads: one at a time.
namespace plr {

class PLR_EXPORT StagedLogger : public StaticLogger {
  public:
    using StaticLogger::StaticLogger;
    StagedLogger(const StagedLogger&) = delete;
    StagedLogger& operator=(const StagedLogger&) = delete;
    // Sends what was collected, if anything was. An exception from that ends the
    // process.
    ~StagedLogger();

    // Adds a line; nothing is sent yet. Const like every logger's, so that
    // whoever logs through this one need not know.
    void forceLog(LogLevel level, LogMessageBuffer&& buffer) const;

  private:
    mutable LogMessageBuffer staged_;
    mutable LogLevel stagedLevel_ = LogLevel::Unset;  // the highest so far
};

}  // namespace plr

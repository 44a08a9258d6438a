#pragma once

#include <mutex>
#include <string>
#include <utility>
#include <vector>

#include "plr/log/tracked_logger.h"

namespace plr::test {

// A tracked logger that remembers what it was told. Any thread.
class FakeTrackedLogger : public TrackedLogger {
  public:
    explicit FakeTrackedLogger(std::string name = "fake", LogLevel localLevel = LogLevel::Unset)
        : name_(std::move(name)), localLevel_(localLevel) {}

    void updateTrackedConfig(LogLevel level) override {
        const std::lock_guard lock(mutex_);
        told_.push_back(level);
    }
    using TrackedLogger::updateTrackedConfig;
    std::string getTrackedLoggerName() const override { return name_; }
    LogLevel getTrackedLogLevel() const override { return localLevel_; }

    // The levels since the last call.
    std::vector<LogLevel> takeTold() {
        const std::lock_guard lock(mutex_);
        return std::exchange(told_, {});
    }

  private:
    const std::string name_;
    const LogLevel localLevel_;
    std::mutex mutex_;
    std::vector<LogLevel> told_;
};

}  // namespace plr::test

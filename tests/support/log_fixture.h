#pragma once

#include <gtest/gtest.h>

#include <memory>
#include <string>
#include <vector>

#include "plr/ipc/values.h"
#include "plr/log/log_message.h"
#include "plr/log/log_server.h"
#include "plr/test/recording_log_writer.h"

namespace plr::test {

// A started server whose messages end in memory.
class LogFixture : public testing::Test {
  protected:
    LogFixture() {
        server_->addWriter(written_);
        server_->start();
    }

    // In force for everybody when it returns, except for what waits on loggers'
    // own queues.
    void configure(const char* domain, LogLevel level) {
        const vox::dict levels = vox::dict::create();
        levels[domain] = vox::int64(static_cast<int>(level));
        const vox::dict config = vox::dict::create();
        config["kDomainLogLevels"] = levels;
        server_->updateConfig(config);
        server_->debugFlush();
    }

    // What was logged since the last call.
    std::vector<std::shared_ptr<LogMessage>> takeMessages() {
        server_->debugFlush();
        return written_->take();
    }
    // The same, as "level's letter, domain, text".
    std::vector<std::string> takeLines() {
        server_->debugFlush();
        return written_->takeLines();
    }

    const std::shared_ptr<LogServer> server_ = LogServer::create("test");

  private:
    const std::shared_ptr<RecordingLogWriter> written_ = std::make_shared<RecordingLogWriter>();
};

}  // namespace plr::test

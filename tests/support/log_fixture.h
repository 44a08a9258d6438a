#pragma once

#include <gtest/gtest.h>

#include <deque>
#include <memory>
#include <mutex>
#include <string>
#include <utility>
#include <vector>

#include "plr/ipc/values.h"
#include "plr/log/log_message.h"
#include "plr/log/log_server.h"
#include "plr/log/memory_buffered_log_writer.h"

namespace plr::test {

// What was written, for another thread.
class KeptMessages : public MemoryBufferedLogWriter {
  public:
    KeptMessages() : MemoryBufferedLogWriter(UNLIMITED, UNLIMITED) {}
    using LogWriter::write;
    void write(std::shared_ptr<LogMessage> message) override {
        const std::lock_guard guard(lock_);
        MemoryBufferedLogWriter::write(std::move(message));
    }
    std::deque<std::shared_ptr<LogMessage>> drain() override {
        const std::lock_guard guard(lock_);
        return MemoryBufferedLogWriter::drain();
    }

  private:
    std::mutex lock_;
};

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
    std::deque<std::shared_ptr<LogMessage>> takeMessages() {
        server_->debugFlush();
        return written_->drain();
    }
    // The same, as "level's letter, domain, text".
    std::vector<std::string> takeLines() {
        std::vector<std::string> lines;
        for (const auto& message : takeMessages())
            lines.push_back(std::string(1, asChar(message->getLevel())) + " " +
                            message->getDomain() + " " + message->getText());
        return lines;
    }

    const std::shared_ptr<LogServer> server_ = LogServer::create("test");

  private:
    const std::shared_ptr<KeptMessages> written_ = std::make_shared<KeptMessages>();
};

}  // namespace plr::test

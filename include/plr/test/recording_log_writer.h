#pragma once

#include <memory>
#include <mutex>
#include <string>
#include <utility>
#include <vector>

#include "plr/log/log_message.h"
#include "plr/log/log_writer.h"

namespace plr::test {

// A log writer that keeps what it is given, for the test to look at.
//
//   const auto log = std::make_shared<plr::test::RecordingLogWriter>();
//   server->addWriter(log);
//   server->start();
//   …
//   server->debugFlush();      // all that was logged before is with the writer
//   log->takeLines();          // "W radio.modem no answer"
//
// Threads: any.
class RecordingLogWriter : public LogWriter {
  public:
    using LogWriter::write;
    void write(std::shared_ptr<LogMessage> message) override {
        const std::lock_guard guard(lock_);
        messages_.push_back(std::move(message));
    }
    void close() override {}

    // What was written since the last call, oldest first.
    [[nodiscard]] std::vector<std::shared_ptr<LogMessage>> take() {
        const std::lock_guard guard(lock_);
        return std::exchange(messages_, {});
    }
    // The same as "level's letter, domain, text".
    [[nodiscard]] std::vector<std::string> takeLines() {
        std::vector<std::string> lines;
        for (const auto& message : take())
            lines.push_back(std::string(1, asChar(message->getLevel())) + " " +
                            message->getDomain() + " " + message->getText());
        return lines;
    }

  private:
    std::mutex lock_;
    std::vector<std::shared_ptr<LogMessage>> messages_;
};

}  // namespace plr::test

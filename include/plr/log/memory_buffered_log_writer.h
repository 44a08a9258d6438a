#pragma once

#include <cstdint>
#include <deque>
#include <memory>

#include "plr/base/export.h"
#include "plr/log/log_writer.h"

// A MemoryBufferedLogWriter keeps the last messages in memory, up to a number of
// messages and of text bytes; the oldest go first and are counted.
//
// Queue:   a server's writers queue; used alone, one thread at a time.
namespace plr {

class PLR_EXPORT MemoryBufferedLogWriter : public LogWriter {
  public:
    static constexpr long UNLIMITED = -1;

    // Limits below 1 mean none. `maxBytes` counts bytes of text.
    MemoryBufferedLogWriter(long maxMessages, long maxBytes) noexcept;
    [[nodiscard]] static std::unique_ptr<MemoryBufferedLogWriter> create(long maxMessages,
                                                                         long maxBytes);
    ~MemoryBufferedLogWriter() override;

    void close() override;  // does nothing
    using LogWriter::write;
    void write(std::shared_ptr<LogMessage> message) override;

    // Moves the messages out, oldest first. Deliberate: counts stay as they are,
    // so a limit of bytes goes on as if the drained messages were still held.
    [[nodiscard]] virtual std::deque<std::shared_ptr<LogMessage>> drain();

    // Drops the oldest message; there must be one.
    void dropFrontMessage();

    // Since creation.
    [[nodiscard]] std::int64_t getDroppedMessageCount() const noexcept { return dropped_; }

  private:
    friend class LogDelivery;  // reads the messages in a crash

    std::deque<std::shared_ptr<LogMessage>> messages_;  // oldest first
    const std::int64_t maxMessages_;
    const std::int64_t maxBytes_;
    std::int64_t bytes_ = 0;  // of text
    std::int64_t dropped_ = 0;
};

}  // namespace plr

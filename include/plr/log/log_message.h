#pragma once

#include <cstdint>
#include <memory>
#include <string>
#include <utility>
#include <vector>

#include "plr/base/export.h"
#include "plr/log/log_level.h"

// A LogMessage is the record of one logged message, from the logger that built
// it to the server and its writers.
//
// Owner:   std::shared_ptr: one record serves all writers.
// Threads: never changes once built; any thread reads it.
// Cost:    create() takes a recycled record, with the room of its texts and the
//          counts of its shared_ptr, so that it allocates nothing once some
//          thousand messages have passed.
namespace plr {

// Nanoseconds of the calendar clock since 1970 (POSIX CLOCK_REALTIME).
using TimeStamp = std::int64_t;

class LogMessageBuffer;

class PLR_EXPORT LogMessage {
  public:
    LogMessage(TimeStamp timeStamp, LogLevel level, std::string domain, std::string&& text,
               std::vector<std::string>&& metaData) noexcept;
    LogMessage(const LogMessage& other);
    LogMessage& operator=(const LogMessage&) = delete;
    virtual ~LogMessage();

    // The same record, shared, with the buffer's text and metadata moved in: the
    // buffer is empty then. Throws std::bad_alloc. Any thread.
    [[nodiscard]] static std::shared_ptr<LogMessage> create(TimeStamp timeStamp, LogLevel level,
                                                            const std::string& domain,
                                                            LogMessageBuffer&& buffer);

    // When the message was built.
    [[nodiscard]] TimeStamp getTimeStamp() const noexcept { return timeStamp_; }
    [[nodiscard]] LogLevel getLevel() const noexcept { return level_; }
    // The log domain of the logger that built it.
    [[nodiscard]] const std::string& getDomain() const noexcept { return domain_; }
    // Bytes, UTF-8 by convention; may hold line feeds and NUL.
    [[nodiscard]] const std::string& getText() const noexcept { return text_; }
    // In the order in which they were added.
    [[nodiscard]] const std::vector<std::string>& getMetaData() const noexcept { return metaData_; }
    // Empty; kept for whoever derives from the record and fills it.
    [[nodiscard]] const std::string& getExtra() const noexcept { return extra_; }

  private:
    friend class LogMessageStore;
    void takeFrom(LogMessageBuffer& buffer);

    TimeStamp timeStamp_;
    LogLevel level_;
    std::string domain_;
    std::string text_;
    std::vector<std::string> metaData_;

  protected:
    std::string extra_;
};

}  // namespace plr

#pragma once

#include <memory>
#include <string>

#include "plr/base/export.h"
#include "plr/log/log_level.h"
#include "plr/log/logger_common_base.h"
#include "plr/log/trel_context.h"

// LoggerBase<Server> is a logger that sends its messages to a server: to a
// LogServer of this process, LoggerBase<std::shared_ptr<LogServer>>. The other
// one, LoggerBase<DummyLogServer>, has none, and is what loggers that send
// elsewhere derive from (vox_logger.h).
//
//   if (logger.enabled(LogLevel::Debug)) {
//       LogMessageBuffer text;
//       text << "registered on " << cell;
//       logger.forceLog(LogLevel::Debug, std::move(text));
//   }
//
// Owner:   a value; the server is shared, and may be empty: then nothing is
//          logged.
// Threads: logging and levels on any thread; everything else while nobody
//          else uses the logger.
// Order:   messages of one thread reach the server in the order of its calls.
namespace plr {

class LogMessage;
class LogMessageBuffer;
class LogServer;

template <class Server>
class LoggerBase;

template <>
class PLR_EXPORT LoggerBase<std::shared_ptr<LogServer>> : public LoggerCommonBase {
  public:
    // The context's name becomes the domain.
    // Deliberate: the logger keeps the context's handle without a reference of
    // its own, and yet releases one when it is destroyed.
    LoggerBase(TrelContext context, std::shared_ptr<LogServer> server);
    // Without a trace-log handle.
    LoggerBase(const std::string& domain, std::shared_ptr<LogServer> server);

    // A finished message of now: the buffer's text and metadata move into it, and
    // the buffer is empty afterwards.
    [[nodiscard]] std::shared_ptr<LogMessage> buildMessage(LogLevel level,
                                                           LogMessageBuffer&& buffer) const;
    // Logs what the buffer holds, whatever the level: ask enabled() first.
    // Without a server the buffer is left alone.
    void forceLog(LogLevel level, LogMessageBuffer&& buffer) const;

    [[nodiscard]] const std::shared_ptr<LogServer>& getLogServer() const noexcept {
        return server_;
    }
    // The inherited level stays what it was.
    void setLogServer(const std::shared_ptr<LogServer>& server) { server_ = server; }

  private:
    std::shared_ptr<LogServer> server_;
};

struct DummyLogServer {};

template <>
class LoggerBase<DummyLogServer> : public LoggerCommonBase {
  public:
    // Without a trace-log handle.
    explicit LoggerBase(const std::string& domain) : LoggerCommonBase(domain, nullptr) {}
};

}  // namespace plr

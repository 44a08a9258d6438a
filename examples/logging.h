#pragma once

#include <memory>
#include <string>
#include <utility>
#include <vector>

#include "plr/log.h"

// How the example programs log.
namespace radio {

// Starts a program's log, which also survives crashes. Each place is one of
//
//   console     standard error
//   system      the journal, or what there is instead
//   PATH        a file, with a slash in its name
//
// Throws std::system_error when a file cannot be opened, std::invalid_argument
// for what is no place.
[[nodiscard]] std::shared_ptr<plr::LogServer> startLog(const char* program,
                                                       const std::vector<std::string>& places);

// Logs the parts as one text. `logger` is any of the library's.
template <class Logger, class... Parts>
void log(const Logger& logger, plr::LogLevel level, const Parts&... parts) {
    if (!logger.enabled(level))
        return;
    plr::LogMessageBuffer text;
    static_cast<void>((text << ... << parts));
    logger.forceLog(level, std::move(text));
}

// Sends what the flat interface has to say (debug prints) into the log, at Debug in the
// domain radio.port, while it exists. One at a time.
class DebugPrints {
  public:
    explicit DebugPrints(const std::shared_ptr<plr::LogServer>& logServer);
    DebugPrints(const DebugPrints&) = delete;
    DebugPrints& operator=(const DebugPrints&) = delete;
    ~DebugPrints();

  private:
    const plr::StaticLogger logger_;
};

}  // namespace radio

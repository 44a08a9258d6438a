#include "examples/modem_reader.h"

#include <optional>

#include "examples/at_line.h"
#include "examples/logging.h"
#include "examples/radio_reports.h"

namespace radio {

using plr::LogLevel;

// The modem calls on this object's queue, and ends there together with it.
ModemReader::ModemReader(std::shared_ptr<plr::LogServer> logServer, const std::string& path,
                         ReportHandler onReport)
    : SharedLoggable("modem", "radio.modem", std::move(logServer)),
      onReport_(std::move(onReport)),
      modem_(
          path, ownQueue_.queue(),
          [this](const ModemLine& said) {
              ownQueue_.assertCurrent();
              handleLine_sync(said);
          },
          [this](int error) {
              log(logger(), LogLevel::Notice, "the modem has ended, error ", error);
          }) {}

void ModemReader::handleLine_sync(const ModemLine& said) {
    log(logger(), LogLevel::Debug, "line ", said.number, ": ", said.text);
    const auto line = said.cut ? std::nullopt : parseAtLine(said.text);
    const Reading reading = line ? readLine(*line) : Reading{{}, {}, "unreadable"};
    if (reading.complaint)
        log(logger(), LogLevel::Warn, "line ", said.number, " is ", reading.complaint,
            ", skipped: ", said.text);
    if (!reading.path.empty())
        onReport_(reading.path, reading.value);
}

}  // namespace radio

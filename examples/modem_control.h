#pragma once

#include <functional>
#include <memory>
#include <string>

#include "examples/modem.h"
#include "plr/ipc.h"
#include "plr/log.h"

namespace radio {

// A ModemReader makes reports of what a modem says: a path and a value each.
// radio_reports.h says which.
//
// Owner:   the std::shared_ptr of create().
// Queue:   its own, on which the handler is called.
// Logs:    in the domain radio.modem: each line at Debug, what is skipped at Warn.
class ModemReader : public plr::SharedLoggable<ModemReader> {
  public:
    using ReportHandler = std::function<void(const std::string& path, const vox::object& value)>;

    // Throws std::system_error when `path` cannot be opened.
    [[nodiscard]] static std::shared_ptr<ModemReader> create(
        std::shared_ptr<plr::LogServer> logServer, const std::string& path,
        ReportHandler onReport) {
        return make_shared_ptr(new ModemReader(std::move(logServer), path, std::move(onReport)));
    }

    void start() const { modem_.start(); }  // once

  private:
    ModemReader(std::shared_ptr<plr::LogServer> logServer, const std::string& path,
                ReportHandler onReport);
    void handleLine_sync(const ModemLine& said) PLR_ON(ownQueue_);

    const ReportHandler onReport_;
    const Modem modem_;
};

}  // namespace radio

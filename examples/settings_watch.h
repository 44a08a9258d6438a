#pragma once

#include <memory>
#include <string>

#include "examples/modem_control.h"
#include "examples/radiod_options.h"
#include "plr/log.h"
#include "qf/preferences.h"

namespace radio {

// A SettingsWatch keeps the modem's line as the preferences and the command line say,
// from create() on. A new name for the service is logged, and waits for the next start.
//
// Owner:   the std::shared_ptr of create().
// Queue:   its own.
// Logs:    in the domain radio.settings; what is wrong with the files at Warn.
class SettingsWatch : public plr::SharedLoggable<SettingsWatch> {
  public:
    // `service`: the name that is served.
    [[nodiscard]] static std::shared_ptr<SettingsWatch> create(
        const std::shared_ptr<plr::LogServer>& logServer, const RadiodOptions& options,
        const std::string& service, std::shared_ptr<ModemControl> modem);

  private:
    SettingsWatch(const std::shared_ptr<plr::LogServer>& logServer, RadiodOptions options,
                  std::string service, std::shared_ptr<ModemControl> modem);
    void init_sync() PLR_ON(ownQueue_);
    void follow_sync() PLR_ON(ownQueue_);

    const RadiodOptions options_;
    const std::string service_;
    const std::shared_ptr<ModemControl> modem_;
    qf::preferences_observer observer_ PLR_CONFINED_TO(ownQueue_);
};

}  // namespace radio

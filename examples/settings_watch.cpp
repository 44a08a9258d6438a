#include "examples/settings_watch.h"

#include <utility>

#include "examples/logging.h"
#include "examples/radio_settings.h"
#include "plr/qf/make_qf_string.h"

namespace radio {

SettingsWatch::SettingsWatch(const std::shared_ptr<plr::LogServer>& logServer,
                             RadiodOptions options, std::string service,
                             std::shared_ptr<ModemControl> modem)
    : SharedLoggable("settings", "radio.settings", logServer),
      options_(std::move(options)),
      service_(std::move(service)),
      modem_(std::move(modem)) {}

std::shared_ptr<SettingsWatch> SettingsWatch::create(
    const std::shared_ptr<plr::LogServer>& logServer, const RadiodOptions& options,
    const std::string& service, std::shared_ptr<ModemControl> modem) {
    auto watch = make_shared_ptr(new SettingsWatch(logServer, options, service, std::move(modem)));
    watch->execute_wrapped([self = watch.get()] {
        self->ownQueue_.assertCurrent();
        self->init_sync();
    });
    return watch;
}

// The observer first, so that no change is missed.
void SettingsWatch::init_sync() {
    const auto follow = plr::whileAlive(weak_from_this(), [](SettingsWatch& self) {
        self.ownQueue_.assertCurrent();
        self.follow_sync();
    });
    observer_ = qf::preferences_observer(plr::qf::MakeQfString(kPreferences), ownQueue_.queue(),
                                         dispatch::block<void()>(follow));
    follow_sync();
}

void SettingsWatch::follow_sync() {
    for (const std::string& error : settingsErrors())
        log(logger(), plr::LogLevel::Warn, error);
    const RadioSettings settings = readSettings();
    if (settings.service != service_)
        log(logger(), plr::LogLevel::Notice, settings.service,
            " will be served from the next start on");
    modem_->use(options_.over(settings.modem));
}

}  // namespace radio

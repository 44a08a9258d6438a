#include "examples/power.h"

#include <chrono>
#include <utility>

#include "examples/logging.h"

namespace radio {

using namespace std::chrono_literals;
using plr::LogLevel;
using plr::rest::AssertionAcquireState;
using plr::rest::AssertionState;

PowerControl::PowerControl(const std::shared_ptr<plr::LogServer>& logServer,
                           std::shared_ptr<plr::TimerService> timers)
    : SharedLoggable("power", "radio.power", logServer), timers_(std::move(timers)) {}

std::shared_ptr<PowerControl> PowerControl::create(const std::shared_ptr<plr::LogServer>& logServer,
                                                   std::shared_ptr<plr::TimerService> timers,
                                                   vox::connection service) {
    auto power = make_shared_ptr(new PowerControl(logServer, std::move(timers)));
    power->execute_wrapped([self = power.get(), service = std::move(service)] {
        self->ownQueue_.assertCurrent();
        self->init_sync(service);
    });
    return power;
}

void PowerControl::init_sync(vox::connection service) {
    // This object goes on its queue, and with it both handlers.
    keepOn_.emplace(rest_, "/assertions/keep_radio_on",
                    [this](const AssertionAcquireState& wanted) {
                        ownQueue_.assertCurrent();
                        serveHolders_sync(wanted);
                    });
    rest_.registerAsRequestSink(
        "/requests/reset_modem",
        plr::whileAlive(weak_from_this(), [](PowerControl& self, auto&&, const Reply& reply) {
            self.ownQueue_.assertCurrent();
            self.reset_sync(reply);
        }));
    rest_.connect(std::move(service));
}

void PowerControl::serveHolders_sync(const AssertionAcquireState& wanted) {
    setPower_sync(wanted.state != AssertionState::kIdle);
    if (wanted.state == AssertionState::kPending) {
        log(logger(), LogLevel::Info, "generation ", wanted.generation, " is granted");
        keepOn_->grant();
    }
}

void PowerControl::setPower_sync(bool on) {
    if (std::exchange(on_, on) == on)
        return;
    log(logger(), LogLevel::Notice, "the radio is ", on ? "on" : "off");
    rest_.setProperty("/radio/power", vox::boolean(on));
}

// The answer leaves when the modem is back.
void PowerControl::reset_sync(const Reply& reply) {
    log(logger(), LogLevel::Notice, "the modem is reset");
    timers_->runAfter(100ms, ownQueue_.queue(),
                      plr::whileAlive(weak_from_this(), [reply](PowerControl& self) {
                          self.ownQueue_.assertCurrent();
                          if (reply)
                              *reply = vox::int64(++self.resets_);
                      }));
}

}  // namespace radio

#include "examples/power.h"

#include <utility>

#include "examples/logging.h"

namespace radio {

using plr::LogLevel;
using plr::rest::AssertionAcquireState;
using plr::rest::AssertionState;

std::shared_ptr<PowerControl> PowerControl::create(const std::shared_ptr<plr::LogServer>& logServer,
                                                   vox::connection service) {
    auto power = make_shared_ptr(new PowerControl(logServer));
    power->execute_wrapped([self = power.get(), service = std::move(service)] {
        self->ownQueue_.assertCurrent();
        self->init_sync(service);
    });
    return power;
}

void PowerControl::init_sync(vox::connection service) {
    // This object goes on its queue, and with it the handler.
    keepOn_.emplace(rest_, "/assertions/keep_radio_on",
                    [this](const AssertionAcquireState& wanted) {
                        ownQueue_.assertCurrent();
                        serveHolders_sync(wanted);
                    });
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

}  // namespace radio

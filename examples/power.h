#pragma once

#include <memory>
#include <optional>

#include "plr/ipc.h"
#include "plr/log.h"
#include "plr/rest.h"

namespace radio {

// A PowerControl has the radio on while somebody wants it: it grants
// /assertions/keep_radio_on, and tells by /radio/power whether the radio is on.
//
// It is a client of the service like any other, and may live in another process.
//
// Owner:   the std::shared_ptr of create().
// Queue:   its own.
// Logs:    what it does, in the domain radio.power.
class PowerControl : public plr::SharedLoggable<PowerControl> {
  public:
    // `service`: a connection to the radio service, not started yet.
    [[nodiscard]] static std::shared_ptr<PowerControl> create(
        const std::shared_ptr<plr::LogServer>& logServer, vox::connection service);

  private:
    explicit PowerControl(const std::shared_ptr<plr::LogServer>& logServer)
        : SharedLoggable("power", "radio.power", logServer) {}
    void init_sync(vox::connection service) PLR_ON(ownQueue_);
    void serveHolders_sync(const plr::rest::AssertionAcquireState& wanted) PLR_ON(ownQueue_);
    void setPower_sync(bool on) PLR_ON(ownQueue_);

    plr::RestModule rest_ PLR_CONFINED_TO(ownQueue_)
    = plr::RestModule(ownQueue_.queue(), "power");
    std::optional<plr::rest::AssertionProvider> keepOn_ PLR_CONFINED_TO(ownQueue_);
    bool on_ PLR_CONFINED_TO(ownQueue_)
    = false;
};

}  // namespace radio

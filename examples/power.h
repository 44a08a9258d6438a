#pragma once

#include <memory>
#include <optional>

#include "plr/concurrency.h"
#include "plr/ipc.h"
#include "plr/log.h"
#include "plr/rest.h"

namespace radio {

// A PowerControl has the radio on while somebody wants it: it grants
// /assertions/keep_radio_on, tells by /radio/power whether the radio is on, and
// answers /requests/reset_modem with the number of resets.
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
        const std::shared_ptr<plr::LogServer>& logServer, std::shared_ptr<plr::TimerService> timers,
        vox::connection service);

  private:
    using Reply = std::shared_ptr<vox::object>;

    PowerControl(const std::shared_ptr<plr::LogServer>& logServer,
                 std::shared_ptr<plr::TimerService> timers);
    void init_sync(vox::connection service) PLR_ON(ownQueue_);
    void serveHolders_sync(const plr::rest::AssertionAcquireState& wanted) PLR_ON(ownQueue_);
    void setPower_sync(bool on) PLR_ON(ownQueue_);
    void reset_sync(const Reply& reply) PLR_ON(ownQueue_);

    const std::shared_ptr<plr::TimerService> timers_;
    plr::RestModule rest_ PLR_CONFINED_TO(ownQueue_)
    = plr::RestModule(ownQueue_.queue(), "power");
    std::optional<plr::rest::AssertionProvider> keepOn_ PLR_CONFINED_TO(ownQueue_);
    bool on_ PLR_CONFINED_TO(ownQueue_)
    = false;
    std::int64_t resets_ PLR_CONFINED_TO(ownQueue_)
    = 0;
};

}  // namespace radio

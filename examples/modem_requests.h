#pragma once

#include <atomic>
#include <cstdint>
#include <memory>

#include "examples/modem_control.h"
#include "plr/ipc.h"
#include "plr/log.h"
#include "plr/rest.h"

namespace radio {

// A ModemRequests answers what clients ask of the modem:
//
//   /requests/enter_pin    "1234": OK, or why not: +CME ERROR: 16 is a wrong one
//   /requests/refresh      asks the modem for all that it reports; OK
//   /requests/reset_modem  resets it; how often that was done
//   /requests/send_sms     PDUs in hex (sms_pdu.h), an array: OK when all are sent, or why
//                          the first that was not is not
//
// The answer leaves when the modem has answered; "no answer" or "not reset" when it
// does not.
//
// Owner:   the std::shared_ptr of create().
// Queue:   its own.
// Logs:    in the domain radio.requests.
class ModemRequests : public plr::SharedLoggable<ModemRequests> {
  public:
    // `service`: a connection to the radio service, not started yet.
    [[nodiscard]] static std::shared_ptr<ModemRequests> create(
        const std::shared_ptr<plr::LogServer>& logServer, std::shared_ptr<ModemControl> modem,
        vox::connection service);

  private:
    using Reply = std::shared_ptr<vox::object>;

    ModemRequests(const std::shared_ptr<plr::LogServer>& logServer,
                  std::shared_ptr<ModemControl> modem)
        : SharedLoggable("requests", "radio.requests", logServer), modem_(std::move(modem)) {}
    void init_sync(vox::connection service) PLR_ON(ownQueue_);
    void enterPin_sync(const vox::object& pin, const Reply& reply) PLR_ON(ownQueue_);
    void sendMessages_sync(const vox::object& pdus, const Reply& reply) PLR_ON(ownQueue_);
    void reset_sync(const Reply& reply) PLR_ON(ownQueue_);

    const std::shared_ptr<ModemControl> modem_;
    plr::RestModule rest_ PLR_CONFINED_TO(ownQueue_)
    = plr::RestModule(ownQueue_.queue(), "modem");
    std::atomic<std::int64_t> resets_ = 0;  // counted on the modem's queue
};

}  // namespace radio

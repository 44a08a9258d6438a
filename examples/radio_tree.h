#pragma once

#include <memory>

#include "plr/log.h"
#include "plr/rest.h"

namespace radio {

// Installs the resources of a radio service, and says what each is for:
//
//   /connections            who is connected
//   /radio/...              the last value of everything that the modem reported
//   /radio/sms/...          messages that came (sms_inbox.h)
//   /events/...             calls and messages as they come; not kept
//   /messages/KEY           what the modem keeps, SM-3 for instance, until a client removes it
//   /assertions/...         what clients need: keep_radio_on (power.h)
//   /requests/...           what clients ask for: reset_modem and more (modem_requests.h)
//   /log/DOMAIN             levels of log domains (log_levels.h)
//   /log_server             an endpoint for clients to log to (remote_log.h)
//   /descriptions           all this, to read
//
// What the modem and the power component tell, the card's PIN, and messages to send come
// from this user only, by access rules. `logger` has the log that the last ones are about. Any
// thread.
void installResources(plr::rest::RestServerExample& server,
                      const std::shared_ptr<plr::Logger>& logger);

}  // namespace radio

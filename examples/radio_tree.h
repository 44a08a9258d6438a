#pragma once

#include <memory>

#include "plr/log.h"
#include "plr/rest.h"

namespace radio {

// Installs the resources of a radio service, and says what each is for:
//
//   /connections            who is connected
//   /radio/...              the last value of everything that the modem reported
//   /events/...             calls and messages as they come; not kept
//   /assertions/...         what clients need: keep_radio_on (power.h)
//   /requests/...           what clients ask for: reset_modem (power.h)
//   /log/DOMAIN             levels of log domains (log_levels.h)
//   /log_server             an endpoint for clients to log to (remote_log.h)
//   /descriptions           all this, to read
//
// `logger` has the log that the last ones are about. Any thread.
void installResources(plr::rest::RestServerExample& server,
                      const std::shared_ptr<plr::Logger>& logger);

}  // namespace radio

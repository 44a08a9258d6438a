#include "examples/radio_tree.h"

#include "examples/log_levels.h"
#include "examples/remote_log.h"

namespace radio {

using namespace plr::rest;

void installResources(RestServerExample& server, const std::shared_ptr<plr::Logger>& logger) {
    server.registerResource("/connections", std::make_shared<ConnectionRestResource>());
    server.registerResource("/radio", std::make_shared<PropertyRestResource>(true));
    server.registerResource("/events", std::make_shared<PropertyRestResource>(false));
    server.registerResource("/assertions", std::make_shared<AssertionRestResource>(provider_only));
    server.registerResource("/requests", std::make_shared<RequestRestResource>());
    server.registerResource("/log", std::make_shared<LogLevels>(logger));
    server.registerResource("/log_server", std::make_shared<RemoteLog>(logger->getLogServer()));
}

}  // namespace radio

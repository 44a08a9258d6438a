#include "examples/radio_tree.h"

#include <unistd.h>

#include "examples/log_levels.h"
#include "examples/radio_resource.h"
#include "examples/remote_log.h"
#include "examples/sms_inbox.h"

namespace radio {
namespace {

using namespace plr::rest;

constexpr std::size_t kStoredMessages = 1000;

constexpr struct {
    const char *path, *type, *doc;
} kDescriptions[] = {
    {"/radio/operator", "string", "The network's name; null while there is none."},
    {"/radio/power", "bool", "Whether the radio is on."},
    {"/radio/registration", "dictionary", "Whether a network takes calls, and where."},
    {"/radio/signal", "int64", "Signal strength in dBm; null when it is not known."},
    {"/radio/sim", "string", "READY, or what the card waits for."},
    {"/radio/sms", "map", "Messages that came, from 1 on: text, sender and time."},
    {"/assertions/keep_radio_on", "assertion", "Keeps the radio on while somebody holds it."},
    {"/requests/enter_pin", "request", "Gives the card its PIN, a string; answers the result."},
    {"/requests/refresh", "request", "Asks the modem for what it reports; answers the result."},
    {"/requests/reset_modem", "request", "Answers the number of resets when the modem is back."},
    {"/requests/send_sms", "request", "Sends PDUs, hex strings; answers the result."},
    {"/settings/airplane_mode", "bool", "Kept for whom it concerns."},
    {"/settings/status_seconds", "int64", "Period of status lines in the log; 0 ends them."},
};

// Others watch, hold and ask. Reports, grants and answers come from this user only.
void restrictAccess(RestServerExample& server) {
    const uid_t self = ::geteuid();
    const auto only = [self](const char* path, Operation operation) {
        return AccessRule{.path = path, .operations = {operation}, .users = {self}};
    };
    server.setAccessRules({
        only("/radio", Operation::kSet),
        only("/events", Operation::kSet),
        only("/assertions/keep_radio_on/provider", Operation::kPush),
        only("/requests", Operation::kPush),
        only("/requests/enter_pin", Operation::kGet),
        only("/requests/send_sms", Operation::kGet),
    });
}

}  // namespace

void installResources(RestServerExample& server, const std::shared_ptr<plr::Logger>& logger) {
    server.registerResource("/connections", std::make_shared<ConnectionRestResource>(),
                            {"array", "Who is connected."});
    server.registerResource("/radio", std::make_shared<RadioResource>(SmsInbox::kMostKept),
                            {"properties", "What the modem reported last."});
    server.registerResource("/events", std::make_shared<PropertyRestResource>(false),
                            {"events", "Calls and messages as they come."});
    server.registerResource("/messages", std::make_shared<MapRestResource>(kStoredMessages),
                            {"map", "Messages that the modem keeps; null removes one."});
    server.registerResource("/assertions", std::make_shared<AssertionRestResource>(provider_only),
                            {"assertions", "What clients need."});
    server.registerResource("/requests", std::make_shared<RequestRestResource>(),
                            {"requests", "What clients ask for."});
    server.registerResource("/log", std::make_shared<LogLevels>(logger),
                            {"properties", "Levels of log domains by name; null takes one back."});
    server.registerResource("/log_server", std::make_shared<RemoteLog>(logger->getLogServer()),
                            {"endpoint", "Where clients log to."});
    server.registerResource("/descriptions", server.descriptions());
    for (const auto& [path, type, doc] : kDescriptions)
        server.describe(path, {type, doc});
    restrictAccess(server);
}

}  // namespace radio

#include "examples/log_levels.h"

#include <optional>
#include <string>

#include "examples/logging.h"
#include "examples/show.h"

namespace radio {
namespace {

using plr::LogLevel;

// The level of that name; Unset for null.
std::optional<LogLevel> levelOf(const vox::object& value) {
    using enum LogLevel;
    if (!value)
        return Unset;
    for (const LogLevel level :
         {Unset, Always, Trace, Debug, Info, Notice, Warn, Error, Fatal, Never})
        if (value.text() == asString(level))
            return level;
    return std::nullopt;
}

vox::dict configOf(const std::string& domain, LogLevel level) {
    const auto levels = vox::dict::create();
    levels[domain.c_str()] = vox::int64(static_cast<int>(level));
    auto config = vox::dict::create();
    config["kDomainLogLevels"] = levels;
    return config;
}

}  // namespace

bool LogLevels::handleRestMessage_GET(plr::rest::RestResourceContext& context,
                                      const plr::rest::PathView& path) {
    if (path)
        return PropertyRestResource::handleRestMessage_GET(context, path);
    return context.sendReplyWithValue(logger_->getLogServer()->getSimpleConfig());
}

bool LogLevels::handleRestMessage_SET(plr::rest::RestResourceContext& context,
                                      const plr::rest::PathView& path) {
    if (!path)
        return false;
    const std::string domain(path.current());
    const auto level = levelOf(context.getRestValue());
    if (!level) {
        log(*logger_, LogLevel::Warn, "no level for ", domain, ": ",
            oneLine(context.getRestValue()));
        return false;
    }
    const auto& server = logger_->getLogServer();
    server->updateConfig(configOf(domain, *level));
    // Waits for it: whoever has seen this line, or an answer, has the new level.
    const LogLevel effective = server->getCurrentLogLevelSlow(domain);
    log(*logger_, LogLevel::Notice, domain, " logs at ", effective);
    return PropertyRestResource::handleRestMessage_SET(context, path);
}

}  // namespace radio

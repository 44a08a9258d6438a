#include "examples/logging.h"

#include <Pelorin>
#include <stdexcept>
#include <string_view>

namespace radio {
namespace {

std::shared_ptr<plr::LogWriter> makeWriter(const char* program, const std::string& place) {
    if (place == "console")
        return plr::ConsoleLogWriter::create();
    if (place == "system")
        return plr::KelLogWriter::create(program, nullptr, -1);
    if (place.find('/') != std::string::npos)
        return plr::FileLogWriter::create({.path = place});
    throw std::invalid_argument(place + " is no place for a log");
}

}  // namespace

std::shared_ptr<plr::LogServer> startLog(const char* program,
                                         const std::vector<std::string>& places) {
    auto server = plr::LogServer::create(program);
    for (const std::string& place : places)
        server->addWriter(makeWriter(program, place));
    server->start();
    plr::drainLogsOnCrash(server);
    return server;
}

DebugPrints::DebugPrints(const std::shared_ptr<plr::LogServer>& logServer)
    : logger_("radio.port", logServer) {
    const auto print = [](void* context, const char* function, const char* text) {
        std::string_view line(text);
        line.remove_suffix(line.ends_with('\n') ? 1 : 0);
        log(static_cast<DebugPrints*>(context)->logger_, plr::LogLevel::Debug, function, ": ",
            std::string(line));
    };
    PelorinDebugSetDelegate(print, this);
}

DebugPrints::~DebugPrints() {
    PelorinDebugSetDelegate(nullptr, nullptr);
}

}  // namespace radio

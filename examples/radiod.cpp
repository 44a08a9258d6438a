// radiod: a radio service. It asks a modem, reads what it says, line by line, and
// publishes that as properties and events under a name, net.example.radio.
//
//   radiod [--modem PATH] [--baud N] [--no-flow-control] [--log PLACE]... [--group NAME]
//
//   --modem PATH    a terminal with a modem that speaks AT, there already or yet to come;
//                   or a FIFO or file with a recorded session
//   --baud N        bits a second of the terminal
//   --no-flow-control   the terminal has no lines for it
//   --log PLACE     console (standard error; used when there is no --log), system,
//                   or the path of a file
//   --group NAME    its members may be clients; without it only this user and root
//
// What is left out is in the preferences (radio_settings.h), which it follows while it
// runs; a new name is for the next start.
//
// systemd may start it (systemd/net.example.radio.service). radio_tree.h says what
// clients find, radio_reports.h which result code becomes which path and value.

#include <grp.h>

#include <exception>
#include <iostream>
#include <memory>
#include <stdexcept>
#include <string>
#include <vector>

#include "examples/end_signals.h"
#include "examples/logging.h"
#include "examples/modem_control.h"
#include "examples/modem_requests.h"
#include "examples/power.h"
#include "examples/radio_service.h"
#include "examples/radio_settings.h"
#include "examples/radiod_options.h"
#include "examples/settings_watch.h"
#include "vox/service.h"

namespace {

vox::listener createListener(const std::string& service, const std::string& groupName) {
    const auto listener = vox::listener::create(service.c_str());
    if (groupName.empty())
        return listener;
    const group* const found = ::getgrnam(groupName.c_str());  // NOLINT(concurrency-mt-unsafe)
    if (!found)
        throw std::invalid_argument("there is no group " + groupName);
    listener.set_policy({.users = {}, .groups = {found->gr_gid}, .everybody = false});
    return listener;
}

int serve(const radio::RadiodOptions& options, const std::shared_ptr<plr::LogServer>& logServer,
          radio::EndSignals& end) {
    const auto timers = plr::DispatchTimerService::create(logServer);
    const auto service = radio::RadioService::create(logServer, timers);
    const auto modem = radio::ModemControl::create(
        logServer, timers,
        [service](const auto& path, const auto& value) { service->publish(path, value); });
    const std::string name = radio::serviceName();
    const auto listener = createListener(name, options.group);
    std::shared_ptr<radio::PowerControl> power;
    std::shared_ptr<radio::ModemRequests> requests;
    const plr::StaticLogger logger("radio", logServer);
    if (service->serve(listener, [&end] { end.raise(1); })) {
        const auto endpoint = vox::endpoint::create(listener);
        power = radio::PowerControl::create(logServer, endpoint.connect());
        requests = radio::ModemRequests::create(logServer, modem, endpoint.connect());
        radio::log(logger, plr::LogLevel::Notice, "serving ", name);
        vox_notify_ready();
    }
    const auto settings = radio::SettingsWatch::create(logServer, options, name, modem);
    const int status = end.wait();
    vox_notify_stopping();
    modem->close();
    radio::log(logger, plr::LogLevel::Notice, "ending");
    return status;
}

// What stops the service is in its log, and the log is out before the process is.
int run(const radio::RadiodOptions& options, radio::EndSignals& end) {
    const auto logServer = radio::startLog("radiod", options.logs);
    const plr::ScopedLogFlusher flusher(logServer);
    const radio::DebugPrints debugPrints(logServer);
    try {
        return serve(options, logServer, end);
    } catch (const std::exception& error) {
        radio::log(plr::StaticLogger("radio", logServer), plr::LogLevel::Fatal, error.what());
        return 1;
    }
}

}  // namespace

int main(int argc, char** argv) {
    const auto options = radio::parseOptions({argv + 1, argv + argc});
    if (!options) {
        std::cerr << "usage: radiod [--modem PATH] [--baud N] [--no-flow-control]"
                     " [--log console|system|PATH]... [--group NAME]\n";
        return 2;
    }
    radio::EndSignals end;
    try {
        return run(*options, end);
    } catch (const std::exception& error) {
        std::cerr << "radiod: " << error.what() << '\n';
        return 1;
    }
}

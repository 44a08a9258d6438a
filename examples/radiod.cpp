// radiod: a radio service. It reads what a modem says, line by line, and
// publishes it as properties and events under the name net.example.radio.
//
//   radiod --modem PATH [--log PLACE]... [--group NAME]
//
//   --modem PATH    a terminal, a FIFO or a file with a recorded session
//   --log PLACE     console (standard error; used when there is no --log), system,
//                   or the path of a file
//   --group NAME    its members may be clients; without it only this user and root
//
// systemd may start it (systemd/net.example.radio.service). radio_tree.h says what
// clients find, radio_reports.h which result code becomes which path and value.

#include <grp.h>

#include <exception>
#include <iostream>
#include <memory>
#include <stdexcept>
#include <string>
#include <string_view>
#include <vector>

#include "examples/end_signals.h"
#include "examples/logging.h"
#include "examples/modem_reader.h"
#include "examples/power.h"
#include "examples/radio_service.h"
#include "vox/service.h"

namespace {

constexpr const char* kService = "net.example.radio";

struct Options {
    std::string modem;
    std::vector<std::string> logs;
    std::string group;
};

// False when they are wrong.
bool parse(int argc, char** argv, Options& options) {
    for (int i = 1; i + 1 < argc; i += 2) {
        if (std::string_view(argv[i]) == "--modem")
            options.modem = argv[i + 1];
        else if (std::string_view(argv[i]) == "--log")
            options.logs.emplace_back(argv[i + 1]);
        else if (std::string_view(argv[i]) == "--group")
            options.group = argv[i + 1];
        else
            return false;
    }
    if (options.logs.empty())
        options.logs.emplace_back("console");
    return argc % 2 == 1 && !options.modem.empty();
}

vox::listener createListener(const std::string& groupName) {
    const auto listener = vox::listener::create(kService);
    if (groupName.empty())
        return listener;
    const group* const found = ::getgrnam(groupName.c_str());  // NOLINT(concurrency-mt-unsafe)
    if (!found)
        throw std::invalid_argument("there is no group " + groupName);
    listener.set_policy({.users = {}, .groups = {found->gr_gid}, .everybody = false});
    return listener;
}

int serve(const Options& options, const std::shared_ptr<plr::LogServer>& logServer,
          radio::EndSignals& end) {
    const auto timers = plr::DispatchTimerService::create(logServer);
    const auto service = radio::RadioService::create(logServer, timers);
    const auto reader = radio::ModemReader::create(
        logServer, options.modem,
        [service](const auto& path, const auto& value) { service->publish(path, value); });
    const auto listener = createListener(options.group);
    std::shared_ptr<radio::PowerControl> power;
    const plr::StaticLogger logger("radio", logServer);
    if (service->serve(listener, [&end] { end.raise(1); })) {
        power = radio::PowerControl::create(logServer, timers,
                                            vox::endpoint::create(listener).connect());
        radio::log(logger, plr::LogLevel::Notice, "serving ", kService);
        vox_notify_ready();
    }
    reader->start();
    const int status = end.wait();
    vox_notify_stopping();
    radio::log(logger, plr::LogLevel::Notice, "ending");
    return status;
}

// What stops the service is in its log, and the log is out before the process is.
int run(const Options& options, radio::EndSignals& end) {
    const auto logServer = radio::startLog("radiod", options.logs);
    const plr::ScopedLogFlusher flusher(logServer);
    try {
        return serve(options, logServer, end);
    } catch (const std::exception& error) {
        radio::log(plr::StaticLogger("radio", logServer), plr::LogLevel::Fatal, error.what());
        return 1;
    }
}

}  // namespace

int main(int argc, char** argv) {
    Options options;
    if (!parse(argc, argv, options)) {
        std::cerr << "usage: radiod --modem PATH [--log console|system|PATH]... [--group NAME]\n";
        return 2;
    }
    radio::EndSignals end;
    try {
        return run(options, end);
    } catch (const std::exception& error) {
        std::cerr << "radiod: " << error.what() << '\n';
        return 1;
    }
}

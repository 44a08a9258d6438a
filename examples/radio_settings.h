#pragma once

#include <string>
#include <vector>

#include "examples/modem.h"

namespace radio {

// What an administrator sets for the radio service and its clients: the preferences of
// the application "radiod", /etc/pelorin/preferences/radiod.toml for instance.
//
//   service = "net.example.radio"    the name that is served, and that clients look for
//   modem = "/dev/modem"             as --modem, --baud, --no-flow-control of radiod
//   baud = 115200
//   flow_control = true
//
// These values hold for what is not there, or is no such value; a number and "yes" may
// be in quotes. Any thread.
inline constexpr const char* kPreferences = "radiod";

struct RadioSettings {
    std::string service;
    ModemSettings modem;
};
// As of now.
[[nodiscard]] RadioSettings readSettings();
// What is wrong with the files, each with its place.
[[nodiscard]] std::vector<std::string> settingsErrors();

// The name that clients look for.
[[nodiscard]] inline std::string serviceName() {
    return readSettings().service;
}

}  // namespace radio

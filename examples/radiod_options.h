#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <vector>

#include "examples/modem.h"

namespace radio {

// What radiod's command line says; radiod.cpp explains it. What it leaves open the
// preferences say (radio_settings.h).
struct RadiodOptions {
    std::optional<std::string> modem;
    std::optional<std::uint32_t> baud;
    bool noFlowControl = false;
    std::vector<std::string> logs;  // at least one
    std::string group;              // empty: none

    // What the preferences say of the modem's line, but for what is said here.
    [[nodiscard]] ModemSettings over(ModemSettings preferred) const;
};

// Nothing when it is wrong.
[[nodiscard]] std::optional<RadiodOptions> parseOptions(const std::vector<std::string>& arguments);

}  // namespace radio

#pragma once

#include <optional>
#include <string>
#include <vector>

#include "examples/modem.h"

namespace radio {

// What radiod's command line says; radiod.cpp explains it.
struct RadiodOptions {
    ModemSettings modem;
    std::vector<std::string> logs;  // at least one
    std::string group;              // empty: none
};

// Nothing when it is wrong.
[[nodiscard]] std::optional<RadiodOptions> parseOptions(const std::vector<std::string>& arguments);

}  // namespace radio

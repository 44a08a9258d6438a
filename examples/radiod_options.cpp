#include "examples/radiod_options.h"

#include <charconv>
#include <cstddef>

namespace radio {
namespace {

bool readNumber(const std::string& text, std::uint32_t& number) {
    const char* const end = text.data() + text.size();
    const auto read = std::from_chars(text.data(), end, number);
    return read.ec == std::errc() && read.ptr == end && number > 0;
}

// One that has a value.
bool take(const std::string& name, const std::string& value, RadiodOptions& options) {
    if (name == "--modem")
        options.modem = value;
    else if (name == "--baud")
        return readNumber(value, options.baud.emplace());
    else if (name == "--log")
        options.logs.push_back(value);
    else if (name == "--group")
        options.group = value;
    else
        return false;
    return true;
}

}  // namespace

ModemSettings RadiodOptions::over(ModemSettings preferred) const {
    return {.path = modem.value_or(preferred.path),
            .baud = baud.value_or(preferred.baud),
            .flowControl = preferred.flowControl && !noFlowControl};
}

std::optional<RadiodOptions> parseOptions(const std::vector<std::string>& arguments) {
    RadiodOptions options;
    for (std::size_t i = 0; i < arguments.size(); ++i) {
        if (arguments[i] == "--no-flow-control")
            options.noFlowControl = true;
        else if (i + 1 == arguments.size() || !take(arguments[i], arguments[i + 1], options))
            return std::nullopt;
        else
            ++i;
    }
    if (options.logs.empty())
        options.logs.emplace_back("console");
    return options;
}

}  // namespace radio

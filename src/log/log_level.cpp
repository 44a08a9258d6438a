#include "plr/log/log_level.h"

#include <ostream>

namespace plr {

const char* asString(LogLevel level) noexcept {
    switch (level) {
        case LogLevel::Unset:
            return "Unset";
        case LogLevel::Always:
            return "Always";
        case LogLevel::Trace:
            return "Trace";
        case LogLevel::Debug:
            return "Debug";
        case LogLevel::Info:
            return "Info";
        case LogLevel::Notice:
            return "Notice";
        case LogLevel::Warn:
            return "Warn";
        case LogLevel::Error:
            return "Error";
        case LogLevel::Fatal:
            return "Fatal";
        case LogLevel::Never:
            return "Never";
    }
    return "???";
}

char asChar(LogLevel level) noexcept {
    switch (level) {
        case LogLevel::Trace:
        case LogLevel::Debug:
        case LogLevel::Info:
        case LogLevel::Notice:
        case LogLevel::Warn:
        case LogLevel::Error:
        case LogLevel::Fatal:
            return *asString(level);
        case LogLevel::Unset:
        case LogLevel::Always:
        case LogLevel::Never:
            break;
    }
    return '?';
}

std::ostream& operator<<(std::ostream& stream, LogLevel level) {
    return stream << asString(level);
}

}  // namespace plr

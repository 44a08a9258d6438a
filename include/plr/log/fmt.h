#pragma once

#include <fmt/format.h>

#include <type_traits>
#include <utility>

#include "plr/log/log_level.h"
#include "plr/log/log_message_buffer.h"

// Logging with the format strings of {fmt} (https://fmt.dev, version 9 or later),
// for programs that use that library; pelorin itself does not need it.
//
//   plr::logInfo(logger, "cell {} at {} dBm", cell, dBm);
//   plr::log(*this, level, "{:>8}", name);        // in a Loggable object
//
// The compiler holds the format against its arguments. Works for whatever has
// enabled() and forceLog(), as loggers do, or a logger() that has: objects that
// derive from Loggable.
//
// Cost:   when the level is disabled, one test. The arguments of a call are
//         evaluated before it, as always: what is dear to compute goes into a
//         callable, which runs only when the level is enabled:
//
//   plr::logDebug(logger, [&](plr::LogMessageBuffer& text) {
//       plr::append(text, "{} neighbours", scan().size());
//       text << plr::MetaData("band=3");
//   });
//
// Errors: what formatting throws (fmt::format_error for a negative width at run
//         time, exceptions of your own formatters) reaches the caller, and nothing
//         is logged.
// Thread: as the logger's.
namespace plr {

// Appends formatted text to a buffer.
template <class... Arguments>
void append(LogMessageBuffer& buffer, fmt::format_string<Arguments...> format,
            Arguments&&... arguments);

namespace detail {

template <class T>
concept HasLogger = requires(const T& object) {
    object.logger().enabled(LogLevel::Info);
};

template <class T>
const auto& loggerOf(const T& object) {
    if constexpr (HasLogger<T>)
        return object.logger();
    else
        return object;
}

inline void appendFormatted(LogMessageBuffer& buffer, fmt::string_view format,
                            fmt::format_args arguments) {
    fmt::memory_buffer text;
    fmt::vformat_to(fmt::appender(text), format, arguments);
    buffer.appendString(std::string_view(text.data(), text.size()));
}

// Out of line: a call that logs nothing is to be small.
template <class Logger>
[[gnu::noinline]] void forceLogFormatted(const Logger& logger, LogLevel level,
                                         fmt::string_view format, fmt::format_args arguments) {
    LogMessageBuffer buffer;
    appendFormatted(buffer, format, arguments);
    logger.forceLog(level, std::move(buffer));
}

}  // namespace detail

template <class... Arguments>
void append(LogMessageBuffer& buffer, fmt::format_string<Arguments...> format,
            Arguments&&... arguments) {
    detail::appendFormatted(buffer, format, fmt::make_format_args(arguments...));
}

// Logs formatted text at a level.
template <class Logger, class... Arguments>
void log(const Logger& logger, LogLevel level, fmt::format_string<Arguments...> format,
         Arguments&&... arguments) {
    const auto& target = detail::loggerOf(logger);
    if (target.enabled(level))
        detail::forceLogFormatted(target, level, format, fmt::make_format_args(arguments...));
}

// Logs what a callable puts into the buffer that it is given.
template <class Logger, class Compose>
requires std::is_invocable_v<Compose&, LogMessageBuffer&>
void log(const Logger& logger, LogLevel level, Compose&& compose) {
    const auto& target = detail::loggerOf(logger);
    if (!target.enabled(level))
        return;
    LogMessageBuffer buffer;
    compose(buffer);
    target.forceLog(level, std::move(buffer));
}

// The same for each level, with a format or with a callable: logTrace(logger, …).
#define PLR_LOG_AT(level)                                                            \
    template <class Logger, class... Arguments>                                      \
    void log##level(const Logger& logger, fmt::format_string<Arguments...> format,   \
                    Arguments&&... arguments) {                                      \
        log(logger, LogLevel::level, format, std::forward<Arguments>(arguments)...); \
    }                                                                                \
    template <class Logger, class Compose>                                           \
    requires std::is_invocable_v<Compose&, LogMessageBuffer&>                        \
    void log##level(const Logger& logger, Compose&& compose) {                       \
        log(logger, LogLevel::level, compose);                                       \
    }
PLR_LOG_AT(Trace)
PLR_LOG_AT(Debug)
PLR_LOG_AT(Info)
PLR_LOG_AT(Notice)
PLR_LOG_AT(Warn)
PLR_LOG_AT(Error)
PLR_LOG_AT(Fatal)
#undef PLR_LOG_AT

}  // namespace plr

#pragma once

#include <cstddef>
#include <cstdint>
#include <memory>
#include <string>
#include <string_view>

#include "plr/ipc/connection.h"
#include "plr/ipc/dict.h"
#include "plr/log/log_level.h"
#include "plr/log/log_message.h"

// What a VoxLogger and a VoxLogServer say to each other: dictionaries, integers
// of 64 bits with sign.
//
//   client to server
//     check-in   kLoggerName, kLoggerDomain: string. As a request it asks whether
//                the server confirms; one that does replies
//     message    kLogMessage: string; kLogMessageLevel, kLogMessageTimestamp
//                (nanoseconds since 1970): integer; kLogMessageMetadata: array of
//                strings, when there are any
//     level      kLoggerLevel: integer, the logger's own
//     confirm    kLoggerConfirm: integer, messages so far; a request, which is
//                replied to when all messages before it have been written
//   server to client
//     level      kLoggerLevel: integer, what the domain hands down
//     replies    empty
namespace plr {

class LogMessageBuffer;

namespace remote_log {

inline constexpr const char* kLoggerName = "kLoggerName";
inline constexpr const char* kLoggerDomain = "kLoggerDomain";
inline constexpr const char* kLoggerLevel = "kLoggerLevel";
inline constexpr const char* kLoggerConfirm = "kLoggerConfirm";
inline constexpr const char* kLogMessage = "kLogMessage";
inline constexpr const char* kLogMessageLevel = "kLogMessageLevel";
inline constexpr const char* kLogMessageTimestamp = "kLogMessageTimestamp";
inline constexpr const char* kLogMessageMetadata = "kLogMessageMetadata";

// The longest name and domain of a client, in bytes.
inline constexpr std::size_t kLongestName = 256;

[[nodiscard]] vox::dict levelMessage(LogLevel level);
// A level is cut to 8 bits; Unset when `value` is no integer.
[[nodiscard]] LogLevel asLevel(const vox::object& value);

// The client's half: a message of now with the buffer's text and metadata; a
// note of how many messages were lost here, and how; and the same message with
// what is no UTF-8 as the writers would show it.
[[nodiscard]] vox::dict encode(LogLevel level, LogMessageBuffer&& buffer);
[[nodiscard]] vox::dict noteOf(std::uint64_t count, std::string_view what);
[[nodiscard]] vox::dict repaired(const vox::dict& message);

// The server's half. Lenient: what is missing or of another type counts as empty,
// a time of 0 as now.
[[nodiscard]] std::shared_ptr<LogMessage> decode(const vox::dict& message,
                                                 const std::string& domain);
// Replies, when `message` is a request.
[[nodiscard]] vox::dict replyTo(const vox::dict& message);

// What a message costs whoever holds it, in bytes, about.
[[nodiscard]] std::size_t costOf(const vox::dict& message);

}  // namespace remote_log
}  // namespace plr

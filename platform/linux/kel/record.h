#pragma once

#include <cstddef>
#include <cstdint>
#include <ctime>
#include <string>
#include <string_view>

#include "platform/linux/kel/message.h"

// A message on its way: encoded for the journal, with what the lines of the
// other logs need.
namespace kel {

inline constexpr int kInfo = 6;
inline constexpr int kWarning = 4;

// Who sends; the same for all messages of a client.
struct identity {
    identity(const char* ident, const char* facility);

    std::string name;    // SYSLOG_IDENTIFIER
    int facility;        // of RFC 5424; -1 for none
    std::string domain;  // the "Facility" of messages that have none
    std::string fields;  // what every message begins with, encoded
};

struct record {
    // A part of `bytes`.
    struct part {
        std::size_t at = 0;
        std::size_t length = 0;
    };
    [[nodiscard]] std::string_view view(part wanted) const noexcept {
        return std::string_view(bytes).substr(wanted.at, wanted.length);
    }

    std::string bytes;  // the fields
    part text;
    part domain;
    int priority = kInfo;
    std::time_t when = 0;
    std::uint64_t lost_before = 0;  // messages that were dropped right before this one
};

// 0 to 7, by "Level".
[[nodiscard]] int priority_of(const kel_message& message) noexcept;
[[nodiscard]] record encode(const kel_message& message, const identity& sender);
// What stands in the place of `count` dropped messages.
[[nodiscard]] record encode_gap(std::uint64_t count, const identity& sender);

// The forms of the other logs. Control characters are escaped, so that one
// message is one line.
//
// RFC 3164, without a line feed: <PRI>Mmm dd hh:mm:ss name[pid]: domain: text
[[nodiscard]] std::string syslog_line(const record& message, const identity& sender);
// As systemd reads it from standard error: <N>name[pid]: domain: text
[[nodiscard]] std::string console_line(const record& message, const identity& sender);

}  // namespace kel

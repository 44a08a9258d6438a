#pragma once

#include <cstddef>
#include <cstdint>
#include <cstring>
#include <string>
#include <string_view>
#include <vector>

#include "plr/log/log_level.h"
#include "plr/log/log_message.h"

// The text of one log record:
//
//   record   = time " " level " " domain ": " text *( " {" metadata "}" ) LF
//   level    = one letter, see asChar()
//
// Every line of a text but the first starts with four spaces, so that no text
// can pass for a record. Control characters (C0 but tab, DEL, C1) and bytes that
// are not UTF-8 (RFC 3629) appear as \x and two hexadecimal digits a byte; line
// feeds in domain and metadata do, too. A backslash stands for itself: escapes
// are for reading, not for decoding.
//
// A Sink has put(std::string_view). Nothing here allocates or asks the locale:
// the same code serves a crash. Hot path: bench/log_cases.h.
namespace plr {

struct Record {
    std::string_view time;
    LogLevel level;
    std::string_view domain;
    std::string_view text;
    const std::vector<std::string>* metaData;  // a loan; may be null
    std::string_view paint;                    // a terminal's escape sequence; may be empty
};

namespace record_text {

// The length of the longest start of `text` that may be copied: no control
// character but tab, UTF-8 throughout.
[[nodiscard]] std::size_t plainPrefix(std::string_view text) noexcept;

// Whether all bytes are printable ASCII.
[[nodiscard]] inline bool isPlain(std::string_view text) noexcept {
    constexpr std::uint64_t kOnes = 0x0101010101010101;
    constexpr std::uint64_t kHigh = kOnes * 0x80;
    const auto suspects = [](std::uint64_t word) {
        // High bits: bytes above 0x7F, those below 0x20, and 0x7F. A borrow can only
        // come from a byte that is a suspect itself.
        const std::uint64_t deletes = word ^ (kOnes * 0x7F);
        return (word | (word - kOnes * 0x20) | (deletes - kOnes)) & kHigh;
    };
    std::uint64_t found = 0;
    const char* at = text.data();
    std::size_t left = text.size();
    for (; left >= 8; at += 8, left -= 8) {
        std::uint64_t word = 0;
        std::memcpy(&word, at, 8);
        found |= suspects(word);
    }
    std::uint64_t word = kOnes * ' ';
    std::memcpy(&word, at, left);
    return (found | suspects(word)) == 0;
}

inline constexpr std::string_view kContinuation = "\n    ";

template <class Sink>
[[gnu::noinline]] void putEscaped(Sink& sink, std::string_view text, std::string_view lineFeed) {
    while (!text.empty()) {
        const std::size_t plain = plainPrefix(text);
        sink.put(text.substr(0, plain));
        text.remove_prefix(plain);
        if (text.empty())
            return;
        const auto byte = static_cast<unsigned char>(text.front());
        text.remove_prefix(1);
        if (byte == '\n' && !lineFeed.empty()) {
            sink.put(lineFeed);
            continue;
        }
        constexpr const char* kDigits = "0123456789abcdef";
        const char escape[] = {'\\', 'x', kDigits[byte >> 4], kDigits[byte & 15]};
        sink.put({escape, sizeof escape});
    }
}

// `lineFeed` stands in for line feeds, which are escaped when it is empty.
template <class Sink>
void putSafely(Sink& sink, std::string_view text, std::string_view lineFeed) {
    if (isPlain(text)) [[likely]]
        sink.put(text);
    else
        putEscaped(sink, text, lineFeed);
}

template <class Sink>
void putLevelAndDomain(Sink& sink, const Record& record) {
    const char level[] = {asChar(record.level), ' '};
    sink.put({level, sizeof level});
    putSafely(sink, record.domain, {});
}

template <class Sink>
void putRecord(Sink& sink, const Record& record) {
    sink.put(record.time);
    sink.put(" ");
    if (record.paint.empty()) [[likely]] {
        putLevelAndDomain(sink, record);
    } else {
        sink.put(record.paint);
        putLevelAndDomain(sink, record);
        sink.put("\x1b[0m");
    }
    sink.put(": ");
    putSafely(sink, record.text, kContinuation);
    if (record.metaData != nullptr)
        for (const std::string& item : *record.metaData) {
            sink.put(" {");
            putSafely(sink, item, {});
            sink.put("}");
        }
    sink.put("\n");
}

}  // namespace record_text
}  // namespace plr

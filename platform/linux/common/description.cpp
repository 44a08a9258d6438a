#include "platform/linux/common/description.h"

#include <time.h>

#include <algorithm>
#include <cinttypes>
#include <cstdarg>
#include <cstdio>

#include "platform/linux/vox/codec.h"

namespace description {
namespace {

constexpr std::size_t kMostData = 64;  // bytes of one data value that are shown

}  // namespace

void append_format(std::string& out, const char* format, ...) {
    char text[64];
    va_list arguments;
    va_start(arguments, format);
    const int length = std::vsnprintf(text, sizeof text, format, arguments);
    va_end(arguments);
    out.append(text, static_cast<std::size_t>(std::clamp(length, 0, int{sizeof text} - 1)));
}

void append_text(std::string& out, std::string_view text, bool quoted) {
    const bool valid =
        vox_wire::is_utf8({reinterpret_cast<const std::uint8_t*>(text.data()), text.size()});
    std::size_t room = out.size() < kMostBytes ? kMostBytes - out.size() : 0;
    while (room > 0 && room < text.size() &&
           (static_cast<unsigned char>(text[room]) & 0xc0) == 0x80)
        room--;  // no part of a character
    const char* const quote = quoted ? "\"" : "";
    out += quote;
    for (const char c : text.substr(0, room)) {
        const auto byte = static_cast<unsigned char>(c);
        if (quoted && (c == '"' || c == '\\'))
            (out += '\\') += c;
        else if (byte < 0x20 || byte == 0x7f || (byte >= 0x80 && !valid))
            append_format(out, "\\x%02x", byte);
        else
            out += c;
    }
    if (text.size() > room)
        out += "…";
    out += quote;
}

void append_data(std::string& out, std::string_view data) {
    append_format(out, "<%zu bytes", data.size());
    for (const char c : data.substr(0, kMostData))
        append_format(out, " %02x", static_cast<unsigned char>(c));
    out += data.size() > kMostData ? " …>" : ">";
}

void append_date(std::string& out, std::int64_t nanoseconds) {
    std::int64_t part = nanoseconds % 1'000'000'000;
    time_t seconds = nanoseconds / 1'000'000'000;
    if (part < 0) {
        part += 1'000'000'000;
        seconds--;
    }
    tm utc;
    gmtime_r(&seconds, &utc);
    char text[32];
    strftime(text, sizeof text, "%Y-%m-%dT%H:%M:%S", &utc);
    out += text;
    append_format(out, ".%09" PRId64 "Z", part);
}

}  // namespace description

#pragma once

#include <charconv>
#include <cstddef>
#include <cstdint>
#include <string_view>

#include "plr/log/log_message.h"
#include "src/log/record_text.h"
#include "src/log/time_text.h"

namespace plr {

// How one writer's records look. Threads: one at a time.
class RecordFormat {
  public:
    using Offset = TimeText::Offset;
    struct Style {
        TimeText::Zone zone;
        bool timeOfDayOnly = false;
        bool coloured = false;  // level and domain, in the level's colour
    };

    explicit RecordFormat(Style style) noexcept : time_(style.zone), style_(style) {}

    // Async-signal-safe when the sink is and the offset is kept.
    template <class Sink>
    void put(Sink& sink, const LogMessage& message, Offset offset = Offset::Ask) {
        const LogLevel level = message.getLevel();
        record_text::putRecord(
            sink, {shown(time_.render(message.getTimeStamp(), offset)), level, message.getDomain(),
                   message.getText(), &message.getMetaData(), paint(level)});
    }
    // "Note: 17 log messages dropped", then `why`, under the domain "log".
    template <class Sink>
    void putNote(Sink& sink, TimeStamp time, std::uint64_t dropped, std::string_view why,
                 Offset offset = Offset::Ask) {
        char text[160] = "Note: ";
        char* end = std::to_chars(text + 6, text + 32, dropped).ptr;
        for (const std::string_view part : {std::string_view(" log messages dropped"), why})
            end += part.copy(end, static_cast<std::size_t>(text + sizeof text - end));
        record_text::putRecord(sink, {shown(time_.render(time, offset)),
                                      LogLevel::Info,
                                      "log",
                                      {text, static_cast<std::size_t>(end - text)},
                                      nullptr,
                                      {}});
    }

  private:
    [[nodiscard]] std::string_view shown(std::string_view time) const noexcept {
        return style_.timeOfDayOnly ? time.substr(TimeText::kTimeOfDay, TimeText::kTimeOfDayLength)
                                    : time;
    }
    // ECMA-48, "select graphic rendition".
    [[nodiscard]] std::string_view paint(LogLevel level) const noexcept {
        if (!style_.coloured)
            return {};
        if (level >= LogLevel::Error)
            return level >= LogLevel::Fatal ? "\x1b[1;31m" : "\x1b[31m";
        if (level >= LogLevel::Notice)
            return level >= LogLevel::Warn ? "\x1b[33m" : "\x1b[36m";
        return level >= LogLevel::Info ? "\x1b[32m" : "\x1b[2m";
    }

    TimeText time_;
    const Style style_;
};

}  // namespace plr

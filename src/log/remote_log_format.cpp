#include "src/log/remote_log_format.h"

#include <utility>

#include "plr/concurrency/clock.h"
#include "plr/ipc/array.h"
#include "plr/ipc/read.h"
#include "plr/ipc/values.h"
#include "plr/log/log_message_buffer.h"
#include "src/log/record_text.h"

namespace plr::remote_log {
namespace {

// Beside the bytes of its texts; an item of metadata is a string as well.
constexpr std::size_t kMessageCost = 256;
constexpr std::size_t kItemCost = 64;

vox::object safeText(const vox::object& text) {
    struct Sink {
        std::string text;
        void put(std::string_view piece) { text += piece; }
    } sink;
    record_text::putSafely(sink, text.text(), "\n");
    return vox::string(std::string_view(sink.text));
}

}  // namespace

vox::dict levelMessage(LogLevel level) {
    vox::dict message = vox::dict::create();
    message[kLoggerLevel] = vox::int64(static_cast<std::uint8_t>(level));
    return message;
}

LogLevel asLevel(const vox::object& value) {
    return static_cast<LogLevel>(static_cast<std::uint8_t>(vox::dyn_cast_or_default(value, 0LL)));
}

// Hot path: bench/log_remote.cpp.
vox::dict encode(LogLevel level, LogMessageBuffer&& buffer) {
    const std::string text = buffer.takeString();
    const std::vector<std::string> items = buffer.takeMetadata();
    vox::dict message = vox::dict::create();
    message[kLogMessageLevel] = vox::int64(static_cast<std::uint8_t>(level));
    message[kLogMessage] = vox::string(std::string_view(text));
    message[kLogMessageTimestamp] =
        vox::int64(static_cast<std::int64_t>(Clock::now_in_nanoseconds()));
    if (!items.empty()) {
        const vox::array metadata = vox::array::create();
        for (const std::string& item : items)
            metadata.append(vox::string(std::string_view(item)));
        message[kLogMessageMetadata] = metadata;
    }
    return message;
}

vox::dict noteOf(std::uint64_t count, std::string_view what) {
    LogMessageBuffer text;
    text << "Note: " << count << " log messages dropped, " << what;
    return encode(LogLevel::Warn, std::move(text));
}

vox::dict repaired(const vox::dict& message) {
    vox::dict copy = vox::dict::create();
    copy[kLogMessageLevel] = message[kLogMessageLevel];
    copy[kLogMessage] = safeText(message[kLogMessage]);
    copy[kLogMessageTimestamp] = message[kLogMessageTimestamp];
    if (const vox::array items = message[kLogMessageMetadata]) {
        const vox::array metadata = vox::array::create();
        for (std::size_t i = 0; i < items.count(); ++i)
            metadata.append(safeText(items[i]));
        copy[kLogMessageMetadata] = metadata;
    }
    return copy;
}

// Hot path: bench/log_remote.cpp.
std::shared_ptr<LogMessage> decode(const vox::dict& message, const std::string& domain) {
    LogMessageBuffer content;
    content << message.text(kLogMessage);
    const vox::array items = message[kLogMessageMetadata];
    for (std::size_t i = 0; i < items.count(); ++i)
        content.addMetaData(std::string(items[i].text()));
    TimeStamp time = vox::dyn_cast_or_default(message[kLogMessageTimestamp], 0LL);
    if (time == 0)
        time = static_cast<TimeStamp>(Clock::now_in_nanoseconds());
    return LogMessage::create(time, asLevel(message[kLogMessageLevel]), domain, std::move(content));
}

vox::dict replyTo(const vox::dict& message) {
    return vox::object::adopt(vox_dictionary_create_reply(message.get()));
}

// Hot path: bench/log_remote.cpp.
std::size_t costOf(const vox::dict& message) {
    std::size_t cost = kMessageCost + message.text(kLogMessage).size();
    const vox::array items = message[kLogMessageMetadata];
    for (std::size_t i = 0; i < items.count(); ++i)
        cost += kItemCost + items[i].text().size();
    return cost;
}

}  // namespace plr::remote_log

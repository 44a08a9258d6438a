#include "plr/log/log_message.h"

#include <array>
#include <cstddef>

#include "plr/log/log_message_buffer.h"
#include "src/base/magazines.h"
#include "src/log/log_message_lock.h"

namespace plr {

LogMessage::LogMessage(TimeStamp timeStamp, LogLevel level, std::string domain, std::string&& text,
                       std::vector<std::string>&& metaData) noexcept
    : timeStamp_(timeStamp),
      level_(level),
      domain_(std::move(domain)),
      text_(std::move(text)),
      metaData_(std::move(metaData)) {}

LogMessage::LogMessage(const LogMessage& other) = default;

LogMessage::~LogMessage() = default;

// Records that are used again and again: a message, the room of its texts, and
// the place of its shared_ptr's counts.
class LogMessageStore {
  public:
    // `fill` sets the fields of an empty message.
    template <class Fill>
    [[nodiscard]] static std::shared_ptr<LogMessage> make(Fill&& fill) {
        Record* const record = take();
        try {
            fill(record->message);
        } catch (...) {
            give(record);
            throw;
        }
        return {&record->message, Empty{}, Place<std::byte>{record}};
    }

    static detail::BriefMutex& lock() noexcept { return Records::depotLock(); }

  private:
    static constexpr std::size_t kCounts = 64;      // bytes; more than any implementation takes
    static constexpr std::size_t kKeptRoom = 1024;  // bytes of text

    struct Record {
        LogMessage message{0, LogLevel::Unset, {}, {}, {}};
        alignas(std::max_align_t) std::array<std::byte, kCounts> counts;
    };
    struct Source {
        static constexpr std::size_t kMagazine = 63;
        static constexpr std::size_t kDepotMagazines = 128;  // 8064 records

        static void fill(std::array<Record*, kMagazine>& places) {
            std::size_t made = 0;
            try {
                for (; made < kMagazine; ++made)
                    places[made] = new Record;
            } catch (...) {
                while (made != 0)
                    delete places[--made];
                throw;
            }
        }
        static void discard(Record* record) noexcept { delete record; }
    };
    using Records = detail::Magazines<Record, Source>;

    // When the last owner goes: what the message held goes too, apart from room.
    struct Empty {
        void operator()(LogMessage* message) const noexcept {
            clear(message->text_);
            clear(message->domain_);
            message->metaData_.clear();
        }
        static void clear(std::string& text) noexcept {
            if (text.capacity() > kKeptRoom)
                std::string().swap(text);
            else
                text.clear();
        }
    };

    // An allocator whose one allocation is the record's place for the counts; the
    // record is free when they are.
    template <class Value>
    struct Place {
        using value_type = Value;
        explicit Place(Record* of) noexcept : record(of) {}
        template <class Other>
        Place(const Place<Other>& other) noexcept : record(other.record) {}
        [[nodiscard]] Value* allocate(std::size_t count) noexcept {
            static_assert(sizeof(Value) <= kCounts && alignof(Value) <= alignof(std::max_align_t));
            static_cast<void>(count);
            return reinterpret_cast<Value*>(record->counts.data());
        }
        void deallocate(Value* /*place*/, std::size_t /*count*/) noexcept { give(record); }
        friend bool operator==(const Place&, const Place&) noexcept = default;
        Record* record;
    };

    static Record* take() {
        if constexpr (detail::kRecycle)
            return Records::take();
        else
            return new Record;
    }
    static void give(Record* record) noexcept {
        if constexpr (detail::kRecycle)
            Records::give(record);
        else
            delete record;
    }
};

detail::BriefMutex& detail::logMessageLock() noexcept {
    return LogMessageStore::lock();
}

void LogMessage::takeFrom(LogMessageBuffer& buffer) {
    metaData_.swap(buffer.metaData_);
    if (buffer.stream_ || !buffer.text_.empty()) [[unlikely]] {
        text_ = buffer.takeString();
        return;
    }
    text_ = buffer.inPlace();
    buffer.inPlaceLength_ = 0;
}

// Hot path: bench/log_cases.h.
std::shared_ptr<LogMessage> LogMessage::create(TimeStamp timeStamp, LogLevel level,
                                               const std::string& domain,
                                               LogMessageBuffer&& buffer) {
    return LogMessageStore::make([&](LogMessage& message) {
        message.timeStamp_ = timeStamp;
        message.level_ = level;
        message.domain_ = domain;
        message.takeFrom(buffer);
    });
}

}  // namespace plr

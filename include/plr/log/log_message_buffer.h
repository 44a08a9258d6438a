#pragma once

#include <concepts>
#include <cstdarg>
#include <memory>
#include <ostream>
#include <sstream>
#include <string>
#include <string_view>
#include <type_traits>
#include <utility>
#include <vector>

#include "ob/ob.h"
#include "plr/base/export.h"

// A LogMessageBuffer is where the text and metadata of one message are composed:
//
//     if (logger.enabled(LogLevel::Info)) {
//         LogMessageBuffer buffer;
//         buffer << "cell " << cell << ", " << dBm << " dBm" << MetaData("band=" + band);
//         logger.forceLog(LogLevel::Info, std::move(buffer));
//     }
//
// Owner:   the caller, usually on the stack; a logger takes its contents.
// Threads: one at a time.
// Cost:    text and numbers are written into the buffer itself, up to kInPlace
//          bytes without an allocation. A standard stream is made when somebody
//          asks for it, by a manipulator or by the conversion to std::ostream&.
//
// Numbers appear as a new std::ostringstream writes them, in the global locale,
// with boolalpha and without skipws; a stream that exists keeps its formatting.
namespace plr {

// Marks a text as metadata for operator<<.
struct MetaData {
    explicit MetaData(std::string item) : text(std::move(item)) {}
    std::string text;
};

class PLR_EXPORT LogMessageBuffer {
  public:
    // Longer texts go to the heap.
    static constexpr std::size_t kInPlace = 120;

    LogMessageBuffer() noexcept {}
    // Formats as printf(3) does.
    [[nodiscard, gnu::format(printf, 1, 2)]] static LogMessageBuffer createWithFormat(
        const char* format, ...);
    [[nodiscard, gnu::format(printf, 1, 0)]] static LogMessageBuffer vCreateWithFormat(
        const char* format, va_list arguments);
    // The same as vCreateWithFormat(): a new buffer.
    [[nodiscard, gnu::format(printf, 1, 0)]] static LogMessageBuffer vprintf(const char* format,
                                                                             va_list arguments);
    // Formats as the platform's string objects do: printf's conversions and %@
    // for an object. A null format gives an empty buffer.
    [[nodiscard]] static LogMessageBuffer createWithObFormat(ObString* format, ...);
    [[nodiscard]] static LogMessageBuffer vCreateWithObFormat(ObString* format, va_list arguments);

    // The copy has the text that the other one's str() would give, and no stream.
    LogMessageBuffer(const LogMessageBuffer& other);
    LogMessageBuffer(LogMessageBuffer&& other) noexcept;
    LogMessageBuffer& operator=(LogMessageBuffer other) noexcept;
    ~LogMessageBuffer() = default;
    void swap(LogMessageBuffer& other) noexcept;

    // Nothing was put in. Deliberate: false from the moment a stream was made,
    // even when nothing was written to it; a cheap test.
    [[nodiscard]] bool empty() const noexcept {
        return !stream_ && inPlaceLength_ == 0 && text_.empty();
    }

    // Ends the stream, if there is one, and returns the text; a loan.
    const std::string& str();
    // The same, for moving out; empty texts remain.
    [[nodiscard]] std::string&& takeString();
    [[nodiscard]] std::vector<std::string>&& takeMetadata() noexcept;

    // The stream behind the buffer, made now if need be; a loan until str(), a
    // merge or the buffer's end.
    operator std::ostream&();

    // Hot path: bench/log_cases.h.
    void appendString(std::string_view text) {
        if (stream_ || text.size() > kInPlace - inPlaceLength_) [[unlikely]]
            return appendElsewhere(text);
        text.copy(inPlace_ + inPlaceLength_, text.size());
        inPlaceLength_ += static_cast<unsigned char>(text.size());
    }
    void appendString(const std::string& text) { appendString(std::string_view(text)); }
    // Null appends "(null)".
    void appendString(const char* text) { appendString(std::string_view(text ? text : "(null)")); }
    void appendChar(char character) { appendString(std::string_view(&character, 1)); }

    void addMetaData(std::string item);
    void addMetaData(MetaData item);

    // Appends text and metadata of the other one, which keeps its own in the
    // first form.
    void merge(const LogMessageBuffer& other);
    void merge(LogMessageBuffer&& other);

    // As a stream would write them; a stream that exists may show a number of each
    // type in another way (std::hex).
    void appendNumber(int number);
    void appendNumber(unsigned int number);
    void appendNumber(long number);
    void appendNumber(unsigned long number);
    void appendNumber(long long number);
    void appendNumber(unsigned long long number);
    void appendNumber(float number);
    void appendNumber(double number);
    void appendPointer(const void* pointer);

  private:
    friend class LogMessage;  // takes what is in place

    [[nodiscard]] std::string_view inPlace() const noexcept { return {inPlace_, inPlaceLength_}; }
    void appendElsewhere(std::string_view text);
    void appendContentOf(const LogMessageBuffer& other);
    void moveToText();
    template <class Number>
    void insert(Number number);
    [[nodiscard]] bool hasClassicNumbers();
    std::ostream& makeStream();

    enum class Numbers : unsigned char { Unknown, Classic, Localised };

    // The text is text_ and then what is in place; or the stream's while there is
    // one.
    std::string text_;
    std::unique_ptr<std::ostringstream> stream_;
    std::vector<std::string> metaData_;
    Numbers numbers_ = Numbers::Unknown;  // how they are written without a stream
    unsigned char inPlaceLength_ = 0;
    char inPlace_[kInPlace];
};

inline LogMessageBuffer& operator<<(LogMessageBuffer& buffer, const std::string& text) {
    buffer.appendString(std::string_view(text));
    return buffer;
}
inline LogMessageBuffer& operator<<(LogMessageBuffer& buffer, const char* text) {
    buffer.appendString(text);
    return buffer;
}
inline LogMessageBuffer& operator<<(LogMessageBuffer& buffer, std::string_view text) {
    buffer.appendString(text);
    return buffer;
}
inline LogMessageBuffer& operator<<(LogMessageBuffer& buffer, char character) {
    buffer.appendChar(character);
    return buffer;
}
// "true" or "false", whatever the stream's formatting.
inline LogMessageBuffer& operator<<(LogMessageBuffer& buffer, bool value) {
    buffer.appendString(std::string_view(value ? "true" : "false"));
    return buffer;
}
inline LogMessageBuffer& operator<<(LogMessageBuffer& buffer, int number) {
    buffer.appendNumber(number);
    return buffer;
}
inline LogMessageBuffer& operator<<(LogMessageBuffer& buffer, unsigned int number) {
    buffer.appendNumber(number);
    return buffer;
}
inline LogMessageBuffer& operator<<(LogMessageBuffer& buffer, long number) {
    buffer.appendNumber(number);
    return buffer;
}
inline LogMessageBuffer& operator<<(LogMessageBuffer& buffer, unsigned long number) {
    buffer.appendNumber(number);
    return buffer;
}
inline LogMessageBuffer& operator<<(LogMessageBuffer& buffer, long long number) {
    buffer.appendNumber(number);
    return buffer;
}
inline LogMessageBuffer& operator<<(LogMessageBuffer& buffer, unsigned long long number) {
    buffer.appendNumber(number);
    return buffer;
}
inline LogMessageBuffer& operator<<(LogMessageBuffer& buffer, float number) {
    buffer.appendNumber(number);
    return buffer;
}
inline LogMessageBuffer& operator<<(LogMessageBuffer& buffer, double number) {
    buffer.appendNumber(number);
    return buffer;
}
inline LogMessageBuffer& operator<<(LogMessageBuffer& buffer, const void* pointer) {
    buffer.appendPointer(pointer);
    return buffer;
}
inline LogMessageBuffer& operator<<(LogMessageBuffer& buffer, MetaData item) {
    buffer.addMetaData(std::move(item));
    return buffer;
}
inline LogMessageBuffer& operator<<(LogMessageBuffer& buffer,
                                    std::ostream& (*manipulator)(std::ostream&)) {
    manipulator(buffer);
    return buffer;
}
inline LogMessageBuffer& operator<<(LogMessageBuffer& buffer,
                                    std::ios_base& (*manipulator)(std::ios_base&)) {
    manipulator(static_cast<std::ostream&>(buffer));
    return buffer;
}
inline LogMessageBuffer& operator<<(LogMessageBuffer& buffer, const LogMessageBuffer& other) {
    buffer.merge(other);
    return buffer;
}
inline LogMessageBuffer& operator<<(LogMessageBuffer& buffer, LogMessageBuffer&& other) {
    buffer.merge(std::move(other));
    return buffer;
}
// The object's text in UTF-8; "<nil>" for null.
PLR_EXPORT LogMessageBuffer& operator<<(LogMessageBuffer& buffer, ObString* string);
PLR_EXPORT LogMessageBuffer& operator<<(LogMessageBuffer& buffer, ObNumber* number);

// Whatever else a standard stream takes: std::setw(), your own types. (The buffer's
// type is deduced so that asking a stream for its operators does not end up here.)
template <class T>
concept Streamable = (std::is_class_v<T> || std::is_enum_v<T>)&&requires(std::ostream& stream,
                                                                         const T& value) {
    stream << value;
};
template <std::same_as<LogMessageBuffer> Buffer, Streamable T>
Buffer& operator<<(Buffer& buffer, const T& value) {
    static_cast<std::ostream&>(buffer) << value;
    return buffer;
}

// For composing in one expression: forceLog(level, LogMessageBuffer() << "cell " << cell).
template <class T>
LogMessageBuffer&& operator<<(LogMessageBuffer&& buffer, T&& value) {
    buffer << std::forward<T>(value);
    return std::move(buffer);
}

}  // namespace plr

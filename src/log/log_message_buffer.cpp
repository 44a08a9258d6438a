#include "plr/log/log_message_buffer.h"

#include <charconv>
#include <cstdio>
#include <iterator>
#include <locale>

namespace plr {
namespace {

// Texts of up to this length are formatted in one pass.
constexpr std::size_t kFirstAttempt = 64;

// Without a stream, numbers are written here as a new stream would: in the
// global locale, which may group digits or have a comma for a point.
bool numbersAreClassic() {
    return std::locale() == std::locale::classic();
}

}  // namespace

LogMessageBuffer::LogMessageBuffer() noexcept = default;

LogMessageBuffer LogMessageBuffer::vCreateWithFormat(const char* format, va_list arguments) {
    LogMessageBuffer buffer;
    std::string& text = buffer.text_;
    text.resize(kFirstAttempt);
    va_list again;
    va_copy(again, arguments);
    const int length = std::vsnprintf(text.data(), text.size(), format, arguments);
    const std::size_t needed = length > 0 ? static_cast<std::size_t>(length) : 0;
    if (needed >= text.size()) {
        text.resize(needed + 1);
        std::vsnprintf(text.data(), text.size(), format, again);
    }
    va_end(again);
    text.resize(needed);
    return buffer;
}

LogMessageBuffer LogMessageBuffer::createWithFormat(const char* format, ...) {
    va_list arguments;
    va_start(arguments, format);
    LogMessageBuffer buffer = vCreateWithFormat(format, arguments);
    va_end(arguments);
    return buffer;
}

LogMessageBuffer LogMessageBuffer::vprintf(const char* format, va_list arguments) {
    return vCreateWithFormat(format, arguments);
}

LogMessageBuffer::LogMessageBuffer(const LogMessageBuffer& other)
    : text_(other.content()), metaData_(other.metaData_) {}

LogMessageBuffer::LogMessageBuffer(LogMessageBuffer&& other) noexcept : LogMessageBuffer() {
    swap(other);
}

LogMessageBuffer& LogMessageBuffer::operator=(LogMessageBuffer other) noexcept {
    swap(other);
    return *this;
}

LogMessageBuffer::~LogMessageBuffer() = default;

void LogMessageBuffer::swap(LogMessageBuffer& other) noexcept {
    text_.swap(other.text_);
    stream_.swap(other.stream_);
    metaData_.swap(other.metaData_);
}

std::string_view LogMessageBuffer::content() const noexcept {
    return stream_ ? stream_->view() : std::string_view(text_);
}

const std::string& LogMessageBuffer::str() {
    if (stream_) {
        text_ = stream_->view();
        stream_.reset();
    }
    return text_;
}

std::string&& LogMessageBuffer::takeString() {
    str();
    return std::move(text_);
}

std::vector<std::string>&& LogMessageBuffer::takeMetadata() noexcept {
    return std::move(metaData_);
}

std::ostream& LogMessageBuffer::makeStream() {
    auto made = std::make_unique<std::ostringstream>();
    made->unsetf(std::ios_base::skipws);
    made->setf(std::ios_base::boolalpha);
    made->write(text_.data(), static_cast<std::streamsize>(text_.size()));
    stream_ = std::move(made);
    return *stream_;
}

LogMessageBuffer::operator std::ostream&() {
    return stream_ ? *stream_ : makeStream();
}

void LogMessageBuffer::append(std::string_view text) {
    text_.append(text);
}

void LogMessageBuffer::appendString(std::string_view text) {
    if (stream_)
        stream_->write(text.data(), static_cast<std::streamsize>(text.size()));
    else
        append(text);
}

void LogMessageBuffer::appendString(const char* text) {
    appendString(std::string_view(text ? text : "(null)"));
}

void LogMessageBuffer::appendChar(char character) {
    appendString(std::string_view(&character, 1));
}

void LogMessageBuffer::addMetaData(std::string item) {
    metaData_.push_back(std::move(item));
}

void LogMessageBuffer::addMetaData(MetaData item) {
    addMetaData(std::move(item.text));
}

void LogMessageBuffer::merge(const LogMessageBuffer& other) {
    if (&other == this)
        return merge(LogMessageBuffer(other));
    str();
    append(other.content());
    metaData_.insert(metaData_.end(), other.metaData_.begin(), other.metaData_.end());
}

void LogMessageBuffer::merge(LogMessageBuffer&& other) {
    str();
    append(other.str());
    metaData_.insert(metaData_.end(), std::make_move_iterator(other.metaData_.begin()),
                     std::make_move_iterator(other.metaData_.end()));
}

// Hot path: bench/log_cases.h.
template <class Number>
void LogMessageBuffer::insert(Number number) {
    if (stream_ || !numbersAreClassic()) {
        static_cast<std::ostream&>(*this) << number;
        return;
    }
    char digits[32];
    std::to_chars_result end{};
    if constexpr (std::is_floating_point_v<Number>)
        end = std::to_chars(digits, std::end(digits), number, std::chars_format::general, 6);
    else
        end = std::to_chars(digits, std::end(digits), number);
    append(std::string_view(digits, static_cast<std::size_t>(end.ptr - digits)));
}

void LogMessageBuffer::appendNumber(long long number) {
    insert(number);
}
void LogMessageBuffer::appendNumber(unsigned long long number) {
    insert(number);
}
void LogMessageBuffer::appendNumber(float number) {
    insert(static_cast<double>(number));
}
void LogMessageBuffer::appendNumber(double number) {
    insert(number);
}

void LogMessageBuffer::appendPointer(const void* pointer) {
    static_cast<std::ostream&>(*this) << pointer;
}

}  // namespace plr

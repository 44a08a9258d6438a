#include "plr/log/log_message_buffer.h"

#include <algorithm>
#include <charconv>
#include <cstdio>
#include <iterator>
#include <locale>

namespace plr {
namespace {

// Texts of up to this length are formatted in one pass.
constexpr std::size_t kFirstAttempt = 64;

// A used stream is kept for the thread's next buffer that needs one, unless its
// text grew beyond this many bytes.
constexpr std::size_t kKeptRoom = 1024;

struct Spare {
    std::unique_ptr<std::ostringstream> stream;
    ~Spare();
};
thread_local constinit bool spareEnded = false;
thread_local Spare spare;
Spare::~Spare() {
    spareEnded = true;
}

std::unique_ptr<std::ostringstream> takeStream() {
    if (spareEnded || !spare.stream)
        return std::make_unique<std::ostringstream>();
    return std::move(spare.stream);
}

// Leaves nothing that could be told from a new stream.
void keepStream(std::unique_ptr<std::ostringstream> used) {
    static const std::ios pristine(nullptr);
    std::ios& base = *used;
    if (spareEnded || spare.stream || base.rdbuf() != used->rdbuf() ||
        used->view().size() > kKeptRoom)
        return;
    base.exceptions(std::ios_base::goodbit);
    base.clear();
    base.copyfmt(pristine);
    used->str({});
    spare.stream = std::move(used);
}

}  // namespace

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

LogMessageBuffer LogMessageBuffer::vCreateWithObFormat(ObString* format, va_list arguments) {
    LogMessageBuffer buffer;
    if (!format)
        return buffer;
    ObString* const text = ob_string_create_with_format_arguments(format, arguments);
    buffer << text;
    ob_release(text);
    return buffer;
}

LogMessageBuffer LogMessageBuffer::createWithObFormat(ObString* format, ...) {
    va_list arguments;
    va_start(arguments, format);
    LogMessageBuffer buffer = vCreateWithObFormat(format, arguments);
    va_end(arguments);
    return buffer;
}

LogMessageBuffer::LogMessageBuffer(const LogMessageBuffer& other) : metaData_(other.metaData_) {
    appendContentOf(other);
}

LogMessageBuffer::LogMessageBuffer(LogMessageBuffer&& other) noexcept : LogMessageBuffer() {
    swap(other);
}

LogMessageBuffer& LogMessageBuffer::operator=(LogMessageBuffer other) noexcept {
    swap(other);
    return *this;
}

void LogMessageBuffer::swap(LogMessageBuffer& other) noexcept {
    text_.swap(other.text_);
    stream_.swap(other.stream_);
    metaData_.swap(other.metaData_);
    std::swap(numbers_, other.numbers_);
    std::swap_ranges(inPlace_, inPlace_ + std::max(inPlaceLength_, other.inPlaceLength_),
                     other.inPlace_);
    std::swap(inPlaceLength_, other.inPlaceLength_);
}

const std::string& LogMessageBuffer::str() {
    numbers_ = Numbers::Unknown;
    if (stream_) {
        text_ = stream_->view();
        keepStream(std::move(stream_));
    } else {
        moveToText();
    }
    return text_;
}

void LogMessageBuffer::moveToText() {
    text_.append(inPlace());
    inPlaceLength_ = 0;
}

std::string&& LogMessageBuffer::takeString() {
    str();
    return std::move(text_);
}

std::vector<std::string>&& LogMessageBuffer::takeMetadata() noexcept {
    return std::move(metaData_);
}

std::ostream& LogMessageBuffer::makeStream() {
    auto made = takeStream();
    made->imbue(std::locale());
    made->unsetf(std::ios_base::skipws);
    made->setf(std::ios_base::boolalpha);
    moveToText();
    made->write(text_.data(), static_cast<std::streamsize>(text_.size()));
    stream_ = std::move(made);
    return *stream_;
}

LogMessageBuffer::operator std::ostream&() {
    return stream_ ? *stream_ : makeStream();
}

void LogMessageBuffer::appendElsewhere(std::string_view text) {
    if (stream_) {
        stream_->write(text.data(), static_cast<std::streamsize>(text.size()));
        return;
    }
    moveToText();
    text_.append(text);
}

void LogMessageBuffer::appendContentOf(const LogMessageBuffer& other) {
    if (other.stream_)
        return appendString(other.stream_->view());
    appendString(other.text_);
    appendString(other.inPlace());
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
    appendContentOf(other);
    metaData_.insert(metaData_.end(), other.metaData_.begin(), other.metaData_.end());
}

void LogMessageBuffer::merge(LogMessageBuffer&& other) {
    str();
    appendString(other.str());
    metaData_.insert(metaData_.end(), std::make_move_iterator(other.metaData_.begin()),
                     std::make_move_iterator(other.metaData_.end()));
}

// A new stream takes the global locale, which may group digits or have a comma
// for a point. Asked once for each text: it is dearer than the digits.
bool LogMessageBuffer::hasClassicNumbers() {
    static const std::locale& classic = std::locale::classic();
    if (numbers_ == Numbers::Unknown)
        numbers_ = std::locale() == classic ? Numbers::Classic : Numbers::Localised;
    return numbers_ == Numbers::Classic;
}

// Hot path: bench/log_cases.h.
template <class Number>
void LogMessageBuffer::insert(Number number) {
    if (stream_ || !hasClassicNumbers()) {
        static_cast<std::ostream&>(*this) << number;
        return;
    }
    char digits[32];
    std::to_chars_result end{};
    if constexpr (std::is_floating_point_v<Number>)
        end = std::to_chars(digits, std::end(digits), static_cast<double>(number),
                            std::chars_format::general, 6);
    else
        end = std::to_chars(digits, std::end(digits), number);
    appendString(std::string_view(digits, static_cast<std::size_t>(end.ptr - digits)));
}

void LogMessageBuffer::appendNumber(int number) {
    insert(number);
}
void LogMessageBuffer::appendNumber(unsigned int number) {
    insert(number);
}
void LogMessageBuffer::appendNumber(long number) {
    insert(number);
}
void LogMessageBuffer::appendNumber(unsigned long number) {
    insert(number);
}
void LogMessageBuffer::appendNumber(long long number) {
    insert(number);
}
void LogMessageBuffer::appendNumber(unsigned long long number) {
    insert(number);
}
void LogMessageBuffer::appendNumber(float number) {
    insert(number);
}
void LogMessageBuffer::appendNumber(double number) {
    insert(number);
}

void LogMessageBuffer::appendPointer(const void* pointer) {
    static_cast<std::ostream&>(*this) << pointer;
}

LogMessageBuffer& operator<<(LogMessageBuffer& buffer, ObString* string) {
    if (string)
        buffer.appendString(
            std::string_view(ob_string_get_utf8(string), ob_string_get_length(string)));
    else
        buffer.appendString("<nil>");
    return buffer;
}

LogMessageBuffer& operator<<(LogMessageBuffer& buffer, ObNumber* number) {
    if (!number)
        return buffer << "<nil>";
    void* const pool = ob_autorelease_pool_push();
    buffer << ob_number_get_string_value(number);
    ob_autorelease_pool_pop(pool);
    return buffer;
}

}  // namespace plr

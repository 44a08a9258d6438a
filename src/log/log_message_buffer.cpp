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

// Texts start with room for this many bytes, and keep it for the thread's next
// buffer unless they grew beyond the second.
constexpr std::size_t kRoom = 128;
constexpr std::size_t kKeptRoom = 1024;

// What a thread's last buffer left for its next.
struct Spares {
    std::string text;
    std::unique_ptr<std::ostringstream> stream;
    ~Spares();
};
[[gnu::tls_model("initial-exec")]] thread_local constinit bool sparesEnded = false;
[[gnu::tls_model("initial-exec")]] thread_local Spares spares;
Spares::~Spares() {
    sparesEnded = true;
}

std::unique_ptr<std::ostringstream> takeStream() {
    if (sparesEnded || !spares.stream)
        return std::make_unique<std::ostringstream>();
    return std::move(spares.stream);
}

// Leaves nothing that could be told from a new stream.
void keepStream(std::unique_ptr<std::ostringstream> used) {
    static const std::ios pristine(nullptr);
    std::ios& base = *used;
    if (sparesEnded || spares.stream || base.rdbuf() != used->rdbuf() ||
        used->view().size() > kKeptRoom)
        return;
    base.exceptions(std::ios_base::goodbit);
    base.clear();
    base.copyfmt(pristine);
    used->str({});
    spares.stream = std::move(used);
}

}  // namespace

LogMessageBuffer::LogMessageBuffer() noexcept {
    if (!sparesEnded)
        text_.swap(spares.text);
}

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

LogMessageBuffer::~LogMessageBuffer() {
    if (sparesEnded || text_.capacity() < kRoom || text_.capacity() > kKeptRoom)
        return;
    text_.clear();
    spares.text.swap(text_);
}

void LogMessageBuffer::swap(LogMessageBuffer& other) noexcept {
    text_.swap(other.text_);
    stream_.swap(other.stream_);
    metaData_.swap(other.metaData_);
    std::swap(numbers_, other.numbers_);
}

std::string_view LogMessageBuffer::content() const noexcept {
    return stream_ ? stream_->view() : std::string_view(text_);
}

const std::string& LogMessageBuffer::str() {
    numbers_ = Numbers::Unknown;
    if (stream_) {
        text_ = stream_->view();
        keepStream(std::move(stream_));
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
    auto made = takeStream();
    made->imbue(std::locale());
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
    if (text_.capacity() < kRoom) [[unlikely]]
        text_.reserve(std::max(kRoom, text_.size() + text.size()));
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

// A new stream takes the global locale, which may group digits or have a comma
// for a point. Asked once for each text: it is dearer than the digits.
bool LogMessageBuffer::hasClassicNumbers() {
    if (numbers_ == Numbers::Unknown)
        numbers_ = std::locale() == std::locale::classic() ? Numbers::Classic : Numbers::Localised;
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
    append(std::string_view(digits, static_cast<std::size_t>(end.ptr - digits)));
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

}  // namespace plr

#include <algorithm>
#include <array>
#include <cstddef>
#include <cstdint>
#include <cstring>
#include <limits>
#include <string_view>

#include "Pelorin"

// The flat interface's dump. A line is built in a fixed area on the stack, then
// copied to what room is left.
namespace {

constexpr int kDefaultLineLength = 32;
constexpr int kLongestLine = 62;
constexpr std::size_t kCharactersPerByte = 3;  // two digits and a blank
constexpr std::size_t kMostOffset = 8 + 2;     // digits of an offset, two blanks
constexpr std::uint32_t kLineInBuffer = 146;   // of the default length, with room to spare
constexpr std::size_t kLineArea = 256;

// Digits, blanks, characters, line feed, NUL.
static_assert((kLongestLine + 1) * kCharactersPerByte + kLongestLine + 2 <= kLineArea);
static_assert(kMostOffset + (kDefaultLineLength + 1) * kCharactersPerByte + kDefaultLineLength +
                  1 <=
              kLineInBuffer);

// "00 ", "01 " ...; one more character, so that an entry is copied in one step.
constexpr auto kDigitsAndBlank = [] {
    constexpr std::string_view digits = "0123456789ABCDEF";
    std::array<std::array<char, 4>, 256> table{};
    for (std::size_t byte = 0; byte < table.size(); ++byte)
        table[byte] = {digits[byte >> 4], digits[byte & 15], ' ', ' '};
    return table;
}();

constexpr char printable(std::uint8_t byte) {
    return byte >= 0x20 && byte <= 0x7E ? static_cast<char>(byte) : '.';
}

// One line of a dump: the text from `offset` on is what operations see.
class Line {
  public:
    Line(std::size_t position, const std::uint8_t* bytes, std::size_t count, std::size_t lineLength)
        : begin_(writeOffset(position)) {
        char* end = writeDigits(bytes, count);
        const std::size_t blanks = (lineLength + 1 - count) * kCharactersPerByte;
        std::memset(end, ' ', blanks);
        end = std::transform(bytes, bytes + count, end + blanks, printable);
        *end++ = '\n';
        *end = '\0';
        end_ = end;
    }

    [[nodiscard]] const char* withoutOffset() const { return area_.data() + kMostOffset; }
    [[nodiscard]] std::string_view text() const {
        return {begin_, static_cast<std::size_t>(end_ - begin_)};
    }

  private:
    // Leftwards from the digits' place; returns where it begins.
    char* writeOffset(std::size_t position) {
        char* to = area_.data() + kMostOffset;
        *--to = ' ';
        *--to = ' ';
        for (int digits = 0; digits < 4 || position != 0; ++digits, position >>= 4)
            *--to = "0123456789abcdef"[position & 15];
        return to;
    }

    char* writeDigits(const std::uint8_t* bytes, std::size_t count) {
        char* to = area_.data() + kMostOffset;
        for (std::size_t i = 0; i < count; ++i, to += kCharactersPerByte)
            std::memcpy(to, kDigitsAndBlank[bytes[i]].data(), kDigitsAndBlank[0].size());
        return to;
    }

    std::array<char, kMostOffset + kLineArea> area_;
    const char* begin_;
    const char* end_;
};

// Appends what fits at `count` and ends it with a NUL. Returns the new count: `size`
// when the text was cut.
std::uint32_t append(char* out, std::uint32_t size, std::uint32_t count, std::string_view text) {
    const std::uint32_t room = size - count;
    const std::size_t written = std::min<std::size_t>(text.size(), room - 1);
    std::memcpy(out + count, text.data(), written);
    out[count + written] = '\0';
    return written < text.size() ? size : count + static_cast<std::uint32_t>(written);
}

}  // namespace

extern "C" {

std::uint32_t PelorinLogGetBufferSize(std::uint32_t count) {
    const std::uint64_t lines =
        (std::uint64_t{count} + kDefaultLineLength - 1) / kDefaultLineLength;
    return static_cast<std::uint32_t>(std::min<std::uint64_t>(
        lines * kLineInBuffer + 1, std::numeric_limits<std::uint32_t>::max()));
}

std::uint32_t PelorinLogBinaryToBuffer(char* out, std::uint32_t size, const void* data,
                                       std::int32_t length) {
    return PelorinLogBinaryToBufferWithLineLengthAndOperation(out, size, data, length,
                                                              kDefaultLineLength, nullptr);
}

std::uint32_t PelorinLogBinaryToBufferWithLineLengthAndOperation(
    char* out, std::uint32_t size, const void* data, std::int32_t length, std::int32_t lineLength,
    PelorinLogLineOperation* operation) {
    if (size == 0)
        return 0;
    *out = '\0';
    if (length < 1 || lineLength < 1 || lineLength > kLongestLine)
        return 0;
    const auto* const bytes = static_cast<const std::uint8_t*>(data);
    const auto total = static_cast<std::size_t>(length);
    const auto perLine = static_cast<std::size_t>(lineLength);
    std::uint32_t count = 0;
    for (std::size_t position = 0; position < total && count < size; position += perLine) {
        const Line line(position, bytes + position, std::min(total - position, perLine), perLine);
        if (operation && operation->callback)
            operation->callback(operation, line.withoutOffset());
        count = append(out, size, count, line.text());
    }
    return count;
}

}  // extern "C"

#include "plr/format/hex.h"

#include <algorithm>
#include <bit>
#include <cstddef>
#include <limits>
#include <string_view>

#include "Pelorin"
#include "src/format/hex_kernel.h"

namespace plr {
namespace detail {

std::string hexOf(std::uint64_t bits, unsigned digits) {
    const auto needed = static_cast<unsigned>(std::bit_width(bits) + 3) / 4;
    std::string text(std::max(digits, needed), '0');
    for (auto to = text.rbegin(); bits != 0; bits >>= 4, ++to)
        *to = "0123456789abcdef"[bits & 15];
    return text;
}

}  // namespace detail

namespace {

// In every locale the same.
bool isBlank(char character) {
    return character == ' ' || (character >= '\t' && character <= '\r');
}

// Reads the pairs at the front of `text`, at most `most`, and takes them from it.
// False, with nothing taken, when there is none.
bool takePairs(std::string_view& text, std::size_t most, std::uint8_t*& to) {
    const std::size_t pairs =
        hexkernel::decodeHexStrict(to, text.data(), std::min(most, text.size() / 2));
    text.remove_prefix(2 * pairs);
    to += pairs;
    return pairs != 0;
}

// Each of these writes the bytes of `text` from `to` on, and returns whether the text
// is one of its kind.
bool parsePairs(std::string_view text, std::uint8_t*& to) {
    return text.empty() || (takePairs(text, text.size(), to) && text.empty());
}

bool parseBetweenBlanks(std::string_view text, std::uint8_t*& to) {
    for (;;) {
        text.remove_prefix(static_cast<std::size_t>(
            std::find_if_not(text.begin(), text.end(), isBlank) - text.begin()));
        if (text.empty())
            return true;
        if (!takePairs(text, text.size(), to))
            return false;
    }
}

bool parseBetweenSpaces(std::string_view text, std::uint8_t*& to) {
    if (text.empty())
        return true;
    while (takePairs(text, 1, to)) {
        if (text.empty())
            return true;
        if (text.front() != ' ')
            return false;
        text.remove_prefix(1);  // and a pair is to follow
    }
    return false;
}

bool parse(std::string_view text, HexWhitespaceOption option, std::uint8_t*& to) {
    switch (option) {
        case kHexWhitespaceSkip:
            return parseBetweenBlanks(text, to);
        case kHexWhitespaceSingleSpace:
            return parseBetweenSpaces(text, to);
        case kHexWhitespaceNone:
            return parsePairs(text, to);
    }
    return false;
}

}  // namespace

std::string hex(const void* data, unsigned long length) {
    std::string text(2 * length, '\0');
    hexkernel::encodeHex(text.data(), static_cast<const std::uint8_t*>(data), length, true);
    return text;
}

std::string hex(const std::vector<unsigned char>& bytes) {
    return hex(bytes.data(), bytes.size());
}

std::string hex_sp(const void* data, unsigned long length) {
    if (length == 0)
        return {};
    // Written close together at the end, then moved to their places from the front on.
    std::string text(3 * length - 1, ' ');
    const std::size_t digits = text.size() - 2 * length;
    hexkernel::encodeHex(text.data() + digits, static_cast<const std::uint8_t*>(data), length,
                         true);
    for (std::size_t i = 0; i + 1 < length; ++i) {
        text[3 * i] = text[digits + 2 * i];
        text[3 * i + 1] = text[digits + 2 * i + 1];
        text[3 * i + 2] = ' ';
    }
    return text;
}

std::string hex_sp(const std::vector<unsigned char>& bytes) {
    return hex_sp(bytes.data(), bytes.size());
}

std::vector<unsigned char> parse_hex(const std::string& text, HexWhitespaceOption option) {
    return parse_hex(text.data(), text.size(), option);
}

std::vector<unsigned char> parse_hex(const char* text, unsigned long length,
                                     HexWhitespaceOption option) {
    std::vector<unsigned char> bytes(length / 2);
    unsigned char* end = bytes.data();
    if (!parse(std::string_view(text, length), option, end))
        return {};
    bytes.resize(static_cast<std::size_t>(end - bytes.data()));
    return bytes;
}

unsigned int assign(unsigned char* out, const std::string& hexText, unsigned long capacity) {
    constexpr unsigned long greatest = std::numeric_limits<std::uint32_t>::max();
    return PelorinHexToBin(out, static_cast<std::uint32_t>(std::min(capacity, greatest)),
                           hexText.c_str());
}

}  // namespace plr

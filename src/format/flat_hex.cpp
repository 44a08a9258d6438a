#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <cstring>
#include <limits>

#include "Pelorin"
#include "src/format/hex_kernel.h"

// The flat interface's hex text: what limits and odd lengths make of it. The
// digits are the kernel's.
namespace {

constexpr std::uint32_t kGreatest = std::numeric_limits<std::uint32_t>::max();

// Reads the lone low digit in front of a text of odd length; returns 1 if there is one.
std::uint32_t readLoneDigit(std::uint8_t* out, const char* text, std::size_t textLength) {
    if (textLength % 2 == 0)
        return 0;
    *out = static_cast<std::uint8_t>(PelorinDecodeHexWithDefault(*text, 0));
    return 1;
}

}  // namespace

extern "C" {

void PelorinEncodeHex(std::uint8_t byte, char* high, char* low) {
    PelorinEncodeHexWithLowerCase(byte, high, low, false);
}

void PelorinEncodeHexWithLowerCase(std::uint8_t byte, char* high, char* low, bool lowerCase) {
    const char* const digits = lowerCase ? "0123456789abcdef" : "0123456789ABCDEF";
    *high = digits[byte >> 4];
    *low = digits[byte & 15];
}

std::uint32_t PelorinDecodeHexWithDefault(char character, std::uint32_t otherwise) {
    if (character >= '0' && character <= '9')
        return static_cast<std::uint32_t>(character - '0');
    const int lower = character | 0x20;
    if (lower >= 'a' && lower <= 'f')
        return static_cast<std::uint32_t>(lower - 'a' + 10);
    return otherwise;
}

std::uint32_t PelorinBinToHexGetBufferSize(std::uint32_t count) {
    return static_cast<std::uint32_t>(
        std::min<std::uint64_t>(std::uint64_t{count} * 2 + 1, kGreatest));
}

std::uint32_t PelorinBinToHex(char* out, std::uint32_t size, const void* data,
                              std::uint32_t length) {
    return PelorinBinToHexWithLowerCase(out, size, data, length, false);
}

std::uint32_t PelorinBinToHexWithLowerCase(char* out, std::uint32_t size, const void* data,
                                           std::uint32_t length, bool lowerCase) {
    if (size == 0)
        return 0;
    const std::uint32_t bytes = std::min(length, (size - 1) / 2);
    plr::hexkernel::encodeHex(out, static_cast<const std::uint8_t*>(data), bytes, lowerCase);
    out[std::size_t{2} * bytes] = '\0';
    return 2 * bytes + 1;
}

std::uint32_t PelorinHexToBin(void* out, std::uint32_t capacity, const char* text) {
    if (capacity == 0)
        return 0;
    auto* const bytes = static_cast<std::uint8_t*>(out);
    const std::size_t length = std::strlen(text);
    const std::uint32_t lone = readLoneDigit(bytes, text, length);
    const std::size_t pairs = std::min<std::size_t>(capacity - lone, length / 2);
    plr::hexkernel::decodeHex(bytes + lone, text + lone, pairs);
    return static_cast<std::uint32_t>(pairs) + lone;
}

}  // extern "C"

#include "plr/format/byte_dump.h"

#include <algorithm>
#include <cstdint>
#include <limits>
#include <string_view>

#include "Pelorin"
#include "plr/format/binary.h"
#include "plr/format/hex.h"
#include "src/format/hex_kernel.h"

namespace plr {
namespace {

constexpr std::size_t kBytesPerLine = 8;
constexpr std::size_t kDigitsPerLine = 2 * kBytesPerLine;
constexpr std::string_view kGap = "    ";

void appendLine(std::string& out, unsigned long offset, const void* bytes, std::size_t length) {
    out += hex0(static_cast<unsigned short>(offset));
    out += kGap;
    out += hex_sp(bytes, length);
}

std::string bytesLine(unsigned long offset, const void* bytes, std::size_t length,
                      const std::string& description) {
    std::string line;
    appendLine(line, offset, bytes, length);
    return line.append(kGap).append(description);
}

std::string dumpText(const unsigned char* data, unsigned int length) {
    const auto dumped = std::min<std::uint32_t>(length, std::numeric_limits<std::int32_t>::max());
    std::string text(PelorinLogGetBufferSize(dumped), '\0');
    const std::uint32_t count =
        PelorinLogBinaryToBuffer(text.data(), static_cast<std::uint32_t>(text.size()), data,
                                 static_cast<std::int32_t>(dumped));
    text.resize(std::min<std::size_t>(count, text.size() - 1));
    return text;
}

std::string upperCaseHex(const unsigned char* data, unsigned int length) {
    std::string text(std::size_t{2} * length, '\0');
    hexkernel::encodeHex(text.data(), data, length, false);
    return text;
}

}  // namespace

std::string getBytePrettyPrint(unsigned long offset, unsigned char byte,
                               const std::string& description) {
    std::string line = hex0(static_cast<unsigned short>(offset));
    line.append(kGap).append(hex0(byte)).append(kGap).append(binary0(byte));
    return line.append(kGap).append(description);
}

std::string getBytesPrettyPrint(unsigned long offset, const std::vector<unsigned char>& bytes,
                                const std::string& description) {
    return bytesLine(offset, bytes.data(), bytes.size(), description);
}

std::string getBytesPrettyPrint(unsigned long offset, const std::string& bytes,
                                const std::string& description) {
    return bytesLine(offset, bytes.data(), bytes.size(), description);
}

std::string getBytedumpPrettyPrint(const std::string& hexText) {
    std::string dump;
    for (std::size_t at = 0; at < hexText.size(); at += kDigitsPerLine) {
        std::uint8_t bytes[kBytesPerLine];
        const std::size_t length = std::min(hexText.size() - at, kDigitsPerLine) / 2;
        hexkernel::decodeHex(bytes, hexText.data() + at, length);
        if (at != 0)
            dump += '\n';
        appendLine(dump, at / 2, bytes, length);
    }
    return dump;
}

std::string getBytedumpPrettyPrintBinary(const unsigned char* data, unsigned int length) {
    return getBytedumpPrettyPrint(hex(data, length));
}

unsigned int count_trailing_zeroes(const unsigned char* data, unsigned int length) {
    unsigned int count = 0;
    while (count < length && data[length - 1 - count] == 0)
        ++count;
    return count;
}

void assign(std::string& out, const unsigned char* data, unsigned int length, bool dump,
            bool trimTrailingZeroes) {
    if (trimTrailingZeroes)
        length -= count_trailing_zeroes(data, length);
    out = dump ? dumpText(data, length) : upperCaseHex(data, length);
}

}  // namespace plr

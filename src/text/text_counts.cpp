#include <array>
#include <span>

#include "plr/text/gsm7.h"
#include "plr/text/text_converter.h"
#include "plr/text/text_transform.h"
#include "src/text/hex_transforms.h"
#include "src/text/utf16.h"

namespace plr {
namespace {

// The sum of what `count` says of each run of codes.
template <class Count>
std::size_t countAll(TextTransform& stage, Count count) {
    std::array<std::uint32_t, 256> codes;
    std::size_t sum = 0;
    for (std::size_t got = codes.size(); got == codes.size();) {
        got = stage.nextCodes(codes.data(), codes.size());
        sum += count(std::span<const std::uint32_t>(codes.data(), got));
    }
    return sum;
}

std::size_t countUnits(std::span<const std::uint32_t> codes) {
    std::size_t units = codes.size();
    for (const std::uint32_t code : codes)
        units += utf16::isHighSurrogate(code >> 16) ? 1 : 0;
    return units;
}

}  // namespace

std::uint32_t TextConverter::decodeHexString(const char* text, unsigned long length) noexcept {
    std::uint32_t value = 0;
    for (unsigned long i = 0; i < length; ++i)
        value = value << 4 | hexDigitValue(static_cast<unsigned char>(text[i]));
    return value;
}

int TextConverter::getGsm7EncodedSize(int code, Ucs2ToGsm7Tables tables) noexcept {
    // What the tables have not becomes '?', one septet.
    return ucs2ToGsm7(static_cast<std::uint32_t>(code), tables) > 0x7F ? 14 : 7;
}

std::size_t TextConverter::countCharactersInUtf8Message(const char* text, unsigned long length) {
    TextConverter converter;
    converter.setSource(text, length);
    converter.pushConversion(Conversion::kUtf8ToUcs2);
    return countAll(*converter.top, countUnits);
}

std::size_t TextConverter::countSeptetsInMessage(const char* text, unsigned long length,
                                                 Ucs2ToGsm7Tables tables) {
    TextConverter converter;
    converter.setSource(text, length);
    converter.pushConversion(Conversion::kUtf8ToUcs2);
    converter.pushConversion(Conversion::kUcs2ToGsm7, static_cast<int>(tables));
    return countAll(*converter.top,
                    [](std::span<const std::uint32_t> codes) { return codes.size(); });
}

}  // namespace plr

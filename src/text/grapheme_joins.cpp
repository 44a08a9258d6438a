#include "src/text/grapheme_joins.h"

#include <algorithm>
#include <array>
#include <utility>

#include "src/text/combining_marks.h"

namespace plr {
namespace {

constexpr char32_t kJoiner = 0x200D;

// What joins and is no mark.
constexpr std::array<CharacterRange, 8> kOthers = {{
    {0xE33, 0xE33},      // Thai SARA AM
    {0xEB3, 0xEB3},      // Lao AM
    {0x1160, 0x11FF},    // vowels and finals of Korean syllables
    {0x200C, kJoiner},   // ZWNJ, ZWJ
    {0xD7B0, 0xD7FB},    // more vowels and finals
    {0xFF9E, 0xFF9F},    // halfwidth voiced sound marks
    {0x1F3FB, 0x1F3FF},  // colours of skin
    {0xE0020, 0xE007F},  // tags
}};

template <class Ranges>
bool contains(const Ranges& ranges, char32_t character) noexcept {
    const auto range =
        std::ranges::lower_bound(ranges, character, {}, [](const auto& r) { return r.last; });
    return range != ranges.end() && range->first <= character;
}

bool isRegionalIndicator(char32_t character) noexcept {
    return character >= 0x1F1E6 && character <= 0x1F1FF;
}

}  // namespace

bool GraphemeJoins::next(char32_t character) noexcept {
    const char32_t previous = std::exchange(previous_, character);
    const bool wasFlagHalf = isFlagHalf_;
    isFlagHalf_ = isRegionalIndicator(character) && !wasFlagHalf;
    if (isRegionalIndicator(character) && wasFlagHalf)
        return true;
    if (previous == '\r' && character == '\n')
        return true;
    return previous == kJoiner || contains(kCombiningMarks, character) ||
           contains(kOthers, character);
}

}  // namespace plr

#include "src/text/gsm7_tables.h"

namespace plr::gsm7 {
namespace {

constexpr std::size_t kSeptets = 128;
constexpr std::size_t kLanguages = kAlphabets.size();
static_assert(kExtensions.size() == kLanguages);

constexpr bool isComplete(Table alphabet) {
    return alphabet.size() == kSeptets && alphabet[kEscape] == kEscape &&
           alphabet[kReplacement] == u'?';
}
static_assert(std::all_of(kAlphabets.begin(), kAlphabets.end(), isComplete));
static_assert(std::all_of(kExtensions.begin(), kExtensions.end(),
                          [](Table table) { return table.size() == kSeptets; }));

constexpr Characters makeCharacters(Table alphabet, Table extension) {
    Characters characters{};
    for (std::size_t septet = 0; septet < kSeptets; ++septet) {
        characters[septet] = alphabet[septet];
        characters[kSeptets + septet] =
            extension[septet] == u' ' ? alphabet[septet] : extension[septet];
    }
    characters[kSeptets + kEscape] = u' ';
    return characters;
}

constexpr Codes makeCodes(Table alphabet, Table extension) {
    Codes codes{};
    codes.fill(kUnknown);
    const auto put = [&codes](char16_t unit, std::size_t code) {
        codes[kPages.of[unit / 64] * std::size_t{64} + unit % 64] =
            static_cast<std::uint16_t>(code);
    };
    for (std::size_t septet = 0; septet < kSeptets; ++septet)
        if (extension[septet] != u' ')
            put(extension[septet], kEscaped | septet);
    for (std::size_t septet = 0; septet < kSeptets; ++septet)
        if (septet != kEscape)
            put(alphabet[septet], septet);  // shorter, so in place of the other
    return codes;
}

// By locking shift, then by single shift.
template <class Made>
constexpr auto ofAllPairs(Made (*make)(Table, Table)) {
    std::array<Made, kLanguages * kLanguages> made{};
    for (std::size_t i = 0; i < made.size(); ++i)
        made[i] = make(kAlphabets[i / kLanguages], kExtensions[i % kLanguages]);
    return made;
}

constexpr auto kCharacters = ofAllPairs(makeCharacters);
constexpr auto kCodes = ofAllPairs(makeCodes);

constexpr std::size_t languageOf(int id) {
    const auto language = static_cast<unsigned>(id);
    return language < kLanguages ? language : 0;
}

}  // namespace

const Characters& charactersOf(int locking, int single) noexcept {
    return kCharacters[languageOf(locking) * kLanguages + languageOf(single)];
}

const Codes& codesOf(TextConverter::Ucs2ToGsm7Tables tables) noexcept {
    const auto locking = static_cast<unsigned>(tables) % 16;
    const auto single = static_cast<unsigned>(tables) / 16;
    return locking < kLanguages && single < kLanguages ? kCodes[locking * kLanguages + single]
                                                       : kCodes[0];
}

}  // namespace plr::gsm7

#include "src/text/euc_kr.h"

#include <gtest/gtest.h>
#include <iconv.h>

#include <algorithm>
#include <map>
#include <string>

#include "tests/text/stage_run.h"

namespace {

using namespace plr::test;
using enum plr::TextConverter::Conversion;

constexpr std::uint32_t kReplacement = 0xFFFD;

// The characters of the C library by their octets.
std::map<std::string, char16_t> pairsOfCLibrary() {
    std::map<std::string, char16_t> pairs;
    const iconv_t conversion = iconv_open("WCHAR_T", "EUC-KR");
    for (int pair = 0x8000; pair <= 0xFFFF; ++pair) {
        std::string octets{static_cast<char>(pair >> 8), static_cast<char>(pair)};
        char* in = octets.data();
        std::size_t inLeft = octets.size();
        wchar_t character = 0;
        char* out = reinterpret_cast<char*>(&character);
        std::size_t outLeft = sizeof character;
        iconv(conversion, nullptr, nullptr, nullptr, nullptr);
        if (iconv(conversion, &in, &inLeft, &out, &outLeft) == 0 && inLeft == 0)
            pairs[octets] = static_cast<char16_t>(character);
    }
    iconv_close(conversion);
    return pairs;
}

bool mayBeOfPair(char octet) {
    return octet >= '\xA1' && octet <= '\xFE';
}

// Deliberate difference: to the C library 0x80 to 0x9F are control characters.
Codes model(const std::string& octets, const std::map<std::string, char16_t>& pairs) {
    Codes text;
    for (std::size_t i = 0; i < octets.size(); ++i) {
        const bool pair =
            i + 1 < octets.size() && mayBeOfPair(octets[i]) && mayBeOfPair(octets[i + 1]);
        const auto found = pair ? pairs.find(octets.substr(i, 2)) : pairs.end();
        const auto octet = static_cast<unsigned char>(octets[i]);
        text.push_back(found != pairs.end() ? found->second : octet < 0x80 ? octet : kReplacement);
        i += pair;
    }
    return text;
}

TEST(EucKr, EveryTwoOctetsAsTheCLibrary) {
    const auto pairs = pairsOfCLibrary();
    ASSERT_EQ(pairs.size(), 8227U);
    for (int pair = 0; pair <= 0xFFFF; ++pair) {
        const std::string octets{static_cast<char>(pair >> 8), static_cast<char>(pair), '\xB0',
                                 '\xA1', '\xC7'};
        for (const std::size_t length : {2U, 5U}) {
            const std::string part = octets.substr(0, length);
            const Codes codes = model(part, pairs);
            const bool isMarked = std::count(codes.begin(), codes.end(), kReplacement) != 0;
            const Made expected{codes, isMarked, length};
            for (const std::size_t run : {1U, 3U}) {
                ASSERT_EQ(makeFromMemory({kEucKRToUcs2}, part, run), expected) << std::hex << pair;
                ASSERT_EQ(make({kEucKRToUcs2}, codesOf(part), run), expected) << std::hex << pair;
            }
        }
        // Where a limit ends the reading, a run has read as far as single codes.
        const Codes codes = codesOf(octets);
        for (const int limit : {1, 2}) {
            ASSERT_EQ(makeFromMemory({kEucKRToUcs2}, octets, 3, limit),
                      makeFromMemory({kEucKRToUcs2}, octets, 1, limit));
            ASSERT_EQ(make({kEucKRToUcs2}, codes, 3, limit), make({kEucKRToUcs2}, codes, 1, limit));
        }
    }
}

TEST(EucKr, ResetForgetsTheOctetPulledBehindALead) {
    CodeSource source({0xB0, 'A', 'B'});
    plr::EucKRToUcs2Transform stage;
    stage.setSource(&source);
    stage.setCount(-1);
    EXPECT_EQ(stage.nextCode(), 0xFFFDU);
    stage.reset();
    EXPECT_FALSE(stage.getExceptionStatus());
    EXPECT_EQ(stage.nextCode(), static_cast<std::uint32_t>('B'));
    EXPECT_EQ(stage.nextCode(), plr::TextTransform::kEnd);
}

}  // namespace

#include "src/text/euc_kr.h"

#include <gtest/gtest.h>
#include <iconv.h>

#include <map>
#include <string>
#include <vector>

#include "plr/text/octet_source_buffer.h"
#include "src/text/plain_transforms.h"

namespace {

using namespace plr;

// How the octets are read: in runs of `run` codes, from memory or from another stage.
struct Reading {
    std::size_t run;
    bool fromMemory;
    int limit = -1;
};

struct Result {
    std::u16string text;
    bool marked;
    std::uint64_t octets;  // that were read

    bool operator==(const Result&) const = default;
};

Result convert(const std::string& octets, const Reading& reading) {
    OctetSourceBuffer memory;
    memory.setSource(octets.data(), static_cast<int>(octets.size()));
    ISOLatin1ToUcs2Transform between;
    between.setSource(&memory);
    between.setCount(-1);
    EucKRToUcs2Transform stage;
    stage.setSource(reading.fromMemory ? static_cast<TextTransform*>(&memory) : &between);
    stage.setCount(reading.limit);
    std::vector<std::uint32_t> codes(reading.run);
    std::u16string text;
    while (const std::size_t count = stage.nextCodes(codes.data(), codes.size()))
        text.append(codes.begin(), codes.begin() + static_cast<std::ptrdiff_t>(count));
    return {text, stage.getExceptionStatus(), memory.getCount()};
}

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
std::u16string model(const std::string& octets, const std::map<std::string, char16_t>& pairs) {
    std::u16string text;
    for (std::size_t i = 0; i < octets.size(); ++i) {
        const bool pair =
            i + 1 < octets.size() && mayBeOfPair(octets[i]) && mayBeOfPair(octets[i + 1]);
        const auto found = pair ? pairs.find(octets.substr(i, 2)) : pairs.end();
        if (found != pairs.end())
            text += found->second;
        else
            text += static_cast<unsigned char>(octets[i]) < 0x80 ? static_cast<char16_t>(octets[i])
                                                                 : u'\uFFFD';
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
            const std::u16string text = model(part, pairs);
            const Result expected{text, text.find(u'\uFFFD') != text.npos, length};
            for (const Reading reading : {Reading{1, true}, {3, true}, {1, false}, {3, false}})
                ASSERT_EQ(convert(part, reading), expected) << std::hex << pair;
        }
        // Where a limit ends the reading, a run has read as far as single codes.
        for (const bool fromMemory : {false, true})
            for (const int limit : {1, 2})
                ASSERT_EQ(convert(octets, {3, fromMemory, limit}),
                          convert(octets, {1, fromMemory, limit}))
                    << std::hex << pair;
    }
}

TEST(EucKr, ResetForgetsTheOctetPulledBehindALead) {
    OctetSourceBuffer memory;
    memory.setSource("\xB0\x41\x42", 3);
    ISOLatin1ToUcs2Transform between;
    between.setSource(&memory);
    between.setCount(-1);
    EucKRToUcs2Transform stage;
    stage.setSource(&between);
    stage.setCount(-1);
    EXPECT_EQ(stage.nextCode(), 0xFFFDU);
    stage.reset();
    EXPECT_FALSE(stage.getExceptionStatus());
    EXPECT_EQ(stage.nextCode(), static_cast<std::uint32_t>('B'));
    EXPECT_EQ(stage.nextCode(), TextTransform::kEnd);
}

}  // namespace

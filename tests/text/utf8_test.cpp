#include <gtest/gtest.h>

#include <algorithm>
#include <string>

#include "src/text/utf16.h"
#include "tests/text/stage_run.h"

// UTF-8 and UTF-16, every code point and what is ill-formed, against plain readings of
// the standards.
namespace {

using namespace plr::test;
using enum plr::TextConverter::Conversion;
using plr::utf16::kReplacement;

// What one code point is in both.
std::string octetsOf(std::uint32_t point) {
    const auto tail = [=](int shift) { return static_cast<char>(0x80 | (point >> shift & 0x3F)); };
    if (point < 0x80)
        return {static_cast<char>(point)};
    if (point < 0x800)
        return {static_cast<char>(0xC0 | point >> 6), tail(0)};
    if (point < 0x10000)
        return {static_cast<char>(0xE0 | point >> 12), tail(6), tail(0)};
    return {static_cast<char>(0xF0 | point >> 18), tail(12), tail(6), tail(0)};
}

std::uint32_t codeOf(std::uint32_t point) {
    const std::uint32_t above = point - 0x10000;
    return point < 0x10000 ? point : (0xD800 | above >> 10) << 16 | 0xDC00 | (above & 0x3FF);
}

// A line of the table of well-formed sequences (Unicode, table 3-7).
struct WellFormed {
    unsigned char firstLead, lastLead, firstSecond, lastSecond;
    std::size_t length;
};
constexpr WellFormed kWellFormed[] = {
    {0x00, 0x7F, 0, 0, 1},       {0xC2, 0xDF, 0x80, 0xBF, 2}, {0xE0, 0xE0, 0xA0, 0xBF, 3},
    {0xE1, 0xEC, 0x80, 0xBF, 3}, {0xED, 0xED, 0x80, 0x9F, 3}, {0xEE, 0xEF, 0x80, 0xBF, 3},
    {0xF0, 0xF0, 0x90, 0xBF, 4}, {0xF1, 0xF3, 0x80, 0xBF, 4}, {0xF4, 0xF4, 0x80, 0x8F, 4},
};

// Takes the code point at `i`, or the maximal subpart of a sequence there.
std::uint32_t takePoint(const std::string& octets, std::size_t& i) {
    const auto octet = [&](std::size_t at) { return static_cast<unsigned char>(octets[at]); };
    const unsigned char lead = octet(i++);
    for (const WellFormed& row : kWellFormed) {
        if (lead < row.firstLead || lead > row.lastLead)
            continue;
        std::uint32_t point = row.length == 1 ? lead : lead & (0x7FU >> row.length);
        for (std::size_t k = 1; k < row.length; ++k) {
            const unsigned char first = k == 1 ? row.firstSecond : 0x80;
            const unsigned char last = k == 1 ? row.lastSecond : 0xBF;
            if (i == octets.size() || octet(i) < first || octet(i) > last)
                return kReplacement;
            point = point << 6 | (octet(i++) & 0x3F);
        }
        return point;
    }
    return kReplacement;
}

Codes modelOf(const std::string& octets) {
    Codes codes;
    for (std::size_t i = 0; i < octets.size();)
        codes.push_back(codeOf(takePoint(octets, i)));
    return codes;
}

// From memory and from another stage, in short runs and long ones.
void expectDecodes(const std::string& octets, const Codes& expected) {
    const bool isMarked = std::count(expected.begin(), expected.end(), kReplacement) != 0;
    const Codes codes = codesOf(octets);
    const Made made{expected, isMarked, octets.size()};
    for (const std::size_t run : {1U, 7U, 1000U}) {
        ASSERT_EQ(makeFromMemory({kUtf8ToUcs2}, octets, run), made) << run;
        ASSERT_EQ(make({kUtf8ToUcs2}, codes, run), made) << run;
    }
}

TEST(Utf8, EveryCodePoint) {
    for (std::uint32_t first = 0; first <= 0x10FFFF; first += 0x800) {
        if (first == 0xD800)
            continue;
        std::string octets;
        Codes codes;
        for (std::uint32_t point = first; point < first + 0x800; ++point) {
            octets += octetsOf(point);
            codes.push_back(codeOf(point));
        }
        const Made there{codes, false, octets.size()};
        ASSERT_EQ(makeFromMemory({kUtf8ToUcs2}, octets, 100), there) << std::hex << first;
        const Made back{codesOf(octets), false, codes.size()};
        ASSERT_EQ(make({kUcs2ToUtf8}, codes, 100), back) << std::hex << first;
    }
}

// Of octets at the bounds of the table every four, one after the other; then every three
// at the end.
TEST(Utf8, IllFormedSequencesByTheirMaximalSubparts) {
    const std::string bounds =
        "A\x7F\x80\x8F\x90\x9F\xA0\xBF\xC1\xC2\xDF\xE0\xE1\xEC\xED\xEE\xEF\xF0\xF1\xF3\xF4\xF5\xFF";
    for (const char a : bounds) {
        for (const char b : bounds) {
            std::string all;
            for (const char c : bounds) {
                for (const char d : bounds)
                    all += {a, b, c, d};
                expectDecodes({a, b, c}, modelOf({a, b, c}));
            }
            expectDecodes(all, modelOf(all));
            if (HasFatalFailure())
                FAIL() << std::hex << int{a} << " " << int{b};
        }
    }
}

TEST(Utf8, SurrogatesThatAreTwoUnits) {
    constexpr std::uint32_t kHigh = 0xD83D;
    constexpr std::uint32_t kLow = 0xDE00;
    constexpr std::uint32_t kPair = kHigh << 16 | kLow;
    const std::string face = octetsOf(0x1F600);
    const std::string replaced = octetsOf(kReplacement);
    const struct {
        const char* name;
        Codes codes;
        std::string octets;
        bool isMarked;
    } rows[] = {
        {"a pair", {kHigh, kLow}, face, false},
        {"high before a character", {kHigh, 'A'}, replaced + "A", true},
        {"high before a pair", {kHigh, kHigh, kLow}, replaced + face, true},
        {"high before a pair in one code", {kHigh, kPair}, replaced + face, true},
        {"low before high", {kLow, kHigh}, replaced + replaced, true},
        {"high at the end", {'A', kHigh}, "A" + replaced, true},
    };
    for (const auto& row : rows) {
        for (const std::size_t run : {1U, 3U, 100U}) {
            const Made expected{codesOf(row.octets), row.isMarked, row.codes.size()};
            EXPECT_EQ(make({kUcs2ToUtf8}, row.codes, run), expected) << row.name;
        }
    }
}

}  // namespace

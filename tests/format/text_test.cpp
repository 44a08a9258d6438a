#include <gtest/gtest.h>

#include <string>
#include <utility>

#include "plr/format/bitfield.h"
#include "plr/format/flag_names.h"
#include "plr/format/rle.h"

// Fields of bits, run lengths, names of flags.
namespace {

TEST(BitField, EveryByteAndRangeAgainstAModel) {
    for (unsigned range = 0; range < 12 * 12; ++range) {
        const auto low = static_cast<unsigned char>(range / 12);
        const auto high = static_cast<unsigned char>(range % 12);
        const bool valid = low <= high && high - low < 8;
        for (int value = 0; value < 256; ++value) {
            std::string picture;
            int field = 0;
            for (int bit = valid ? 7 : -1; bit >= 0; --bit) {
                const bool inside = low <= bit && bit <= high;
                const int set = value >> bit & 1;
                field = inside ? field * 2 + set : field;
                picture += !inside ? '-' : set != 0 ? '1' : '0';
            }
            const auto byte = static_cast<unsigned char>(value);
            ASSERT_EQ(plr::bitfield(byte, {low, high}), field) << value << " " << range;
            ASSERT_EQ(plr::bitfieldPrettyPrint(byte, {low, high}, '-'), picture);
        }
    }
}

TEST(BitField, WiderTypes) {
    EXPECT_EQ(plr::bitfield(0xF0, {4, 7}), 0x0F);
    EXPECT_EQ(plr::bitfield(-1LL, {0, 63}), -1);
    EXPECT_EQ(plr::bitfield(static_cast<short>(-1), {4, 19}), 0xFFF) << "no bits above its own";
    EXPECT_EQ(plr::bitfield(~0ULL, {64, 70}), 0U);
    for (const plr::BitRange& range : {plr::BitRange(0, 64), {0, 255}, {5, 3}, {255, 0}}) {
        EXPECT_EQ(plr::bitfield(~0ULL, range), 0U);
        EXPECT_EQ(plr::bitfieldPrettyPrint(~0ULL, range, '-'), "");
    }
    // Of a field, 8 bits are shown.
    const unsigned short ones = 0xFFFF;
    EXPECT_EQ(plr::bitfieldPrettyPrint(ones, {0, 15}, '.'), "0000000011111111");
    EXPECT_EQ(plr::bitfieldPrettyPrint(ones, {4, 13}, '.'), "..0011111111....");
}

TEST(RunLength, CompressesRunsFromFiveOnAndGivesThemBack) {
    const std::pair<std::string, std::string> rows[] = {
        {"", ""},
        {"aaaa", "aaaa"},
        {"aaaaa", "<5>a"},
        {"aaaaaaab", "<7>ab"},
        {"baaaaaaaaaaccccc>>>>>", "b<10>a<5>c<5>>"},
        {std::string(100000, 'x') + std::string(99, 'y'), "<100000>x<99>y"},
    };
    for (const auto& [plain, compressed] : rows) {
        std::string text = plain;
        plr::to_rle(text);
        EXPECT_EQ(text, compressed);
        EXPECT_EQ(plr::from_rle(text), plain);
    }
    EXPECT_EQ(plr::to_rle("\0\0\0\x12", 4), "<6>012");
}

TEST(RunLength, Expands) {
    const std::pair<const char*, std::string> rows[] = {
        {"<12>a", std::string(12, 'a')},
        {"x<+2>ay<007>b", "xaaybbbbbbb"},
        {"b<3>", "b"},  // nothing follows the count
        {"<3><2>ab", "aab"},
        {"b<0>ac<-1>d<-2147483648>d", "bc"},
    };
    for (const auto& [text, expected] : rows)
        EXPECT_EQ(plr::from_rle(text), expected);
    for (const char* text : {"<3>", "b<3", "b<x>a", "b<>a", "b<3x>a", "b< 3>a", "b<+-3>a", "b<->a",
                             "b<2147483648>a", "b<0x3>a"})
        EXPECT_EQ(plr::from_rle(text), "") << text;
    EXPECT_EQ(plr::from_rle("ab<6>c", 8), "abcccccc");
    EXPECT_EQ(plr::from_rle("ab<6>c", 7), "");
    EXPECT_EQ(plr::from_rle("a<2147483647>b", 1 << 20), "");
}

TEST(FlagNames, LabelsAndWhatIsLeft) {
    const auto name = [](unsigned long word, const char* separator) {
        std::string out;
        plr::appendLabelIfBitSet(out, word, separator, 0x1, "A");
        plr::appendLabelIfBitSet(out, word, separator, 0x6, "B");
        plr::appendLabelIfBitSet(out, word, separator, 0x4, "C");  // claimed by B
        plr::appendLeftoverBits(out, word, separator);
        return out;
    };
    EXPECT_EQ(name(0x45, "|"), "A|B|0x40");
    EXPECT_EQ(name(0x45, nullptr), "AB0x40");
    EXPECT_EQ(name(0xAB0, ", "), "0xab0");
    EXPECT_EQ(name(0x2, ", "), "B");
    EXPECT_EQ(name(0, "|"), "");
}

}  // namespace

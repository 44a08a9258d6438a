#include "plr/format/hex.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <cstring>
#include <string>
#include <string_view>
#include <vector>

#include "Pelorin"
#include "plr/format/binary.h"
#include "plr/format/byte_dump.h"

// Hex text of bytes and back, flat and in plr; integers in hex and binary.
namespace {

using Bytes = std::vector<unsigned char>;

Bytes someBytes(std::size_t length) {
    Bytes bytes(length);
    for (std::size_t i = 0; i < length; ++i)
        bytes[i] = static_cast<unsigned char>(i * 41 + length);
    return bytes;
}

TEST(FlatHex, OneDigitBothWays) {
    for (int i = 0; i < 256; ++i) {
        const auto position = std::string_view("0123456789abcdefABCDEF").find(static_cast<char>(i));
        const std::size_t digit = position < 16 ? position : position - 6;
        ASSERT_EQ(PelorinDecodeHexWithDefault(static_cast<char>(i), 77),
                  position == std::string_view::npos ? 77 : digit);
        char text[3] = {};
        PelorinEncodeHex(static_cast<std::uint8_t>(i), &text[0], &text[1]);
        ASSERT_EQ(std::stoi(text, nullptr, 16), i);
    }
    char text[3] = {};
    PelorinEncodeHex(0xA9, &text[0], &text[1]);
    EXPECT_STREQ(text, "A9");
    PelorinEncodeHexWithLowerCase(0xB, &text[0], &text[1], true);
    EXPECT_STREQ(text, "0b");
}

TEST(FlatHex, TextIsCutAtWholeBytes) {
    const std::string whole = "DEADBEEF";
    for (std::uint32_t size = 0; size <= 12; ++size) {
        std::string out(16, '~');
        const std::uint32_t digits = size == 0 ? 0 : std::min<std::uint32_t>((size - 1) / 2 * 2, 8);
        const std::string expected = size == 0 ? "" : whole.substr(0, digits) + '\0';
        EXPECT_EQ(PelorinBinToHex(out.data(), size, "\xDE\xAD\xBE\xEF", 4), expected.size());
        EXPECT_EQ(out, expected + std::string(16 - expected.size(), '~')) << size;
    }
    EXPECT_EQ(PelorinBinToHexGetBufferSize(4), 9U);
    EXPECT_EQ(PelorinBinToHexGetBufferSize(0x80000000), 0xFFFFFFFF);
}

TEST(FlatHex, LenientReading) {
    const struct {
        const char* text;
        std::uint32_t capacity;
        const char* expected;
    } rows[] = {
        {"", 4, ""},
        {"0aF0", 4, "0a f0"},
        {"ABC", 4, "0a bc"},  // the first character alone
        {"1", 4, "01"},
        {"x", 4, "00"},
        {"zABC1", 4, "00 ab c1"},
        {"zz", 4, "00"},
        {"1g g2 12", 4, "10 00 20 12"},
        {"0102030405", 3, "01 02 03"},
        {"10203", 2, "01 02"},
        {"123", 1, "01"},
        {"12", 0, ""},
        {"123", 0, ""},
    };
    for (const auto& row : rows) {
        Bytes out(8, '~');
        const std::uint32_t count = PelorinHexToBin(out.data(), row.capacity, row.text);
        EXPECT_EQ(plr::hex_sp(out.data(), count), row.expected) << row.text;
        EXPECT_EQ(std::count(out.begin(), out.end(), '~'), 8 - count) << row.text;
        Bytes same(8, '~');
        EXPECT_EQ(plr::assign(same.data(), row.text, row.capacity), count);
        EXPECT_EQ(same, out);
    }
    Bytes out(8);
    EXPECT_EQ(plr::assign(out.data(), "12", 0x1'0000'0000), 1U) << "a capacity above 32 bits";
    EXPECT_EQ(plr::assign(out.data(),
                          std::string("12\0\0"
                                      "34",
                                      6),
                          8),
              1U)
        << "a NUL ends it";
}

TEST(Hex, BytesComeBackAndBothFacesAgree) {
    for (std::size_t length = 0; length <= 70; ++length) {
        const Bytes bytes = someBytes(length);
        const auto count = static_cast<std::uint32_t>(length);
        std::string flat(PelorinBinToHexGetBufferSize(count), '~');
        EXPECT_EQ(
            PelorinBinToHexWithLowerCase(flat.data(), count * 2 + 1, bytes.data(), count, true),
            flat.size());
        flat.pop_back();
        EXPECT_EQ(plr::hex(bytes), flat);
        std::string spaced;
        for (std::size_t i = 0; i < length; ++i)
            spaced += (i == 0 ? "" : " ") + plr::hex0(bytes[i]);
        EXPECT_EQ(plr::hex_sp(bytes), spaced);
        std::string upper = flat;
        std::replace_if(
            upper.begin(), upper.end(), [](char c) { return c >= 'a'; }, '~');
        std::string assigned;
        plr::assign(assigned, bytes.data(), count, false, false);
        std::replace_if(
            assigned.begin(), assigned.end(), [](char c) { return c >= 'A'; }, '~');
        EXPECT_EQ(assigned, upper);
        for (const auto option : {plr::kHexWhitespaceSkip, plr::kHexWhitespaceNone})
            EXPECT_EQ(plr::parse_hex(flat, option), bytes);
        for (const auto option : {plr::kHexWhitespaceSkip, plr::kHexWhitespaceSingleSpace})
            EXPECT_EQ(plr::parse_hex(spaced, option), bytes);
    }
}

TEST(ParseHex, BlanksStandWhereTheOptionTakesThem) {
    const struct {
        const char* text;
        const char* expected[3];  // with Skip, SingleSpace, None
    } rows[] = {
        {"0A0b", {"0a0b", "", "0a0b"}},
        {"0A0", {"", "", ""}},
        {"0", {"", "", ""}},
        {"0g", {"", "", ""}},
        {"0a0b0g", {"", "", ""}},
        {"0a 0b", {"0a0b", "0a0b", ""}},
        {"0a", {"0a", "0a", "0a"}},
        {"0a 0b ", {"0a0b", "", ""}},
        {" 0a 0b", {"0a0b", "", ""}},
        {"0a  0b", {"0a0b", "", ""}},
        {"0a\t0b", {"0a0b", "", ""}},
        {"0a 0", {"", "", ""}},
        {"0 a0", {"", "", ""}},
        {"\t\n 0A\v\f\r0b0C \t", {"0a0b0c", "", ""}},
        {" \t", {"", "", ""}},
        {"0a\b0b", {"", "", ""}},
        {"0a\xA0"
         "0b",
         {"", "", ""}},
    };
    for (const auto& row : rows)
        for (int option = 0; option < 3; ++option)
            EXPECT_EQ(plr::hex(plr::parse_hex(row.text, plr::HexWhitespaceOption(option))),
                      row.expected[option])
                << row.text << ", " << option;
    EXPECT_TRUE(plr::parse_hex("0a", plr::HexWhitespaceOption(3)).empty());
    EXPECT_TRUE(plr::parse_hex("0a", plr::HexWhitespaceOption(-1)).empty());
    EXPECT_TRUE(plr::parse_hex(std::string("0a\0"
                                           "0b",
                                           5),
                               plr::kHexWhitespaceSkip)
                    .empty());
    EXPECT_TRUE(plr::parse_hex(nullptr, 0, plr::kHexWhitespaceSkip).empty());
}

std::string withoutZeros(const std::string& digits) {
    return digits.substr(std::min(digits.find_first_not_of('0'), digits.size() - 1));
}

template <class T>
void checkInteger(T value) {
    std::string bits;
    std::string digits;
    for (std::size_t bit = 8 * sizeof(T); bit-- > 0;) {
        bits += (value >> bit & 1) != 0 ? '1' : '0';
        if (bit % 4 == 0)
            digits += "0123456789abcdef"[value >> bit & 15];
    }
    EXPECT_EQ(plr::binary0(value), bits);
    EXPECT_EQ(plr::binary(value), withoutZeros(bits));
    EXPECT_EQ(plr::hex0(value), digits);
    EXPECT_EQ(plr::hex(value), withoutZeros(digits));
}

template <class... Ts>
void checkTypes() {
    for (unsigned bit = 0; bit < 64; ++bit)
        for (const long long value : {1LL << bit, -(1LL << bit), 0x123456789ABCDEF0LL >> bit})
            (checkInteger(static_cast<Ts>(value)), ...);
    (checkInteger(Ts{0}), ...);
}

TEST(Integers, EveryTypeBitByBit) {
    checkTypes<unsigned char, signed char, char, unsigned short, short, unsigned int, int,
               unsigned long, long, unsigned long long, long long>();
    EXPECT_EQ(plr::hex(static_cast<signed char>(-1)), "ff");
    EXPECT_EQ(plr::hex0(static_cast<unsigned short>(0xAB)), "00ab");
    EXPECT_EQ(plr::binary(5U), "101");
}

template <class T>
concept HasHex = requires(T value) {
    plr::hex(value);
};
static_assert(HasHex<char> && !HasHex<bool> && !HasHex<wchar_t> && !HasHex<char8_t> &&
              !HasHex<plr::HexWhitespaceOption> && !HasHex<double> && !HasHex<const char*>);

}  // namespace

#include "plr/format/hex.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <string>
#include <string_view>
#include <vector>

#include "Pelorin"
#include "plr/format/binary.h"
#include "plr/format/byte_dump.h"
#include "support/byte_models.h"

// Hex text of bytes and back, flat and in plr; integers in hex and binary.
namespace {

using plr::HexWhitespaceOption;
using plr::test::Bytes;
using plr::test::print;

TEST(FlatHex, OneDigitBothWays) {
    for (int i = 0; i < 256; ++i) {
        const auto at = std::string_view("0123456789abcdefABCDEF").find(static_cast<char>(i));
        ASSERT_EQ(PelorinDecodeHexWithDefault(static_cast<char>(i), 0xFFFFFFFF),
                  at == std::string_view::npos ? 0xFFFFFFFF
                  : at < 16                    ? at
                                               : at - 6);
        const auto byte = static_cast<std::uint8_t>(i);
        char text[3] = {};
        PelorinEncodeHex(byte, &text[0], &text[1]);
        ASSERT_EQ(text, print("%02X", byte));
        PelorinEncodeHexWithLowerCase(byte, &text[0], &text[1], true);
        ASSERT_EQ(text, print("%02x", byte));
    }
}

TEST(FlatHex, TextIsCutAtWholeBytes) {
    for (std::uint32_t size = 1; size <= 12; ++size) {
        std::string out(16, '~');
        const std::uint32_t digits = std::min((size - 1) / 2 * 2, 8U);
        EXPECT_EQ(PelorinBinToHex(out.data(), size, "\xDE\xAD\xBE\xEF", 4), digits + 1);
        const std::string expected = std::string("DEADBEEF", digits) + '\0';
        EXPECT_EQ(out, expected + std::string(15 - digits, '~'));
    }
    EXPECT_EQ(PelorinBinToHex(nullptr, 0, "x", 1), 0U);
    EXPECT_EQ(PelorinBinToHexGetBufferSize(4), 9U);
    EXPECT_EQ(PelorinBinToHexGetBufferSize(0x80000000), 0xFFFFFFFF);
}

TEST(FlatHex, LenientReading) {
    const struct {
        const char* text;
        std::uint32_t capacity;
        const char* expected;
    } rows[] = {
        {"ABC", 4, "0a bc"},  // the first character alone
        {"1", 4, "01"},           {"zz", 4, "00"},
        {"zABC1", 4, "00 ab c1"}, {"1g g2 12", 4, "10 00 20 12"},
        {"10203", 2, "01 02"},    {"123", 1, "01"},
        {"123", 0, ""},
    };
    for (const auto& row : rows) {
        Bytes out(8, '~');
        const std::uint32_t count = plr::assign(out.data(), row.text, row.capacity);
        EXPECT_EQ(plr::hex_sp(out.data(), count), row.expected) << row.text;
        EXPECT_EQ(std::count(out.begin(), out.end(), '~'), 8 - count) << row.text;
    }
    Bytes out(8);
    EXPECT_EQ(plr::assign(out.data(), "12", 0x1'0000'0000), 1U) << "a capacity above 32 bits";
    EXPECT_EQ(plr::assign(out.data(), std::string("12\0\0", 4), 8), 1U) << "a NUL ends it";
}

TEST(Hex, BytesComeBackAndBothFacesAgree) {
    for (std::uint32_t length = 0; length <= 70; ++length) {
        Bytes bytes(length);
        std::string spaced;
        for (std::uint32_t i = 0; i < length; ++i) {
            bytes[i] = static_cast<unsigned char>(i * 41 + length);
            spaced += print("%s%02x", i == 0 ? "" : " ", bytes[i]);
        }
        EXPECT_EQ(plr::hex_sp(bytes), spaced);
        std::string flat(2 * length + 1, '~');
        PelorinBinToHexWithLowerCase(flat.data(), 2 * length + 1, bytes.data(), length, true);
        EXPECT_EQ(plr::hex(bytes), flat.c_str());
        EXPECT_EQ(plr::parse_hex(flat.c_str(), plr::kHexWhitespaceSkip), bytes);
        EXPECT_EQ(plr::parse_hex(flat.c_str(), plr::kHexWhitespaceNone), bytes);
        EXPECT_EQ(plr::parse_hex(spaced, plr::kHexWhitespaceSkip), bytes);
        EXPECT_EQ(plr::parse_hex(spaced, plr::kHexWhitespaceSingleSpace), bytes);
        PelorinBinToHex(flat.data(), 2 * length + 1, bytes.data(), length);
        std::string assigned;
        plr::assign(assigned, bytes.data(), length, false, false);
        EXPECT_EQ(assigned, flat.c_str());
    }
}

TEST(ParseHex, BlanksStandWhereTheOptionTakesThem) {
    const struct {
        std::vector<HexWhitespaceOption> takes;
        std::vector<std::string> texts;  // all of the same bytes
    } rows[] = {
        {{plr::kHexWhitespaceSkip, plr::kHexWhitespaceNone}, {"0A0b"}},
        {{plr::kHexWhitespaceSkip, plr::kHexWhitespaceSingleSpace}, {"0a 0B"}},
        {{plr::kHexWhitespaceSkip},
         {"0a 0b ", " 0a 0b", "0a  0b", "0a\t0b", "0a0b ", "\t\n 0A\v\f\r0b \t"}},
        {{},
         {"0a0", "0", "0g", "0a0b0g", "0a 0b 0", "0 a0b", "0a\b0b", "0a\xA0\x30\x62",
          std::string("0a\0000b", 5)}},
    };
    for (const auto& row : rows)
        for (const std::string& text : row.texts)
            for (int i = -1; i <= 3; ++i) {
                const auto option = static_cast<HexWhitespaceOption>(i);
                const auto taken = std::count(row.takes.begin(), row.takes.end(), option);
                EXPECT_EQ(plr::parse_hex(text, option), taken != 0 ? Bytes({10, 11}) : Bytes())
                    << text << ", option " << i;
            }
    EXPECT_TRUE(plr::parse_hex(nullptr, 0, plr::kHexWhitespaceSingleSpace).empty());
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
        for (const auto value : {1ULL << bit, ~0ULL << bit, 0x123456789ABCDEF0ULL >> bit})
            (checkInteger(static_cast<Ts>(value)), ...);
}

TEST(Integers, EveryTypeBitByBit) {
    checkTypes<unsigned char, signed char, char, unsigned short, short, unsigned int, int,
               unsigned long, long, unsigned long long, long long>();
    EXPECT_EQ(plr::hex(static_cast<signed char>(-1)), "ff");
    EXPECT_EQ(plr::hex0(static_cast<unsigned short>(0xAB)), "00ab");
    EXPECT_EQ(plr::binary(5U) + plr::hex(0U) + plr::binary(0), "10100");
}

template <class T>
concept HasHex = requires(T value) {
    plr::hex(value);
};
static_assert(HasHex<char> && !HasHex<bool> && !HasHex<wchar_t> && !HasHex<char8_t> &&
              !HasHex<HexWhitespaceOption> && !HasHex<double> && !HasHex<const char*>);

}  // namespace

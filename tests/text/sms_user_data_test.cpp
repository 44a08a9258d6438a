#include "plr/text/sms_user_data.h"

#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "plr/format/hex.h"

// User data against octets of another codec.
namespace plr {
namespace {

using Error = SmsUserDataError;
using Language = TextConverter::NationalLanguageId;
using MessageEncoding = TextConverter::MessageEncoding;

constexpr bool kHeader = true;
constexpr bool kNoHeader = false;

struct Row {
    const char* name;
    const char* userData;  // hex
    int codingScheme;
    int length;
    bool hasHeader;
    std::string text;  // of data, the hex digits
    std::optional<SmsConcatenation> concatenation{};
    std::optional<SmsPorts> ports{};
};

const Row kRows[] = {
    {"septets", "e8329bfd4697d9ec37", 0x00, 10, kNoHeader, "hellohello"},
    {"octets behind the end", "e8329bfd4697d9ec37ffff", 0x00, 10, kNoHeader, "hellohello"},
    {"extension, @ at the end", "1bdea6bcf181c200", 0x00, 9, kNoHeader, "[€] a@"},
    {"nothing", "", 0x00, 0, kNoHeader, ""},
    {"Turkish, part 2 of 3", "0b0003a50302240101250101841904ce660e", 0x00, 20, kHeader, "ağ€Şş",
     SmsConcatenation{0xA5, 3, 2}},
    {"Spanish single shift", "03240102d884378926", 0x00, 10, kHeader, "áçM"},
    {"languages that are not known", "0625010d24010d9b3201", 0x00, 11, kHeader, "€è"},
    {"a language, then none", "062401012401209b33", 0x00, 10, kHeader, "ğ"},
    {"16-bit reference", "0608041234020178", 0x00, 9, kHeader, "x", SmsConcatenation{0x1234, 2, 1}},
    {"elements twice, one not known", "0e0003010201000307030370020909001e", 0x00, 19, kHeader, "x",
     SmsConcatenation{7, 3, 3}},
    {"part 3 of 2", "050003010203f0", 0x00, 8, kHeader, "x"},
    {"part 0", "050003010200f0", 0x00, 8, kHeader, "x"},
    {"a header alone", "05000301020100", 0x00, 7, kHeader, "", SmsConcatenation{1, 2, 1}},
    {"UCS-2", "0416d83dde0000e9", 0x08, 8, kNoHeader, "Ж😀é"},
    {"UCS-2, part",
     "050003070201"
     "0416",
     0x08, 8, kHeader, "Ж", SmsConcatenation{7, 2, 1}},
    {"UCS-2, half a unit at the end", "041600", 0x08, 3, kNoHeader, "Ж"},
    {"EUC-KR", "bec8b3e7", 0x84, 4, kNoHeader, "안녕"},
    {"data, 16-bit ports",
     "0605040b8423f0"
     "0106",
     0xF6,
     9,
     kHeader,
     "0106",
     {},
     SmsPorts{0x0B84, 0x23F0}},
    {"data, 8-bit ports",
     "040402f0f1"
     "aa",
     0x04,
     6,
     kHeader,
     "aa",
     {},
     SmsPorts{0xF0, 0xF1}},
    {"compressed", "0102", 0x20, 2, kNoHeader, "0102"},
};

TEST(SmsUserData, IsReadByCodingSchemeAndHeader) {
    for (const Row& row : kRows) {
        SCOPED_TRACE(row.name);
        const auto read = decodeSmsUserData(parse_hex(row.userData, kHexWhitespaceNone),
                                            static_cast<std::uint8_t>(row.codingScheme),
                                            static_cast<std::uint8_t>(row.length), row.hasHeader);
        EXPECT_STREQ(asString(read.error), "none");
        EXPECT_EQ(read.data.empty() ? read.text : hex(read.data), row.text);
        EXPECT_EQ(read.header.concatenation, row.concatenation);
        EXPECT_EQ(read.header.ports, row.ports);
    }
}

TEST(SmsUserData, BadLengthsAreRefused) {
    const struct {
        const char* name;
        std::vector<std::uint8_t> userData;
        std::uint8_t codingScheme, length;
        bool hasHeader;
        Error error;
    } rows[] = {
        {"reserved scheme", {0x61, 0xF1, 0x18}, 0x80, 3, kNoHeader, Error::kReservedCoding},
        {"161 septets", std::vector<std::uint8_t>(200), 0x00, 161, kNoHeader, Error::kTooLong},
        {"141 octets", std::vector<std::uint8_t>(200), 0x08, 141, kNoHeader, Error::kTooLong},
        {"an octet less", std::vector<std::uint8_t>(139), 0x00, 160, kNoHeader, Error::kCutShort},
        {"no octets", {}, 0x08, 2, kNoHeader, Error::kCutShort},
        {"no header", {}, 0x00, 0, kHeader, Error::kHeaderTooLong},
        {"header beyond the text", {2, 0x70, 0}, 0x08, 2, kHeader, Error::kHeaderTooLong},
        {"header beyond the septets", {2, 0x70, 0}, 0x00, 3, kHeader, Error::kHeaderTooLong},
        {"element beyond the header", {2, 0x70, 1, 0}, 0x08, 4, kHeader, Error::kHeaderElements},
        {"half an element", {1, 0x70, 1, 0}, 0x04, 4, kHeader, Error::kHeaderElements},
    };
    for (const auto& row : rows) {
        const auto read =
            decodeSmsUserData(row.userData, row.codingScheme, row.length, row.hasHeader);
        EXPECT_STREQ(asString(read.error), asString(row.error)) << row.name;
    }
    EXPECT_EQ(decodeSmsUserData(rows[0].userData, 0x80, 3, kNoHeader).text, "abc");
}

TEST(SmsUserData, IsWrittenAsAnotherCodecDoes) {
    const SmsEncoding turkish{MessageEncoding::kGSM7, Language::kTurkish, Language::kTurkish};
    const SmsEncoding ucs2{MessageEncoding::kUCS2};
    const std::string two(71, 'x');
    const struct {
        const char* name;
        std::vector<SmsPart> parts;
        const char* begin;  // hex, of the last part's user data
        int length, codingScheme;
    } rows[] = {
        {"septets", encodeSms("[€] a@", {}), "1bdea6bcf181c200", 9, 0x00},
        {"tables", encodeSms("ağ€Ş", turkish), "0624010125010161068103", 12, 0x00},
        {"a table, no text", encodeSms("", {MessageEncoding::kGSM7, {}, Language::kSpanish}),
         "0324010200", 5, 0x00},
        {"UCS-2", encodeSms("Ж😀é", ucs2), "0416d83dde0000e9", 8, 0x08},
        {"parts", encodeSms(two, ucs2, SmsReference::k8Bit, 0x1234), "050003340202", 14, 0x08},
        {"wide", encodeSms(two, ucs2, SmsReference::k16Bit, 0x1234), "06080412340202", 17, 0x08},
        {"untied", encodeSms(two, ucs2, SmsReference::kNone), "0078", 2, 0x08},
        {"class 0",
         encodeSms("hi", {}, SmsReference::k8Bit, 0, TextConverter::MessageClass::kClass0), "e834",
         2, 0x10},
    };
    for (const auto& row : rows) {
        SCOPED_TRACE(row.name);
        const SmsPart& part = row.parts.at(row.parts.size() - 1);
        EXPECT_TRUE(hex(part.userData).starts_with(row.begin)) << hex(part.userData);
        EXPECT_EQ(part.length, row.length);
        EXPECT_EQ(part.codingScheme, row.codingScheme);
    }
}

TEST(SmsUserData, HasUpTo255Parts) {
    EXPECT_EQ(encodeSms(std::string(255 * 153, 'x'), {}).size(), 255U);
    EXPECT_TRUE(encodeSms(std::string(255 * 153 + 1, 'x'), {}).empty());
}

}  // namespace
}  // namespace plr

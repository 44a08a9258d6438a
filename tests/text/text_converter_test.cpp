#include "plr/text/text_converter.h"

#include <gtest/gtest.h>

#include <random>
#include <vector>

#include "plr/text/text_transform.h"

// The fuzzer of chains, which holds runs of codes against single ones.
extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size);

namespace {

using plr::TextConverter;
using enum TextConverter::Conversion;

constexpr std::uint32_t kEnd = plr::TextTransform::kEnd;

class Converter : public TextConverter {
  public:
    explicit Converter(const std::string& octets, const std::vector<Conversion>& stages = {}) {
        setSource(octets.data(), octets.size());
        for (const Conversion stage : stages)
            pushConversion(stage);
    }
};

TEST(TextConverter, ReadsUpToTheEndOfItsSource) {
    const std::string octets = "abc\xFF";
    Converter converter(octets);
    EXPECT_EQ(converter.readChars(0), "");
    EXPECT_EQ(converter.readChars(3), "abc");
    EXPECT_EQ(converter.getSourceCount(), 3U);
    EXPECT_EQ(converter.getSourceAvailableCount(), 1U);
    EXPECT_EQ(converter.readChars(3), "\xFF");
    EXPECT_EQ(converter.nextCode(), kEnd);
    EXPECT_EQ(Converter(octets.substr(3)).nextCode(), 0xFFU);
    EXPECT_FALSE(converter.exceptionOccurred());
}

TEST(TextConverter, LongTextsComeWholeAndInMemoryOfTheirSize) {
    std::string octets;
    for (unsigned i = 0; i < 300000; ++i)
        octets += static_cast<char>(i * i / 7);
    for (const std::size_t length : {1023U, 1024U, 1025U, 300000U}) {
        const std::string part = octets.substr(0, length);
        const std::string hex = Converter(part, {kBinaryToHex}).readChars(~0UL);
        EXPECT_EQ(hex.size(), 2 * length);
        EXPECT_LE(hex.capacity(), 5 * length);
        EXPECT_EQ(Converter(hex, {kHexToBinary}).readChars(~0UL), part);
        EXPECT_EQ(Converter(hex, {kHexToBinary}).readChars(length - 1), part.substr(0, length - 1));
    }
}

TEST(TextConverter, LimitsAreSignedAndOutliveTheirSource) {
    const std::string octets = "abcdef";
    Converter converter(octets);
    converter.pushConversion(kBinaryToHex, 0, 0x1'0000'0003);
    EXPECT_EQ(converter.readChars(9), "616");
    converter.setSource(octets.data(), octets.size());  // forgets the digit that was left
    EXPECT_EQ(converter.readChars(9), "");
    converter.pushConversion(static_cast<TextConverter::Conversion>(25), 0, 2);
    EXPECT_EQ(converter.readChars(9), "61");
    converter.pushConversion(static_cast<TextConverter::Conversion>(-1), 0, 0xFFFFFFFF);
    EXPECT_EQ(converter.readChars(99), "6263646566");
    for (int i = 0; i < 3; ++i)
        converter.popConversion();  // the source stays
    converter.setSource(octets.data(), 0x1'0000'0002);
    EXPECT_EQ(converter.readChars(99), "ab");
    converter.setSource(octets.data(), 0x8000'0000);
    EXPECT_EQ(converter.readChars(99), "");
}

TEST(TextConverter, NothingIsReadBehindTheSourceWhateverItsLimit) {
    const std::vector<char> octets{'a', 'b'};
    TextConverter converter;
    EXPECT_EQ(converter.nextCode(), kEnd);
    converter.setSource(octets.data(), octets.size());
    converter.pushConversion(static_cast<TextConverter::Conversion>(20), 0, 1);
    EXPECT_EQ(converter.readChars(9), "a");
    converter.pushConversion(static_cast<TextConverter::Conversion>(20));
    EXPECT_EQ(converter.nextCode(), std::uint32_t{'b'});
    EXPECT_EQ(converter.nextCode(), kEnd);
}

TEST(TextConverter, OctetsAroundTheOffset) {
    const std::string octets = "abcdef";
    Converter converter(octets);
    EXPECT_EQ(converter.readChars(4), "abcd");
    EXPECT_EQ(converter.getBytesToCurrentOffset(3), "bcd");
    EXPECT_EQ(converter.getBytesToCurrentOffset(4), "abcd");
    EXPECT_EQ(converter.getBytesToCurrentOffset(5), "");
    EXPECT_EQ(converter.getBytesFromCurrentOffset(1), "e");
    EXPECT_EQ(converter.getBytesFromCurrentOffset(2), "");  // all that are left
    EXPECT_EQ(converter.getBytesFromCurrentOffset(~0UL), "");
    EXPECT_EQ(TextConverter().getBytesToCurrentOffset(0), "");
    EXPECT_EQ(TextConverter().getBytesFromCurrentOffset(0), "");
}

TEST(TextConverter, ConversionsAndTheirMarks) {
    const struct {
        std::string octets;
        std::vector<TextConverter::Conversion> stages;
        std::string expected;
        bool isMarked;
    } rows[] = {
        {"\x01\xAF", {kBinaryToHex}, "01af", false},
        {"1aBGx2f", {kHexToBinary}, std::string("\x1A\xB0\x02", 3), false},
        {std::string("\0A\xD8\x3D\xDE\0", 6), {kOctetToUcs2, kUcs2ToUtf8}, "A\U0001F600", false},
        {"\U0001F600\xFF", {kUtf8ToUcs2, kUcs2ToOctet}, {"\xD8\x3D\xDE\0\xFF\xFD", 6}, true},
        {std::string("\0Ax", 3), {kOctetToUcs2, kUcs2ToOctet}, {"\0A", 2}, true},
        {"aé", {kUtf8ToUcs2, kUcs2ToAscii7}, "a?", true},
        {"a\x80", {kAscii7ToUcs2, kUcs2ToUtf8}, "a\uFFFD", true},
        {"a\xE9", {kISOLatin1ToUcs2, kUcs2ToUtf8}, "aé", false},
        {"가", {kUtf8ToUcs2, kISOLatin1ToUcs2, kUcs2ToUtf8}, "\uFFFD", true},
    };
    for (const auto& row : rows) {
        Converter converter(row.octets, row.stages);
        EXPECT_EQ(converter.readChars(99), row.expected);
        EXPECT_EQ(converter.exceptionOccurred(), row.isMarked) << row.expected;
        converter.setSource("", 0);
        EXPECT_FALSE(converter.exceptionOccurred());
    }
}

TEST(TextConverter, HexNumbersAndCounts) {
    const auto number = [](const std::string& text) {
        return TextConverter::decodeHexString(text.data(), text.size());
    };
    EXPECT_EQ(number(""), 0U);
    EXPECT_EQ(number("1aF"), 0x1AFU);
    EXPECT_EQ(number("1g:/@G`2"), 0x10000002U);
    EXPECT_EQ(number("123456789A"), 0x3456789AU);

    using Tables = TextConverter::Ucs2ToGsm7Tables;
    const std::string text = "a€\U0001F600ğ";
    EXPECT_EQ(TextConverter::countCharactersInUtf8Message(text.data(), text.size()), 5U);
    EXPECT_EQ(TextConverter::countSeptetsInMessage(text.data(), text.size(), Tables::kDefault), 5U);
    EXPECT_EQ(TextConverter::countSeptetsInMessage(text.data(), text.size(), Tables::kTurkish), 4U);
    EXPECT_EQ(TextConverter::getGsm7EncodedSize('a', Tables::kDefault), 7);
    EXPECT_EQ(TextConverter::getGsm7EncodedSize(0x20AC, Tables::kDefault), 14);
}

TEST(TextConverter, Names) {
    const auto name = [](auto value) { return std::string(asString(value)); };
    using Encoding = TextConverter::MessageEncoding;
    using Language = TextConverter::NationalLanguageId;
    const char* const encodings[] = {"kGSM7", "k8BitData", "kUCS2", "kKSC5601", "Unknown"};
    const char* const languages[] = {"None", "Turkish", "Spanish", "Portuguese", "Unknown"};
    for (int i = 0; i < 5; ++i) {
        EXPECT_EQ(name(static_cast<Encoding>(i)), encodings[i]);
        EXPECT_EQ(name(static_cast<Language>(i)), languages[i]);
    }
}

TEST(TextConverter, RandomChainsReadAlikeSinglyAndInRuns) {
    std::mt19937 random(7);
    for (int i = 0; i < 5000; ++i) {
        std::vector<std::uint8_t> input(random() % 600);
        const std::uint32_t mask = random() % 2 == 0 ? 0xFF : 0x7F;
        for (std::uint8_t& octet : input)
            octet = static_cast<std::uint8_t>(random() & mask);
        LLVMFuzzerTestOneInput(input.data(), input.size());
    }
}

}  // namespace

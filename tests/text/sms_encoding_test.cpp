#include "plr/text/sms_encoding.h"

#include <gtest/gtest.h>

#include <numeric>
#include <random>
#include <string>
#include <vector>

#include "plr/text/sms_user_data.h"

// Encodings, sizes and cuts; and texts through user data and back.
namespace plr {
namespace {

using enum TextConverter::NationalLanguageId;
using Languages = std::vector<TextConverter::NationalLanguageId>;
using MessageEncoding = TextConverter::MessageEncoding;

const SmsEncoding kUcs2{MessageEncoding::kUCS2};

std::string times(std::size_t n, const std::string& text) {
    std::string all;
    while (n-- > 0)
        all += text;
    return all;
}

SmsEncoding gsm7(TextConverter::NationalLanguageId locking,
                 TextConverter::NationalLanguageId single) {
    return {MessageEncoding::kGSM7, locking, single};
}

TEST(SmsEncoding, TakesTheFewestPartsAndThenTheFewestTables) {
    const struct {
        const char* name;
        std::string text;
        Languages languages;
        SmsEncoding encoding;
    } rows[] = {
        {"default", "hello {€}", {kTurkish}, {}},
        {"nothing", "", {kTurkish}, {}},
        {"not allowed", "ş", {}, kUcs2},
        {"single shift for few", "ş", {kTurkish}, gsm7(kNone, kTurkish)},
        {"locking for many", times(155, "ş"), {kTurkish}, gsm7(kTurkish, kNone)},
        {"single shift at its end", times(77, "ş") + "a", {kTurkish}, gsm7(kNone, kTurkish)},
        {"locking beyond", times(78, "ş"), {kTurkish}, gsm7(kTurkish, kNone)},
        {"the language that has it",
         "ã",
         {kTurkish, kSpanish, kPortuguese},
         gsm7(kNone, kPortuguese)},
        {"the first of two", "çá", {kPortuguese, kSpanish}, gsm7(kNone, kPortuguese)},
        {"fewer septets",
         "ğ" + times(20, "ã"),
         {kTurkish, kPortuguese},
         gsm7(kPortuguese, kTurkish)},
        {"one of each language", "ğã", {kTurkish, kPortuguese}, gsm7(kTurkish, kPortuguese)},
        {"Spanish has no locking shift", times(160, "á"), {kSpanish}, gsm7(kNone, kSpanish)},
        {"other scripts", "Привет", {kTurkish, kSpanish, kPortuguese}, kUcs2},
        {"ill-formed", "a\xFF", {kTurkish}, kUcs2},
    };
    for (const auto& row : rows) {
        const SmsEncoding chosen = chooseSmsEncoding(row.text, row.languages);
        EXPECT_TRUE(chosen == row.encoding)
            << row.name << ": " << asString(chosen.encoding) << ' ' << asString(chosen.locking)
            << ' ' << asString(chosen.single);
    }
}

TEST(SmsSize, CountsUnitsBehindHeaders) {
    using enum SmsReference;
    const struct {
        const char* name;
        std::string text;
        SmsEncoding encoding;
        SmsReference reference;
        std::size_t parts, units, unitsAPart, unitsLeft;
    } rows[] = {
        {"nothing", "", {}, k8Bit, 1, 0, 160, 160},
        {"full", times(160, "x"), {}, k8Bit, 1, 160, 160, 0},
        {"one more", times(161, "x"), {}, k8Bit, 2, 161, 153, 145},
        {"one more, wide", times(161, "x"), {}, k16Bit, 2, 161, 152, 143},
        {"one more, untied", times(161, "x"), {}, kNone, 2, 161, 160, 159},
        {"one table",
         times(156, "x"),
         {MessageEncoding::kGSM7, {}, kTurkish},
         k8Bit,
         2,
         156,
         149,
         142},
        {"two tables", "x", gsm7(kTurkish, kTurkish), k8Bit, 1, 1, 152, 151},
        {"escape over the end", times(152, "x") + times(8, "€"), {}, k8Bit, 2, 168, 153, 137},
        {"not in the alphabet", "Ж", {}, k8Bit, 1, 1, 160, 159},
        {"UCS-2 full", times(35, "😀"), kUcs2, k8Bit, 1, 70, 70, 0},
        {"UCS-2", times(36, "😀"), kUcs2, k8Bit, 2, 72, 67, 61},
        {"UCS-2, wide", times(71, "Ж"), kUcs2, k16Bit, 2, 71, 66, 61},
    };
    for (const auto& row : rows) {
        SCOPED_TRACE(row.name);
        const SmsSize size = measureSms(row.text, row.encoding, row.reference);
        EXPECT_EQ(size.parts, row.parts);
        EXPECT_EQ(size.units, row.units);
        EXPECT_EQ(size.unitsAPart, row.unitsAPart);
        EXPECT_EQ(size.unitsLeft, row.unitsLeft);
    }
}

TEST(SmsSplit, KeepsTogetherWhatIsSeenAsOne) {
    const struct {
        const char* name;
        std::string sequence;
    } rows[] = {
        {"surrogates", "😀"},
        {"combining marks", "e\u0301\u0323"},
        {"Devanagari vowel", "क\u093F"},
        {"Thai SARA AM", "น\u0E33"},
        {"Korean syllable in parts", "\u1112\u1161\u11AB"},
        {"line end", "\r\n"},
        {"keycap", "1\uFE0F\u20E3"},
        {"colour of skin", "👍🏽"},
        {"family", "👨‍👩‍👧‍👦"},
        {"flag", "🇰🇷"},
        {"flag of tags", "🏴\U000E0067\U000E0062\U000E007F"},
    };
    for (const auto& row : rows)
        for (std::size_t units = 50; units <= 67; ++units) {
            const std::string before(units, 'a');
            const std::string first =
                splitSms(before + times(12, row.sequence) + before, kUcs2).at(0);
            const std::size_t whole = (67 - units) / measureSms(row.sequence, kUcs2).units;
            EXPECT_EQ(first, before + times(whole, row.sequence)) << row.name << ' ' << units;
        }
    EXPECT_EQ(splitSms(std::string(152, 'a') + "€€€€€", {}).at(0), std::string(152, 'a'));
}

TEST(SmsSplit, CutsBetweenCharactersWhatNoPartHasRoomFor) {
    const std::string text = "a" + times(300, "\u0301");
    const auto parts = splitSms("xx" + text, kUcs2);
    EXPECT_EQ(parts.size(), 5U) << "303 units, 67 a part";
    EXPECT_EQ(std::accumulate(parts.begin(), parts.end(), std::string()), "xx" + text);
    EXPECT_EQ(parts.at(0).size(), 3 + 64 * 2U) << "the parts are full";
}

// Texts of characters that the tables have, and of all others.
class Texts {
  public:
    std::string next() {
        static const std::vector<std::vector<std::string>> kinds = {
            {"a", "B", " ", "@", "é", "Ω", "\n"},
            {"€", "[", "{", "\\", "x"},
            {"ş", "Ğ", "ı", "€", "k"},
            {"ã", "Ê", "ç", "^", "á"},
            {"Ж", "中", "a", "e\u0301", "क\u093F"},
            {"😀", "👍🏽", "👨‍👩‍👧‍👦", "🇰🇷", "\u1112\u1161\u11AB", "\r\n"},
        };
        const auto& first = kinds[random_() % kinds.size()];
        const auto& second = kinds[random_() % 4];
        std::string text;
        for (std::size_t n = random_() % 700; n > 0; --n) {
            const auto& kind = random_() % 3 == 0 ? second : first;
            text += kind[random_() % kind.size()];
        }
        return text;
    }
    std::minstd_rand random_{7};
};

std::string decoded(const std::vector<SmsPart>& parts, SmsReference reference) {
    std::string text;
    for (std::size_t i = 0; i < parts.size(); ++i) {
        const auto& [userData, length, codingScheme, hasHeader] = parts[i];
        EXPECT_LE(userData.size(), 140U);
        const auto read = decodeSmsUserData(userData, codingScheme, length, hasHeader);
        EXPECT_EQ(read.error, SmsUserDataError::kNone);
        EXPECT_FALSE(read.hasReplacements);
        const bool isTied = parts.size() > 1 && reference != SmsReference::kNone;
        EXPECT_EQ(read.header.concatenation.has_value(), isTied);
        if (read.header.concatenation) {
            EXPECT_EQ(*read.header.concatenation,
                      (SmsConcatenation{0x5A, static_cast<std::uint8_t>(parts.size()),
                                        static_cast<std::uint8_t>(i + 1)}));
        }
        text += read.text;
    }
    return text;
}

TEST(SmsEncoding, TextsComeBackFromTheirPartsAndMeasuresHold) {
    Texts texts;
    for (int round = 0; round < 200; ++round) {
        const std::string text = texts.next();
        const auto reference = static_cast<SmsReference>(round % 3);
        const Languages languages = round % 4 == 0   ? Languages{}
                                    : round % 4 == 1 ? Languages{kTurkish}
                                                     : Languages{kPortuguese, kSpanish, kTurkish};
        const SmsEncoding encoding = chooseSmsEncoding(text, languages, reference);
        const auto parts = encodeSms(text, encoding, reference, 0x5A);
        ASSERT_EQ(decoded(parts, reference), text);
        const SmsSize size = measureSms(text, encoding, reference);
        ASSERT_EQ(size.parts, parts.size()) << text;
        const std::string filled = text + std::string(size.unitsLeft, 'a');
        EXPECT_EQ(encodeSms(filled, encoding, reference).size(), size.parts) << text;
        EXPECT_EQ(encodeSms(filled + 'a', encoding, reference).size(), size.parts + 1) << text;
    }
}

}  // namespace
}  // namespace plr

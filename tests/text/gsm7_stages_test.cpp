#include <gtest/gtest.h>

#include <optional>
#include <string>

#include "plr/format/hex.h"
#include "plr/text/gsm7.h"
#include "src/text/gsm7_alphabets.h"
#include "stage_run.h"

// The stages between UTF-16 and the GSM alphabets, against searches in the alphabets.
namespace {

using namespace plr;
using namespace plr::test;
using enum TextConverter::Conversion;
using Tables = TextConverter::Ucs2ToGsm7Tables;

constexpr std::uint32_t kEscape = 0x1B;
constexpr std::uint32_t kGrin = 0xD83DDE00;  // U+1F600
constexpr std::uint32_t kReplacement = 0xFFFD;

gsm7::Table alphabetOf(int id) {
    return gsm7::kAlphabets[id >= 0 && id <= 3 ? static_cast<std::size_t>(id) : 0];
}

gsm7::Table extensionOf(int id) {
    return gsm7::kExtensions[id >= 0 && id <= 3 ? static_cast<std::size_t>(id) : 0];
}

// A unit's code in GSM 7-bit, as ucs2ToGsm7() has it.
std::int32_t find(char16_t unit, int locking, int single) {
    const auto septet = alphabetOf(locking).find(unit);
    if (septet != gsm7::Table::npos && septet != kEscape)
        return static_cast<std::int32_t>(septet);
    const auto behind = unit == u' ' ? gsm7::Table::npos : extensionOf(single).find(unit);
    return behind == gsm7::Table::npos ? -1 : static_cast<std::int32_t>(kEscape << 8 | behind);
}

Codes codesOf(std::int32_t code) {
    if (code < 0)
        return {'?'};
    const auto septet = static_cast<std::uint32_t>(code);
    return septet > 0xFF ? Codes{kEscape, septet & 0x7F} : Codes{septet};
}

void checkEveryUnit(int tables, int locking, int single) {
    const StageOf encoder{kUcs2ToGsm7, tables};
    const StageOf decoder{kGsm7ToUcs2, locking, single};
    for (std::uint32_t unit = 0; unit <= 0xFFFF; ++unit) {
        const std::int32_t code = find(static_cast<char16_t>(unit), locking, single);
        const Codes codes = codesOf(code);
        ASSERT_EQ(ucs2ToGsm7(unit, static_cast<Tables>(tables)), code) << unit;
        ASSERT_EQ(make(encoder, {unit}), (Made{codes, code < 0, 1})) << unit;
        if (code >= 0) {
            ASSERT_EQ(make(decoder, codes), (Made{{unit}, false, codes.size()})) << unit;
        }
    }
    EXPECT_EQ(make(encoder, {kGrin, 'a'}), (Made{{'?', 'a'}, true, 2}));
    EXPECT_EQ(ucs2ToGsm7(kGrin, static_cast<Tables>(tables)), -1);
}

TEST(Gsm7Stages, EveryUnitInEveryPairOfTables) {
    for (int locking = 0; locking <= 3; ++locking)
        for (int single = 0; single <= 3; ++single) {
            SCOPED_TRACE("locking " + std::to_string(locking) + ", single " +
                         std::to_string(single));
            checkEveryUnit(locking + 16 * single, locking, single);
        }
    for (const int unknown : {0x04, 0x14, 0x40, 0x100, -1})
        EXPECT_EQ(make({kUcs2ToGsm7, unknown}, {0x20AC, 0x11E}),
                  make({kUcs2ToGsm7}, {0x20AC, 0x11E}));
}

TEST(Gsm7Stages, EverySeptetInEveryPairOfTables) {
    for (int locking = -1; locking <= 4; ++locking)
        for (int single = -1; single <= 4; ++single) {
            const StageOf decoder{kGsm7ToUcs2, locking, single};
            for (std::uint32_t septet = 0; septet < 0x80; ++septet) {
                if (septet == kEscape)
                    continue;
                const std::uint32_t plain = alphabetOf(locking)[septet];
                const std::uint32_t shifted = extensionOf(single)[septet];
                ASSERT_EQ(make(decoder, {septet}), (Made{{plain}, false, 1})) << septet;
                ASSERT_EQ(make(decoder, {kEscape, septet, septet}),
                          (Made{{shifted == ' ' ? plain : shifted, plain}, false, 3}))
                    << septet;
            }
        }
}

TEST(Gsm7Stages, WhatIsNoTextIsReplaced) {
    const struct {
        StageOf of;
        Codes input;
        Codes output;
    } rows[] = {
        {{kGsm7ToUcs2}, {'a', kEscape, kEscape, 'b'}, {'a', ' ', 'b'}},
        {{kGsm7ToUcs2}, {'a', kEscape}, {'a'}},
        {{kGsm7ToUcs2}, {0x80, 'a', 0xFFFFFFFE}, {kReplacement, 'a', kReplacement}},
        {{kGsm7ToUcs2}, {kEscape, 0x80, 'e'}, {kReplacement, 'e'}},
        {{kAdn8ToUcs2, 0x400}, {0x100, kEscape, 'e'}, {kReplacement, 0x20AC}},
        {{kAdn8ToUcs2, 0x400}, {'a', kEscape}, {'a'}},
        {{kOctetToGsm7}, {0x80, 'a', 0xFE, 0x100}, {'?', 'a', '?', '?'}},
    };
    for (const auto& row : rows)
        for (const std::size_t run : {1U, 100U})
            EXPECT_EQ(make(row.of, row.input, run), (Made{row.output, true, row.input.size()}));
    EXPECT_EQ(make({kAdn8ToUcs2, 0x400}, {kEscape, 0x81}), (Made{{0x401}, false, 2}));
}

// Runs of every length give the same, and read as far; also from memory.
TEST(Gsm7Stages, RunsAreAsSingleCodes) {
    Codes units;
    for (std::uint32_t i = 0; i < 400; ++i)
        units.push_back(i % 7 < 3 && i < 200 ? 0x20AC : i % 50 == 0 ? 0x4E00 : 'a' + i % 26);
    Codes codes = make({kUcs2ToGsm7}, units).codes;
    codes.insert(codes.begin() + 100, {kEscape, kEscape, 0x90, kEscape, 0xFF, 'a'});
    codes.insert(codes.end() - 100, 0x80 + kEscape);
    const std::string octets(codes.begin(), codes.end());
    for (const int limit : {0, 1, 2, 3, 17, 256, -1})
        for (const std::size_t run : {1U, 2U, 3U, 5U, 64U, 1000U}) {
            EXPECT_EQ(make({kUcs2ToGsm7}, units, run, limit), make({kUcs2ToGsm7}, units, 1, limit));
            for (const StageOf& decoder : {StageOf{kGsm7ToUcs2}, StageOf{kAdn8ToUcs2, 0x400}}) {
                const Made expected = make(decoder, codes, 1, limit);
                EXPECT_EQ(make(decoder, codes, run, limit), expected);
                EXPECT_EQ(makeFromMemory(decoder, octets, run, limit), expected);
            }
        }
}

TEST(Gsm7Stages, AResetForgetsHalfOfAPair) {
    CodeSource source({0x20AC, 'a'});
    const auto stage = makeStage(kUcs2ToGsm7, 0, 0);
    stage->setSource(&source);
    stage->setCount(-1);
    EXPECT_EQ(stage->nextCode(), kEscape);
    stage->reset();
    EXPECT_EQ(stage->nextCode(), 'a');
}

TEST(Gsm7Stages, KnownTexts) {
    const struct {
        const char* text;
        Tables tables;
        const char* septets;
    } rows[] = {
        {"@£ Δ_ñ¿à", Tables::kDefault, "00012010117d607f"},
        {"€[^]\f", Tables::kDefault, "1b651b3c1b141b3e1b0a"},
        {"ĞğŞşİıç€", Tables::kTurkish, "0b0c1c1d40076004"},
        {"ĞğŞşİıç€", Tables::kTurkishSingle, "1b471b671b531b731b491b691b631b65"},
        {"Ğ{", Tables::kTurkishLocking, "0b1b28"},
        {"çÁáÍíÓóÚúñ", Tables::kSpanishSingle, "1b091b411b611b491b691b4f1b6f1b551b757d"},
        {"êúíóçÔôÁáªÇÀ∞Óºãõ`~|", Tables::kPortuguese,
         "0406070809 0b0c0e0f 12131415 19 24 7b7c7d 601a"},
        {"ÊÂâÃÀΦ€", Tables::kPortugueseSingle, "1b1f1b611b7f1b5b1b41121b65"},
        {"ΦΓç", Tables::kPortuguese, "1b121b1309"},
    };
    for (const auto& row : rows) {
        TextConverter converter;
        converter.setSource(row.text, std::string(row.text).size());
        converter.pushConversion(kUtf8ToUcs2);
        converter.pushConversion(kUcs2ToGsm7, static_cast<int>(row.tables));
        const std::string septets = converter.readChars(100);
        EXPECT_EQ(hex(septets.data(), septets.size()),
                  hex(parse_hex(row.septets, kHexWhitespaceSkip)))
            << row.text;
        EXPECT_FALSE(converter.exceptionOccurred()) << row.text;
    }
}

// From a base on, in what form a unit goes into an alpha identifier.
Codes adn8Of(char16_t unit, int base) {
    const std::int32_t code = find(unit, 0, 0);
    const auto distance = static_cast<std::uint16_t>(unit - base);
    return distance < 0x80 && (code < 0 || code > 0xFF) ? Codes{0x80U + distance} : codesOf(code);
}

TEST(AlphaIdentifierStages, EveryUnitWithSeveralBases) {
    for (const int base : {0, 0x0380, 0x0400, 0x0530, 0x2080, 0xFFC0, 0x1'0400, -0x40}) {
        const StageOf encoder{kUcs2ToAdn8, base};
        const StageOf decoder{kAdn8ToUcs2, base};
        for (std::uint32_t unit = 0; unit <= 0xFFFF; ++unit) {
            const Codes codes = adn8Of(static_cast<char16_t>(unit), base);
            const bool isLost = codes == Codes{'?'} && unit != '?';
            ASSERT_EQ(make(encoder, {unit}), (Made{codes, isLost, 1})) << unit << " at " << base;
            if (!isLost) {
                ASSERT_EQ(make(decoder, codes), (Made{{unit}, false, codes.size()}))
                    << unit << " at " << base;
            }
        }
        EXPECT_EQ(make(encoder, {kGrin}), (Made{{'?'}, true, 1}));
    }
}

TEST(AlphaIdentifierStages, UnusedOctetsEndSeptets) {
    CodeSource source({'a', 0x7F, 0xFF, 'b'});
    const auto stage = makeStage(kOctetToGsm7, 0, 0);
    stage->setSource(&source);
    stage->setCount(-1);
    EXPECT_EQ(drain(*stage, 10), (Codes{'a', 0x7F}));
    EXPECT_EQ(drain(*stage, 10), Codes());
    EXPECT_EQ(source.pulled(), 3U) << "nothing behind the end is read";
    EXPECT_FALSE(stage->getExceptionStatus());
    stage->reset();
    EXPECT_EQ(drain(*stage), Codes{'b'});
}

}  // namespace

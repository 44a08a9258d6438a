#include <gtest/gtest.h>

#include <functional>
#include <memory>
#include <numeric>
#include <optional>
#include <set>
#include <string>

#include "src/text/utf16.h"
#include "tests/text/stage_run.h"

// Every code unit, and some pairs and codes that are neither, through a stage and back.
namespace {

using namespace plr::test;
using enum plr::TextConverter::Conversion;
using Result = std::pair<Codes, bool>;  // codes, and whether a stage is marked

struct Row {
    std::string name;
    StageOf there;
    std::optional<StageOf> back;
    std::function<Result(std::uint32_t)> expected;
};

Result kept(std::uint32_t code) {
    return {{code}, false};
}
Result replacedBy(std::uint32_t code) {
    return {{code}, true};
}

auto keptBelow(std::uint32_t limit, std::uint32_t replacement) {
    return [=](std::uint32_t code) { return code < limit ? kept(code) : replacedBy(replacement); };
}

Result inUtf8(std::uint32_t code) {
    const bool isUnit = code <= 0xFFFF && code >> 11 != 0xD800 >> 11;
    return isUnit || plr::utf16::isPair(code) ? kept(code) : replacedBy(0xFFFD);
}

Result inUcs2Octets(std::uint32_t code) {
    if (plr::utf16::isPair(code))
        return {{code >> 16, code & 0xFFFF}, false};
    return code <= 0xFFFF ? kept(code) : replacedBy(0xFFFD);
}

Result inSeptets(std::uint32_t code) {
    return {{code & 0x7F}, code > 0x7F};
}

// What the decoder makes of some code, alone or behind an escape, is kept.
auto keptIfDecoded(const StageOf& decoder) {
    std::set<std::uint32_t> decoded;
    for (std::uint32_t code = 0; code <= 0xFF; ++code)
        for (const Codes& codes : {Codes{code}, Codes{0x1B, code}}) {
            const Made made = make(decoder, codes);
            if (!made.isMarked && made.codes.size() == 1)
                decoded.insert(made.codes[0]);
        }
    return [=](std::uint32_t code) { return decoded.count(code) ? kept(code) : replacedBy('?'); };
}

std::vector<Row> rows() {
    std::vector<Row> rows{
        {"Utf8", {kUcs2ToUtf8}, {{kUtf8ToUcs2}}, inUtf8},
        {"OctetsAsUtf8", {kUtf8ToUcs2}, {}, keptBelow(0x80, 0xFFFD)},
        {"Ucs2Octets", {kUcs2ToOctet}, {{kOctetToUcs2}}, inUcs2Octets},
        {"Ascii", {kUcs2ToAscii7}, {{kAscii7ToUcs2}}, keptBelow(0x80, '?')},
        {"OctetsAsAscii", {kAscii7ToUcs2}, {}, keptBelow(0x80, 0xFFFD)},
        {"OctetsAsLatin1", {kISOLatin1ToUcs2}, {}, keptBelow(0x100, 0xFFFD)},
        {"OctetsAsEucKr", {kEucKRToUcs2}, {}, keptBelow(0x80, 0xFFFD)},
        {"OctetsOfSim",
         {kOctetToGsm7},
         {},
         [](std::uint32_t code) { return code == 0xFF ? Result() : keptBelow(0x80, '?')(code); }},
        {"Hex",
         {kBinaryToHex},
         {{kHexToBinary}},
         [](std::uint32_t code) { return kept(code & 0xFF); }},
        {"GsmSeptets",
         {kGsm7ToUcs2},
         {{kUcs2ToGsm7}},
         [](std::uint32_t code) {
             return code == 0x1B ? Result{{}, true} : keptBelow(0x80, '?')(code);
         }},
        {"SmsSeptets", {kSmsPack}, {{kSmsUnpack}}, inSeptets},
        {"SmsSeptetsBehindFillBits", {kSmsPack, 3}, {{kSmsUnpack, 3}}, inSeptets},
        {"UssdSeptets", {kUssdPack}, {{kSmsUnpack}}, inSeptets},
        {"C2KSeptets", {kC2KSmsUnpackedToPacked}, {{kC2KSmsPackedToUnpacked}}, inSeptets},
        {"OctetsAsSmsSeptets",
         {kSmsUnpack},
         {},
         [](std::uint32_t code) {
             return Result{{code & 0x7F}, code > 0xFF};
         }},
        {"OctetsAsC2KSeptets",
         {kC2KSmsPackedToUnpacked},
         {},
         [](std::uint32_t code) {
             return Result{{code >> 1 & 0x7F}, code > 0xFF};
         }},
    };
    for (const int locking : {0, 1, 3})
        for (const int single : {0, 1, 2, 3}) {
            const StageOf encoder{kUcs2ToGsm7, locking + 16 * single};
            const StageOf decoder{kGsm7ToUcs2, locking, single};
            const std::string name = std::to_string(locking) + std::to_string(single);
            rows.push_back({"Gsm7Tables" + name, encoder, decoder, keptIfDecoded(decoder)});
        }
    for (const int base : {0, 0x3C0, 0xAC00, 0xFFC0}) {
        const StageOf decoder{kAdn8ToUcs2, base};
        rows.push_back({"Adn8From" + std::to_string(base),
                        {kUcs2ToAdn8, base},
                        decoder,
                        keptIfDecoded(decoder)});
    }
    return rows;
}

class Stage {
  public:
    explicit Stage(const StageOf& of) : stage_(plr::makeStage(of.conversion, of.p, of.q)) {
        stage_->setSource(&source_);
        stage_->setCount(-1);
    }
    Result operator()(const Codes& codes) {
        source_.setCodes(codes);
        stage_->reset();
        Codes made = drain(*stage_, 4);
        return {std::move(made), stage_->getExceptionStatus()};
    }

  private:
    CodeSource source_;
    std::unique_ptr<plr::TextTransform> stage_;
};

class CodeUnits : public testing::TestWithParam<Row> {};

TEST_P(CodeUnits, ComeBackOrAreReplacedAndMark) {
    const Row& row = GetParam();
    Codes codes(0x10000);
    std::iota(codes.begin(), codes.end(), 0U);
    for (const std::uint32_t pair : {0xD800DC00, 0xD83DDE00, 0xDBFFDFFF})
        codes.push_back(pair);
    for (const std::uint32_t none : {0x10000U, 0x110000U, 0xD800D800U, 0xDC00D800U, 0xFFFFFFFEU})
        codes.push_back(none);
    Stage there(row.there);
    Stage back(row.back.value_or(StageOf{kUtf8ToUcs2}));
    for (const std::uint32_t code : codes) {
        Result result = there({code});
        if (row.back) {
            const auto [made, isMarked] = back(result.first);
            result = {made, result.second || isMarked};
        }
        ASSERT_EQ(result, row.expected(code)) << std::hex << code;
    }
}

INSTANTIATE_TEST_SUITE_P(All, CodeUnits, testing::ValuesIn(rows()),
                         [](const auto& row) { return row.param.name; });

}  // namespace

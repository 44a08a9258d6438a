#include <gtest/gtest.h>

#include <string>

#include "plr/format/hex.h"
#include "plr/text/octet_source_buffer.h"
#include "stage_run.h"

// Packing and unpacking septets against a model that moves single bits.
namespace {

using namespace plr;
using namespace plr::test;
using enum TextConverter::Conversion;
using Bits = std::vector<bool>;

constexpr std::uint32_t kCr = 0x0D;

void append(Bits& bits, std::uint32_t code, int width, bool lowFirst) {
    for (int i = 0; i < width; ++i)
        bits.push_back((code >> (lowFirst ? i : width - 1 - i) & 1) != 0);
}

struct Packing {
    TextConverter::Conversion conversion;
    int in;  // bits
    int out;
    bool lowFirst;
};

constexpr Packing kPackings[] = {{kSmsPack, 7, 8, true},
                                 {kUssdPack, 7, 8, true},
                                 {kSmsUnpack, 8, 7, true},
                                 {kC2KSmsPackedToUnpacked, 8, 7, false},
                                 {kC2KSmsUnpackedToPacked, 7, 8, false}};

// The first bit that is delivered, from the first of the source on.
int offsetOf(const Packing& packing, int p) {
    switch (packing.conversion) {
        case kC2KSmsPackedToUnpacked:
            return p % 8;
        case kC2KSmsUnpackedToPacked:
            return 0;
        default:
            return packing.in == 8 ? (p + 70) % 7 : -((p + 70) % 7);
    }
}

Codes model(const Packing& packing, int p, const Codes& input) {
    const int offset = offsetOf(packing, p);
    Bits bits(static_cast<std::size_t>(std::max(-offset, 0)));
    for (const std::uint32_t code : input)
        append(bits, code, packing.in, packing.lowFirst);
    bits.erase(bits.begin(),
               bits.begin() + std::min<std::ptrdiff_t>(std::max(offset, 0), std::ssize(bits)));
    const bool endsWithCr = !input.empty() && input.back() == kCr;
    if (packing.conversion == kUssdPack &&
        (bits.size() % 8 == 1 || (endsWithCr && bits.size() % 8 == 0)))
        append(bits, kCr, 7, true);
    while (packing.out == 8 && bits.size() % 8 != 0)
        bits.push_back(false);
    Codes codes;
    const auto out = static_cast<std::size_t>(packing.out);
    for (std::size_t at = 0; at + out <= bits.size(); at += out) {
        std::uint32_t code = 0;
        for (std::size_t i = 0; i < out; ++i)
            if (bits[at + i])
                code |= 1U << (packing.lowFirst ? i : out - 1 - i);
        codes.push_back(code);
    }
    return codes;
}

// All ends are met with and without a CR.
Codes someCodes(std::size_t length, int width, bool withCr) {
    Codes codes(length);
    for (std::size_t i = 0; i < length; ++i)
        codes[i] = static_cast<std::uint32_t>(i * 37 + length * 11 + 5) % (1U << width);
    if (withCr && length != 0)
        codes.back() = kCr;
    return codes;
}

TEST(SeptetStages, EveryLengthAndOffsetIsAsBitByBit) {
    for (const Packing& packing : kPackings)
        for (int p = -8; p <= 8; ++p)
            for (std::size_t length = 0; length <= 200; ++length) {
                const StageOf of{packing.conversion, p};
                const Codes input = someCodes(length, packing.in, length % 3 != 0);
                const Made expected{model(packing, p, input), false, length};
                for (const std::size_t run : {1U, 13U, 512U})
                    ASSERT_EQ(make(of, input, run), expected)
                        << static_cast<int>(of.conversion) << ", p " << p << ", run " << run;
                const std::string octets(input.begin(), input.end());
                ASSERT_EQ(makeFromMemory(of, octets, 512), expected) << p << ", " << length;
            }
}

TEST(SeptetStages, UnpackingUndoesPacking) {
    for (int p = -8; p <= 8; ++p)
        for (std::size_t length = 0; length <= 200; ++length)
            for (const std::size_t run : {1U, 50U, 1000U}) {
                const Codes septets = someCodes(length, 7, true);
                const int limit = static_cast<int>(length);
                const Codes packed = make({kSmsPack, p}, septets, run).codes;
                const Made back{septets, false, length == 0 ? 0 : packed.size()};
                ASSERT_EQ(make({kSmsUnpack, p}, packed, run, limit), back) << p << ", " << length;
                const Codes ussd = make({kUssdPack, p}, septets, run).codes;
                ASSERT_EQ(make({kSmsUnpack, p}, ussd, run, limit).codes, septets);
                const Codes packedHigh = make({kC2KSmsUnpackedToPacked}, septets, run).codes;
                ASSERT_EQ(make({kC2KSmsPackedToUnpacked}, packedHigh, run, limit).codes, septets);
            }
}

// As many source codes as the codes so far need.
TEST(SeptetStages, ReadNoFurtherThanTheyMust) {
    for (const Packing& packing : kPackings)
        for (int p = -7; p <= 7; ++p)
            for (int limit = 0; limit <= 30; ++limit) {
                const int bits = limit * packing.out + offsetOf(packing, p);
                const int needed =
                    limit == 0 || bits < 0 ? 0 : (bits + packing.in - 1) / packing.in;
                for (const std::size_t run : {1U, 8U, 100U})
                    ASSERT_EQ(make({packing.conversion, p}, Codes(60), run, limit).pulled,
                              static_cast<std::size_t>(needed))
                        << static_cast<int>(packing.conversion) << ", p " << p << ", " << limit;
            }
}

TEST(SeptetStages, CodesThatAreTooGreatAreCutAndMark) {
    for (const Packing& packing : kPackings)
        for (const std::size_t length : {1U, 8U, 20U}) {
            const std::uint32_t excess = 1U << packing.in;
            Codes codes = someCodes(length, packing.in, false);
            const Codes expected = make({packing.conversion}, codes).codes;
            codes[length / 2] |= excess;
            EXPECT_EQ(make({packing.conversion}, codes), (Made{expected, true, length}));
        }
}

TEST(SeptetStages, KnownMessages) {
    const struct {
        TextConverter::Conversion conversion;
        int p;
        std::string text;
        const char* packed;
    } rows[] = {
        {kSmsPack, 0, "hellohello", "e8329bfd4697d9ec37"},
        {kSmsPack, 1, "hellohello", "d06536fb8d2eb3d96f"},
        {kSmsPack, 0, "1234567", "31d98c56b3dd00"},
        {kUssdPack, 0, "1234567", "31d98c56b3dd1a"},
        {kUssdPack, 0, "1234567\r", "31d98c56b3dd1a0d"},
        {kUssdPack, 0, "*100#", "aa180c3602"},
        {kC2KSmsUnpackedToPacked, 0, "hello", "d19766cde0"},
    };
    for (const auto& row : rows) {
        TextConverter converter;
        converter.pushConversion(row.conversion, row.p);
        for (int times = 0; times < 2; ++times) {  // the second one after a reset
            converter.setSource(row.text.data(), row.text.size());
            const std::string packed = converter.readChars(100);
            EXPECT_EQ(hex(packed.data(), packed.size()), row.packed) << row.text;
            EXPECT_EQ(converter.readChars(1), "");
        }
    }
}

}  // namespace

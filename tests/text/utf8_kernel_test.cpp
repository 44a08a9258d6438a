#include "src/text/utf8_kernel.h"

#include <gtest/gtest.h>

#include <random>
#include <string>
#include <vector>

#include "src/text/utf16.h"
#include "src/text/utf8_decoder.h"

// Every kernel that this machine can run, against one that leaves all to single characters.
namespace {

using namespace plr;
using utf8kernel::Kernel;

constexpr Kernel kNone{"none", [](utf8kernel::Decoding&) noexcept {},
                       [](utf8kernel::Encoding&) noexcept {}};

struct Decoded {
    std::u16string units;
    std::size_t pairs;
    bool isMarked;
    std::size_t used;
    bool operator==(const Decoded&) const = default;
};

// Up to `most` units, or one more, of octets that fill their memory.
Decoded decode(const Kernel& kernel, const std::vector<unsigned char>& octets, std::size_t most) {
    Utf8Decoder decoder(octets, kernel);
    std::u16string units(most + 1, 0);
    units.resize(decoder.decode(units.data(), most, true));
    return {units, decoder.pairs(), decoder.isMarked(), decoder.used()};
}

void expectAlike(const std::vector<unsigned char>& octets, std::size_t most) {
    const Decoded expected = decode(kNone, octets, most);
    for (const Kernel& kernel : utf8kernel::kernels())
        ASSERT_TRUE(decode(kernel, octets, most) == expected)
            << kernel.name << " " << octets.size();
}

// But for those that begin as ASCII. One after the other, so that they stand at every place of
// a block.
TEST(Utf8Kernel, EverySequenceOfThreeOctets) {
    for (unsigned first = 0x7F; first < 256; ++first) {
        std::vector<unsigned char> octets;
        for (unsigned rest = 0; rest < 0x10000; ++rest)
            for (const unsigned octet : {first, rest >> 8, rest & 0xFF, unsigned{'|'}})
                octets.push_back(static_cast<unsigned char>(octet));
        octets.push_back('|');
        expectAlike(octets, octets.size());
        if (first % 16 != 0)
            continue;
        octets.erase(octets.begin(), octets.begin() + static_cast<std::ptrdiff_t>(first % 5));
        expectAlike(octets, octets.size());
    }
}

class Random {
  public:
    std::uint32_t operator()(std::uint32_t below) {
        return static_cast<std::uint32_t>(engine_() % below);
    }

    // Mostly of one kind, as texts are.
    std::uint32_t character() {
        constexpr std::uint32_t kinds[][2] = {{0x20, 0x60},     {0xC0, 0x500},   {0xAC00, 11172},
                                              {0x1F600, 0x300}, {0xFF00, 0x200}, {0x10FF00, 0x100}};
        if ((*this)(20) == 0)
            kind_ = (*this)(6);
        const auto& kind = kinds[(*this)(4) == 0 ? 0 : kind_];
        return kind[0] + (*this)(kind[1]);
    }
    std::uint32_t code() {
        const std::uint32_t point = character();
        return point < 0x10000 ? point : utf16::pairOfCharacter(point);
    }

  private:
    std::mt19937 engine_{11};
    std::uint32_t kind_ = 0;
};

std::string octetsOf(std::uint32_t code) {
    const auto tail = [](std::uint32_t bits) { return static_cast<char>(0x80 | (bits & 0x3F)); };
    if (code < 0x80)
        return {static_cast<char>(code)};
    if (code < 0x800)
        return {static_cast<char>(0xC0 | code >> 6), tail(code)};
    if (code < 0x10000)
        return {static_cast<char>(0xE0 | code >> 12), tail(code >> 6), tail(code)};
    const std::uint32_t point = utf16::characterOfPair(code);
    return {static_cast<char>(0xF0 | point >> 18), tail(point >> 12), tail(point >> 6),
            tail(point)};
}

TEST(Utf8Kernel, MixedTextsWholeAndSpoilt) {
    Random random;
    for (int i = 0; i < 20000; ++i) {
        std::string text;
        for (std::uint32_t length = random(120); length > 0; --length)
            text += octetsOf(random.code());
        if (!text.empty() && i % 3 == 0)
            text[random(static_cast<std::uint32_t>(text.size()))] = static_cast<char>(random(256));
        text.resize(text.size() - std::min<std::size_t>(text.size(), random(4)));
        const std::vector<unsigned char> octets(text.begin(), text.end());
        expectAlike(octets, i % 2 == 0 ? octets.size() : random(100));
    }
}

// What a kernel makes of UTF-16 is right, and it stops before what it must not convert, and near
// the end otherwise.
TEST(Utf8Kernel, EncodesUpToWhatIsNoCharacter) {
    Random random;
    for (int i = 0; i < 20000; ++i) {
        std::vector<char16_t> units;
        std::vector<std::string> characters;  // by unit; empty for the first of two
        const std::uint32_t length = random(100);
        while (units.size() < length) {
            const std::uint32_t code = random.code();
            if (utf16::isPair(code)) {
                units.push_back(static_cast<char16_t>(code >> 16));
                characters.emplace_back();
            }
            units.push_back(static_cast<char16_t>(code));
            characters.push_back(octetsOf(code));
        }
        std::size_t bad = units.size();
        if (!units.empty() && i % 3 == 0) {
            bad = random(static_cast<std::uint32_t>(bad));
            bad -= utf16::isLowSurrogate(units[bad]) ? 1 : 0;
            units[bad] = i % 2 == 0 ? 0xDFFF : u'x';  // a low one without its high one
            if (i % 2 != 0)
                units[bad] = bad + 1 < units.size() && utf16::isLowSurrogate(units[bad + 1])
                                 ? 0xDC00
                                 : 0xD800;
        }
        for (const Kernel& kernel : utf8kernel::kernels()) {
            std::vector<char> out(4 * units.size());
            utf8kernel::Encoding run{units.data(), units.data() + units.size(), out.data(),
                                     out.data() + out.size()};
            kernel.encode(run);
            const auto read = static_cast<std::size_t>(run.in - units.data());
            std::string expected;
            for (std::size_t k = 0; k < read; ++k)
                expected += characters[k];
            ASSERT_EQ(std::string(out.data(), run.out), expected) << kernel.name << " " << i;
            ASSERT_LE(read, bad) << kernel.name;
            ASSERT_GE(read + 1, std::min(bad, units.size() < 16 ? 0 : units.size() - 15))
                << kernel.name;
        }
    }
}

}  // namespace

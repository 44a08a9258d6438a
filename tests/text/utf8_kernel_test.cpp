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
using Codes = std::vector<std::uint32_t>;

constexpr Kernel kNone{"none", [](utf8kernel::Decoding&) noexcept {},
                       [](utf8kernel::Encoding&) noexcept {}};

struct Decoded {
    Codes codes;
    bool isMarked;
    std::size_t used;
    bool operator==(const Decoded&) const = default;
};

// Up to `most` codes of octets that fill their memory.
Decoded decode(const Kernel& kernel, const std::vector<unsigned char>& octets, std::size_t most) {
    Utf8Decoder decoder(octets, kernel);
    Codes codes(most);
    codes.resize(decoder.decode(codes.data(), most, true));
    return {codes, decoder.isMarked(), decoder.used()};
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

// Codes go in as they are, and pairs as two units, too. What a kernel makes of them is
// right, and it stops before what it must not convert, and near the end otherwise.
TEST(Utf8Kernel, EncodesUpToWhatIsNoCharacter) {
    Random random;
    for (int i = 0; i < 20000; ++i) {
        Codes codes;
        std::vector<std::string> characters;  // by code; empty for the second of two
        const std::uint32_t length = random(100);
        while (codes.size() < length) {
            const std::uint32_t code = random.code();
            if (utf16::isPair(code) && i % 2 == 0) {
                codes.push_back(code >> 16);
                characters.push_back(octetsOf(code));
            }
            codes.push_back(utf16::isPair(code) && i % 2 == 0 ? code & 0xFFFF : code);
            characters.push_back(codes.back() == code ? octetsOf(code) : std::string());
        }
        std::size_t bad = codes.size();
        if (!codes.empty() && i % 3 == 0) {
            constexpr std::uint32_t kBad[] = {0x10000, 0xFFFFFFFF, 0xD800D800, 0xD800, 0xDFFF};
            bad = random(static_cast<std::uint32_t>(bad));
            codes[bad] = kBad[random(i % 2 == 0 ? 3 : 5)];  // beside a half it would be one
        }
        for (const Kernel& kernel : utf8kernel::kernels()) {
            std::vector<char> out(4 * codes.size());
            utf8kernel::Encoding run{codes.data(), codes.data() + codes.size(), out.data(),
                                     out.data() + out.size()};
            kernel.encode(run);
            const auto read = static_cast<std::size_t>(run.in - codes.data());
            std::string expected;
            for (std::size_t k = 0; k < read; ++k)
                expected += characters[k];
            ASSERT_EQ(std::string(out.data(), run.out), expected) << kernel.name << " " << i;
            ASSERT_LE(read, bad) << kernel.name;
            ASSERT_GE(read + 1, std::min(bad, codes.size() < 16 ? 0 : codes.size() - 15))
                << kernel.name;
        }
    }
}

}  // namespace

#include "src/format/hex_kernel.h"

#include <gtest/gtest.h>
#include <sys/mman.h>
#include <unistd.h>

#include <cctype>
#include <cstdio>
#include <cstring>
#include <string>

// Every kernel that this machine can run, against loops of one character at a time.
namespace {

using plr::hexkernel::Kernel;

// Memory whose end stands at pages that may not be touched.
class Fence {
  public:
    Fence() {
        page_ = static_cast<std::size_t>(::sysconf(_SC_PAGESIZE));
        void* const got =
            ::mmap(nullptr, 2 * page_, PROT_READ | PROT_WRITE, MAP_PRIVATE | MAP_ANONYMOUS, -1, 0);
        EXPECT_NE(got, MAP_FAILED);
        begin_ = static_cast<char*>(got);
        EXPECT_EQ(::mprotect(begin_ + page_, page_, PROT_NONE), 0);
    }
    Fence(const Fence&) = delete;
    Fence& operator=(const Fence&) = delete;
    ~Fence() { ::munmap(begin_, 2 * page_); }

    // Places `content` so that it ends `gap` before the fence.
    char* put(const std::string& content, std::size_t gap) {
        std::memset(begin_, '~', page_);
        char* const place = begin_ + page_ - gap - content.size();
        std::memcpy(place, content.data(), content.size());
        return place;
    }
    // Nothing was written around the `bytes` that end `gap` before the fence.
    bool isKept(std::size_t bytes, std::size_t gap) const {
        const std::string all(begin_, page_);
        return all.find_first_not_of('~') >= page_ - gap - bytes &&
               all.substr(page_ - gap) == std::string(gap, '~');
    }

  private:
    std::size_t page_ = 0;
    char* begin_ = nullptr;
};

std::uint8_t* asBytes(char* text) {
    return reinterpret_cast<std::uint8_t*>(text);
}

std::string naiveHex(const std::string& bytes, bool lowerCase) {
    std::string text;
    for (const char byte : bytes) {
        char two[3];
        std::snprintf(two, sizeof two, lowerCase ? "%02x" : "%02X",
                      static_cast<std::uint8_t>(byte));
        text += two;
    }
    return text;
}

class HexKernel : public testing::TestWithParam<Kernel> {
  protected:
    const Kernel& kernel_ = GetParam();
    Fence in_;
    Fence out_;

    // What decoding `text` gives, at the fence; the strict count goes to `digits`.
    std::string decoded(const std::string& text, std::size_t gap, std::size_t& digits) {
        const std::size_t pairs = text.size() / 2;
        const char* const from = in_.put(text, gap);
        char* out = out_.put(std::string(pairs, ' '), gap);
        digits = kernel_.decodeStrict(asBytes(out), from, pairs);
        EXPECT_TRUE(out_.isKept(pairs, gap));
        const std::string strict(out, digits);
        out = out_.put(std::string(pairs, ' '), gap);
        kernel_.decode(asBytes(out), from, pairs);
        EXPECT_TRUE(out_.isKept(pairs, gap));
        const std::string lenient(out, pairs);
        EXPECT_EQ(strict, lenient.substr(0, digits));
        return lenient;
    }
};

TEST_P(HexKernel, EveryLengthAndAlignmentBothWays) {
    for (std::size_t length = 0; length <= 300; ++length) {
        std::string bytes(length, 0);
        for (std::size_t i = 0; i < length; ++i) {
            bytes[i] = static_cast<char>(i * 167 + length);
        }
        for (const std::size_t gap : {0U, 1U, 7U, 16U, 31U}) {
            for (const bool lowerCase : {false, true}) {
                char* const data = in_.put(bytes, gap);
                char* const out = out_.put(std::string(2 * length, ' '), gap);
                kernel_.encode(out, asBytes(data), length, lowerCase);
                const std::string text(out, 2 * length);
                ASSERT_EQ(text, naiveHex(bytes, lowerCase));
                ASSERT_TRUE(out_.isKept(2 * length, gap));
                std::size_t digits = 0;
                ASSERT_EQ(decoded(text, gap, digits), bytes);
                ASSERT_EQ(digits, length);
            }
        }
    }
}

TEST_P(HexKernel, EveryCharacterAtEveryPlace) {
    for (const std::size_t pairs : {3U, 8U, 13U, 45U}) {
        for (std::size_t place = 0; place < 2 * pairs; ++place) {
            for (int character = 0; character < 256; ++character) {
                std::string text(2 * pairs, '7');
                std::string expected(pairs, '\x77');
                text[place] = static_cast<char>(character);
                const bool isDigit = character < 128 && std::isxdigit(character) != 0;
                const int value = isDigit ? std::stoi(std::string(1, text[place]), nullptr, 16) : 0;
                expected[place / 2] =
                    static_cast<char>(place % 2 == 0 ? value * 16 + 7 : 7 * 16 + value);
                std::size_t digits = 0;
                ASSERT_EQ(decoded(text, 0, digits), expected) << place << " " << character;
                ASSERT_EQ(digits, isDigit ? pairs : place / 2) << place << " " << character;
            }
        }
    }
}

INSTANTIATE_TEST_SUITE_P(All, HexKernel, testing::ValuesIn(plr::hexkernel::kernels()),
                         [](const auto& kernel) { return std::string(kernel.param.name); });

TEST(HexKernelChoice, IsUsedFromTheFirstCallOn) {
    std::string bytes = "any bytes, more than one block of them";
    std::string text(2 * bytes.size(), 0);
    std::string back(bytes.size(), 0);
    plr::hexkernel::encodeHex(text.data(), asBytes(bytes.data()), bytes.size(), true);
    EXPECT_EQ(text, naiveHex(bytes, true));
    plr::hexkernel::decodeHex(asBytes(back.data()), text.data(), bytes.size());
    EXPECT_EQ(back, bytes);
    text[9] = 'g';
    EXPECT_EQ(plr::hexkernel::decodeHexStrict(asBytes(back.data()), text.data(), bytes.size()), 4U);
}

}  // namespace

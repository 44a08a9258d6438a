#include <algorithm>
#include <array>

#include "plr/text/octet_source_buffer.h"
#include "plr/text/text_converter.h"

namespace plr {
namespace {

constexpr std::size_t kFirst = 1024;  // characters that go through the stack, into memory of
                                      // their very number
constexpr std::size_t kStep = 16384;  // characters at a time, behind these
constexpr std::size_t kLeast = 64;    // characters for which there is room at each step
constexpr std::size_t kGreatestGrowth = 8;

// The text with room for what is left of a source of which `taken` octets made it; without
// trust in that, a few times its length at the most.
void grow(std::string& text, std::uint64_t taken, std::uint64_t left) {
    const std::uint64_t rest = left * text.size() / std::max<std::uint64_t>(taken, 1);
    text.reserve(std::min<std::uint64_t>(text.size() + rest + rest / 16 + kLeast,
                                         kGreatestGrowth * text.size()));
}

}  // namespace

std::string TextConverter::readChars(unsigned long max) {
    const std::uint64_t start = getSourceCount();
    std::array<char, kFirst> first;
    std::size_t got = top->nextChars(first.data(), std::min(max, first.size()));
    std::string text(first.data(), got);
    for (std::size_t wanted = first.size(); got == wanted && text.size() < max;) {
        if (text.capacity() - text.size() < kLeast)
            grow(text, getSourceCount() - start, getSourceAvailableCount());
        const std::size_t size = text.size();
        wanted = std::min({max - size, text.capacity() - size, kStep});
        text.resize(size + wanted);
        got = top->nextChars(text.data() + size, wanted);
        text.resize(size + got);
    }
    return text;
}

}  // namespace plr

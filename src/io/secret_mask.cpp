#include "src/io/secret_mask.h"

#include <algorithm>

namespace plr::io {
namespace {

constexpr std::uint64_t kStart = 1;  // a pattern may begin anywhere
constexpr std::uint64_t kAll = ~std::uint64_t{0};

constexpr bool isDigit(std::uint8_t byte) {
    return byte >= '0' && byte <= '9';
}
constexpr bool endsLine(std::uint8_t byte) {
    return byte == '\r' || byte == '\n';
}
constexpr bool isLetter(std::uint8_t byte) {
    return (byte | 0x20) >= 'a' && (byte | 0x20) <= 'z';
}

constexpr bool takes(char character, std::uint8_t byte) {
    if (character == '#')
        return isDigit(byte);
    const auto own = static_cast<std::uint8_t>(character);
    return byte == own || (isLetter(own) && (byte ^ 0x20) == own);
}

}  // namespace

bool SecretMask::add(std::string_view text) {
    Pattern pattern;
    States here = kStart;
    for (std::size_t i = 0; i < text.size(); ++i) {
        if (endsLine(static_cast<std::uint8_t>(text[i])))
            return false;
        if (i > 0 && text[i - 1] == '#' && text[i] != '#')
            pattern.stayOnDigit |= here;
        if (text[i] == '*') {
            pattern.stay |= here;
            continue;
        }
        if (here == kStart << kLongestPattern)
            return false;
        for (std::size_t byte = 0; byte < pattern.takes.size(); ++byte)
            pattern.takes[byte] |= takes(text[i], static_cast<std::uint8_t>(byte)) ? here : 0;
        pattern.secret |= text[i] == '#' ? here : 0;
        here <<= 1;
    }
    if (text.ends_with('#'))
        pattern.stayOnDigit |= here;
    pattern.end = here;
    if (pattern.secret == 0)
        return false;
    patterns_.push_back(pattern);
    return true;
}

void SecretMask::hide(std::span<const std::uint8_t> known, std::size_t count, std::uint8_t* shown) {
    std::copy_n(known.begin(), count, shown);
    for (Pattern& pattern : patterns_)
        hide(pattern, known, count, shown);
}

void SecretMask::hide(Pattern& pattern, std::span<const std::uint8_t> known, std::size_t count,
                      std::uint8_t* shown) {
    reached_[0] = pattern.reached;
    for (std::size_t i = 0; i < count; ++i)
        reached_[i + 1] = pattern.after(reached_[i], known[i]);
    pattern.reached = reached_[count];
    // From the end: the states from which the pattern's end can still be reached.
    States hopeful = kAll;
    for (std::size_t i = known.size(); i-- > 0;) {
        if (i < count && pattern.hides(reached_[i], known[i], hopeful))
            shown[i] = '*';
        hopeful = pattern.before(hopeful, known[i]);
    }
}

void SecretMask::skip() {
    for (Pattern& pattern : patterns_)
        pattern.reached = kAll;
}

SecretMask::States SecretMask::Pattern::staying(std::uint8_t byte) const {
    return stay | (isDigit(byte) ? stayOnDigit : 0);
}

SecretMask::States SecretMask::Pattern::after(States states, std::uint8_t byte) const {
    if (endsLine(byte))
        return kStart;
    return (states & takes[byte]) << 1 | (states & staying(byte)) | kStart;
}

SecretMask::States SecretMask::Pattern::before(States states, std::uint8_t byte) const {
    if (endsLine(byte))
        return end;
    return (states >> 1 & takes[byte]) | (states & staying(byte)) | end;
}

bool SecretMask::Pattern::hides(States from, std::uint8_t byte, States to) const {
    const States taken = (from & secret & takes[byte]) << 1;
    const States kept = isDigit(byte) ? from & stayOnDigit : 0;
    return ((taken | kept) & to) != 0;
}

}  // namespace plr::io

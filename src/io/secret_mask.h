#pragma once

#include <array>
#include <cstddef>
#include <cstdint>
#include <span>
#include <string_view>
#include <vector>

// Hides the secret digits of a stream of text lines, however the stream is cut.
//
// Patterns say where they are: "#" n times stands for n digits and all that follow
// them, which are secret; "*" for any text within the line (behind a "#" its digits are
// hidden, too: more than need be, never less); every other character for itself, in
// either case. CR and LF end lines.
//
// A pattern is an automaton whose states are the places between its characters, and
// a set of states is the bits of a word. What came of a line is kept as such a set,
// not as text: a line may have any length. A digit is hidden when some way through
// the pattern takes it for a "#" and what is known to follow leads to the pattern's
// end, or is over before that is decided.
//
// Threads: one at a time.
// Cost:    a few operations for each byte and pattern. Only add() allocates.
namespace plr::io {

class SecretMask {
  public:
    static constexpr std::size_t kLongestPattern = 63;  // characters, without "*"
    static constexpr std::size_t kMostAtOnce = 512;     // bytes

    // False for a pattern that is too long, without "#", or with a line's end. Throws
    // std::bad_alloc.
    [[nodiscard]] bool add(std::string_view pattern);

    // The stream goes on with `known`. Writes its first `count` bytes (at most
    // kMostAtOnce) to `shown`, with "*" for secret digits, and moves behind them; the
    // others will be given again.
    void hide(std::span<const std::uint8_t> known, std::size_t count, std::uint8_t* shown);

    // The stream goes on after bytes that nobody saw: up to the line's end, what
    // may be secret is.
    void skip();

  private:
    using States = std::uint64_t;
    static_assert(kLongestPattern < 8 * sizeof(States));

    struct Pattern {
        std::array<States, 256> takes{};  // by byte: the states that it moves on
        States secret = 0;                // those from which a digit is a secret one
        States stayOnDigit = 0;           // that a secret digit does not end
        States stay = 0;                  // that nothing but the line's end ends
        States end = 0;                   // the last
        States reached = 1;               // by the line so far

        [[nodiscard]] States after(States states, std::uint8_t byte) const;
        [[nodiscard]] States before(States states, std::uint8_t byte) const;
        [[nodiscard]] bool hides(States from, std::uint8_t byte, States to) const;
        [[nodiscard]] States staying(std::uint8_t byte) const;
    };

    void hide(Pattern& pattern, std::span<const std::uint8_t> known, std::size_t count,
              std::uint8_t* shown);

    std::vector<Pattern> patterns_;
    std::array<States, kMostAtOnce + 1> reached_;  // work area: before each byte
};

}  // namespace plr::io

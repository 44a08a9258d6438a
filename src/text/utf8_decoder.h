#pragma once

#include <cstddef>
#include <cstdint>
#include <span>

#include "src/text/utf8_kernel.h"

namespace plr {

// Reads UTF-8 from memory, as UTF-16. What is well-formed is table 3-7
// of the Unicode standard; each maximal subpart of what is not becomes one U+FFFD.
class Utf8Decoder {
  public:
    explicit Utf8Decoder(std::span<const unsigned char> octets,
                         const utf8kernel::Kernel& kernel = utf8kernel::kernel()) noexcept
        : kernel_(kernel), begin_(octets.data()), next_(begin_), end_(begin_ + octets.size()) {}

    // Delivers characters until there are `most` units, or one more where a pair is last, for
    // which there is room, too; returns how many. `atEnd`: no octets follow; a sequence that
    // is cut is ill-formed. Otherwise it is left alone.
    std::size_t decode(char16_t* out, std::size_t most, bool atEnd) noexcept;

    // Octets that were read.
    [[nodiscard]] std::size_t used() const noexcept {
        return static_cast<std::size_t>(next_ - begin_);
    }
    // Pairs that were delivered.
    [[nodiscard]] std::size_t pairs() const noexcept { return pairs_; }
    // Whether any of it was ill-formed.
    [[nodiscard]] bool isMarked() const noexcept { return marked_; }

  private:
    bool decodeOne(char16_t*& out, bool atEnd) noexcept;
    [[nodiscard]] std::size_t left() const noexcept {
        return static_cast<std::size_t>(end_ - next_);
    }

    const utf8kernel::Kernel& kernel_;
    const unsigned char* begin_;
    const unsigned char* next_;
    const unsigned char* end_;
    std::size_t pairs_ = 0;
    bool marked_ = false;
};

}  // namespace plr

#pragma once

#include <algorithm>
#include <cstddef>
#include <cstdint>

#include "plr/base/export.h"

namespace plr {

class OctetSourceBuffer;

// One stage of a TextConverter: it delivers codes, one at a time or in runs, and
// pulls what it needs for them, and no more, from the stage below.
//
// A code is an octet, a septet or a character, by the stage. Characters are UTF-16 code
// units; one outside the basic plane is a single code with its high surrogate in the
// upper half and its low surrogate in the lower half.
//
// Owner:   the TextConverter that made it.
// Threads: one at a time.
// Failure: what cannot be converted becomes the stage's replacement character and
//          marks the stage; nothing throws.
class PLR_EXPORT TextTransform {
  public:
    static constexpr std::uint32_t kEnd = 0xFFFFFFFF;  // the end of the stream

    TextTransform() = default;
    TextTransform(const TextTransform&) = delete;
    TextTransform& operator=(const TextTransform&) = delete;
    virtual ~TextTransform();

    // The next code; kEnd at the end, and once `count` codes were delivered.
    virtual std::uint32_t nextCode() = 0;
    // Forgets the mark, and what the stage kept between codes; not the count.
    virtual void reset();

    // Up to `most` codes at once. All that a caller can see, codes, marks and how far the
    // source was read, is as after so many calls of nextCode(), up to and with the first
    // that gives kEnd. Returns how many codes there are; fewer than `most` mean the end.
    // By default it makes these calls. Hot path: bench/text_pelorin.cpp.
    virtual std::size_t nextCodes(std::uint32_t* out, std::size_t most);
    // The same, of each code the low 8 bits. By default of blocks of nextCodes().
    virtual std::size_t nextChars(char* out, std::size_t most);
    // The same as UTF-16: codes until there are `most` units, or one more where a pair is last;
    // there is room for that. Returns the number of units; fewer than `most` mean the end.
    // By default by nextCode().
    virtual std::size_t nextUnits(char16_t* out, std::size_t most);
    // This stage where it is the bottom one, whose octets lie in memory and need not be
    // copied; null elsewhere.
    virtual OctetSourceBuffer* asOctetSource() noexcept;
    // Whether no code is above 0xFF, so that nextChars() loses nothing. By default false.
    [[nodiscard]] virtual bool deliversOctets() const noexcept;
    // Whether every code is a unit or a pair, so that nextUnits() loses nothing. By default
    // false.
    [[nodiscard]] virtual bool deliversUnits() const noexcept;

    // How many more codes it may deliver; any number if `codes` is negative.
    void setCount(int codes) noexcept { count = codes; }
    // `below`: outlives this stage, or is replaced; null ends the stream.
    void setSource(TextTransform* below) noexcept { source = below; }
    [[nodiscard]] TextTransform* getSource() const noexcept { return source; }
    void markExceptionOccurred() noexcept { exception = true; }
    // Whether this stage or one below it is marked.
    [[nodiscard]] bool getExceptionStatus() const noexcept;

  protected:
    // How many of `most` codes the count lets through.
    [[nodiscard]] std::size_t permitted(std::size_t most) const noexcept {
        return count < 0 ? most : std::min(most, static_cast<std::size_t>(count));
    }
    // Takes `codes`, which were permitted, off the count.
    void spend(std::size_t codes) noexcept {
        if (count > 0)
            count -= static_cast<std::int32_t>(codes);
    }

    std::int32_t count = 0;           // codes that may still be delivered; negative: any number
    TextTransform* source = nullptr;  // the stage below, not owned; null at the bottom
    bool exception = false;           // input was met that could not be converted
};

}  // namespace plr

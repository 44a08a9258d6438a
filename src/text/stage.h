#pragma once

#include <array>

#include "plr/text/text_transform.h"
#include "src/text/octets.h"

namespace plr {

// A stage that is written once, for any number of codes:
//
//   class ExampleTransform : public Stage<ExampleTransform> {
//     public:
//       std::size_t convert(std::uint32_t* out, std::size_t most);
//   };
//
// convert() delivers up to `most` codes, at least one, with fewer at the end only. It need
// not look at the count. So that single codes and runs of them read the source alike, it
// pulls no more than what so many codes need at the least, by pull(), and keeps
// between calls only what it had to pull.
template <class Derived>
class Stage : public TextTransform {
  public:
    std::uint32_t nextCode() final {
        std::uint32_t code = kEnd;
        // What a stage wrote without delivering it is no code.
        return nextCodes(&code, 1) == 1 ? code : kEnd;
    }
    std::size_t nextCodes(std::uint32_t* out, std::size_t most) final { return deliver(out, most); }

  protected:
    template <class Out>
    std::size_t deliver(Out* out, std::size_t most) {
        most = permitted(most);
        if (most == 0)
            return 0;
        const std::size_t codes = static_cast<Derived*>(this)->convert(out, most);
        spend(codes);
        return codes;
    }

    // Up to `most` codes of the source; fewer at its end.
    std::size_t pull(std::uint32_t* codes, std::size_t most) {
        return source == nullptr ? 0 : source->nextCodes(codes, most);
    }
};

// A stage that delivers units and no pairs, by a convert() to codes. It may have one to units,
// too, or take this one by `using UnitStage::convert;`.
template <class Derived>
class UnitStage : public Stage<Derived> {
  public:
    std::size_t nextUnits(char16_t* out, std::size_t most) final {
        return this->deliver(out, most);
    }
    [[nodiscard]] bool deliversUnits() const noexcept final { return true; }

    std::size_t convert(char16_t* out, std::size_t most) {
        std::array<std::uint32_t, 512> codes;
        std::size_t done = 0;
        for (bool more = true; more && done < most;) {
            const std::size_t wanted = std::min(most - done, codes.size());
            const std::size_t got = static_cast<Derived*>(this)->convert(codes.data(), wanted);
            octets::narrowUnits(out + done, codes.data(), got);
            done += got;
            more = got == wanted;
        }
        return done;
    }
};

// A stage that delivers octets, by a convert() to characters, so that they need not pass as
// codes. It may have one to codes, too, or take this one by `using OctetStage::convert;`.
template <class Derived>
class OctetStage : public Stage<Derived> {
  public:
    std::size_t nextChars(char* out, std::size_t most) final { return this->deliver(out, most); }
    [[nodiscard]] bool deliversOctets() const noexcept final { return true; }

    std::size_t convert(std::uint32_t* out, std::size_t most) {
        std::array<char, 256> chars;
        std::size_t done = 0;
        for (bool more = true; more && done < most;) {
            const std::size_t wanted = std::min(most - done, chars.size());
            const std::size_t got = static_cast<Derived*>(this)->convert(chars.data(), wanted);
            octets::widen(out + done, chars.data(), got);
            done += got;
            more = got == wanted;
        }
        return done;
    }
};

}  // namespace plr

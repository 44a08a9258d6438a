#pragma once

#include <span>

#include "src/text/gsm7_tables.h"
#include "src/text/stage.h"

// The stages between UTF-16 and the GSM alphabets, see TextConverter::Conversion.
// Hot paths: bench/text_pelorin.cpp.
namespace plr {

// Characters to codes. `Lookup`: codeOf() and latinCodeOf() as in gsm7_tables.h.
template <class Lookup>
class Gsm7Encoder final : public OctetStage<Gsm7Encoder<Lookup>> {
  public:
    explicit Gsm7Encoder(int p) : lookup_(p) {}

    using OctetStage<Gsm7Encoder>::convert;
    std::size_t convert(char* out, std::size_t most);
    void reset() override;

  private:
    std::size_t encode(char* out, std::span<const std::uint32_t> characters);
    std::size_t encodeOne(char* out);

    static constexpr int kNone = -1;
    Lookup lookup_;
    int held_ = kNone;  // the code behind an escape that was delivered alone
};

// Codes to characters. `Lookup`: characters(), and characterAbove7F(code), which gives kNone
// if there is none.
template <class Lookup>
class Gsm7Decoder final : public UnitStage<Gsm7Decoder<Lookup>> {
  public:
    explicit Gsm7Decoder(int p, int q = 0) : lookup_(p, q) {}

    using UnitStage<Gsm7Decoder>::convert;
    std::size_t convert(std::uint32_t* out, std::size_t most);

  private:
    std::size_t decodeSome(std::uint32_t* out, std::size_t most, bool& more, std::uint32_t& shift);
    template <class Code>
    std::size_t decode(std::uint32_t* out, std::span<const Code> codes, std::uint32_t& shift);
    std::uint32_t characterAbove7F(std::uint32_t code);

    Lookup lookup_;
};

namespace gsm7 {

inline constexpr std::uint32_t kNone = 0xFFFFFFFF;

class AlphabetCodes {
  public:
    explicit AlphabetCodes(int tables)
        : codes_(codesOf(static_cast<TextConverter::Ucs2ToGsm7Tables>(tables))) {}

    [[nodiscard]] std::uint32_t codeOf(std::uint32_t character) const noexcept {
        return gsm7::codeOf(codes_, character);
    }
    [[nodiscard]] std::uint32_t latinCodeOf(std::uint32_t unit) const noexcept {
        return gsm7::latinCodeOf(codes_, unit);
    }

  private:
    const Codes& codes_;
};

// 128 units, from a base on, are the codes from 0x80 on.
class Adn8Codes {
  public:
    explicit Adn8Codes(int base) : base_(static_cast<std::uint16_t>(base)) {}

    // The shortest there is: a septet of the alphabet, from the base on, behind the escape.
    [[nodiscard]] std::uint32_t codeOf(std::uint32_t character) const noexcept {
        const std::uint32_t code = gsm7::codeOf(codesOf({}), character);
        const auto distance = static_cast<std::uint16_t>(character - base_);
        return code > 0x7F && distance < 0x80 && character <= 0xFFFF ? 0x80U | distance : code;
    }
    [[nodiscard]] std::uint32_t latinCodeOf(std::uint32_t unit) const noexcept {
        return codeOf(unit);
    }

  private:
    std::uint16_t base_;
};

class AlphabetCharacters {
  public:
    AlphabetCharacters(int locking, int single) : characters_(charactersOf(locking, single)) {}

    [[nodiscard]] const Characters& characters() const noexcept { return characters_; }
    [[nodiscard]] std::uint32_t characterAbove7F(std::uint32_t) const noexcept { return kNone; }

  private:
    const Characters& characters_;
};

class Adn8Characters {
  public:
    Adn8Characters(int base, int) : base_(static_cast<std::uint16_t>(base)) {}

    [[nodiscard]] const Characters& characters() const noexcept { return charactersOf(0, 0); }
    [[nodiscard]] std::uint32_t characterAbove7F(std::uint32_t code) const noexcept {
        return code > 0xFF ? kNone : static_cast<std::uint16_t>(base_ + (code & 0x7F));
    }

  private:
    std::uint16_t base_;
};

}  // namespace gsm7

using Ucs2ToGsm7Transform = Gsm7Encoder<gsm7::AlphabetCodes>;
using Ucs2ToAdn8Transform = Gsm7Encoder<gsm7::Adn8Codes>;
using Gsm7ToUcs2Transform = Gsm7Decoder<gsm7::AlphabetCharacters>;
using Adn8ToUcs2Transform = Gsm7Decoder<gsm7::Adn8Characters>;

class OctetToGsm7Transform final : public Stage<OctetToGsm7Transform> {
  public:
    std::size_t convert(std::uint32_t* out, std::size_t most);
    void reset() override;

  private:
    bool ended_ = false;  // 0xFF was met
};

}  // namespace plr

#pragma once

#include "src/text/gsm7_tables.h"
#include "src/text/stage.h"

// The stages between UTF-16 and the GSM alphabets, see TextConverter::Conversion.
// Hot paths: bench/text_pelorin.cpp.
namespace plr {

// Characters to codes. `Derived` has codeOf(), which is as gsm7::codeOf().
template <class Derived>
class Gsm7Encoder : public Stage<Derived> {
  public:
    std::size_t convert(std::uint32_t* out, std::size_t most);
    void reset() final;

  private:
    std::size_t encode(std::uint32_t* out, const std::uint32_t* characters, std::size_t length);
    std::size_t encodeOne(std::uint32_t* out);

    std::uint32_t held_ = TextTransform::kEnd;  // what goes behind an escape that went out
};

class Ucs2ToGsm7Transform final : public Gsm7Encoder<Ucs2ToGsm7Transform> {
  public:
    explicit Ucs2ToGsm7Transform(int tables)
        : codes_(gsm7::codesOf(static_cast<TextConverter::Ucs2ToGsm7Tables>(tables))) {}

    [[nodiscard]] std::uint32_t codeOf(std::uint32_t character) const noexcept {
        return gsm7::codeOf(codes_, character);
    }

  private:
    const gsm7::Codes& codes_;
};

class Ucs2ToAdn8Transform final : public Gsm7Encoder<Ucs2ToAdn8Transform> {
  public:
    explicit Ucs2ToAdn8Transform(int base) : base_(static_cast<std::uint16_t>(base)) {}

    [[nodiscard]] std::uint32_t codeOf(std::uint32_t character) const noexcept;

  private:
    std::uint16_t base_;
};

// Codes to characters. `Derived` has characterAbove7F(code).
template <class Derived>
class Gsm7Decoder : public Stage<Derived> {
  public:
    std::size_t convert(std::uint32_t* out, std::size_t most);

  protected:
    explicit Gsm7Decoder(const gsm7::Characters& characters) : characters_(characters) {}
    std::uint32_t replacement();

  private:
    std::size_t decode(std::uint32_t* codes, std::size_t length, std::uint32_t& shift);

    const gsm7::Characters& characters_;
};

class Gsm7ToUcs2Transform final : public Gsm7Decoder<Gsm7ToUcs2Transform> {
  public:
    Gsm7ToUcs2Transform(int locking, int single)
        : Gsm7Decoder(gsm7::charactersOf(locking, single)) {}

    std::uint32_t characterAbove7F(std::uint32_t) { return replacement(); }
};

class Adn8ToUcs2Transform final : public Gsm7Decoder<Adn8ToUcs2Transform> {
  public:
    explicit Adn8ToUcs2Transform(int base)
        : Gsm7Decoder(gsm7::charactersOf(0, 0)), base_(static_cast<std::uint16_t>(base)) {}

    std::uint32_t characterAbove7F(std::uint32_t code) {
        return code > 0xFF ? replacement() : static_cast<std::uint16_t>(base_ + (code & 0x7F));
    }

  private:
    std::uint16_t base_;
};

class OctetToGsm7Transform final : public Stage<OctetToGsm7Transform> {
  public:
    std::size_t convert(std::uint32_t* out, std::size_t most);
    void reset() final;

  private:
    bool ended_ = false;  // 0xFF was met
};

}  // namespace plr

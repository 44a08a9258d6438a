#pragma once

#include <span>

#include "src/text/octet_pull.h"
#include "src/text/stage.h"

// The stages that pack septets into octets and unpack them, see TextConverter::Conversion.
//
// To them their source is one run of bits. It goes through an accumulator in blocks of 56
// bits, 8 septets or 7 octets. Hot paths: bench/text_pelorin.cpp.
namespace plr {

// Takes codes of `kIn` bits and delivers codes of `kOut` bits, septets and octets.
// `Order`: of the bits in an octet, see septet_stages.cpp.
template <class Derived, class Order, int kIn, int kOut>
class BitStage : public OctetStage<Derived> {
  public:
    using OctetStage<Derived>::convert;
    std::size_t convert(char* out, std::size_t most);
    void reset() final;

    // At the end, before what is held is filled up to an octet: may add to it.
    void addPadding() noexcept {}

  protected:
    // Bits that were read and are still to be delivered, at most 7 between two calls. A
    // length below zero: so many of the next bits are dropped.
    struct Held {
        std::uint64_t bits = 0;
        int length = 0;
    };

    // `offset`: of the first bit that is delivered, from the first of the source.
    explicit BitStage(int offset) noexcept : start_{0, -offset}, held_(start_) {}

    [[nodiscard]] Held& held() noexcept { return held_; }
    // The last code that was taken; 0 before the first.
    [[nodiscard]] std::uint32_t last() const noexcept { return last_; }

  private:
    [[nodiscard]] std::size_t neededFor(std::size_t codes) const noexcept;
    std::span<const unsigned char> take(std::size_t most, OctetBuffer& buffer);
    std::size_t regroup(std::span<const unsigned char> in, char* out, std::size_t most);
    std::size_t finish(char* out);

    const Held start_;
    Held held_;
    std::uint32_t last_ = 0;
};

struct LowBitFirst;
struct HighBitFirst;

// As many bits reach as far into a septet as p of them, also below 0.
constexpr int fillBitsOf(int p) noexcept {
    return (p % 7 + 7) % 7;
}

class SmsUnpacker final : public BitStage<SmsUnpacker, LowBitFirst, 8, 7> {
  public:
    // The first octet begins at bit (7 - fillBits) mod 7 of the septet grid.
    explicit SmsUnpacker(int fillBits) noexcept : BitStage(fillBitsOf(fillBits)) {}
};

class SmsPacker final : public BitStage<SmsPacker, LowBitFirst, 7, 8> {
  public:
    explicit SmsPacker(int fillBits) noexcept : BitStage(-fillBitsOf(fillBits)) {}
};

class UssdPacker final : public BitStage<UssdPacker, LowBitFirst, 7, 8> {
  public:
    explicit UssdPacker(int fillBits) noexcept : BitStage(-fillBitsOf(fillBits)) {}
    void addPadding() noexcept;
};

class C2KSmsPackedToUnpackedTransform final
    : public BitStage<C2KSmsPackedToUnpackedTransform, HighBitFirst, 8, 7> {
  public:
    explicit C2KSmsPackedToUnpackedTransform(int offset) noexcept : BitStage(offset % 8) {}
};

class C2KSmsUnpackedToPackedTransform final
    : public BitStage<C2KSmsUnpackedToPackedTransform, HighBitFirst, 7, 8> {
  public:
    C2KSmsUnpackedToPackedTransform() noexcept : BitStage(0) {}
};

}  // namespace plr

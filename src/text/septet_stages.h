#pragma once

#include <algorithm>

#include "plr/text/octet_source_buffer.h"
#include "src/text/stage.h"

// The stages that pack septets into octets and unpack them, see TextConverter::Conversion.
//
// To them their source is one run of bits. It goes through an accumulator in blocks of 56
// bits, 8 septets or 7 octets. Hot paths: bench/text_pelorin.cpp.
namespace plr {

// Bits that were read and are still to be delivered, at most 7 between two calls. A length
// below zero: so many of the next bits are dropped.
struct HeldBits {
    std::uint64_t bits = 0;
    int length = 0;
};

// 3GPP TS 23.038, 6.1.2: the first bit is the lowest.
struct LowBitFirst {
    static void add(HeldBits& held, std::uint64_t value, int width) noexcept {
        held.bits |= held.length < 0 ? value >> -held.length : value << held.length;
        held.length += width;
    }
    static std::uint32_t take(HeldBits& held, int width) noexcept {
        const std::uint64_t taken = held.bits & ((std::uint64_t{1} << width) - 1);
        held.bits >>= width;
        held.length -= width;
        return static_cast<std::uint32_t>(taken);
    }
    // Where the `width` bits of part `i` of a block stand in it.
    static constexpr int shiftOf(int i, int width) noexcept { return i * width; }
};

// 3GPP2 C.S0015: the first bit is the highest. What was taken stays above those held.
struct HighBitFirst {
    static void add(HeldBits& held, std::uint64_t value, int width) noexcept {
        held.bits = held.bits << width | value;
        held.length += width;
    }
    static std::uint32_t take(HeldBits& held, int width) noexcept {
        held.length -= width;
        const std::uint64_t mask = (std::uint64_t{1} << width) - 1;
        return static_cast<std::uint32_t>(held.bits >> held.length & mask);
    }
    static constexpr int shiftOf(int i, int width) noexcept { return 56 - (i + 1) * width; }
};

// Takes codes of `kIn` bits and delivers codes of `kOut` bits, septets and octets.
template <class Derived, class Order, int kIn, int kOut>
class BitStage : public OctetStage<Derived> {
  public:
    std::size_t convert(std::uint32_t* out, std::size_t most) { return convertTo(out, most); }
    std::size_t convert(char* out, std::size_t most) { return convertTo(out, most); }
    void reset() final;

    // At the end, before what is held is filled up to an octet.
    void addPadding() noexcept {}

  protected:
    // `offset`: of the first bit that is delivered, from the first of the source.
    explicit BitStage(int offset) noexcept : start_{0, -offset}, held_(start_) {}

    [[nodiscard]] HeldBits& held() noexcept { return held_; }
    // The last code that was taken; 0 before the first.
    [[nodiscard]] std::uint32_t last() const noexcept { return last_; }

  private:
    [[nodiscard]] std::size_t neededFor(std::size_t codes) const noexcept;
    template <class Out>
    std::size_t convertTo(Out* out, std::size_t most);
    template <class Out>
    std::size_t convertOctets(OctetSourceBuffer& octets, Out* out, std::size_t most);
    template <class In, class Out>
    std::size_t regroup(const In* in, std::size_t length, Out* out, std::size_t most);
    template <class Out>
    std::size_t finish(Out* out);

    const HeldBits start_;
    HeldBits held_;
    std::uint32_t last_ = 0;
};

class SmsUnpacker final : public BitStage<SmsUnpacker, LowBitFirst, 8, 7> {
  public:
    // The first octet begins at bit (7 - fillBits) mod 7 of the septet grid.
    explicit SmsUnpacker(int fillBits) noexcept : BitStage(std::max(fillBits, 0) % 7) {}
};

class SmsPacker final : public BitStage<SmsPacker, LowBitFirst, 7, 8> {
  public:
    explicit SmsPacker(int fillBits) noexcept : BitStage(-(std::max(fillBits, 0) % 7)) {}
};

class UssdPacker final : public BitStage<UssdPacker, LowBitFirst, 7, 8> {
  public:
    explicit UssdPacker(int fillBits) noexcept : BitStage(-(std::max(fillBits, 0) % 7)) {}
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

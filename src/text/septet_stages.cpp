#include "src/text/septet_stages.h"

#include <array>

namespace plr {
namespace {

constexpr int kBlockBits = 56;
constexpr std::size_t kMostPulled = 256;  // codes
constexpr std::uint32_t kCarriageReturn = 0x0D;

}  // namespace

// Source codes for so many, with the bits held. No more are read, so that the source is
// where single codes would have left it.
template <class Derived, class Order, int kIn, int kOut>
std::size_t BitStage<Derived, Order, kIn, kOut>::neededFor(std::size_t codes) const noexcept {
    const std::int64_t bits = static_cast<std::int64_t>(codes) * kOut - held_.length;
    return bits <= 0 ? 0 : static_cast<std::size_t>((bits + kIn - 1) / kIn);
}

template <class Derived, class Order, int kIn, int kOut>
template <class Out>
std::size_t BitStage<Derived, Order, kIn, kOut>::convertTo(Out* out, std::size_t most) {
    if constexpr (kIn == 8)
        if (OctetSourceBuffer* octets = this->source ? this->source->asOctetSource() : nullptr)
            return convertOctets(*octets, out, most);
    std::array<std::uint32_t, kMostPulled> codes;
    std::size_t made = 0;
    while (made < most) {
        const std::size_t wanted = std::min(most - made, kMostPulled * kIn / kOut - 2);
        const std::size_t needed = neededFor(wanted);
        const std::size_t got = this->pull(codes.data(), needed);
        made += regroup(codes.data(), got, out + made, wanted);
        if (got < needed)
            return made + finish(out + made);
    }
    return made;
}

// Straight from memory.
template <class Derived, class Order, int kIn, int kOut>
template <class Out>
std::size_t BitStage<Derived, Order, kIn, kOut>::convertOctets(OctetSourceBuffer& octets, Out* out,
                                                               std::size_t most) {
    const auto left = octets.peek();
    const std::size_t taken = std::min(neededFor(most), left.size());
    octets.skip(taken);
    return regroup(left.data(), taken, out, most);
}

template <class Derived, class Order, int kIn, int kOut>
template <class In, class Out>
std::size_t BitStage<Derived, Order, kIn, kOut>::regroup(const In* in, std::size_t length, Out* out,
                                                         std::size_t most) {
    constexpr std::uint32_t kMask = (1U << kIn) - 1;
    constexpr std::size_t kPartsIn = kBlockBits / kIn;
    constexpr std::size_t kPartsOut = kBlockBits / kOut;
    HeldBits held = held_;
    std::uint32_t all = 0;
    std::size_t i = 0;
    std::size_t made = 0;
    const auto addOne = [&] {
        all |= in[i];
        Order::add(held, in[i++] & kMask, kIn);
    };
    if (held.length < 0 && length != 0)
        addOne();
    for (; length - i >= kPartsIn && most - made >= kPartsOut; i += kPartsIn, made += kPartsOut) {
        std::uint64_t block = 0;
        for (std::size_t k = 0; k < kPartsIn; ++k) {
            all |= in[i + k];
            block |= std::uint64_t{in[i + k] & kMask} << Order::shiftOf(static_cast<int>(k), kIn);
        }
        Order::add(held, block, kBlockBits);
        for (std::size_t k = 0; k < kPartsOut; ++k)
            out[made + k] = static_cast<Out>(Order::take(held, kOut));
    }
    for (; made < most; ++made) {
        while (held.length < kOut && i < length)
            addOne();
        if (held.length < kOut)
            break;
        out[made] = static_cast<Out>(Order::take(held, kOut));
    }
    if (length != 0)
        last_ = in[length - 1] & kMask;
    if (all > kMask)
        this->markExceptionOccurred();
    held_ = held;
    return made;
}

// Where octets are delivered, the last one is filled with zero bits.
template <class Derived, class Order, int kIn, int kOut>
template <class Out>
std::size_t BitStage<Derived, Order, kIn, kOut>::finish(Out* out) {
    if constexpr (kOut == 8) {
        static_cast<Derived*>(this)->addPadding();
        last_ = 0;
        if (held_.length > 0) {
            Order::add(held_, 0, kOut - held_.length);
            *out = static_cast<Out>(Order::take(held_, kOut));
            return 1;
        }
    }
    return 0;
}

template <class Derived, class Order, int kIn, int kOut>
void BitStage<Derived, Order, kIn, kOut>::reset() {
    TextTransform::reset();
    held_ = start_;
    last_ = 0;
}

// 3GPP TS 23.038, 6.1.2.3.1: the receiver takes a CR at the end of an octet for padding, so a
// meant one is sent twice, and seven zero bits for an '@', so a CR fills them.
void UssdPacker::addPadding() noexcept {
    const bool endsWithCr = held().length == 0 && last() == kCarriageReturn;
    if (endsWithCr || held().length == 1)
        LowBitFirst::add(held(), kCarriageReturn, 7);
}

template class BitStage<SmsUnpacker, LowBitFirst, 8, 7>;
template class BitStage<SmsPacker, LowBitFirst, 7, 8>;
template class BitStage<UssdPacker, LowBitFirst, 7, 8>;
template class BitStage<C2KSmsPackedToUnpackedTransform, HighBitFirst, 8, 7>;
template class BitStage<C2KSmsUnpackedToPackedTransform, HighBitFirst, 7, 8>;

}  // namespace plr

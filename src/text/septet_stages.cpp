#include "src/text/septet_stages.h"

#include <algorithm>
#include <bit>
#include <cstring>

namespace plr {
namespace {

constexpr int kBlockBits = 56;
constexpr std::uint64_t kBlockMask = (std::uint64_t{1} << kBlockBits) - 1;
constexpr std::uint32_t kCarriageReturn = 0x0D;

// Eight septets, one a byte, as 56 bits.
constexpr std::uint64_t squeeze(std::uint64_t septets) {
    septets = (septets & 0x007F007F007F007F) | (septets & 0x7F007F007F007F00) >> 1;
    septets = (septets & 0x00003FFF00003FFF) | (septets & 0x3FFF00003FFF0000) >> 2;
    return (septets & 0x000000000FFFFFFF) | (septets & 0x0FFFFFFF00000000) >> 4;
}

constexpr std::uint64_t spread(std::uint64_t bits) {
    bits = (bits & 0x000000000FFFFFFF) | (bits & 0x00FFFFFFF0000000) << 4;
    bits = (bits & 0x00003FFF00003FFF) | (bits & 0x0FFFC0000FFFC000) << 2;
    return (bits & 0x007F007F007F007F) | (bits & 0x3F803F803F803F80) << 1;
}
static_assert(spread(squeeze(0x7F0102030405067F)) == 0x7F0102030405067F);

std::uint64_t swapped(std::uint64_t word, std::endian order) {
    return std::endian::native == order ? word : __builtin_bswap64(word);
}

constexpr std::uint64_t maskOf(int width) {
    return (std::uint64_t{1} << width) - 1;
}

}  // namespace

// 3GPP TS 23.038, 6.1.2: the first bit is the lowest.
struct LowBitFirst {
    static constexpr std::endian kBytes = std::endian::little;
    static constexpr int kBlockShift = 0;  // of a block in a word of eight bytes

    static void add(auto& held, std::uint64_t value, int width) noexcept {
        held.bits |= held.length < 0 ? value >> -held.length : value << held.length;
        held.length += width;
    }
    static std::uint64_t take(auto& held, int width) noexcept {
        const std::uint64_t taken = held.bits & maskOf(width);
        held.bits >>= width;
        held.length -= width;
        return taken;
    }
};

// 3GPP2 C.S0015: the first bit is the highest. What was taken stays above those held.
struct HighBitFirst {
    static constexpr std::endian kBytes = std::endian::big;
    static constexpr int kBlockShift = 8;

    static void add(auto& held, std::uint64_t value, int width) noexcept {
        held.bits = held.bits << width | value;
        held.length += width;
    }
    static std::uint64_t take(auto& held, int width) noexcept {
        held.length -= width;
        return held.bits >> held.length & maskOf(width);
    }
};

template <class Derived, class Order, int kIn, int kOut>
std::size_t BitStage<Derived, Order, kIn, kOut>::convert(char* out, std::size_t most) {
    OctetBuffer buffer;
    std::size_t made = 0;
    while (made < most) {
        const std::size_t wanted = std::min(most - made, buffer.size() * 7 / 8);
        const std::size_t needed = neededFor(wanted);
        const auto in = take(needed, buffer);
        made += regroup(in, out + made, wanted);
        if (in.size() < needed)
            return made + finish(out + made);
    }
    return made;
}

// Source codes for so many, with the bits held. No more are read, so that the source is
// where single codes would have left it.
template <class Derived, class Order, int kIn, int kOut>
std::size_t BitStage<Derived, Order, kIn, kOut>::neededFor(std::size_t codes) const noexcept {
    const std::int64_t bits = static_cast<std::int64_t>(codes) * kOut - held_.length;
    return bits <= 0 ? 0 : static_cast<std::size_t>((bits + kIn - 1) / kIn);
}

template <class Derived, class Order, int kIn, int kOut>
std::span<const unsigned char> BitStage<Derived, Order, kIn, kOut>::take(std::size_t most,
                                                                         OctetBuffer& buffer) {
    if (this->source == nullptr)
        return {};
    if (this->source->deliversOctets())
        return pullOctets(*this->source, most, buffer);
    std::size_t got = 0;
    for (std::uint32_t code = 0; got < most && (code = this->source->nextCode()) != this->kEnd;) {
        if (code > 0xFF)
            this->markExceptionOccurred();
        buffer[got++] = static_cast<unsigned char>(code);
    }
    return {buffer.data(), got};
}

template <class Derived, class Order, int kIn, int kOut>
std::size_t BitStage<Derived, Order, kIn, kOut>::regroup(std::span<const unsigned char> in,
                                                         char* out, std::size_t most) {
    constexpr std::size_t kWord = sizeof(std::uint64_t);
    Held held = held_;
    std::uint64_t all = 0;
    std::size_t i = 0;
    std::size_t made = 0;
    const auto addOne = [&] {
        all |= in[i];
        Order::add(held, in[i++] & maskOf(kIn), kIn);
    };
    if (held.length < 0 && !in.empty())
        addOne();
    // Whole words are read and written: of octets, the eighth one in vain.
    for (; in.size() - i >= kWord && most - made >= kWord; i += kBlockBits / kIn) {
        std::uint64_t word = 0;
        std::memcpy(&word, in.data() + i, kWord);
        word = swapped(word, Order::kBytes);
        all |= word;
        Order::add(held, kIn == 7 ? squeeze(word) : word >> Order::kBlockShift & kBlockMask,
                   kBlockBits);
        word = Order::take(held, kBlockBits);
        word = swapped(kOut == 7 ? spread(word) : word << Order::kBlockShift, Order::kBytes);
        std::memcpy(out + made, &word, kWord);
        made += kBlockBits / kOut;
    }
    for (; made < most; ++made) {
        while (held.length < kOut && i < in.size())
            addOne();
        if (held.length < kOut)
            break;
        out[made] = static_cast<char>(Order::take(held, kOut));
    }
    if (kIn == 7 && (all & 0x8080808080808080) != 0)
        this->markExceptionOccurred();
    if (!in.empty())
        last_ = in.back() & maskOf(kIn);
    held_ = held;
    return made;
}

// Where octets are delivered, the last one is filled with zero bits.
template <class Derived, class Order, int kIn, int kOut>
std::size_t BitStage<Derived, Order, kIn, kOut>::finish(char* out) {
    static_cast<Derived*>(this)->addPadding();
    last_ = 0;
    if (kIn == 8 || held_.length <= 0)
        return 0;
    Order::add(held_, 0, kOut - held_.length);
    *out = static_cast<char>(Order::take(held_, kOut));
    return 1;
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

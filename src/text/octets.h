#pragma once

#include <algorithm>
#include <bit>
#include <cstddef>
#include <cstdint>
#include <cstring>

// Octets as codes, and codes as octets. In blocks of a fixed size, which compilers
// turn into vector instructions.
namespace plr::octets {

inline constexpr std::size_t kBlock = 16;

// Of each code the low 8 bits.
template <class Out>
void narrow(Out* out, const std::uint32_t* codes, std::size_t length) noexcept {
    std::size_t i = 0;
    for (; i + kBlock <= length; i += kBlock)
        for (std::size_t k = 0; k < kBlock; ++k)
            out[i + k] = static_cast<Out>(codes[i + k] & 0xFF);
    for (; i < length; ++i)
        out[i] = static_cast<Out>(codes[i] & 0xFF);
}

inline void widen(std::uint32_t* out, const unsigned char* octets, std::size_t length) noexcept {
    std::size_t i = 0;
    for (; i + kBlock <= length; i += kBlock)
        for (std::size_t k = 0; k < kBlock; ++k)
            out[i + k] = octets[i + k];
    for (; i < length; ++i)
        out[i] = octets[i];
}

// Whether none of a block of codes has a bit that is not in `mask`.
inline bool blockFits(const std::uint32_t* codes, std::uint32_t mask) noexcept {
    std::uint32_t all = 0;
    for (std::size_t k = 0; k < kBlock; ++k)
        all |= codes[k];
    return (all & ~mask) == 0;
}

constexpr std::uint16_t bigEndian(std::uint16_t number) noexcept {
    return std::endian::native == std::endian::big
               ? number
               : static_cast<std::uint16_t>(number << 8 | number >> 8);
}

// Up to four octets that one character became.
struct Few {
    std::uint32_t bits = 0;  // the first in the highest bits
    std::size_t length = 0;

    // Delivers up to `most` of them, which are gone then; returns how many.
    template <class Out>
    std::size_t take(Out* out, std::size_t most) noexcept {
        const std::size_t taken = std::min(length, most);
        for (std::size_t i = 0; i < taken; ++i, bits <<= 8)
            out[i] = static_cast<Out>(bits >> 24);
        length -= taken;
        return taken;
    }
};

}  // namespace plr::octets

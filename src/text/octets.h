#pragma once

#include <algorithm>
#include <array>
#include <bit>
#include <cstddef>
#include <cstdint>
#include <cstring>

// Octets as codes, and codes as octets, a block at a time: of a fixed size and between
// local arrays, so that compilers make vector instructions of it.
namespace plr::octets {

inline constexpr std::size_t kBlock = 16;
using Block = std::array<unsigned char, kBlock>;

inline void widenBlock(std::uint32_t* out, const void* octets) noexcept {
    Block block;
    std::memcpy(block.data(), octets, kBlock);
    for (std::size_t k = 0; k < kBlock; ++k)
        out[k] = block[k];
}

// Of each code the low 8 bits.
inline void narrowBlock(char* out, const std::uint32_t* codes) noexcept {
    Block block;
    for (std::size_t k = 0; k < kBlock; ++k)
        block[k] = static_cast<unsigned char>(codes[k]);
    std::memcpy(out, block.data(), kBlock);
}

template <class Octet>
void widen(std::uint32_t* out, const Octet* octets, std::size_t length) noexcept {
    static_assert(sizeof(Octet) == 1);
    std::size_t i = 0;
    for (; i + kBlock <= length; i += kBlock)
        widenBlock(out + i, octets + i);
    for (; i < length; ++i)
        out[i] = static_cast<unsigned char>(octets[i]);
}

inline void narrow(char* out, const std::uint32_t* codes, std::size_t length) noexcept {
    std::size_t i = 0;
    for (; i + kBlock <= length; i += kBlock)
        narrowBlock(out + i, codes + i);
    for (; i < length; ++i)
        out[i] = static_cast<char>(codes[i]);
}

// Of each code the low 16 bits.
inline void narrowUnits(char16_t* out, const std::uint32_t* codes, std::size_t length) noexcept {
    std::size_t i = 0;
    for (; i + kBlock <= length; i += kBlock) {
        std::array<char16_t, kBlock> block;
        for (std::size_t k = 0; k < kBlock; ++k)
            block[k] = static_cast<char16_t>(codes[i + k]);
        std::memcpy(out + i, block.data(), sizeof(block));
    }
    for (; i < length; ++i)
        out[i] = static_cast<char16_t>(codes[i]);
}

// Whether none of a block of codes has a bit that is not in `mask`.
inline bool blockFits(const std::uint32_t* codes, std::uint32_t mask) noexcept {
    std::uint32_t all = 0;
    for (std::size_t k = 0; k < kBlock; ++k)
        all |= codes[k];
    return (all & ~mask) == 0;
}

// A sum and no "or": the latter becomes a rotation, which compilers leave scalar.
constexpr std::uint16_t bigEndian(std::uint16_t number) noexcept {
    return std::endian::native == std::endian::big
               ? number
               : static_cast<std::uint16_t>(static_cast<std::uint16_t>(number << 8) +
                                            static_cast<std::uint16_t>(number >> 8));
}

// For memory: four octets of which the first is in the highest bits, or in the lowest.
constexpr std::uint32_t firstHighest(std::uint32_t octets) noexcept {
    return std::endian::native == std::endian::big ? octets : __builtin_bswap32(octets);
}
constexpr std::uint32_t firstLowest(std::uint32_t octets) noexcept {
    return std::endian::native == std::endian::big ? __builtin_bswap32(octets) : octets;
}

// Up to four octets that one character became.
struct Few {
    std::uint32_t bits = 0;  // the first in the highest bits
    std::size_t length = 0;

    // Delivers up to `most` of them, which are gone then; returns how many.
    std::size_t take(char* out, std::size_t most) noexcept {
        const std::size_t taken = std::min(length, most);
        for (std::size_t i = 0; i < taken; ++i, bits <<= 8)
            out[i] = static_cast<char>(bits >> 24);
        length -= taken;
        return taken;
    }
};

}  // namespace plr::octets

#pragma once

#include <cstddef>
#include <cstdint>

// Octets as codes, and codes as octets. In blocks of a fixed size, which compilers
// turn into vector instructions.
namespace plr::octets {

inline constexpr std::size_t kBlock = 16;

// Of each code the low 8 bits.
inline void narrow(char* out, const std::uint32_t* codes, std::size_t length) noexcept {
    std::size_t i = 0;
    for (; i + kBlock <= length; i += kBlock)
        for (std::size_t k = 0; k < kBlock; ++k)
            out[i + k] = static_cast<char>(codes[i + k]);
    for (; i < length; ++i)
        out[i] = static_cast<char>(codes[i]);
}

inline void widen(std::uint32_t* out, const unsigned char* octets, std::size_t length) noexcept {
    std::size_t i = 0;
    for (; i + kBlock <= length; i += kBlock)
        for (std::size_t k = 0; k < kBlock; ++k)
            out[i + k] = octets[i + k];
    for (; i < length; ++i)
        out[i] = octets[i];
}

}  // namespace plr::octets

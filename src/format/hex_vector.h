#pragma once

#include "src/format/hex_kernel.h"

// Kernels of one table lookup a byte, and those that do many bytes at once, for
// machines that can. A vector kernel does blocks from the front and then the last
// block, which may overlap the one before; what is shorter than its smallest block
// it leaves to the plain one.
namespace plr::hexkernel {

void encodePlain(char* out, const std::uint8_t* data, std::size_t bytes, bool lowerCase) noexcept;
void decodePlain(std::uint8_t* out, const char* text, std::size_t pairs) noexcept;
[[nodiscard]] std::size_t decodeStrictPlain(std::uint8_t* out, const char* text,
                                            std::size_t pairs) noexcept;

// The digits of 0 to 15.
constexpr const char* digits(bool lowerCase) noexcept {
    return lowerCase ? "0123456789abcdef" : "0123456789ABCDEF";
}

#if defined(__x86_64__)
#define PLR_HEX_VECTOR 1
inline constexpr const char* kVectorName = "AVX2";
inline bool canVector() noexcept {
    __builtin_cpu_init();
    return __builtin_cpu_supports("avx2") != 0;
}
#elif defined(__aarch64__)
#define PLR_HEX_VECTOR 1
inline constexpr const char* kVectorName = "NEON";
inline bool canVector() noexcept {
    return true;
}
#endif

void encodeVector(char* out, const std::uint8_t* data, std::size_t bytes, bool lowerCase) noexcept;
void decodeVector(std::uint8_t* out, const char* text, std::size_t pairs) noexcept;
[[nodiscard]] std::size_t decodeStrictVector(std::uint8_t* out, const char* text,
                                             std::size_t pairs) noexcept;

}  // namespace plr::hexkernel

#pragma once

#include <cstddef>
#include <cstdint>
#include <span>

// Hex text of bytes and back: the loops below every function that does either.
//
// Threads: pure functions, any thread, also before main().
// Memory:  nothing is allocated; no NUL is written; input and output may not
//          overlap. Nothing outside the given lengths is read or written.
// Cost:    the fastest kernel that this machine can run, chosen at the first
//          call; bench/bytes_pelorin.cpp.
namespace plr::hexkernel {

// Writes 2 * `bytes` digits, high nibble first.
void encodeHex(char* out, const std::uint8_t* data, std::size_t bytes, bool lowerCase) noexcept;

// Reads 2 * `pairs` characters, digits of either case, and writes `pairs` bytes.
// A character that is no digit counts as the digit 0.
void decodeHex(std::uint8_t* out, const char* text, std::size_t pairs) noexcept;

// Returns how many pairs stand before the first with a character that is no
// digit. Their bytes are in `out`; the rest of its `pairs` bytes is undefined.
[[nodiscard]] std::size_t decodeHexStrict(std::uint8_t* out, const char* text,
                                          std::size_t pairs) noexcept;

// One implementation of the three.
struct Kernel {
    const char* name;
    void (*encode)(char* out, const std::uint8_t* data, std::size_t bytes, bool lowerCase) noexcept;
    void (*decode)(std::uint8_t* out, const char* text, std::size_t pairs) noexcept;
    std::size_t (*decodeStrict)(std::uint8_t* out, const char* text, std::size_t pairs) noexcept;
};

// What this machine can run, from the plain kernel to the fastest.
[[nodiscard]] std::span<const Kernel> kernels() noexcept;

}  // namespace plr::hexkernel

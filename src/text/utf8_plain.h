#pragma once

#include "src/text/octets.h"
#include "src/text/utf16.h"
#include "src/text/utf8_kernel.h"

// One character at a time. A block is what the vector kernels leave to this: so many octets
// or units, for which there is room whatever they become.
namespace plr::utf8kernel {

inline constexpr std::size_t kBlock = octets::kBlock;

[[nodiscard]] inline bool hasBlock(const Decoding& run) noexcept {
    return run.end - run.in >= std::ptrdiff_t{kBlock} &&
           run.outEnd - run.out >= std::ptrdiff_t{kBlock};
}
[[nodiscard]] inline bool hasBlock(const Encoding& run) noexcept {
    return run.end - run.in >= std::ptrdiff_t{kBlock} &&
           run.outEnd - run.out >= std::ptrdiff_t{4 * kBlock};
}

// Each converts a block, or less of it where a character may reach beyond. False before what
// it cannot convert.
[[nodiscard]] bool decodeBlock(Decoding& run) noexcept;
[[nodiscard]] bool encodeBlock(Encoding& run) noexcept;

void decodePlain(Decoding& run) noexcept;
void encodePlain(Encoding& run) noexcept;

#if defined(__x86_64__)
void decodeAvx2(Decoding& run) noexcept;
void encodeAvx2(Encoding& run) noexcept;
#endif

}  // namespace plr::utf8kernel

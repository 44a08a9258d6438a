#pragma once

#include <cstddef>
#include <cstdint>
#include <span>

// The loops below the UTF-8 stages: long runs of well-formed text, many characters at once
// where the machine can. They stop before what is rare, a sequence that is ill-formed or a
// lone surrogate, and near either end, and may be called again behind it.
//
// Threads: pure functions, any thread.
// Memory:  nothing outside of the given ranges is read or written; between `out` and
//          `outEnd`, what is behind the result may be overwritten.
// Cost:    bench/text_pelorin.cpp.
namespace plr::utf8kernel {

// Where it stands in octets, and in the units and pairs (utf16.h) they become.
struct Decoding {
    const unsigned char* in;
    const unsigned char* end;
    std::uint32_t* out;
    std::uint32_t* outEnd;
};

// Where it stands in units and pairs, and in the octets they become. Two units may be one
// character.
struct Encoding {
    const std::uint32_t* in;
    const std::uint32_t* end;
    char* out;
    char* outEnd;
};

struct Kernel {
    const char* name;
    void (*decode)(Decoding& run) noexcept;
    void (*encode)(Encoding& run) noexcept;
};

// What this machine can run, from the plain kernel to the fastest.
[[nodiscard]] std::span<const Kernel> kernels() noexcept;

// The fastest.
[[nodiscard]] const Kernel& kernel() noexcept;

}  // namespace plr::utf8kernel

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

// Where it stands in octets, and in the UTF-16 they become; and how many pairs that has.
struct Decoding {
    const unsigned char* in;
    const unsigned char* end;
    char16_t* out;
    char16_t* outEnd;
    std::size_t pairs = 0;
};

// Where it stands in UTF-16, and in the octets it becomes.
struct Encoding {
    const char16_t* in;
    const char16_t* end;
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

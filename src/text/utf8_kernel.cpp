#include "src/text/utf8_kernel.h"

#include <array>

#include "src/text/utf8_plain.h"

namespace plr::utf8kernel {

std::span<const Kernel> kernels() noexcept {
    static constexpr std::array all {
        Kernel{"plain", decodePlain, encodePlain},
#if defined(__x86_64__)
            Kernel{"AVX2", decodeAvx2, encodeAvx2},
#endif
    };
#if defined(__x86_64__)
    __builtin_cpu_init();
    const bool vector =
        __builtin_cpu_supports("avx2") != 0 && __builtin_cpu_supports("popcnt") != 0;
    return std::span(all).first(vector ? 2 : 1);
#else
    return all;
#endif
}

const Kernel& kernel() noexcept {
    static const Kernel& fastest = kernels().back();
    return fastest;
}

}  // namespace plr::utf8kernel

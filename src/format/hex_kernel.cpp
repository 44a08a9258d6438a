#include "src/format/hex_kernel.h"

#include <array>
#include <atomic>

#include "src/format/hex_vector.h"

namespace plr::hexkernel {
namespace {

constexpr std::array kKernels{
    Kernel{"plain", encodePlain, decodePlain, decodeStrictPlain},
#ifdef PLR_HEX_VECTOR
    Kernel{kVectorName, encodeVector, decodeVector, decodeStrictVector},
#endif
};

const Kernel& choose() noexcept;

// Stands in until the first call has chosen.
constexpr Kernel kUndecided{
    "undecided",
    [](char* out, const std::uint8_t* data, std::size_t bytes, bool lowerCase) noexcept {
        choose().encode(out, data, bytes, lowerCase);
    },
    [](std::uint8_t* out, const char* text, std::size_t pairs) noexcept {
        choose().decode(out, text, pairs);
    },
    [](std::uint8_t* out, const char* text, std::size_t pairs) noexcept {
        return choose().decodeStrict(out, text, pairs);
    }};

// What it points to is constant, and whoever chooses, chooses the same.
constinit std::atomic<const Kernel*> chosen{&kUndecided};

const Kernel& choose() noexcept {
    const Kernel& fastest = kernels().back();
    chosen.store(&fastest, std::memory_order_relaxed);
    return fastest;
}

const Kernel& kernel() noexcept {
    return *chosen.load(std::memory_order_relaxed);
}

}  // namespace

void encodeHex(char* out, const std::uint8_t* data, std::size_t bytes, bool lowerCase) noexcept {
    kernel().encode(out, data, bytes, lowerCase);
}

void decodeHex(std::uint8_t* out, const char* text, std::size_t pairs) noexcept {
    kernel().decode(out, text, pairs);
}

std::size_t decodeHexStrict(std::uint8_t* out, const char* text, std::size_t pairs) noexcept {
    return kernel().decodeStrict(out, text, pairs);
}

std::span<const Kernel> kernels() noexcept {
#ifdef PLR_HEX_VECTOR
    return std::span(kKernels).first(canVector() ? 2 : 1);
#else
    return kKernels;
#endif
}

}  // namespace plr::hexkernel

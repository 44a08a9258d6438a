#pragma once

#include <cstdint>
#include <string>

#include "plr/base/export.h"
#include "plr/format/integer.h"

// Binary digits of an integer, the most significant first. A negative number shows
// its two's complement in the width of its type.
//
// Threads: pure functions.
namespace plr {

namespace detail {
// At least `digits` digits, 1 to 64.
[[nodiscard]] PLR_EXPORT std::string binaryOf(std::uint64_t bits, unsigned digits);
}  // namespace detail

// Without leading zeros; "0" for zero.
template <FormattedInteger T>
[[nodiscard]] std::string binary(T value) {
    return detail::binaryOf(detail::bitsOf(value), 1);
}

// All digits of the type: "00000101" for an unsigned char of 5.
template <FormattedInteger T>
[[nodiscard]] std::string binary0(T value) {
    return detail::binaryOf(detail::bitsOf(value), 8 * sizeof(T));
}

}  // namespace plr

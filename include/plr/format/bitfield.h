#pragma once

#include <cstdint>
#include <string>
#include <utility>

#include "plr/base/export.h"
#include "plr/format/integer.h"

// Fields of bits in an integer.
//
// Threads: pure functions.
namespace plr {

// (low bit, high bit), both belonging to the field; bit 0 is the least significant.
// It is valid for an integer that has as many bits as the field: high is not below
// low, nor by the integer's width or more above it.
using BitRange = std::pair<unsigned char, unsigned char>;

namespace detail {
[[nodiscard]] PLR_EXPORT std::uint64_t bitfieldOf(std::uint64_t bits, unsigned width,
                                                  BitRange range) noexcept;
[[nodiscard]] PLR_EXPORT std::string bitfieldPictureOf(std::uint64_t bits, unsigned width,
                                                       BitRange range, char fill);
}  // namespace detail

// The field's value: 0xF of (4, 7) in 0xF0. 0 when the range is not valid. Bits above
// the integer's own are 0.
template <FormattedInteger T>
[[nodiscard]] T bitfield(T value, const BitRange& range) noexcept {
    return static_cast<T>(detail::bitfieldOf(detail::bitsOf(value), 8 * sizeof(T), range));
}

// The integer's bits, the most significant first, with `fill` for those that are not
// in the field: "1011----" for (4, 7) in 0xB0. Empty when the range is not valid.
// Deliberate: of a field, the lowest 8 bits are shown; those above print as '0'.
template <FormattedInteger T>
[[nodiscard]] std::string bitfieldPrettyPrint(T value, const BitRange& range, char fill) {
    return detail::bitfieldPictureOf(detail::bitsOf(value), 8 * sizeof(T), range, fill);
}

}  // namespace plr

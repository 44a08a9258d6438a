#pragma once

#include <concepts>
#include <cstdint>
#include <type_traits>

// The integers that plr::hex(), plr::binary() and plr::bitfield() take: the
// standard types of 1 to 8 bytes. bool, wchar_t, the charN_t and enumerations are
// refused: their numbers are rarely what is meant.
namespace plr {

template <class T>
concept FormattedInteger = std::same_as<T, unsigned char> || std::same_as<T, signed char> ||
    std::same_as<T, char> || std::same_as<T, unsigned short> || std::same_as<T, short> ||
    std::same_as<T, unsigned int> || std::same_as<T, int> || std::same_as<T, unsigned long> ||
    std::same_as<T, long> || std::same_as<T, unsigned long long> || std::same_as<T, long long>;

namespace detail {

// The bits of `value` alone: a negative number brings no others.
template <FormattedInteger T>
[[nodiscard]] constexpr std::uint64_t bitsOf(T value) noexcept {
    return static_cast<std::make_unsigned_t<T>>(value);
}

}  // namespace detail
}  // namespace plr

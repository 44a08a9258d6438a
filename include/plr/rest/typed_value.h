#pragma once

#include <concepts>
#include <cstdint>
#include <limits>
#include <optional>
#include <string>
#include <type_traits>
#include <vector>

#include "plr/base/export.h"
#include "plr/ipc/object.h"

// A value as the type that a program wants: the strict companion of the lenient
// readers of plr/ipc/read.h. Any thread.
//
//   bool                        a boolean
//   every integer type          an integer, signed or unsigned, that is in range
//   double                      a double, or an integer
//   std::string                 a string
//   std::vector<std::uint8_t>   data
//   vox::object                 everything but null
//   every other T               what read_rest_value(T&, const vox::object&), found
//                               by its arguments, reads from everything but null
//                               into a T{}
//
// Nothing for the null object, and for everything else.
namespace plr::rest {

namespace detail {

[[nodiscard]] PLR_EXPORT std::optional<bool> asBool(const vox::object& value);
[[nodiscard]] PLR_EXPORT std::optional<std::int64_t> asSigned(const vox::object& value,
                                                              std::int64_t least,
                                                              std::int64_t most);
[[nodiscard]] PLR_EXPORT std::optional<std::uint64_t> asUnsigned(const vox::object& value,
                                                                 std::uint64_t most);
[[nodiscard]] PLR_EXPORT std::optional<double> asDouble(const vox::object& value);
[[nodiscard]] PLR_EXPORT std::optional<std::string> asText(const vox::object& value);
[[nodiscard]] PLR_EXPORT std::optional<std::vector<std::uint8_t>> asData(const vox::object& value);

template <class T>
concept RestReadable = std::default_initializable<T> && requires(T& out, const vox::object& value) {
    read_rest_value(out, value);
};

template <class T>
std::optional<T> asInteger(const vox::object& value) {
    using Limits = std::numeric_limits<T>;
    if constexpr (Limits::is_signed) {
        if (const auto number = asSigned(value, Limits::min(), Limits::max()))
            return static_cast<T>(*number);
    } else {
        if (const auto number = asUnsigned(value, Limits::max()))
            return static_cast<T>(*number);
    }
    return std::nullopt;
}

template <class T>
std::optional<T> readInto(const vox::object& value) {
    static_assert(RestReadable<T>,
                  "no value can be read as this type: declare read_rest_value(T&, const "
                  "vox::object&) in the namespace of T, which needs a default constructor");
    if (!value)
        return std::nullopt;
    std::optional<T> out(std::in_place);
    if constexpr (RestReadable<T>)  // else one error is enough
        read_rest_value(*out, value);
    return out;
}

}  // namespace detail

template <class T>
[[nodiscard]] std::optional<T> valueAs(const vox::object& value) {
    if constexpr (std::is_same_v<T, bool>)
        return detail::asBool(value);
    else if constexpr (std::is_integral_v<T>)
        return detail::asInteger<T>(value);
    else if constexpr (std::is_same_v<T, double>)
        return detail::asDouble(value);
    else if constexpr (std::is_same_v<T, std::string>)
        return detail::asText(value);
    else if constexpr (std::is_same_v<T, std::vector<std::uint8_t>>)
        return detail::asData(value);
    else if constexpr (std::is_same_v<T, vox::object>)
        return value ? std::optional(value) : std::nullopt;
    else
        return detail::readInto<T>(value);
}

}  // namespace plr::rest

#pragma once

#include <atomic>
#include <cstdint>
#include <string>
#include <string_view>
#include <utility>
#include <variant>

#include "ob/ob.h"

// How objects lie in memory: a counted header, then the type's own content.
namespace ob {

enum class type : std::uint8_t { string, number };

struct object {
    explicit object(type of) noexcept : kind(of) {}
    const type kind;
    std::atomic<long> references{1};
};

// What "%@" prints.
[[nodiscard]] std::string text_of(const object* any);
// printf with "%@"; reads `arguments` and leaves them to the caller.
[[nodiscard]] std::string format(std::string_view pattern, va_list arguments);

}  // namespace ob

struct ObString : ob::object {
    explicit ObString(std::string content) : object(ob::type::string), text(std::move(content)) {}
    const std::string text;
};

struct ObNumber : ob::object {
    using content = std::variant<bool, std::int64_t, std::uint64_t, double>;
    explicit ObNumber(content of) noexcept : object(ob::type::number), value(of) {}
    const content value;
};

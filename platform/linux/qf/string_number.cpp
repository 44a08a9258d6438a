#include <locale.h>

#include <algorithm>
#include <cfloat>
#include <charconv>
#include <cstdlib>

#include "platform/linux/qf/value.h"
#include "qf/string.h"

namespace {

bool is_digit(char c) noexcept {
    return c >= '0' && c <= '9';
}

// The number from its '-' or first digit on, empty for none: what from_chars would
// read differently ("inf", "nan", "+-1") is none.
std::string_view number_at_start(std::string_view text) noexcept {
    text.remove_prefix(std::min(text.find_first_not_of(" \t\n\v\f\r"), text.size()));
    const bool negative = text.starts_with('-');
    std::string_view digits = text.substr(negative || text.starts_with('+') ? 1 : 0);
    const std::size_t point = digits.starts_with('.') ? 1 : 0;
    if (digits.size() <= point || !is_digit(digits[point]))
        return {};
    return negative ? text : digits;
}

// What does not fit a double: too small is 0, too large the end of the range.
double beyond_range(std::string_view number) noexcept {
    static const locale_t plain = newlocale(LC_ALL_MASK, "C", nullptr);
    return std::clamp(strtod_l(number.data(), nullptr, plain), -DBL_MAX, DBL_MAX);
}

}  // namespace

extern "C" {

int32_t qf_string_get_int_value(QfStringRef string) {
    const std::string_view number = number_at_start(qf::checked(string)->view());
    int32_t value = 0;
    const auto result = std::from_chars(number.data(), number.data() + number.size(), value);
    if (result.ec == std::errc::result_out_of_range)
        return number.front() == '-' ? INT32_MIN : INT32_MAX;
    return value;
}

double qf_string_get_double_value(QfStringRef string) {
    const std::string_view number = number_at_start(qf::checked(string)->view());
    double value = 0;
    const auto result = std::from_chars(number.data(), number.data() + number.size(), value);
    if (result.ec == std::errc::result_out_of_range)
        return beyond_range(number);
    return std::clamp(value, -DBL_MAX, DBL_MAX);
}

}  // extern "C"

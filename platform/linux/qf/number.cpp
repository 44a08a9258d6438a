#include <bit>
#include <cmath>
#include <limits>
#include <type_traits>
#include <utility>

#include "platform/linux/qf/value.h"

namespace {

QfNumberRef make_number(QfNumberType type, std::uint64_t bits) noexcept {
    return qf::make<qf_number>(0, type, bits);
}

// One past the range of an integer type: a power of two, which every float has.
template <class Integer>
constexpr double kPastEnd = 2.0 *
                            static_cast<double>(std::uint64_t{1}
                                                << (std::numeric_limits<Integer>::digits - 1));

template <class Value>
Value load(const void* value) noexcept {
    Value loaded;
    std::memcpy(&loaded, value, sizeof loaded);
    return loaded;
}

template <class Value>
std::uint64_t load_bits(const void* value) noexcept {
    if constexpr (std::is_floating_point_v<Value>)
        return std::bit_cast<std::uint64_t>(double{load<Value>(value)});
    else  // negative ones get the sign in all bits above
        return static_cast<std::uint64_t>(load<Value>(value));
}

// ---- Integers to the target's type: low bits, or the nearest float -------------

template <class Target, class Integer>
bool fits(Integer from, Target to) noexcept {
    if constexpr (std::is_integral_v<Target>) {
        return std::cmp_equal(from, to);
    } else {
        return static_cast<double>(to) < kPastEnd<Integer> && static_cast<Integer>(to) == from;
    }
}

template <class Target, class Integer>
bool convert_integer(Integer from, void* value) noexcept {
    const auto to = static_cast<Target>(from);
    std::memcpy(value, &to, sizeof to);
    return fits(from, to);
}

// ---- Floats: cut off, or the nearest end of the range --------------------------

template <class Target>
Target cut(double from) noexcept {
    constexpr auto kLeast = static_cast<double>(std::numeric_limits<Target>::min());
    if (std::isnan(from))
        return 0;
    if (from >= kPastEnd<Target>)
        return std::numeric_limits<Target>::max();
    return from <= kLeast ? std::numeric_limits<Target>::min() : static_cast<Target>(from);
}

template <class Target>
bool convert_float(double from, void* value) noexcept {
    Target to;
    if constexpr (std::is_integral_v<Target>)
        to = cut<Target>(from);
    else
        to = static_cast<Target>(from);
    std::memcpy(value, &to, sizeof to);
    if constexpr (std::is_integral_v<Target>)
        return from < kPastEnd<Target> && static_cast<double>(to) == from;
    else
        return static_cast<double>(to) == from || std::isnan(from);
}

template <class Target>
bool convert(QfNumberRef number, void* value) noexcept {
    if (number->detail <= kQfNumberSInt64Type)
        return convert_integer<Target>(static_cast<std::int64_t>(number->bits), value);
    if (number->detail <= kQfNumberUInt64Type)
        return convert_integer<Target>(number->bits, value);
    return convert_float<Target>(std::bit_cast<double>(number->bits), value);
}

}  // namespace

extern "C" {

QfNumberRef qf_number_create(QfNumberType type, const void* value) {
    switch (type) {
        case kQfNumberSInt8Type:
            return make_number(type, load_bits<std::int8_t>(value));
        case kQfNumberSInt16Type:
            return make_number(type, load_bits<std::int16_t>(value));
        case kQfNumberSInt32Type:
            return make_number(type, load_bits<std::int32_t>(value));
        case kQfNumberSInt64Type:
        case kQfNumberUInt64Type:
            return make_number(type, load_bits<std::uint64_t>(value));
        case kQfNumberUInt8Type:
            return make_number(type, load_bits<std::uint8_t>(value));
        case kQfNumberUInt16Type:
            return make_number(type, load_bits<std::uint16_t>(value));
        case kQfNumberUInt32Type:
            return make_number(type, load_bits<std::uint32_t>(value));
        case kQfNumberFloatType:
            return make_number(type, load_bits<float>(value));
        case kQfNumberDoubleType:
            return make_number(type, load_bits<double>(value));
    }
    PLR_ASSERT(false, "no type of numbers");
    return nullptr;
}

QfNumberRef qf_number_create_int64(int64_t value) {
    return make_number(kQfNumberSInt64Type, static_cast<std::uint64_t>(value));
}
QfNumberRef qf_number_create_uint64(uint64_t value) {
    return make_number(kQfNumberUInt64Type, value);
}
QfNumberRef qf_number_create_double(double value) {
    return make_number(kQfNumberDoubleType, std::bit_cast<std::uint64_t>(value));
}

QfNumberType qf_number_get_type(QfNumberRef number) {
    return static_cast<QfNumberType>(qf::checked(number)->detail);
}
bool qf_number_is_float(QfNumberRef number) {
    return qf_number_get_type(number) >= kQfNumberFloatType;
}

bool qf_number_get_value(QfNumberRef number, QfNumberType type, void* value) {
    qf::checked(number);
    switch (type) {
        case kQfNumberSInt8Type:
            return convert<std::int8_t>(number, value);
        case kQfNumberSInt16Type:
            return convert<std::int16_t>(number, value);
        case kQfNumberSInt32Type:
            return convert<std::int32_t>(number, value);
        case kQfNumberSInt64Type:
            return convert<std::int64_t>(number, value);
        case kQfNumberUInt8Type:
            return convert<std::uint8_t>(number, value);
        case kQfNumberUInt16Type:
            return convert<std::uint16_t>(number, value);
        case kQfNumberUInt32Type:
            return convert<std::uint32_t>(number, value);
        case kQfNumberUInt64Type:
            return convert<std::uint64_t>(number, value);
        case kQfNumberFloatType:
            return convert<float>(number, value);
        case kQfNumberDoubleType:
            return convert<double>(number, value);
    }
    PLR_ASSERT(false, "no type of numbers");
    return false;
}

}  // extern "C"

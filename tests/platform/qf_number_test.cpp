#include <gtest/gtest.h>

#include <cmath>
#include <cstdint>
#include <limits>
#include <string>
#include <vector>

#include "plr/concurrency/qf_shared_ref.h"
#include "tests/support/qf_balance.h"

namespace {

// Has every integer of 64 bits and every double.
using Real = long double;
static_assert(std::numeric_limits<Real>::digits >= 64);

template <class Value>
constexpr bool kIsInteger = std::numeric_limits<Value>::is_integer;

std::vector<Real> edges() {
    std::vector<Real> all{
        0,      -0.0L, 0.5,    0.1, -0.5,     2.5,       -2.5,
        1e-320, 1e300, -1e300, NAN, INFINITY, -INFINITY, std::numeric_limits<float>::max()};
    for (const int bits : {0, 7, 8, 15, 16, 24, 31, 32, 53, 63, 64})
        for (const Real distance : {-1.0L, 0.0L, 1.0L})
            for (const Real sign : {-1.0L, 1.0L})
                all.push_back(sign * (std::ldexp(1.0L, bits) + distance));
    return all;
}

// The low bits of a whole number, by arithmetic alone.
template <class Target>
Real lowBits(Real value) {
    const Real modulus = std::ldexp(1.0L, 8 * sizeof(Target));
    Real low = std::fmod(value, modulus);
    if (low < static_cast<Real>(std::numeric_limits<Target>::min()))
        low += modulus;
    return low > static_cast<Real>(std::numeric_limits<Target>::max()) ? low - modulus : low;
}

template <class Target>
Real expected(Real value, bool fromInteger) {
    if (!kIsInteger<Target>)
        return static_cast<Target>(value);
    if (std::isnan(value))
        return 0;
    if (fromInteger)
        return lowBits<Target>(value);
    const Real least = std::numeric_limits<Target>::min();
    const Real most = std::numeric_limits<Target>::max();
    return std::min(std::max(std::trunc(value), least), most);
}

bool same(Real left, Real right) {
    return left == right || (std::isnan(left) && std::isnan(right));
}

template <class Target>
void expectRead(QfNumberRef number, QfNumberType type, Real value, bool fromInteger) {
    Target written = 77;
    const bool exact = qf_number_get_value(number, type, &written);
    const Real wanted = expected<Target>(value, fromInteger);
    EXPECT_TRUE(same(static_cast<Real>(written), wanted)) << "gave " << +written;
    EXPECT_EQ(exact, same(wanted, value)) << "gave " << +written;
}

void expectReads(QfNumberRef number, Real value) {
    const bool integer = !qf_number_is_float(number);
    expectRead<std::int8_t>(number, kQfNumberSInt8Type, value, integer);
    expectRead<std::int16_t>(number, kQfNumberSInt16Type, value, integer);
    expectRead<std::int32_t>(number, kQfNumberSInt32Type, value, integer);
    expectRead<std::int64_t>(number, kQfNumberSInt64Type, value, integer);
    expectRead<std::uint8_t>(number, kQfNumberUInt8Type, value, integer);
    expectRead<std::uint16_t>(number, kQfNumberUInt16Type, value, integer);
    expectRead<std::uint32_t>(number, kQfNumberUInt32Type, value, integer);
    expectRead<std::uint64_t>(number, kQfNumberUInt64Type, value, integer);
    expectRead<float>(number, kQfNumberFloatType, value, integer);
    expectRead<double>(number, kQfNumberDoubleType, value, integer);
}

template <class Source>
void expectConversions(QfNumberType type) {
    for (const Real edge : edges()) {
        if (!same(expected<Source>(edge, false), edge))
            continue;  // the type has no such value
        const auto value = static_cast<Source>(edge);
        SCOPED_TRACE("type " + std::to_string(type) + ", value " + std::to_string(edge));
        const auto number = plr::qf::adopt(qf_number_create(type, &value));
        EXPECT_EQ(qf_number_get_type(number.get()), type);
        EXPECT_EQ(qf_number_is_float(number.get()), !kIsInteger<Source>);
        expectReads(number.get(), edge);
    }
}

TEST(QfNumber, ReadsAsEveryTypeAndSaysWhetherThatLostAnything) {
    expectConversions<std::int8_t>(kQfNumberSInt8Type);
    expectConversions<std::int16_t>(kQfNumberSInt16Type);
    expectConversions<std::int32_t>(kQfNumberSInt32Type);
    expectConversions<std::int64_t>(kQfNumberSInt64Type);
    expectConversions<std::uint8_t>(kQfNumberUInt8Type);
    expectConversions<std::uint16_t>(kQfNumberUInt16Type);
    expectConversions<std::uint32_t>(kQfNumberUInt32Type);
    expectConversions<std::uint64_t>(kQfNumberUInt64Type);
    expectConversions<float>(kQfNumberFloatType);
    expectConversions<double>(kQfNumberDoubleType);
}

// Three makers with one value each, where they have it.
std::vector<plr::qf::QfSharedRef<plr::qf::Number>> numbersOf(Real value) {
    std::vector<plr::qf::QfSharedRef<plr::qf::Number>> made;
    if (same(expected<std::int64_t>(value, false), value))
        made.push_back(plr::qf::adopt(qf_number_create_int64(static_cast<std::int64_t>(value))));
    if (same(expected<std::uint64_t>(value, false), value))
        made.push_back(plr::qf::adopt(qf_number_create_uint64(static_cast<std::uint64_t>(value))));
    if (same(expected<double>(value, false), value))
        made.push_back(plr::qf::adopt(qf_number_create_double(static_cast<double>(value))));
    return made;
}

TEST(QfNumber, EqualsByValueWhateverItWasMadeFromAndHashesAlike) {
    for (const Real left : edges()) {
        for (const Real right : edges()) {
            for (const auto& one : numbersOf(left)) {
                for (const auto& other : numbersOf(right)) {
                    EXPECT_EQ(qf_equal(one.get(), other.get()), same(left, right))
                        << std::to_string(left) << " and " << std::to_string(right);
                    if (same(left, right)) {
                        EXPECT_EQ(qf_hash(one.get()), qf_hash(other.get())) << std::to_string(left);
                    }
                }
            }
        }
    }
}

}  // namespace

#include "plr/ipc/read.h"

#include <gtest/gtest.h>

#include <limits>
#include <stdexcept>

#include "plr/ipc/values.h"

namespace {

constexpr std::uint64_t kHuge = std::numeric_limits<std::uint64_t>::max();

TEST(DynCastOrDefault, FollowsTheRulesOfEachType) {
    const struct {
        const char* name;
        vox::object value;
        long long asLongLong;  // fallback 9
        int asInt;
        unsigned asUnsigned;
        std::optional<unsigned long long> asUnsignedLongLong;  // nothing: throws
        bool asBool;                                           // fallback true
        double asDouble;                                       // fallback 1.5
    } rows[] = {
        {"int64 3", vox::int64(3), 3, 3, 3, 3, true, 1.5},
        {"int64 0", vox::int64(0), 0, 0, 0, 0, false, 1.5},
        {"int64 -5", vox::int64(-5), -5, -5, 4294967291U, std::nullopt, true, 1.5},
        {"int64 2^32+7", vox::int64((1LL << 32) + 7), (1LL << 32) + 7, 7, 7, (1ULL << 32) + 7, true,
         1.5},
        {"uint64 5", vox::uint64(5), 5, 5, 5, 5, true, 1.5},
        {"uint64 max", vox::uint64(kHuge), -1, -1, 4294967295U, kHuge, true, 1.5},
        {"true", vox::boolean(true), 1, 1, 1, 9, true, 1.5},
        {"false", vox::boolean(false), 0, 0, 0, 9, false, 1.5},
        {"double 2.5", vox::real(2.5), 9, 9, 9, 9, true, 2.5},
        {"string", vox::string("7"), 9, 9, 9, 9, true, 1.5},
        {"null", vox::object(), 9, 9, 9, 9, true, 1.5},
        {"dictionary", vox::dict::create(), 9, 9, 9, 9, true, 1.5},
    };
    for (const auto& row : rows) {
        SCOPED_TRACE(row.name);
        EXPECT_EQ(vox::dyn_cast_or_default(row.value, 9LL), row.asLongLong);
        EXPECT_EQ(vox::dyn_cast_or_default(row.value, 9L), row.asLongLong);
        EXPECT_EQ(vox::dyn_cast_or_default(row.value, 9UL),
                  static_cast<unsigned long>(row.asLongLong));
        EXPECT_EQ(vox::dyn_cast_or_default(row.value, 9), row.asInt);
        EXPECT_EQ(vox::dyn_cast_or_default(row.value, 9U), row.asUnsigned);
        if (row.asUnsignedLongLong)
            EXPECT_EQ(vox::dyn_cast_or_default(row.value, 9ULL), *row.asUnsignedLongLong);
        else
            EXPECT_THROW(static_cast<void>(vox::dyn_cast_or_default(row.value, 9ULL)),
                         std::out_of_range);
        EXPECT_EQ(vox::dyn_cast_or_default(row.value, true), row.asBool);
        EXPECT_EQ(vox::dyn_cast_or_default(row.value, 1.5), row.asDouble);
    }
}

TEST(DynCastOrDefault, ReadsStringsAndDataByTheirLength) {
    const std::string text("a\0b", 3);
    EXPECT_EQ(vox::dyn_cast_or_default(vox::string(text), std::string("x")), text);
    EXPECT_EQ(vox::dyn_cast_or_default(vox::string(text), "x"), text);
    EXPECT_EQ(vox::dyn_cast_or_default(vox::int64(1), "x"), "x");
    EXPECT_EQ(vox::dyn_cast_or_default(vox::object(), std::string("x")), "x");
    const std::vector<std::uint8_t> bytes{0, 1, 255};
    const std::vector<std::uint8_t> fallback{7};
    EXPECT_EQ(vox::dyn_cast_or_default(vox::data(bytes), fallback), bytes);
    EXPECT_EQ(vox::dyn_cast_or_default(vox::data({}), fallback), std::vector<std::uint8_t>());
    EXPECT_EQ(vox::dyn_cast_or_default(vox::string("x"), fallback), fallback);
}

TEST(IsLogicallyFalse, LooksAtEveryType) {
    const std::uint8_t byte[] = {0};
    const std::uint8_t uuid[16] = {};
    const vox::dict filled = vox::dict::create();
    filled["k"] = nullptr;
    const struct {
        const char* name;
        vox::object value;
        bool expected;
    } rows[] = {
        {"null", vox::object(), true},
        {"int64 0", vox::int64(0), true},
        {"int64 -1", vox::int64(-1), false},
        {"uint64 0", vox::uint64(0), true},
        {"uint64 1", vox::uint64(1), false},
        {"false", vox::boolean(false), true},
        {"true", vox::boolean(true), false},
        {"empty data", vox::data({}), true},
        {"one zero byte", vox::data(byte), false},
        {"empty string", vox::string(std::string_view()), true},
        {"string 0", vox::string("0"), false},
        {"empty array", vox::array::create(), true},
        {"array", vox::array_creator()(""), false},
        {"empty dictionary", vox::dict::create(), true},
        {"dictionary", filled, false},
        {"0.0", vox::real(0.0), false},
        {"date", vox::date(std::chrono::nanoseconds(0)), false},
        {"uuid", vox::uuid(uuid), false},
        {"error", vox::error(0, nullptr), false},
    };
    for (const auto& row : rows)
        EXPECT_EQ(vox::is_logically_false(row.value), row.expected) << row.name;
    EXPECT_TRUE(vox::is_logically_false(vox::dict(vox::int64(1))));
    EXPECT_FALSE(vox::is_logically_false(filled));
    EXPECT_TRUE(vox::is_logically_false(vox::array(vox::int64(1))));
    EXPECT_FALSE(vox::is_logically_false(vox::array(vox::array_creator()("x"))));
}

// {"a": ["x", {"b": 2}], "": {"": 3}}
vox::object sample() {
    const vox::dict inner = vox::dict::create();
    inner["b"] = vox::int64(2);
    const vox::array list = vox::array_creator()("x");
    list.append(inner);
    const vox::dict empty = vox::dict::create();
    empty[""] = vox::int64(3);
    const vox::dict root = vox::dict::create();
    root["a"] = list;
    root[""] = empty;
    return root;
}

TEST(GetSubpath, WalksDictionariesAndArrays) {
    const struct {
        const char* path;
        vox::object expected;
    } rows[] = {
        {"a.1.b", vox::int64(2)},
        {"a.0", vox::string("x")},
        {"a.+1.b", vox::int64(2)},  // as the standard conversion reads it
        {"a.1x.b", vox::int64(2)},
        {"a.2", nullptr},
        {"a.-1", nullptr},  // a huge index
        {"a.0.c", nullptr},
        {"a.0.c.d", nullptr},
        {"b", nullptr},
        {"b.c", nullptr},
        {"a.1.b.0", nullptr},
        {".", vox::int64(3)},
        {"..", nullptr},
    };
    for (const auto& row : rows)
        EXPECT_EQ(vox::get_subpath(sample(), row.path), row.expected) << row.path;
    EXPECT_EQ(vox::get_subpath(sample(), "").type(), VOX_TYPE_DICTIONARY);
    EXPECT_EQ(vox::get_subpath(vox::int64(1), ""), vox::object());
    EXPECT_EQ(vox::get_subpath(vox::object(), "a"), vox::object());
}

TEST(GetSubpath, LetsTheConversionThrow) {
    EXPECT_THROW(static_cast<void>(vox::get_subpath(sample(), "a.b")), std::invalid_argument);
    EXPECT_THROW(static_cast<void>(vox::get_subpath(sample(), "a.")), std::invalid_argument);
    EXPECT_THROW(static_cast<void>(vox::get_subpath(sample(), "a.99999999999999999999999")),
                 std::out_of_range);
}

}  // namespace

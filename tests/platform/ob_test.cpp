#include "ob/ob.h"

#include <gtest/gtest.h>

#include <cstdarg>
#include <cstddef>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <string>
#include <thread>

namespace {

std::string takeText(ObString* owned) {
    std::string text(ob_string_get_utf8(owned), ob_string_get_length(owned));
    ob_release(owned);
    return text;
}

std::string format(const char* pattern, ...) {
    ObString* const made = ob_string_create(pattern);
    va_list arguments;
    va_start(arguments, pattern);
    const std::string text = takeText(ob_string_create_with_format_arguments(made, arguments));
    va_end(arguments);
    ob_release(made);
    return text;
}

// What the C library makes of the same.
#pragma GCC diagnostic push
#pragma GCC diagnostic ignored "-Wformat-nonliteral"
std::string expected(const char* pattern, ...) {
    std::string text(4096, '\0');
    va_list arguments;
    va_start(arguments, pattern);
    const int length = std::vsnprintf(text.data(), text.size(), pattern, arguments);
    va_end(arguments);
    text.resize(static_cast<std::size_t>(length));
    return text;
}
#pragma GCC diagnostic pop

// Every row ends in a number of its own: it shows that the arguments before it
// were taken by their types.
#define EXPECT_LIKE_PRINTF(pattern, ...) \
    EXPECT_EQ(format(pattern "|%d", __VA_ARGS__, 4711), expected(pattern "|%d", __VA_ARGS__, 4711))

TEST(ObFormat, ConversionsAreThoseOfPrintf) {
    int here = 0;
    EXPECT_LIKE_PRINTF("%d %i %u", -1, 2, 3u);
    EXPECT_LIKE_PRINTF("%hhd %hd %hhu %hu", 300, 70000, 300u, 70000u);
    EXPECT_LIKE_PRINTF("%ld %lld %lu %llx", -1L, INT64_MIN, 2UL, UINT64_MAX);
    EXPECT_LIKE_PRINTF("%jd %zu %td %zd", INTMAX_MAX, SIZE_MAX, PTRDIFF_MIN, ssize_t{-1});
    EXPECT_LIKE_PRINTF("%o %x %X %#x %#o", 8u, 255u, 255u, 255u, 8u);
    EXPECT_LIKE_PRINTF("%+d % d %05d %-5d. %5.3d", 1, 1, 1, 1, 1);
    EXPECT_LIKE_PRINTF("%*d %-*d %*d.", 6, 1, 6, 1, -6, 1);
    EXPECT_LIKE_PRINTF("%.*d %.*s %.*s", 3, 1, 2, "abc", -1, "abc");
    EXPECT_LIKE_PRINTF("%f %e %E %g %G %a %A %.0f %#.0f", .5, .5, .5, 1e9, 1e9, .5, .5, 2.5, 2.5);
    EXPECT_LIKE_PRINTF("%Lf %Lg %d", 1.5L, 1e300L, 1);
    EXPECT_LIKE_PRINTF("%c%c %5c %s %10s %.2s %-6s.", 'a', 'b', 'c', "x", "x", "xyz", "x");
    EXPECT_LIKE_PRINTF("%ls %lc", L"wide", static_cast<wint_t>(L'w'));
    EXPECT_LIKE_PRINTF("%p %p %%", static_cast<void*>(&here), nullptr);
    // More than there are registers for arguments.
    EXPECT_LIKE_PRINTF("%d%f%d%f%d%f%d%f%d%f%d%f%d%f%d%f%d%f", 1, 1., 2, 2., 3, 3., 4, 4., 5, 5., 6,
                       6., 7, 7., 8, 8., 9, 9.);
}

TEST(ObFormat, ObjectsPrintTheirText) {
    ObString* const text = ob_string_create_with_length("a\0b", 3);
    ObNumber* const number = ob_number_create_int64(-5);
    EXPECT_EQ(format("%@ %d %@ %@ %10.1@", text, 1, number, nullptr, number),
              std::string("a\0b 1 -5 (null) -5", 18));
    ob_release(text);
    ob_release(number);
}

TEST(ObFormat, WhatIsNoConversionStaysInTheText) {
    int untouched = 7;
    EXPECT_EQ(format("%n%d", &untouched, 1), "%n1");
    EXPECT_EQ(untouched, 7);
    EXPECT_EQ(format("%y %d %-5.2! %k%d", 1, 2), "%y 1 %-5.2! %k2");
    EXPECT_EQ(format("%1$d"), "%1$d");
    for (const char* text : {"", "%", "100 %", "%5", "%.", "%ll", "%-+ #0"})
        EXPECT_EQ(format(text), text);
    EXPECT_EQ(format("%s", static_cast<const char*>(nullptr)), "(null)");
    EXPECT_EQ(format("%100000d", 1).size(), 100000u);
}

TEST(ObNumber, StringValuesReadBack) {
    const auto textOf = [](ObNumber* owned) {
        const std::string text = takeText(ob_number_copy_string_value(owned));
        ob_release(owned);
        return text;
    };
    EXPECT_EQ(textOf(ob_number_create_bool(true)), "true");
    EXPECT_EQ(textOf(ob_number_create_int64(INT64_MIN)), "-9223372036854775808");
    EXPECT_EQ(textOf(ob_number_create_uint64(UINT64_MAX)), "18446744073709551615");
    for (const double value : {0.1, 5., 1.0 / 3, 5e-324, 1.7976931348623157e308, 1e21})
        EXPECT_EQ(std::strtod(textOf(ob_number_create_double(value)).c_str(), nullptr), value);
}

TEST(ObAutorelease, PoolsReleaseInnermostFirst) {
    ObNumber* const number = ob_number_create_bool(true);
    ob_retain(number);
    void* const outer = ob_autorelease_pool_push();
    ob_autorelease(number);
    void* const inner = ob_autorelease_pool_push();
    ObString* const value = ob_number_get_string_value(number);
    ob_retain(value);
    ob_autorelease(ob_retain(number));
    ob_autorelease_pool_pop(inner);
    EXPECT_EQ(ob_get_reference_count(value), 1);
    EXPECT_EQ(ob_get_reference_count(number), 2);
    void* const left = ob_autorelease_pool_push();  // popped by the outer one
    ob_autorelease(ob_retain(number));
    EXPECT_TRUE(ob_autorelease_pool_is_open(left));
    ob_autorelease_pool_pop(outer);
    EXPECT_EQ(ob_get_reference_count(number), 1);
    void* const later = ob_autorelease_pool_push();
    ob_autorelease(ob_retain(number));
    EXPECT_FALSE(ob_autorelease_pool_is_open(left));
    ob_autorelease_pool_pop(left);
    EXPECT_EQ(ob_get_reference_count(number), 2) << "popped once already";
    ob_autorelease_pool_pop(later);
    ob_release(value);
    std::jthread([number] { ob_autorelease(ob_retain(number)); }).join();
    EXPECT_EQ(ob_get_reference_count(number), 1) << "the thread's end releases";
    ob_release(number);
}

TEST(ObObject, NullIsIgnoredButIsNoPool) {
    EXPECT_EQ(ob_retain(nullptr), nullptr);
    EXPECT_EQ(ob_autorelease(nullptr), nullptr);
    ob_release(nullptr);
    EXPECT_EQ(ob_get_reference_count(nullptr), 0);
    EXPECT_DEATH(ob_autorelease_pool_pop(nullptr), "autorelease pool");
    EXPECT_DEATH(ob_autorelease_pool_pop(reinterpret_cast<void*>(1000)), "autorelease pool");
}

}  // namespace

#include "src/log/time_text.h"

#include <cstdlib>

namespace plr {
namespace {

constexpr std::int64_t kNanoseconds = 1'000'000'000;
constexpr std::int64_t kSecondsPerDay = 86'400;

struct Parts {
    std::int64_t quotient, rest;  // the rest is never negative
};

constexpr Parts divide(std::int64_t value, std::int64_t by) noexcept {
    const std::int64_t rest = value % by;
    return rest < 0 ? Parts{value / by - 1, rest + by} : Parts{value / by, rest};
}

template <unsigned Digits>
void put(char* to, std::uint64_t number) noexcept {
    for (unsigned i = Digits; i != 0; number /= 10)
        to[--i] = static_cast<char>('0' + number % 10);
}

struct Date {
    std::int64_t year;
    unsigned month, day;
};

// The proleptic Gregorian calendar, counted in eras of 400 years that start on 1
// March, so that a leap day is the last of its year.
constexpr Date dateOf(std::int64_t daysSince1970) noexcept {
    constexpr std::int64_t kDaysPerEra = 146'097;
    const auto [era, ofEra] = divide(daysSince1970 + 719'468, kDaysPerEra);
    const auto day = static_cast<unsigned>(ofEra);
    const unsigned year = (day - day / 1460 + day / 36'524 - day / 146'096) / 365;
    const unsigned ofYear = day - (365 * year + year / 4 - year / 100);
    const unsigned fromMarch = (5 * ofYear + 2) / 153;
    const unsigned month = fromMarch < 10 ? fromMarch + 3 : fromMarch - 9;
    return {era * 400 + year + (month <= 2 ? 1 : 0), month, ofYear - (153 * fromMarch + 2) / 5 + 1};
}

static_assert(dateOf(0).year == 1970 && dateOf(0).month == 1 && dateOf(0).day == 1);
static_assert(dateOf(11'016).month == 2 && dateOf(11'016).day == 29 && dateOf(-1).year == 1969);

}  // namespace

TimeText::TimeText(Zone zone) noexcept : zone_(zone) {
    const std::int64_t now = std::time(nullptr);
    renderSecond(now, Offset::Ask);
}

std::string_view TimeText::render(TimeStamp time, Offset offset) noexcept {
    const auto [second, nanoseconds] = divide(time, kNanoseconds);
    if (second != second_) [[unlikely]]
        renderSecond(second, offset);
    put<6>(text_ + 20, static_cast<std::uint64_t>(nanoseconds) / 1000);
    return {text_, kLength};
}

void TimeText::renderSecond(std::int64_t second, Offset offset) noexcept {
    second_ = second;
    if (offset == Offset::Ask && zone_ == Zone::Local)
        askOffset(second);
    const auto [days, ofDay] = divide(second + offset_, kSecondsPerDay);
    const auto [year, month, day] = dateOf(days);
    const auto time = static_cast<std::uint64_t>(ofDay);
    put<4>(text_, static_cast<std::uint64_t>(year));
    put<2>(text_ + 5, month);
    put<2>(text_ + 8, day);
    put<2>(text_ + 11, time / 3600);
    put<2>(text_ + 14, time / 60 % 60);
    put<2>(text_ + 17, time % 60);
    const auto minutes = static_cast<std::uint64_t>(std::labs(offset_)) / 60;
    text_[26] = offset_ < 0 ? '-' : '+';
    put<2>(text_ + 27, minutes / 60);
    put<2>(text_ + 30, minutes % 60);
}

void TimeText::askOffset(std::int64_t second) noexcept {
    std::tm local{};
    if (::localtime_r(&second, &local) != nullptr)
        offset_ = local.tm_gmtoff;
}

}  // namespace plr

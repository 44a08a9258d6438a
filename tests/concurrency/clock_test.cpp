#include "plr/concurrency/clock.h"

#include <gmock/gmock.h>

#include <cerrno>

#include "plr/test/manual_calendar.h"
#include "support/fake_log.h"

namespace {

using namespace plr;
using namespace plr::test;
using namespace std::chrono_literals;

TEST(Clock, CountsTheNanosecondsOfTheSystemsTime) {
    const auto before = std::chrono::system_clock::now().time_since_epoch() / 1ns;
    const auto read = Clock::now_in_nanoseconds();
    const auto after = std::chrono::system_clock::now().time_since_epoch() / 1ns;
    EXPECT_GE(read, static_cast<std::uint64_t>(before));
    EXPECT_LE(read, static_cast<std::uint64_t>(after));
}

TEST(Clock, AFailureIsLoggedAndGivesZero) {
    LogPlaces places;
    FakeLog journal(places.journal());
    ManualCalendar calendar(1'700'000'000s + 5ns);
    calendar.fail(EINVAL);
    EXPECT_EQ(Clock::now_in_nanoseconds(), 0u);
    const auto fields = journal.receiveFields();
    EXPECT_THAT(fields, testing::Contains(std::pair("MESSAGE", "Failed to get time, 0x16\n")));
    EXPECT_THAT(fields, testing::Contains(std::pair("PRIORITY", "3")));
    calendar.fail(0);
    EXPECT_EQ(Clock::now_in_nanoseconds(), 1'700'000'000'000'000'005u);
}

}  // namespace

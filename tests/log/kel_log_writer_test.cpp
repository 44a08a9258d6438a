#include "plr/log/kel_log_writer.h"

#include <gtest/gtest.h>

#include "plr/test/manual_calendar.h"
#include "support/fake_log.h"

namespace {

using namespace plr;
using namespace plr::test;

constexpr std::int64_t kStart = 1'700'000'000'000'000'000;

class KelLogWriterTest : public testing::Test {
  protected:
    static LogMessage message(std::int64_t time, LogLevel level = LogLevel::Info,
                              std::string text = "text") {
        return {time, level, "radio.sms", std::move(text), {}};
    }

    LogPlaces places_;
    FakeLog journal_{places_.journal()};
};

TEST_F(KelLogWriterTest, SendsTheMessageAndItsParametersInKeyOrder) {
    const auto writer = KelLogWriter::create("radiod", nullptr, kStart);
    writer->setMsgParams({{"zone", "3"}, {"Build", "7\n8"}});
    writer->write(std::make_shared<LogMessage>(
        message(kStart + 1'500'000'000, LogLevel::Error, std::string("a\n\0b", 4))));
    EXPECT_EQ(journal_.receiveFields(), (JournalFields{{"SYSLOG_IDENTIFIER", "radiod"},
                                                       {"PRIORITY", "3"},
                                                       {"FACILITY", "radio.sms"},
                                                       {"MESSAGE", std::string("a\n\0b", 4)},
                                                       {"ZTSTARTTIME", "     1.500000"},
                                                       {"BUILD", "7\n8"},
                                                       {"ZONE", "3"}}));
    writer->setMsgParams({});
    writer->write(message(kStart));
    EXPECT_EQ(journal_.receiveFields().size(), 5u);
}

TEST_F(KelLogWriterTest, EveryLevelHasItsPriority) {
    const auto writer = KelLogWriter::create(nullptr, nullptr, kStart);
    const std::pair<LogLevel, const char*> rows[] = {
        {LogLevel::Trace, "7"},  {LogLevel::Debug, "7"}, {LogLevel::Info, "6"},
        {LogLevel::Notice, "5"}, {LogLevel::Warn, "4"},  {LogLevel::Error, "3"},
        {LogLevel::Fatal, "2"},  {LogLevel::Never, "6"}, {static_cast<LogLevel>(75), "6"}};
    for (const auto& [level, priority] : rows) {
        writer->write(message(kStart, level));
        EXPECT_EQ(journal_.receiveField("PRIORITY"), priority) << asString(level);
        writer->writeInCrash(message(kStart, level));
        EXPECT_EQ(journal_.receiveField("PRIORITY"), priority) << asString(level);
    }
}

TEST_F(KelLogWriterTest, ElapsedTimeIsSecondsAndMicrosecondsFromNowOn) {
    const ManualCalendar calendar{std::chrono::nanoseconds(kStart)};
    const auto writer = KelLogWriter::create(nullptr, nullptr, -1);
    const std::pair<std::int64_t, const char*> rows[] = {
        {1'000'999, "     0.001000"},
        {123'456'789'012'345'000, "123456789.012345"},
        {-999, "     0.000000"},  // truncated towards zero
        {-1'500'000'000, "    -1.-500000"},
    };
    for (const auto& [elapsed, text] : rows) {
        writer->write(message(kStart + elapsed));
        EXPECT_EQ(journal_.receiveField("ZTSTARTTIME"), text);
    }
    writer->close();
    writer->close_kel();
    writer->writeInCrash(message(kStart));
    writer->flushInCrash();
    EXPECT_FALSE(journal_.hasMore());
}

}  // namespace

#include "plr/log.h"

#include <gmock/gmock.h>

#include <latch>

#include "plr/ipc/values.h"
#include "plr/test/manual_calendar.h"
#include "support/log_fixture.h"
#include "support/waiting.h"

namespace {

using namespace plr;
using namespace plr::test;
using enum LogLevel;
using testing::ElementsAre;
using testing::IsEmpty;
using ServerLogger = LoggerBase<std::shared_ptr<LogServer>>;

TEST(LoggerCommonBase, LetsThroughWhatIsAtLeastItsLevel) {
    const struct {
        LogLevel local, inherited, effective;
    } rows[] = {{Unset, Info, Info},     {Trace, Info, Trace},
                {Fatal, Info, Fatal},    {Unset, Unset, Unset},
                {Debug, Never, Never},   {Never, Debug, Never},
                {Unset, Always, Always}, {LogLevel{30}, Warn, LogLevel{30}}};
    for (const auto& row : rows) {
        SCOPED_TRACE(testing::Message() << row.local << " below " << row.inherited);
        LoggerCommonBase logger("domain", nullptr);
        logger.setLogLevel(row.local);
        logger.setInheritedLogLevel(row.inherited);
        EXPECT_EQ(logger.getLogLevel(), row.effective);
        for (int level = 0; level <= 255; ++level)
            EXPECT_EQ(logger.enabled(static_cast<LogLevel>(level)),
                      level >= static_cast<int>(row.effective))
                << level;
    }
}

// Each setter finds what it set, whatever the other one does meanwhile.
TEST(LoggerCommonBase, KeepsWhatTwoThreadsSetAtOnce) {
    LoggerCommonBase logger("domain", nullptr);
    std::latch start(2);
    const auto set = [&logger, &start](auto setter, auto getter, LogLevel last) {
        start.arrive_and_wait();
        for (int i = 0; i < 300'000; ++i) {
            const LogLevel level = i % 2 ? Debug : Error;
            (logger.*setter)(level);
            ASSERT_EQ((logger.*getter)(), level);
            ASSERT_TRUE(logger.enabled(Fatal));
        }
        (logger.*setter)(last);
    };
    {
        const std::jthread local(set, &LoggerCommonBase::setLogLevel,
                                 &LoggerCommonBase::getLocalLogLevel, Unset);
        const std::jthread inherited(set, &LoggerCommonBase::setInheritedLogLevel,
                                     &LoggerCommonBase::getInheritedLogLevel, Notice);
    }
    EXPECT_EQ(logger.getLogLevel(), Notice);
}

// Counts of a handle of the test's own: what they are, above the start, while the
// objects live, and afterwards.
TEST(LoggerHandles, AreCountedOddly) {
    const trel_t handle = trel_create("test", "counts");
    long start = 0;
    long alive = 0;
    const auto count = [&] { return trel_get_reference_count(handle) - start; };
    const auto look = [&](const auto&...) { alive = count(); };
    const auto context = [] { return TrelContext("test", "counts"); };
    const struct {
        const char* name;
        std::function<void()> run;
        long alive, gone;
    } rows[] = {
        {"copied and moved contexts",
         [&] {
             TrelContext one = context();
             TrelContext two = one;
             TrelContext three = std::move(one);
             three = two;
             two = std::move(three);
             look(two);
         },
         1, 0},
        {"base moved and assigned",
         [&] {
             LoggerCommonBase one("domain", handle);
             LoggerCommonBase two(std::move(one));
             LoggerCommonBase three("other", nullptr);
             three = two;
             two = std::move(three);
             look(two);
         },
         1, 0},
        // The copy releases what it should have retained, and once more at its end.
        {"base copied",
         [&] {
             const LoggerCommonBase one("domain", handle);
             const LoggerCommonBase two(one);
             look(two);
         },
         0, -2},
        // Never retained, and yet released in the end.
        {"logger of a context", [&] { look(ServerLogger(context(), nullptr)); }, 0, -1},
        {"logger copied",
         [&] {
             const ServerLogger one(context(), nullptr);
             look(StaticLogger(one));
         },
         -1, -3},
    };
    for (const auto& row : rows) {
        start = trel_get_reference_count(handle);
        row.run();
        EXPECT_EQ(alive, row.alive) << row.name << ", alive";
        EXPECT_EQ(count(), row.gone) << row.name << ", gone";
    }
}

using Loggers = LogFixture;

TEST_F(Loggers, LogTheBuffersContentsWhateverTheLevel) {
    const ManualCalendar calendar(std::chrono::nanoseconds(1'234'567'890));
    StaticLogger logger("radio.modem", server_);
    const auto message =
        logger.buildMessage(Notice, LogMessageBuffer() << "cell " << 7 << MetaData("band=3"));
    EXPECT_EQ(message->getTimeStamp(), 1'234'567'890);
    EXPECT_THAT(message->getMetaData(), ElementsAre("band=3"));
    logger.setLogLevel(Never);
    logger.forceLog(Trace, LogMessageBuffer() << "cell " << 7);
    logger.setLogServer(nullptr);
    logger.forceLog(Fatal, LogMessageBuffer() << "to nobody");
    EXPECT_THAT(takeLines(), ElementsAre("T radio.modem cell 7"));
}

TEST_F(Loggers, WithoutAQueueLearnTheirLevelWhenMadeAndWhenTold) {
    configure("radio", Debug);
    StaticLogger logger(TrelContext("test", "radio.modem"), server_);
    EXPECT_EQ(logger.getLogLevel(), Debug);
    configure("radio", Warn);
    logger.setLogDomain("other");
    EXPECT_EQ(logger.getLogLevel(), Debug);
    logger.updateLogLevel();
    EXPECT_EQ(logger.getLogLevel(), Info);

    EXPECT_EQ(StaticLogger(ServerLogger("radio", server_)).getLogLevel(), Warn);
    StaticLogger nobodys;
    nobodys.updateLogLevel();
    EXPECT_EQ(nobodys.getLogLevel(), Unset);
}

TEST_F(Loggers, StageLinesForOneMessageAtTheHighestLevel) {
    const struct {
        const char* name;
        std::vector<std::pair<LogLevel, const char*>> lines;
        std::vector<std::string> logged;
    } rows[] = {
        {"an empty one", {{Error, ""}}, {}},
        {"the highest first", {{Fatal, "x"}, {Trace, "y"}}, {"F radio x\ny"}},
        {"empty ones between",
         {{Info, ""}, {Info, "x"}, {Warn, ""}, {Info, "y"}},
         {"W radio x\ny"}},
    };
    for (const auto& row : rows) {
        {
            const StagedLogger logger("radio", server_);
            for (const auto& [level, text] : row.lines)
                logger.forceLog(level, LogMessageBuffer() << text);
            EXPECT_THAT(takeLines(), IsEmpty()) << row.name;
        }
        EXPECT_EQ(takeLines(), row.logged) << row.name;
    }
}

TEST_F(Loggers, WithAQueueAreTrackedThere) {
    configure("radio", Debug);
    const dispatch::queue queue = dispatch::queue::create("loggers");
    queue.suspend();
    auto logger = Logger::create(queue, server_, "first", TrelContext("test", "radio.modem"));
    server_->debugFlush();
    EXPECT_EQ(logger->getInheritedLogLevel(), Unset) << "its queue has not run";
    queue.resume();
    drain(queue);
    EXPECT_EQ(logger->getInheritedLogLevel(), Debug);

    configure("radio", Warn);
    drain(queue);
    EXPECT_FALSE(logger->enabled(Notice));
    logger->setLogLevel(Trace);
    EXPECT_EQ(logger->getTrackedLoggerName(), "first");
    EXPECT_EQ(logger->getTrackedLogLevel(), Trace);

    const std::weak_ptr<plr::Logger> end = logger;
    logger.reset();
    configure("radio", Error);  // nobody is there to be told
    EXPECT_TRUE(end.expired());
    EXPECT_EQ(Logger::create(queue, nullptr, "lone", TrelContext("test", "x"))->getLogLevel(),
              Unset);
}

}  // namespace

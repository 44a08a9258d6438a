#include "plr/log/fmt.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "plr/log/logger.h"
#include "plr/log/staged_logger.h"
#include "support/log_fixture.h"

namespace {

using plr::LogLevel;
using plr::LogMessageBuffer;
using plr::StaticLogger;
using testing::ElementsAre;
using testing::IsEmpty;

#ifdef WRONG_FORMAT  // is not to compile
void wrong(const StaticLogger& logger) {
    plr::logInfo(logger, "{:d}", "no number");
}
#endif

using FmtFront = plr::test::LogFixture;

TEST_F(FmtFront, LogsFormattedTextThroughEveryKindOfLogger) {
    const StaticLogger logger("static", server_);
    plr::logInfo(logger, "{1:04x} {0}", "text", 0xbeef);
    plr::log(logger, LogLevel::Warn, "{{{}}}", std::string(1000, 'x'));
    plr::logError(logger, "nothing to fill in");
    plr::logFatal(*plr::Logger::create(dispatch::queue::create("q"), server_, "name",
                                       plr::TrelContext("test", "tracked")),
                  "{}", true);
    {
        const plr::StagedLogger staged("staged", server_);
        plr::logInfo(staged, "{}", 1);
        plr::logWarn(staged, "{}", 2);
    }
    EXPECT_THAT(takeLines(),
                ElementsAre("I static beef text", "W static {" + std::string(1000, 'x') + "}",
                            "E static nothing to fill in", "F tracked true", "W staged 1\n2"));
}

TEST_F(FmtFront, ComposesOnlyWhatIsEnabled) {
    const StaticLogger logger("d", server_);
    int composed = 0;
    const auto compose = [&composed](LogMessageBuffer& text) {
        plr::append(text, "run {}, ", ++composed);
        text << "and more";
    };
    plr::logDebug(logger, compose);
    plr::log(logger, LogLevel::Trace, compose);
    plr::logTrace(logger, "{:{}}", 1, -1);  // would throw
    EXPECT_THAT(takeLines(), IsEmpty());
    plr::logInfo(logger, compose);
    EXPECT_THROW(plr::logInfo(logger, "{:{}}", 1, -1), fmt::format_error);
    EXPECT_THAT(takeLines(), ElementsAre("I d run 1, and more"));
}

}  // namespace

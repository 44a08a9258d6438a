#include "plr/log/fmt.h"

#include <gmock/gmock.h>

#include "plr/log/logger.h"
#include "plr/log/staged_logger.h"
#include "support/log_fixture.h"

namespace {

using namespace plr;
using testing::ElementsAre;
using testing::IsEmpty;

#ifdef WRONG_FORMAT  // is not to compile
void wrong(const StaticLogger& logger) {
    logInfo(logger, "{:d}", "no number");
}
#endif

using FmtFront = test::LogFixture;

TEST_F(FmtFront, LogsFormattedTextThroughEveryKindOfLogger) {
    const StaticLogger logger("static", server_);
    logInfo(logger, "{1:04x} {0}", "text", 0xbeef);
    log(logger, LogLevel::Warn, "{{{}}}", std::string(1000, 'x'));
    logError(logger, "nothing to fill in");
    logFatal(*Logger::create(dispatch::queue::create("q"), server_, "name",
                             TrelContext("test", "tracked")),
             "{}", true);
    {
        const StagedLogger staged("staged", server_);
        logInfo(staged, "{}", 1);
        logWarn(staged, "{}", 2);
    }
    EXPECT_THAT(takeLines(),
                ElementsAre("I static beef text", "W static {" + std::string(1000, 'x') + "}",
                            "E static nothing to fill in", "F tracked true", "W staged 1\n2"));
}

TEST_F(FmtFront, ComposesOnlyWhatIsEnabled) {
    const StaticLogger logger("d", server_);
    int composed = 0;
    const auto compose = [&composed](LogMessageBuffer& text) {
        append(text, "run {}, ", ++composed);
        text << "and more";
    };
    logDebug(logger, compose);
    log(logger, LogLevel::Trace, compose);
    logTrace(logger, "{:{}}", 1, -1);  // would throw
    EXPECT_THAT(takeLines(), IsEmpty());
    logInfo(logger, compose);
    EXPECT_THROW(logInfo(logger, "{:{}}", 1, -1), fmt::format_error);
    EXPECT_THAT(takeLines(), ElementsAre("I d run 1, and more"));
}

}  // namespace

#include "plr/log.h"

#include <gmock/gmock.h>

#include "plr/ipc/read.h"
#include "support/fake_tracked_logger.h"
#include "support/function_log_writer.h"
#include "support/log_fixture.h"
#include "support/log_records.h"
#include "support/waiting.h"

namespace {

using namespace plr;
using namespace plr::test;
using namespace std::chrono_literals;
using testing::ElementsAre;
using testing::ElementsAreArray;
using testing::IsEmpty;

void log(const StaticLogger& logger, const std::string& text, LogLevel level = LogLevel::Info) {
    logger.forceLog(level, LogMessageBuffer() << text);
}

std::shared_ptr<LogMessage> messageOf(const std::string& text) {
    return std::make_shared<LogMessage>(logMessage(text));
}

std::vector<std::string> textsOf(MemoryBufferedLogWriter& writer) {
    std::vector<std::string> texts;
    for (const auto& message : writer.drain())
        texts.push_back(message->getText());
    return texts;
}

TEST(MemoryBufferedLogWriter, DropsTheOldestBeyondItsLimits) {
    const struct {
        const char* name;
        long maxMessages, maxBytes;
        long left;  // of 4 messages of 8 bytes
    } rows[] = {{"no limits", -1, MemoryBufferedLogWriter::UNLIMITED, 4},
                {"messages", 3, 0, 3},
                {"bytes, exceeded by one message", 0, 10, 2},
                {"bytes, exactly", 0, 16, 2},
                {"less than a message", 0, 1, 1}};
    const std::vector<std::string> texts = {"0.......", "1.......", "2.......", "3......."};
    for (const auto& row : rows) {
        SCOPED_TRACE(row.name);
        const auto writer = MemoryBufferedLogWriter::create(row.maxMessages, row.maxBytes);
        for (const std::string& text : texts)
            writer->write(messageOf(text));
        EXPECT_THAT(textsOf(*writer), ElementsAreArray(texts.end() - row.left, texts.end()));
        EXPECT_EQ(writer->getDroppedMessageCount(), 4 - row.left);
    }
}

TEST(MemoryBufferedLogWriter, StillCountsTheBytesThatWereDrained) {
    const auto writer = MemoryBufferedLogWriter::create(0, 8);
    writer->write(messageOf("12345678"));
    EXPECT_EQ(textsOf(*writer).size(), 1U);
    writer->write(messageOf("12345678"));
    EXPECT_EQ(textsOf(*writer).size(), 1U) << "nothing is left to drop for the new one";
    EXPECT_EQ(writer->getDroppedMessageCount(), 0);
}

TEST(LogServer, DeliversWhatTheStartupBufferHeldBehindANoteOfWhatItDropped) {
    const auto server = LogServer::create("early", MemoryBufferedLogWriter::create(2, -1));
    const auto writer = std::make_shared<MemoryBufferedLogWriter>(-1, -1);
    server->addWriter(writer);
    const StaticLogger logger(std::string("domain"), server);
    EXPECT_EQ(logger.getLogLevel(), LogLevel::Unset) << "no levels before the start";
    for (const char* text : {"1", "2", "3", "4", "5"})
        log(logger, text);
    server->debugFlush();
    EXPECT_THAT(textsOf(*writer), IsEmpty());
    server->start();
    const auto messages = writer->drain();
    ASSERT_EQ(messages.size(), 3U);
    EXPECT_EQ(messages[0]->getText(), "Note: 3 log messages dropped prior to log start");
    EXPECT_EQ(messages[0]->getDomain(), "early");
    EXPECT_EQ(messages[0]->getLevel(), LogLevel::Info);
    EXPECT_EQ(messages[1]->getText() + messages[2]->getText(), "45");
    log(logger, "6");
    server->debugFlush();
    EXPECT_THAT(textsOf(*writer), ElementsAre("6"));
}

class ConfiguredServer : public LogFixture {};

TEST_F(ConfiguredServer, FindsTheLevelOfTheNearestConfiguredDomain) {
    const std::pair<const char*, LogLevel> configured[] = {{"a", LogLevel::Debug},
                                                           {"a-b", LogLevel::Fatal},
                                                           {"a.b.c.d", LogLevel::Error},
                                                           {".dotted", LogLevel::Trace},
                                                           {"quiet", LogLevel::Never}};
    for (const auto& [domain, level] : configured)
        configure(domain, level);
    const std::pair<const char*, LogLevel> rows[] = {
        {"a.b.c", LogLevel::Debug},    {"a.b.c.d.e", LogLevel::Error}, {"a.b", LogLevel::Debug},
        {"a-b.c", LogLevel::Fatal},    {"ab", LogLevel::Info},         {"", LogLevel::Info},
        {"dotted.x", LogLevel::Trace}, {"quiet.x", LogLevel::Never},   {"z", LogLevel::Info}};
    for (const auto& [domain, level] : rows) {
        EXPECT_EQ(server_->getCurrentLogLevel(domain), level) << domain;
        EXPECT_EQ(server_->getCurrentLogLevelSlow(domain), level) << domain;
    }
    configure("a", LogLevel::Unset);
    EXPECT_EQ(server_->getCurrentLogLevel("a.b"), LogLevel::Info);
    server_->updateConfig(vox::dict());
    server_->updateConfig(vox::dict::create());
    server_->debugFlush();
    EXPECT_EQ(server_->getCurrentLogLevel("a-b"), LogLevel::Fatal);
}

TEST_F(ConfiguredServer, ReportsLoggersAndTheWritersThatHaveSomethingToTell) {
    const auto logger = std::make_shared<plr::test::FakeTrackedLogger>("sms", LogLevel::Trace);
    server_->registerLogger("radio.sms", logger);
    server_->addWriter(std::make_shared<FunctionLogWriter>([](const LogMessage&) {}));
    const vox::dict config = server_->getSimpleConfig();
    EXPECT_EQ(vox::get_subpath(config, "kLoggers.0.kLoggerName"), vox::string("sms"));
    EXPECT_EQ(vox::get_subpath(config, "kLogWriters.0.path"), vox::string("/log"));
    EXPECT_FALSE(vox::get_subpath(config, "kLogWriters.1"));
}

// A server whose writers are functions.
class Server : public testing::Test {
  protected:
    std::shared_ptr<FunctionLogWriter> add(FunctionLogWriter::Function function) {
        auto writer = std::make_shared<FunctionLogWriter>(std::move(function));
        server_->addWriter(writer);
        return writer;
    }

    std::shared_ptr<LogServer> server_ = LogServer::create("s");
    const StaticLogger logger_{std::string("d"), server_};
    Event started_, go_;
    std::vector<std::string> seen_;
};

TEST_F(Server, WritesToWhoeverIsThereWhenAMessageIsLogged) {
    const auto first = std::make_shared<MemoryBufferedLogWriter>(-1, -1);
    server_->addWriter(first);
    log(logger_, "1");
    const auto second = add([&](const LogMessage& message) { seen_.push_back(message.getText()); });
    log(logger_, "2");
    server_->close();
    ASSERT_EQ(server_->flush().wait(dispatch::time::after(kBound)), 0);
    EXPECT_TRUE(second->closed);
    EXPECT_THAT(seen_, ElementsAre("2"));
    EXPECT_THAT(textsOf(*first), ElementsAre("1", "2"));
}

// Nobody flushes here: delivery starts by itself, at once and again.
TEST_F(Server, DeliversEveryMessageByItself) {
    Event written;
    add([&](const LogMessage&) { written.signal(); });
    for (int burst = 0; burst < 200; ++burst) {
        for (int i = 0; i < burst % 3 + 1; ++i)
            log(logger_, "x", burst % 7 == 0 ? LogLevel::Error : LogLevel::Info);
        for (int i = 0; i < burst % 3 + 1; ++i)
            ASSERT_TRUE(written.wait());
    }
}

TEST(LogServer, LivesUntilWhatWasLoggedIsWritten) {
    Event go;
    Event written;
    auto server = LogServer::create("s");
    const std::weak_ptr<LogServer> late = server;
    server->addWriter(std::make_shared<FunctionLogWriter>([&](const LogMessage&) {
        EXPECT_TRUE(go.wait());
        EXPECT_FALSE(late.expired());
        written.signal();
    }));
    server->log(messageOf("x"));
    server = nullptr;
    go.signal();
    EXPECT_TRUE(written.wait());
}

TEST_F(Server, IsWaitedForByAFlusherButNotForEver) {
    { const ScopedLogFlusher nothing(nullptr); }
    std::atomic<int> written{0};
    add([&](const LogMessage&) {
        EXPECT_TRUE(go_.wait());
        ++written;
    });
    log(logger_, "held up");
    { const ScopedLogFlusher flusher(server_, 1ms); }
    EXPECT_EQ(written, 0);
    go_.signal();
    { const ScopedLogFlusher flusher(server_); }
    EXPECT_EQ(written, 1);
}

TEST_F(Server, DropsBeyondItsLimitAndSaysHowMuchAtTheGap) {
    add([&](const LogMessage& message) {
        if (message.getText() == "first") {
            started_.signal();
            EXPECT_TRUE(go_.wait());
        }
        seen_.push_back(message.getText());
    });
    server_->limitPending(2, LogServer::WhenFull::Drop);
    log(logger_, "first");
    ASSERT_TRUE(started_.wait());
    for (int i = 0; i < 7; ++i)
        log(logger_, std::to_string(i));
    go_.signal();
    server_->debugFlush();
    log(logger_, "last");
    server_->debugFlush();
    EXPECT_THAT(seen_, ElementsAre("first", "0", "1",
                                   "Note: 5 log messages dropped, too many were waiting", "last"));
}

// Writers that log are not held up by their own queue.
TEST_F(Server, HasCallersWaitAtItsLimit) {
    server_->limitPending(3, LogServer::WhenFull::Wait);
    int written = 0;
    add([&](const LogMessage& message) {
        ++written;
        if (message.getText() == "0")
            for (int i = 0; i < 10; ++i)
                log(logger_, "from the writer");
    });
    for (int i = 0; i < 1000; ++i)
        log(logger_, std::to_string(i));
    server_->debugFlush();
    server_->debugFlush();
    EXPECT_EQ(written, 1010);
}

struct Seen {
    std::uint64_t orderHash = 0;
    std::vector<int> nextOfThread;
    long count = 0;
    bool inOrder = true;

    void add(const LogMessage& message) {
        const int thread = std::stoi(message.getDomain());
        const int number = std::stoi(message.getText());
        inOrder = inOrder && nextOfThread[static_cast<std::size_t>(thread)]++ == number;
        orderHash = orderHash * 1099511628211U + static_cast<std::uint64_t>(thread);
        ++count;
    }
};

TEST_F(ConfiguredServer, GivesAllWritersOneOrderWhateverHappens) {
    constexpr int kThreads = 16;
    constexpr int kMessages = 100'000;
    Seen seen[2];
    for (Seen& by : seen) {
        by.nextOfThread.resize(kThreads);
        server_->addWriter(std::make_shared<FunctionLogWriter>(
            [&by](const LogMessage& message) { by.add(message); }));
    }
    std::atomic<int> running{kThreads};
    std::vector<std::jthread> threads;
    for (int thread = 0; thread < kThreads; ++thread)
        threads.emplace_back([&, thread] {
            StaticLogger logger(std::to_string(thread), server_);
            for (int i = 0; i < kMessages; ++i) {
                logger.forceLog(LogLevel::Error, LogMessageBuffer() << i);
                if (i % 64 == 0)
                    logger.updateLogLevel();
            }
            --running;
        });
    for (int i = 0; running != 0; ++i)
        configure(std::to_string(i % kThreads).c_str(),
                  i % 3 == 0 ? LogLevel::Trace : LogLevel::Warn);
    threads.clear();
    server_->debugFlush();
    for (const Seen& by : seen) {
        EXPECT_EQ(by.count, long{kThreads} * kMessages);
        EXPECT_TRUE(by.inOrder);
    }
    EXPECT_EQ(seen[0].orderHash, seen[1].orderHash);
}

}  // namespace

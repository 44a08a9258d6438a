// The serving side of remote logging, against clients that say what they like.
#include <gmock/gmock.h>

#include <regex>

#include "plr/concurrency/clock.h"
#include "plr/log/log_message_buffer.h"
#include "plr/log/vox_log_server.h"
#include "plr/log/vox_logger.h"
#include "support/function_log_writer.h"
#include "support/log_fixture.h"
#include "support/vox_test.h"

namespace {

using namespace plr;
using namespace plr::test;
using enum LogLevel;
using testing::ElementsAre;
using testing::IsEmpty;
using Lines = std::vector<std::string>;

constexpr const char* kOwn = "remote";  // the server's own domain

// Refuses loggers named "denied", and moves those named "moved".
class PickyServer : public VoxLogServer {
  public:
    static std::shared_ptr<PickyServer> create(const std::shared_ptr<plr::LogServer>& server) {
        auto made = make_shared_ptr(new PickyServer(server));
        made->connectToLogServer_sync();
        return made;
    }
    const dispatch::queue& queue = ownQueue_.queue();

  protected:
    bool handleNewLogger_sync(const std::string& name, std::string& domain) override {
        if (name == "moved")
            domain = "guests." + domain;
        return name != "denied";
    }

  private:
    explicit PickyServer(const std::shared_ptr<plr::LogServer>& server)
        : VoxLogServer(server, "remote log", kOwn) {}
};

Ref checkIn(const std::string& name, const std::string& domain) {
    return dictionary({{"kLoggerName", text(name)}, {"kLoggerDomain", text(domain)}});
}

// A connection to the server without a VoxLogger around it.
class RawClient : public End {
  public:
    explicit RawClient(const VoxLogServer& server)
        : End(vox_connection_create_from_endpoint(server.getEndpoint().get())) {
        resume();
    }
    // Everything sent before has been written.
    void settle() {
        Inbox replies;
        request(dictionary({{"kLoggerConfirm", number(0)}}), replies);
        EXPECT_TRUE(replies.wait(1));
        EXPECT_EQ(vox_get_type(replies[0]), VOX_TYPE_DICTIONARY);
    }
    std::vector<std::int64_t> levels() const {
        std::vector<std::int64_t> levels;
        for (const Ref& event : inbox.all())
            levels.push_back(vox_int64_get_value(vox_dictionary_get_value(event, "kLoggerLevel")));
        return levels;
    }
};

class RemoteLog : public LogFixture {
  protected:
    RemoteLog() {
        remote_->startListeningOn(listener_);
        configure(kOwn, Debug);
    }

    // Lines until one holds `text`; addresses are "0x?".
    Lines linesUntil(const std::string& text) {
        Lines all;
        EXPECT_TRUE(eventually([&] {
            for (const std::string& line : takeLines())
                all.push_back(std::regex_replace(line, std::regex("0x[0-9a-f]+"), "0x?"));
            return !all.empty() && all.back().find(text) != std::string::npos;
        })) << testing::PrintToString(all);
        return all;
    }

    const vox::connection listener_ = vox::listener::create_anonymous();
    std::shared_ptr<PickyServer> remote_ = PickyServer::create(server_);
};

TEST_F(RemoteLog, TheFirstMessageDecides) {
    const std::string longest(256, 'x');
    const std::string failed = "E remote Got request for new logger, but check in failed";
    const std::string unknown =
        "E remote Got client error for conn 0x?, but no client found: "
        "the connection was cancelled";
    struct Row {
        const char* name;
        Ref first;
        std::string line;
    };
    const Row refused[] = {
        {"no domain", checkIn("a", ""), failed},
        {"no name", checkIn("", "a"), failed},
        {"names that are no strings", dictionary({{"kLoggerName", number(1)}}), failed},
        {"a log message", dictionary({{"kLogMessage", text("x")}}), failed},
        {"a long domain", checkIn("a", longest + "x"), failed},
        {"a long name", checkIn(longest + "x", "a"), failed},
        {"denied", checkIn("denied", "calls"),
         "I remote Request DENIED for new logger 'denied' in domain 'calls'"}};
    for (const Row& row : refused) {
        RawClient client(*remote_);
        client.send(row.first);
        client.send(checkIn("too", "late"));
        EXPECT_TRUE(client.inbox.waitForError()) << row.name;
        EXPECT_THAT(linesUntil("no client found"), ElementsAre(row.line, unknown)) << row.name;
    }
    {
        RawClient client(*remote_);
        client.send(checkIn("moved", longest));
        client.send(dictionary({{"kLogMessage", text("here")}}));
        client.settle();
    }
    EXPECT_THAT(
        linesUntil("Client disconnected"),
        ElementsAre(
            "I remote Got client checkin for client 'moved' in domain 'guests." + longest + "'",
            "? guests." + longest + " here", "D remote Client disconnected (0x?: moved)"));
}

TEST_F(RemoteLog, LogsWhatComesLeniently) {
    const struct {
        const char* name;
        const char* key;  // with `value`, in a message "said" at Debug
        Ref value;
        const char* logged;
        TimeStamp time = 0;  // 0: now
    } rows[] = {
        {"with a time", "kLogMessageTimestamp", number(7), "D calls said", 7},
        {"of time 0", "kLogMessageTimestamp", number(0), "D calls said"},
        {"metadata", "kLogMessageMetadata", array({text("a"), text("b")}), "D calls said {a} {b}"},
        {"odd metadata", "kLogMessageMetadata", text("a"), "D calls said"},
        {"odd items", "kLogMessageMetadata", array({number(1), text("b")}), "D calls said {} {b}"},
        {"a level of 9 bits", "kLogMessageLevel", number(256 + 80), "E calls said"},
        {"a level too", "kLoggerLevel", number(10), "D calls said"},
        {"no text", "kLogMessage", number(1), "D calls "},
    };
    RawClient client(*remote_);
    client.send(checkIn("c", "calls"));
    client.settle();
    takeMessages();
    for (const auto& row : rows) {
        SCOPED_TRACE(row.name);
        const auto before = static_cast<TimeStamp>(Clock::now_in_nanoseconds());
        const Ref sent =
            dictionary({{"kLogMessage", text("said")}, {"kLogMessageLevel", number(20)}});
        vox_dictionary_set_value(sent, row.key, row.value);
        client.send(sent);
        client.send(
            dictionary({{"kUnknown", text("ignored")}, {"kLogMessage", Ref(vox_null_create())}}));
        client.settle();
        const auto logged = takeMessages();
        ASSERT_EQ(logged.size(), 1U);
        std::string line = asChar(logged[0]->getLevel()) + (" " + logged[0]->getDomain()) + " " +
                           logged[0]->getText();
        for (const std::string& data : logged[0]->getMetaData())
            line += " {" + data + "}";
        EXPECT_EQ(line, row.logged);
        EXPECT_GE(logged[0]->getTimeStamp(), row.time != 0 ? row.time : before);
        EXPECT_TRUE(row.time == 0 || logged[0]->getTimeStamp() == row.time);
    }
}

TEST_F(RemoteLog, TellsAClientEachChangeOfItsLevelOnce) {
    configure("calls", Debug);
    RawClient client(*remote_);
    client.send(checkIn("c", "calls.voice"));
    client.settle();
    const std::pair<const char*, LogLevel> changes[] = {{"calls", Warn},  {"calls", Warn},
                                                        {"other", Trace}, {"calls.voice", Trace},
                                                        {"calls", Error}, {"calls.voice", Unset}};
    for (const auto& [domain, level] : changes)
        configure(domain, level);
    client.settle();
    // Deliberate: a new logger is told twice, at once and from the tree.
    EXPECT_THAT(client.levels(), ElementsAre(20, 20, 70, 10, 80));
}

TEST_F(RemoteLog, AVoxLoggerIsOneLikeOthers) {
    const auto queue = dispatch::queue::create("client");
    auto logger = VoxLogger::create(queue, "dialer", "calls.voice", remote_->getEndpoint());
    configure("calls", Debug);
    EXPECT_TRUE(eventually([&] { return logger->getInheritedLogLevel() == Debug; }));
    logger->setLogLevel(Trace);
    EXPECT_TRUE(logger->enabled(Trace));
    const auto before = static_cast<plr::TimeStamp>(Clock::now_in_nanoseconds());
    logger->forceLog(Notice, LogMessageBuffer() << "number " << 1 << MetaData("a=1"));
    EXPECT_EQ(logger->flush().wait(), 0);
    const auto logged = takeMessages().back();
    EXPECT_EQ(logged->getText() + " " + logged->getDomain(), "number 1 calls.voice");
    EXPECT_THAT(logged->getMetaData(), ElementsAre("a=1"));
    EXPECT_GE(logged->getTimeStamp(), before);
    EXPECT_EQ(logger->getHeldMessageCount(), 0U);

    // Its level is in the configuration; its domain goes with it.
    const vox::array loggers = server_->getSimpleConfig()["kLoggers"];
    ASSERT_EQ(loggers.count(), 1U);
    const Ref expected = dictionary({{"kLoggerName", text("dialer")},
                                     {"kLoggerLevel", number(10)},
                                     {"kLoggerDomain", text("calls.voice")}});
    EXPECT_EQ(loggers[0], vox::object::retain(expected));
    logger->forceLog(Info, LogMessageBuffer() << "the last");
    logger.reset();
    EXPECT_THAT(
        linesUntil("Client disconnected"),
        ElementsAre("I calls.voice the last", "D remote Client disconnected (0x?: dialer)"));
    EXPECT_TRUE(eventually([this] {
        return !vox::dict(server_->getConfig()["kDomainLogLevels"]).contains("calls.voice");
    }));
}

TEST_F(RemoteLog, SaysWhatBecomesOfItsListener) {
    const auto first = remote_->getEndpoint();
    listener_.cancel();
    EXPECT_THAT(linesUntil("Server error"),
                ElementsAre("I remote Server error: the connection was cancelled"));
    remote_->startListeningOn(vox::connection());
    EXPECT_FALSE(remote_->getEndpoint());
    remote_->startListeningOn(vox::listener::create_anonymous());
    RawClient client(*remote_);
    client.send(checkIn("c", "calls"));
    client.settle();
    remote_.reset();
    EXPECT_TRUE(client.inbox.waitForError());
}

// Messages wait in the server only as far as the writers are slow, and in the
// client otherwise; other clients are served meanwhile.
TEST_F(RemoteLog, AFloodingClientIsReadNoFasterThanItsMessagesAreWritten) {
    const auto open = std::make_shared<std::atomic<bool>>(false);
    server_->addWriter(
        std::make_shared<FunctionLogWriter>([open](const LogMessage&) { open->wait(false); }));
    RawClient flooder(*remote_);
    flooder.send(checkIn("c", "calls"));
    const Ref message = dictionary({{"kLogMessage", text(std::string(10'000, 'x'))}});
    for (int i = 0; i < 800; ++i)
        EXPECT_EQ(flooder.send(message), 0);
    for (int i = 0; i < 50; ++i) {
        RawClient other(*remote_);
        other.send(checkIn("other", "other"));
        EXPECT_TRUE(other.inbox.wait(1));  // its level
    }
    EXPECT_GT(flooder.counts().queued_bytes, 4'000'000U);
    *open = true;
    open->notify_all();
    flooder.settle();
    EXPECT_EQ(flooder.counts().queued_bytes, 0U);
}

}  // namespace

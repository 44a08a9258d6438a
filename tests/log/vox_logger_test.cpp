// The client side of remote logging, against servers that do what they like.
#include "plr/log/vox_logger.h"

#include <gmock/gmock.h>

#include "plr/log/log_message_buffer.h"
#include "support/vox_test.h"

namespace {

using namespace plr;
using namespace plr::test;
using enum LogLevel;
using testing::ElementsAre;
using Lines = std::vector<std::string>;

// The other end of a VoxLogger's connection.
class FakeServer {
  public:
    enum class Answers { Everything, CheckIns, LevelsOnly, Nothing };

    explicit FakeServer(Answers answers, const vox_limits_t* limits = nullptr)
        : FakeServer(vox::connection::create_pair(limits), answers) {}

    // For the logger.
    const vox::connection& connection() const { return theirs_; }
    End& end() { return end_; }
    // What came, in short, once there are so many.
    Lines waitFor(std::size_t count) {
        EXPECT_TRUE(end_.inbox.wait(count)) << testing::PrintToString(lines());
        return lines();
    }

  private:
    FakeServer(std::pair<vox::connection, vox::connection> pair, Answers answers)
        : theirs_(pair.second), end_(vox_retain(pair.first.get())) {
        end_.resume([this, answers](vox_object_t event) {
            if (vox_get_type(event) == VOX_TYPE_DICTIONARY)
                react(answers, event);
            return false;
        });
    }
    void react(Answers answers, vox_object_t event) {
        const bool isCheckIn = vox_dictionary_get_value(event, "kLoggerName") != nullptr;
        if (answers == Answers::Everything || (answers == Answers::CheckIns && isCheckIn))
            end_.send(Ref(vox_dictionary_create_reply(event)));
        if (answers == Answers::LevelsOnly && isCheckIn)
            end_.send(dictionary({{"kLoggerLevel", number(20)}}));
    }
    Lines lines() const {
        Lines lines;
        for (const Ref& event : end_.inbox.all())
            lines.push_back(inShort(vox::object::retain(event)));
        return lines;
    }
    static std::string inShort(const vox::dict& message) {
        const auto number = [&message](const char* key) {
            return std::to_string(vox_int64_get_value(vox::object(message[key]).get()));
        };
        if (message.contains("kLogMessage"))
            return number("kLogMessageLevel") + " " + std::string(message.text("kLogMessage"));
        if (message.contains("kLoggerName"))
            return "check-in " + std::string(message.text("kLoggerName")) + " " +
                   std::string(message.text("kLoggerDomain"));
        if (message.contains("kLoggerLevel"))
            return "level " + number("kLoggerLevel");
        return message.contains("kLoggerConfirm") ? "confirm?" : "end";
    }

    const vox::connection theirs_;
    End end_;
};
using Answers = FakeServer::Answers;

class VoxLoggerTest : public testing::Test {
  protected:
    ~VoxLoggerTest() override {
        logger_.reset();
        drain(queue_);
    }
    void log(const std::string& text) { logger_->forceLog(Info, LogMessageBuffer() << text); }
    // What is logged until the queue is resumed leaves as one burst.
    void hold() {
        drain(queue_);  // what runs there may still send
        queue_.suspend();
    }
    void log(int first, int last) {
        hold();
        for (int i = first; i <= last; ++i)
            log(std::to_string(i));
        queue_.resume();
    }

    const dispatch::queue queue_ = dispatch::queue::create("client");
    std::shared_ptr<VoxLogger> logger_ =
        VoxLogger::create(queue_, "name", "domain", vox::connection());
    Event gone_;
};

TEST_F(VoxLoggerTest, SendsWhatItHoldsAndItsLevelOnEachConnection) {
    log(1, 2);
    logger_->setLogLevel(Debug);
    FakeServer first(Answers::CheckIns);
    logger_->reconnect(first.connection());
    EXPECT_THAT(first.waitFor(5),
                ElementsAre("check-in name domain", "level 20", "40 1", "40 2", "confirm?"));
    log("3");
    EXPECT_EQ(first.waitFor(6).back(), "40 3") << "one confirmation at a time";
    first.end().send(Ref(vox_dictionary_create_reply(first.end().inbox[4])));
    EXPECT_EQ(first.waitFor(7).back(), "confirm?");
    EXPECT_TRUE(eventually([this] { return logger_->getHeldMessageCount() == 1; }));

    FakeServer second(Answers::Everything);
    logger_->reconnect(second.connection());
    EXPECT_THAT(second.waitFor(4),
                ElementsAre("check-in name domain", "level 20", "40 3", "confirm?"));
    EXPECT_EQ(logger_->flush().wait(), 0);
    EXPECT_EQ(logger_->getHeldMessageCount(), 0U);
}

TEST_F(VoxLoggerTest, TellsAtTheGapWhatItDropped) {
    logger_->limitBuffer(3, 1 << 20);
    log(1, 5);
    EXPECT_EQ(logger_->getDroppedMessageCount(), 2U);
    FakeServer server(Answers::Everything);
    logger_->reconnect(server.connection());
    EXPECT_THAT(server.waitFor(7),
                ElementsAre("check-in name domain", "40 1", "40 2", "40 3", "confirm?",
                            "70 Note: 2 log messages dropped, too many were waiting", "confirm?"));
    EXPECT_EQ(logger_->flush().wait(), 0);
    // By bytes; one always fits.
    logger_->limitBuffer(10, 1000);
    queue_.suspend();
    for (const char letter : {'a', 'b', 'c'})
        log(std::string(letter == 'b' ? 10 : 2000, letter));
    queue_.resume();
    EXPECT_EQ(logger_->flush().wait(), 0);
    EXPECT_EQ(logger_->getDroppedMessageCount(), 4U);
    const Lines lines = server.waitFor(11);
    EXPECT_EQ(lines[7], "40 " + std::string(2000, 'a'));
    EXPECT_EQ(lines[9], "70 Note: 2 log messages dropped, too many were waiting");
}

TEST_F(VoxLoggerTest, KeepsNothingForAServerThatDoesNotConfirm) {
    logger_->limitBuffer(100, 1 << 20);
    FakeServer server(Answers::LevelsOnly);
    logger_->reconnect(server.connection());
    EXPECT_TRUE(eventually([this] { return logger_->getInheritedLogLevel() == Debug; }));
    for (int i = 0; i < 1000; i += 100) {
        log(i, i + 99);
        EXPECT_EQ(logger_->flush().wait(), 0);
    }
    EXPECT_EQ(server.waitFor(1001).back(), "40 999");
    EXPECT_EQ(logger_->getDroppedMessageCount(), 0U);
}

TEST_F(VoxLoggerTest, IsBoundedByAServerThatSaysNothing) {
    FakeServer server(Answers::Nothing);
    logger_->reconnect(server.connection());
    log(1, 10'000);
    EXPECT_EQ(logger_->getHeldMessageCount(), 8192U);
    EXPECT_EQ(logger_->getDroppedMessageCount(), 10'000U - 8192U);
}

TEST_F(VoxLoggerTest, TellsOnceThatAConnectionIsLost) {
    const auto lost = [this] {
        logger_->setInvalidationCallback(dispatch::block<void()>([this] { gone_.signal(); }));
    };
    lost();
    EXPECT_TRUE(gone_.wait()) << "there is none: at once";
    std::optional<FakeServer> server(std::in_place, Answers::Everything);
    logger_->reconnect(server->connection());
    server->end().send(dictionary({{"kLoggerLevel", number(30)}}));
    EXPECT_TRUE(eventually([this] { return logger_->getLogLevel() == LogLevel{30}; }));
    server.reset();
    EXPECT_TRUE(gone_.wait());
    lost();
    EXPECT_TRUE(gone_.wait()) << "again at once";
    logger_->reconnect(vox::endpoint());
    EXPECT_TRUE(gone_.wait()) << "one that cannot be made";
    EXPECT_EQ(logger_->getLogLevel(), LogLevel{30}) << "the last level stays";
    logger_->setInvalidationCallback(nullptr);
    log("kept");
    EXPECT_EQ(logger_->flush().wait(), 0) << "nothing to wait for";
}

TEST_F(VoxLoggerTest, WhatCannotBeSentIsMendedOrTold) {
    vox_limits_t limits = vox_limits_default();
    limits.max_message_bytes = 1000;
    FakeServer server(Answers::Everything, &limits);
    logger_->reconnect(server.connection());
    log("before");
    EXPECT_EQ(logger_->flush().wait(), 0);
    hold();
    log("caf\xe9\nau lait");
    log(std::string(2000, 'x'));
    log("after");
    queue_.resume();
    EXPECT_THAT(server.waitFor(7),
                ElementsAre("check-in name domain", "40 before", "confirm?", "40 caf\\xe9\nau lait",
                            "70 Note: 1 log messages dropped, the server does not take them",
                            "40 after", "confirm?"));
    EXPECT_EQ(logger_->getDroppedMessageCount(), 1U);
}

}  // namespace

#include "plr/log/shared_loggable.h"

#include <gmock/gmock.h>

#include <stdexcept>

#include "plr/log/log_message_buffer.h"
#include "support/log_fixture.h"
#include "support/waiting.h"

namespace {

using namespace plr;
using namespace plr::test;
using enum LogLevel;
using testing::ElementsAre;

enum class Fails { Nowhere, InItsConstructor, WhenRegistered };

class Radio : public SharedLoggable<Radio> {
  public:
    static std::shared_ptr<Radio> create(const std::shared_ptr<LogServer>& server,
                                         Fails fails = Fails::Nowhere, Event* queueEnd = nullptr) {
        std::shared_ptr<Radio> radio = make_shared_ptr(new Radio(server, fails, queueEnd));
        radio->execute_wrapped([self = radio.get()] { self->report(LogLevel::Debug, "init"); });
        return radio;
    }
    ~Radio() override { EXPECT_TRUE(ownQueue_.queue().is_current()); }

    using Loggable::setLogLevel;
    void report(LogLevel level, const char* text) const {
        if (enabled(level))
            forceLog(level, LogMessageBuffer() << text);
    }
    using SharedLoggable::updateTrackedConfig;
    void updateTrackedConfig(LogLevel level) override {
        if (fails_ == Fails::WhenRegistered)
            throw std::runtime_error("refused");
        SharedLoggable::updateTrackedConfig(level);
    }

  private:
    Radio(const std::shared_ptr<LogServer>& server, Fails fails, Event* queueEnd)
        : SharedLoggable("Radio", "radio", server), fails_(fails) {
        static const char key = 0;
        if (queueEnd)
            ownQueue_.queue().set_specific(&key, queueEnd,
                                           [](void* end) { static_cast<Event*>(end)->signal(); });
        if (fails == Fails::InItsConstructor)
            throw std::runtime_error("refused");
    }

    const Fails fails_;
};

using SharedLoggable = LogFixture;

TEST_F(SharedLoggable, LogsAtItsConfiguredLevelFromItsFirstWorkOn) {
    configure("radio", Debug);
    const auto radio = Radio::create(server_);
    EXPECT_TRUE(radio->logger().enabled(Debug));
    radio->execute_wrapped_sync([] {});
    EXPECT_THAT(takeLines(), ElementsAre("D radio init"));
    EXPECT_EQ(radio->getTrackedLoggerName(), "radio");
}

TEST_F(SharedLoggable, FollowsTheServerWithoutATurnOnItsQueue) {
    const auto radio = Radio::create(server_);
    radio->execute_wrapped_sync([&] {
        configure("radio", Warn);
        radio->report(Notice, "too little");
        radio->report(Warn, "enough");
    });
    radio->setLogLevel(Notice);
    EXPECT_EQ(radio->getTrackedLogLevel(), Notice);
    radio->report(Notice, "now enough");
    Radio::create(nullptr)->report(Fatal, "to nobody");
    EXPECT_THAT(takeLines(), ElementsAre("W radio enough", "N radio now enough"));
}

TEST_F(SharedLoggable, ThatFailsLeavesNoQueue) {
    configure("radio", Debug);
    for (const Fails fails : {Fails::InItsConstructor, Fails::WhenRegistered}) {
        Event queueEnd;
        EXPECT_THROW(static_cast<void>(Radio::create(server_, fails, &queueEnd)),
                     std::runtime_error);
        EXPECT_TRUE(queueEnd.wait());
    }
}

}  // namespace

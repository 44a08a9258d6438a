#include "examples/at_channel.h"

#include <gtest/gtest.h>

#include <optional>

#include "support/waiting.h"

namespace radio {
namespace {

using namespace std::chrono_literals;

// What a channel did, in order: > written, = answered, ! unsolicited, "silence".
class Conversation {
  public:
    Conversation() {
        channel_.emplace(
            queue_, plr::DispatchTimerService::create(nullptr),
            AtChannel::Output{
                .write =
                    [this](const std::string& bytes) {
                        log_ += "> " + bytes;
                        return !isGone;
                    },
                .onUnsolicited = [this](const ModemLine& line) { log_ += "! " + line.text + '\r'; },
                .onSilence =
                    [this] {
                        log_ += "silence";
                        silence.signal();
                    }});
    }
    ~Conversation() {
        queue_.sync([this] { channel_.reset(); });
    }

    void send(const char* command, std::chrono::milliseconds limit = plr::test::kBound,
              const char* text = "") {
        queue_.sync([&] { channel_->send(command, answer_, limit, text); });
    }
    void hear(const char* line) {
        queue_.sync([&] { channel_->handleLine({1, line, false}); });
    }
    // Since it was asked last.
    std::string log(bool ends = false) {
        return queue_.sync([&] {
            if (ends)
                channel_.reset();
            return std::exchange(log_, {});
        });
    }

    bool isGone = false;
    plr::test::Event silence;

  private:
    const dispatch::queue queue_ = dispatch::queue::create("at_channel_test");
    std::string log_;
    const AtChannel::Handler answer_ = [this](const AtAnswer& answer) {
        log_ += "= ";
        for (const ModemLine& line : answer.lines)
            log_ += line.text + " ";
        log_ += answer.result + '\r';
    };
    std::optional<AtChannel> channel_;
};

TEST(AtChannel, TellsAnswersFromWhatTheModemSaysOnItsOwn) {
    Conversation modem;
    modem.hear("RING");
    modem.hear("OK");  // late
    EXPECT_EQ(modem.log(), "! RING\r! OK\r");
    modem.send("AT+CREG?");
    modem.send("ATE0");
    modem.send("AT+CPIN=\"1234\"");
    EXPECT_EQ(modem.log(), "> AT+CREG?\r");
    for (const char* line : {"AT+CREG?", "+CSQ: 1,0", "+CREG: 2,1", "+CREGX: 1", "RING"})
        modem.hear(line);
    EXPECT_EQ(modem.log(), "! +CSQ: 1,0\r! +CREGX: 1\r! RING\r");
    modem.hear("OK");
    EXPECT_EQ(modem.log(), "> ATE0\r= +CREG: 2,1 OK\r");
    modem.hear("ERROR");
    EXPECT_EQ(modem.log(), "> AT+CPIN=\"1234\"\r= ERROR\r");
    modem.hear("+CME ERROR: 16");
    EXPECT_EQ(modem.log(), "= +CME ERROR: 16\r");
}

TEST(AtChannel, SaysTheTextOfACommandOnceItIsPrompted) {
    Conversation modem;
    modem.send("AT+CMGS=1", plr::test::kBound, "0011");
    for (const char* line : {"> ", "> ", "+CMGS: 7", "OK", "> "})
        modem.hear(line);
    EXPECT_EQ(modem.log(), "> AT+CMGS=1\r> 0011\x1A! > \r= +CMGS: 7 OK\r! > \r");
}

TEST(AtChannel, SaysThatTheModemIsSilentAndAnswersAllAtItsEnd) {
    Conversation modem;
    modem.send("AT+CSQ", 1ms);
    modem.send("AT+CREG?");
    ASSERT_TRUE(modem.silence.wait());
    EXPECT_EQ(modem.log(true), "> AT+CSQ\rsilence= \r= \r");

    Conversation gone;
    gone.isGone = true;
    gone.send("AT+CSQ");
    EXPECT_EQ(gone.log(true), "> AT+CSQ\rsilence= \r");
}

}  // namespace
}  // namespace radio

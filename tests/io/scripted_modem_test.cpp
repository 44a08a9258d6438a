#include "plr/test/scripted_modem.h"

#include <fcntl.h>
#include <gtest/gtest.h>
#include <unistd.h>

#include <array>
#include <stdexcept>
#include <string>

#include "io/open_transport.h"

namespace {

using namespace plr::test;

constexpr auto kScript = R"(# A small modem.
AT+CSQ
    +CSQ: 20,99
    OK
ATD*
    OK
    RING
AT+C*
    +CME ERROR: 4
AT+SILENT
ATL*
    OK
)";

// What a program with the terminal open sees.
class Client {
  public:
    explicit Client(const ScriptedModem& modem)
        : fd_(::open(modem.path().c_str(), O_RDWR | O_NOCTTY | O_NONBLOCK)) {
        EXPECT_TRUE(PelorinTransportCreateWithFD(&transport_, fd_));
    }
    Client(const Client&) = delete;
    Client& operator=(const Client&) = delete;
    ~Client() { ::close(fd_); }

    [[nodiscard]] bool write(const std::string& bytes) const {
        return ::write(fd_, bytes.data(), bytes.size()) == static_cast<ssize_t>(bytes.size());
    }
    [[nodiscard]] std::string read(std::size_t count) { return get(count, true); }
    // Empty when the line is gone.
    [[nodiscard]] std::string readOnce(std::size_t most) { return get(most, false); }
    [[nodiscard]] std::string ask(const std::string& command, const std::string& expected) {
        return write(command) ? read(expected.size()) : "not written";
    }

  private:
    std::string get(std::size_t count, bool toCompletion) {
        return transport_.get(static_cast<std::uint32_t>(count), toCompletion, 60'000).second;
    }

    const int fd_;
    OpenTransport transport_;
};

TEST(ScriptedModem, AnswersAsTheScriptSays) {
    ScriptedModem modem(ModemScript::fromText(kScript));
    const std::string longest = "ATL" + std::string(ScriptedModem::kLongestCommand - 3, 'x');
    struct Row {
        std::string command, answer;
    };
    const std::array rows = {
        Row{"AT\r", "AT\r\r\nOK\r\n"},
        Row{"\nat+csq\r", "\nat+csq\r\r\n+CSQ: 20,99\r\n\r\nOK\r\n"},
        Row{"AT+CSQX\r", "AT+CSQX\r\r\n+CME ERROR: 4\r\n"},
        Row{"ATD123;\r", "ATD123;\r\r\nOK\r\n\r\nRING\r\n"},
        Row{"ATX\r", "ATX\r\r\nERROR\r\n"},
        Row{longest + "\r", longest + "\r\r\nOK\r\n"},
        Row{longest + "x\r", longest + "x\r\r\nERROR\r\n"},
        Row{"AT+SILENT\rate0\r", "AT+SILENT\rate0\r\r\nOK\r\n"},
        Row{"AT\r", "\r\nOK\r\n"},
        Row{"ATE1\r", "\r\nOK\r\n"},
        Row{"AT\r", "AT\r\r\nOK\r\n"},
    };
    for (const Row& row : rows)  // each with a client of its own
        EXPECT_EQ(Client(modem).ask(row.command, row.answer), row.answer) << row.command;
    EXPECT_TRUE(modem.waitForCommands(rows.size() + 1));
    EXPECT_EQ(modem.received().at(3), "ATD123;");
}

TEST(ScriptedModem, SpeaksOnItsOwnAlsoInPieces) {
    ScriptedModem modem((ModemScript()));
    Client client(modem);
    EXPECT_TRUE(modem.say("RING"));
    EXPECT_TRUE(modem.sayBytes(std::string("\0\xFF", 2)));
    EXPECT_EQ(client.read(10), std::string("\r\nRING\r\n\0\xFF", 10));
    modem.sendInPieces(3);
    EXPECT_TRUE(modem.say("RING"));
    for (std::size_t bytes = 8; bytes > 0;) {
        const std::size_t count = client.readOnce(bytes).size();
        ASSERT_GE(count, 1);
        ASSERT_LE(count, 3);
        bytes -= count;
    }
    while (modem.say("RING")) {  // nobody reads: it ends
    }
}

TEST(ScriptedModem, TakesNothingWhilePaused) {
    ScriptedModem modem((ModemScript()));
    Client client(modem);
    modem.pauseReading();
    while (client.write("AT\r")) {  // until the terminal is full
    }
    EXPECT_TRUE(modem.received().empty());
    modem.resumeReading();
    EXPECT_TRUE(modem.waitForCommands(1));
}

TEST(ScriptedModem, IsGoneWhenItHungUp) {
    ScriptedModem modem((ModemScript()));
    Client client(modem);
    modem.hangUp();
    EXPECT_EQ(client.readOnce(1), "");
    EXPECT_FALSE(client.write("AT\r"));
    EXPECT_FALSE(modem.say("RING"));
}

TEST(ModemScript, RefusesWhatItCannotMean) {
    EXPECT_THROW((void)ModemScript::fromText("# none\n  OK\n"), std::invalid_argument);
    EXPECT_THROW((void)ModemScript::fromText("AT\nATE*\nat\n"), std::invalid_argument);
    EXPECT_THROW((void)ModemScript::fromText(std::string(ModemScript::kMostBytes + 1, '\n')),
                 std::invalid_argument);
    EXPECT_THROW((void)ModemScript::fromFile("/nowhere/script"), std::system_error);
}

}  // namespace

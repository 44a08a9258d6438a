#include "examples/modem.h"

#include <gtest/gtest.h>

#include <optional>
#include <stdexcept>
#include <string>
#include <vector>

#include "plr/test/scripted_modem.h"
#include "support/waiting.h"

namespace radio {
namespace {

std::string shown(const ModemLine& line) {
    return std::to_string(line.number) + ':' + line.text + (line.cut ? " (cut)" : "");
}

// The lines of `input`, fed in pieces of `size` bytes.
std::vector<std::string> split(std::string_view input, std::size_t size) {
    std::vector<std::string> lines;
    LineSplitter splitter([&lines](const ModemLine& line) { lines.push_back(shown(line)); });
    for (std::size_t at = 0; at < input.size(); at += size)
        splitter.feed(input.substr(at, size));
    splitter.finish();
    return lines;
}

TEST(LineSplitter, FindsTheSameLinesHoweverTheBytesArrive) {
    const struct {
        std::string input;
        std::vector<std::string> lines;
    } rows[] = {
        {"RING\nRING\n", {"1:RING", "2:RING"}},
        {"\r\nRING\r\n\r\n+CSQ: 1,99\r\n", {"2:RING", "4:+CSQ: 1,99"}},
        {"AT\r\r\nOK\r\n", {"1:AT", "2:OK"}},
        {"\r\n> \r\n+CMGS: 1\r\n> x\n", {"2:> ", "4:+CMGS: 1", "5:> ", "6:x"}},
        {"RING\nlast", {"1:RING", "2:last"}},
        {"", {}},
        {"\n\r\n\n", {}},
        {std::string(1024, 'x') + "\nRING\n", {"1:" + std::string(1024, 'x'), "2:RING"}},
        {std::string(5000, 'x') + "\nRING\n", {"1:" + std::string(1024, 'x') + " (cut)", "2:RING"}},
    };
    for (const auto& row : rows)
        for (const std::size_t size : {std::size_t{1}, std::size_t{3}, std::size_t{100000}})
            EXPECT_EQ(split(row.input, size), row.lines)
                << row.input.substr(0, 40) << " by " << size;
}

TEST(Modem, IsReadUntilItHangsUpAndToldWhatIsWritten) {
    plr::test::ScriptedModem host{plr::test::ModemScript()};
    const auto queue = dispatch::queue::create("modem_test");
    std::vector<std::string> lines;  // touched on the queue only
    plr::test::Event arrived;
    plr::test::Event ended;
    std::optional<Modem> modem;
    const auto open = [&](const std::string& path) {
        modem.emplace(ModemSettings{.path = path}, queue,
                      ModemHandlers{.onLine =
                                        [&](const ModemLine& line) {
                                            lines.push_back(shown(line));
                                            arrived.signal();
                                        },
                                    .onEnd = [&] { ended.signal(); },
                                    .onTrace = [](std::string_view) {}});
    };
    queue.sync([&] { open(host.path()); });
    ASSERT_TRUE(host.say("RING"));
    ASSERT_TRUE(arrived.wait());
    queue.sync([&] { EXPECT_TRUE(modem->write("ATE0\r")); });
    ASSERT_TRUE(arrived.wait());  // the echo
    host.hangUp();
    ASSERT_TRUE(ended.wait());
    queue.sync([&] {
        EXPECT_EQ(lines[0], "2:RING");
        EXPECT_EQ(lines[1], "3:ATE0");
        EXPECT_FALSE(modem->write("AT\r"));
        modem.reset();
        EXPECT_THROW(open("/nothing"), std::runtime_error);
    });
}

}  // namespace
}  // namespace radio

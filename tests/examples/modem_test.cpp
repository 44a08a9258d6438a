#include "examples/modem.h"

#include <fcntl.h>
#include <gtest/gtest.h>
#include <unistd.h>

#include <cstdlib>
#include <optional>
#include <string>
#include <system_error>
#include <vector>

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

TEST(Modem, ReadsATerminalUntilItHangsUp) {
    const int host = ::posix_openpt(O_RDWR | O_NOCTTY | O_CLOEXEC);
    ASSERT_EQ(::grantpt(host), 0);
    ASSERT_EQ(::unlockpt(host), 0);
    const auto queue = dispatch::queue::create("modem_test");
    std::vector<std::string> lines;  // touched on the queue only
    std::optional<int> end;          // the same
    plr::test::Event arrived;
    plr::test::Event ended;
    std::optional<Modem> modem;
    modem.emplace(
        ::ptsname(host), queue,
        [&](const ModemLine& line) {
            lines.push_back(shown(line));
            arrived.signal();
        },
        [&](int error) {
            end = error;
            ended.signal();
        });
    modem->start();
    ASSERT_EQ(::write(host, "\r\nRING\r\n", 8), 8);
    ASSERT_TRUE(arrived.wait());
    ::close(host);
    ASSERT_TRUE(ended.wait());
    queue.sync([&] {
        EXPECT_EQ(lines, std::vector<std::string>{"2:RING"});
        EXPECT_EQ(end, 0);
        modem.reset();
        EXPECT_THROW(Modem("/nothing", queue, {}, {}).start(), std::system_error);
    });
}

}  // namespace
}  // namespace radio

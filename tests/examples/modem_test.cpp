#include "examples/modem.h"

#include <fcntl.h>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <optional>
#include <system_error>
#include <vector>

namespace radio {
namespace {

using ::testing::ElementsAre;
using ::testing::IsEmpty;

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

class ModemTest : public ::testing::Test {
  protected:
    ModemTest() {
        std::string name = std::filesystem::temp_directory_path() / "modem_test.XXXXXX";
        folder_ = ::mkdtemp(name.data());
    }
    ~ModemTest() override {
        queue_.sync([this] { modem_.reset(); });
        std::filesystem::remove_all(folder_);
    }

    void open(const std::string& path, std::size_t expectedLines) {
        for (std::size_t i = 0; i < expectedLines; ++i)
            arrived_.enter();
        ended_.enter();
        modem_.emplace(
            path, queue_,
            [this](const ModemLine& line) {
                lines_.push_back(shown(line));
                arrived_.leave();
            },
            [this](int error) {
                end_ = error;
                ended_.leave();
            });
        modem_->start();
    }
    static bool happened(const dispatch::group& group) {
        return group.wait(dispatch::time::after(std::chrono::seconds(30))) == 0;
    }

    std::filesystem::path folder_;
    dispatch::queue queue_ = dispatch::queue::create("modem_test");
    std::vector<std::string> lines_;  // touched on queue_ until it is idle
    std::optional<int> end_;
    dispatch::group arrived_, ended_;
    std::optional<Modem> modem_;
};

TEST_F(ModemTest, ReadsAFileToItsEnd) {
    std::ofstream(folder_ / "session") << "RING\n\n+CSQ: 20,99\nno end";
    open(folder_ / "session", 3);
    ASSERT_TRUE(happened(ended_));
    EXPECT_THAT(lines_, ElementsAre("1:RING", "3:+CSQ: 20,99", "4:no end"));
    EXPECT_EQ(end_, 0);
}

TEST_F(ModemTest, KeepsAFifoOpenBetweenWriters) {
    const std::string fifo = folder_ / "fifo";
    ASSERT_EQ(::mkfifo(fifo.c_str(), 0600), 0);
    open(fifo, 2);
    for (const char* said : {"RI", "NG\nBUSY\n"}) {
        const int writer = ::open(fifo.c_str(), O_WRONLY | O_CLOEXEC);
        ASSERT_GE(writer, 0);
        ASSERT_GT(::write(writer, said, strlen(said)), 0);
        ::close(writer);
    }
    ASSERT_TRUE(happened(arrived_));
    queue_.sync([this] { modem_.reset(); });
    EXPECT_THAT(lines_, ElementsAre("1:RING", "2:BUSY"));
    EXPECT_EQ(end_, std::nullopt) << "nothing ended";
    ended_.leave();
}

TEST_F(ModemTest, ReadsATerminalUntilItHangsUp) {
    const int host = ::posix_openpt(O_RDWR | O_NOCTTY | O_CLOEXEC);
    ASSERT_GE(host, 0);
    ASSERT_EQ(::grantpt(host), 0);
    ASSERT_EQ(::unlockpt(host), 0);
    open(::ptsname(host), 1);
    ASSERT_EQ(::write(host, "\r\nRING\r\n", 8), 8);
    ASSERT_TRUE(happened(arrived_));
    ::close(host);
    ASSERT_TRUE(happened(ended_));
    EXPECT_THAT(lines_, ElementsAre("2:RING"));
    EXPECT_EQ(end_, 0);
}

TEST_F(ModemTest, SaysWhyItCannotOpen) {
    try {
        open(folder_ / "nothing", 0);
        FAIL() << "opened what is not there";
    } catch (const std::system_error& error) {
        EXPECT_EQ(error.code().value(), ENOENT);
    }
    ended_.leave();
    EXPECT_THAT(lines_, IsEmpty());
}

}  // namespace
}  // namespace radio

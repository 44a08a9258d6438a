#pragma once

#include <fcntl.h>
#include <gtest/gtest.h>
#include <poll.h>
#include <pty.h>
#include <sys/ioctl.h>
#include <termios.h>
#include <unistd.h>

#include <chrono>
#include <string>
#include <string_view>
#include <utility>

#include "io/open_transport.h"
#include "support/debug_records.h"
#include "support/waiting.h"

namespace plr::test {

// A line on a pseudo terminal; the test holds the far end.
class SerialLine {
  public:
    SerialLine() {
        char name[256];
        int port;
        EXPECT_EQ(::openpty(&far_, &port, name, nullptr, nullptr), 0);
        ::fcntl(far_, F_SETFL, O_NONBLOCK);
        ::close(port);
        path_ = name;
    }
    SerialLine(const SerialLine&) = delete;
    SerialLine& operator=(const SerialLine&) = delete;
    ~SerialLine() { unplug(); }

    const std::string& path() const { return path_; }
    int farEnd() const { return far_; }
    void unplug() { ::close(std::exchange(far_, -1)); }

    void send(std::string_view bytes) const {
        EXPECT_EQ(::write(far_, bytes.data(), bytes.size()), std::ssize(bytes));
    }
    // The next `count` bytes that were written to the line.
    [[nodiscard]] std::string receive(std::size_t count) const {
        std::string all(count, '\0');
        std::size_t got = 0;
        const bool complete = eventually([&] {
            while (got < count) {
                const ssize_t more = ::read(far_, all.data() + got, count - got);
                if (more <= 0)
                    return false;
                got += static_cast<std::size_t>(more);
            }
            return true;
        });
        EXPECT_TRUE(complete) << got << " of " << count << " bytes";
        return all;
    }
    // Bytes that the driver has received and nobody has read.
    int unread() const {
        const int port = ::open(path_.c_str(), O_RDWR | O_NOCTTY | O_NONBLOCK);
        int count = -1;
        EXPECT_EQ(::ioctl(port, FIONREAD, &count), 0);
        ::close(port);
        return count;
    }
    // Something was written to the line.
    [[nodiscard]] bool awaitOutput() const {
        pollfd state{far_, POLLIN, 0};
        return ::poll(&state, 1, std::chrono::milliseconds(kBound).count()) == 1;
    }
    termios settings() const {
        termios attributes{};
        EXPECT_EQ(::tcgetattr(far_, &attributes), 0);  // those of the port
        return attributes;
    }

  private:
    int far_ = -1;
    std::string path_;
};

}  // namespace plr::test

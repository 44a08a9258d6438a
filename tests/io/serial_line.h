#pragma once

#include <fcntl.h>
#include <gtest/gtest.h>
#include <poll.h>
#include <pty.h>
#include <sys/ioctl.h>
#include <termios.h>
#include <unistd.h>

#include <chrono>
#include <mutex>
#include <string>
#include <string_view>
#include <utility>

#include "Pelorin"
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

// A transport that ends with its scope.
struct OpenTransport : PelorinTransport {
    OpenTransport() : PelorinTransport{} {}
    OpenTransport(const OpenTransport&) = delete;
    OpenTransport& operator=(const OpenTransport&) = delete;
    ~OpenTransport() { PelorinTransportFree(this); }

    bool put(std::string_view bytes) {
        std::uint32_t count = 0;
        const bool written = write(this, bytes.data(), static_cast<std::uint32_t>(bytes.size()),
                                   &count, true, 0, nullptr);
        EXPECT_EQ(written, count == bytes.size());
        return written;
    }
    // Whether a read succeeded, and what it got.
    using Got = std::pair<bool, std::string>;
    Got get(std::uint32_t length, bool toCompletion = false,
            std::uint32_t timeoutMs = PELORIN_FOREVER) {
        Got got{false, std::string(length, '\0')};
        std::uint32_t count = 0;
        got.first = read(this, got.second.data(), length, &count, toCompletion, timeoutMs, nullptr);
        got.second.resize(count);
        return got;
    }
};

// What is printed while it lives.
class DebugTexts {
  public:
    DebugTexts() { PelorinDebugSetDelegate(&DebugTexts::add, this); }
    DebugTexts(const DebugTexts&) = delete;
    DebugTexts& operator=(const DebugTexts&) = delete;
    ~DebugTexts() { PelorinDebugSetDelegate(nullptr, nullptr); }

    [[nodiscard]] std::string take() {
        const std::lock_guard guard(mutex_);
        return std::exchange(texts_, {});
    }

  private:
    static void add(void* self, const char* /*function*/, const char* text) {
        auto& texts = *static_cast<DebugTexts*>(self);
        const std::lock_guard guard(texts.mutex_);
        texts.texts_ += text;
    }

    std::mutex mutex_;
    std::string texts_;
};

}  // namespace plr::test

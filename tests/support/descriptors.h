#pragma once

#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/resource.h>
#include <sys/socket.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cstddef>
#include <filesystem>
#include <iterator>
#include <string>
#include <utility>

namespace plr::test {

// Two connected descriptors: a pipe, or sockets of a type. Closed at the end.
class Ends {
  public:
    explicit Ends(int socketType = 0) {
        EXPECT_EQ(socketType == 0
                      ? ::pipe2(ends_.data(), O_CLOEXEC)
                      : ::socketpair(AF_UNIX, socketType | SOCK_CLOEXEC, 0, ends_.data()),
                  0);
    }
    ~Ends() {
        ::close(ends_[0]);
        closeIn();
    }
    Ends(const Ends&) = delete;
    Ends& operator=(const Ends&) = delete;
    // What is written to in() is read from out().
    [[nodiscard]] int out() const { return ends_[0]; }
    [[nodiscard]] int in() const { return ends_[1]; }
    const Ends& put(const std::string& text) const {
        EXPECT_EQ(::write(in(), text.data(), text.size()), static_cast<ssize_t>(text.size()));
        return *this;
    }
    void closeIn() {
        if (ends_[1] >= 0)
            ::close(std::exchange(ends_[1], -1));
    }

  private:
    std::array<int, 2> ends_{};
};

// Descriptors that this process has open.
inline std::size_t openDescriptors() {
    return static_cast<std::size_t>(
        std::distance(std::filesystem::directory_iterator("/proc/self/fd"), {}));
}

// No descriptor of `first` or above can be opened while it lives.
class DescriptorLimit {
  public:
    explicit DescriptorLimit(std::size_t first) {
        EXPECT_EQ(::getrlimit(RLIMIT_NOFILE, &before_), 0);
        const rlimit limit{std::min<rlim_t>(first, before_.rlim_max), before_.rlim_max};
        EXPECT_EQ(::setrlimit(RLIMIT_NOFILE, &limit), 0);
    }
    ~DescriptorLimit() { EXPECT_EQ(::setrlimit(RLIMIT_NOFILE, &before_), 0); }
    DescriptorLimit(const DescriptorLimit&) = delete;
    DescriptorLimit& operator=(const DescriptorLimit&) = delete;

  private:
    rlimit before_{};
};

}  // namespace plr::test

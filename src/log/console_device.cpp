#include "src/log/console_device.h"

#include <fcntl.h>
#include <poll.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <climits>
#include <cstdio>
#include <utility>

#include "src/log/signal_block.h"

namespace plr {
namespace {

using std::chrono::milliseconds;
using std::chrono::nanoseconds;
using std::chrono::steady_clock;

constexpr nanoseconds kPatience = milliseconds(100);

bool hasRoom(int fd, nanoseconds patience) noexcept {
    pollfd ready{fd, POLLOUT, 0};
    const auto wait = std::chrono::ceil<milliseconds>(patience);
    return ::poll(&ready, 1, static_cast<int>(wait.count())) != 0;
}

}  // namespace

ConsoleDevice::ConsoleDevice(int lent) noexcept
    : fd_(lent), kind_(Kind::Never), patience_(kPatience) {
    struct stat status {};
    if (::fstat(lent, &status) != 0)
        return;
    if (S_ISSOCK(status.st_mode))
        kind_ = Kind::Socket;
    else if (S_ISFIFO(status.st_mode) || ::isatty(lent) != 0)
        kind_ = openOwn();
}

// O_NONBLOCK on the lent one would hold for everybody who shares it, the user's
// shell for one.
ConsoleDevice::Kind ConsoleDevice::openOwn() noexcept {
    char path[32];
    std::snprintf(path, sizeof path, "/proc/self/fd/%d", fd_);
    const int own = ::open(path, O_WRONLY | O_NONBLOCK | O_NOCTTY | O_CLOEXEC);
    if (own < 0)
        return Kind::Lent;
    fd_ = own;
    return Kind::Own;
}

void ConsoleDevice::close() noexcept {
    const int fd = std::exchange(fd_, -1);
    if (kind_ == Kind::Own && fd >= 0)
        ::close(fd);
}

bool ConsoleDevice::send(RecordBuffer& records) noexcept {
    if (isDead_)
        return false;
    SignalBlock block(SIGPIPE);
    const nanoseconds before = patience_;
    while (!records.empty()) {
        const long written = write(records.waiting());
        if (written > 0) {
            records.consume(static_cast<std::size_t>(written));
        } else if (errno == EAGAIN) {
            if (!waitForRoom())
                return false;
        } else if (errno != EINTR) {
            if (errno == EPIPE)
                block.takeBack();
            refuse(errno);
            return false;
        }
    }
    if (patience_ == before)
        patience_ = kPatience;
    return true;
}

// What write(2) returns; -1 with EAGAIN instead of waiting.
long ConsoleDevice::write(std::string_view bytes) const noexcept {
    if (kind_ == Kind::Socket)
        return ::send(fd_, bytes.data(), bytes.size(), MSG_DONTWAIT | MSG_NOSIGNAL);
    if (kind_ == Kind::Lent) {
        if (!hasRoom(fd_, nanoseconds(0))) {
            errno = EAGAIN;
            return -1;
        }
        bytes = bytes.substr(0, PIPE_BUF);
    }
    return ::write(fd_, bytes.data(), bytes.size());
}

bool ConsoleDevice::waitForRoom() noexcept {
    if (patience_ <= nanoseconds(0))
        return false;
    const auto start = steady_clock::now();
    const bool found = hasRoom(fd_, patience_);
    patience_ -= std::max<nanoseconds>(steady_clock::now() - start, milliseconds(1));
    return found;
}

void ConsoleDevice::refuse(int error) noexcept {
    error_ = error;
    isDead_ = error == EPIPE || error == EIO || error == EBADF || error == ECONNRESET;
}

// Uses up the same patience.
void ConsoleDevice::sendInCrash(std::string_view bytes) noexcept {
    const SignalBlock block(SIGPIPE);
    while (!bytes.empty() && !isDead_) {
        const long written = write(bytes);
        if (written > 0)
            bytes.remove_prefix(static_cast<std::size_t>(written));
        else if (errno == EAGAIN ? !waitForRoom() : errno != EINTR)
            return;
    }
}

}  // namespace plr

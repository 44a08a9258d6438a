// What the machine allows: a pair of AF_UNIX stream sockets and frames that
// nobody looks into. Variants: "" both ends wait in epoll, "_blocking" both in
// recv(), "_batched" (one way) many frames a write.

#include <sys/epoll.h>
#include <sys/socket.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <memory>
#include <vector>

#include "bench/vox_cases.h"

namespace {

using bench::check;

constexpr std::size_t kBatchBytes = 64 * 1024;

// One end of the pair; waits in epoll if told so.
class End {
  public:
    End(int fd, bool useEpoll) : fd_(fd), buffer_(1024 * 1024) {
        if (!useEpoll)
            return;
        epoll_ = check(::epoll_create1(EPOLL_CLOEXEC), "epoll_create1");
        epoll_event event{};
        event.events = EPOLLIN;
        check(::epoll_ctl(epoll_, EPOLL_CTL_ADD, fd_, &event), "epoll_ctl");
    }

    void send(std::size_t bytes) {
        for (std::size_t sent = 0; sent < bytes;) {
            const ssize_t written = ::send(fd_, buffer_.data(), bytes - sent, MSG_NOSIGNAL);
            if (written < 0)
                bench::fail("send");
            sent += static_cast<std::size_t>(written);
        }
    }

    // Makes `frame` part of what the next send() sends, `offset` bytes behind its
    // start.
    void put(const std::vector<char>& frame, std::size_t offset) {
        std::copy(frame.begin(), frame.end(),
                  buffer_.begin() + static_cast<std::ptrdiff_t>(offset));
    }

    // Receives what is there, at least a byte; 0 at the end of the stream.
    std::size_t receiveSome() {
        if (epoll_ >= 0) {
            epoll_event event{};
            while (::epoll_wait(epoll_, &event, 1, -1) < 0 && errno == EINTR) {
            }
        }
        const ssize_t got = ::recv(fd_, buffer_.data(), buffer_.size(), 0);
        return static_cast<std::size_t>(check(static_cast<int>(got), "recv"));
    }

    // False at the end of the stream.
    bool receive(std::size_t bytes) {
        for (std::size_t got = 0; got < bytes;) {
            const std::size_t more = receiveSome();
            if (more == 0)
                return false;
            got += more;
        }
        return true;
    }

  private:
    int fd_;
    int epoll_ = -1;
    std::vector<char> buffer_;
};

void serve(const bench::vox_cases::Case& measured, End& end) {
    const std::size_t frame = measured.frameBytes();
    if (measured.roundTrip)
        while (end.receive(frame))
            end.send(frame);
    else if (end.receive(frame * measured.messages()))
        end.send(1);
}

}  // namespace

int main(int argc, char** argv) {
    const auto measured = bench::vox_cases::parse(argc, argv);
    const bool useEpoll = measured.variant != "_blocking";
    std::array<int, 2> pair{};
    check(::socketpair(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0, pair.data()), "socketpair");
    const bench::Child server([&] {
        ::close(pair[0]);
        measured.place(true);
        End end(pair[1], useEpoll);
        serve(measured, end);
    });
    ::close(pair[1]);
    measured.place(false);
    End end(pair[0], useEpoll);
    const std::size_t frame = measured.frameBytes();
    if (measured.roundTrip) {
        bench::vox_cases::measureRoundTrips(measured, [&] {
            end.send(frame);
            if (!end.receive(frame))
                bench::fail("the server ended");
        });
        return 0;
    }
    const std::vector<char> message(frame);
    std::size_t waiting = 0;  // bytes not written yet
    const std::size_t batch = measured.variant == "_batched" ? kBatchBytes : 1;
    bench::vox_cases::measureOneWay(
        measured,
        [&] {
            end.put(message, waiting);
            waiting += frame;
            if (waiting >= batch)
                end.send(std::exchange(waiting, 0));
        },
        [&] {
            end.send(waiting);
            if (!end.receive(1))
                bench::fail("the server ended");
        });
}

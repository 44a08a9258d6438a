// What the machine allows: a relay with N AF_UNIX stream sockets that waits in
// epoll and copies each message that arrives to all of them, one write each. The
// variant "batched" copies all that has arrived with one write a socket.

#include <sys/epoll.h>
#include <sys/socket.h>

#include <array>
#include <utility>
#include <vector>

#include "bench/fanout_sockets.h"
#include "bench/vox_cases.h"

namespace {

using bench::check;

constexpr std::size_t kFrame = bench::vox_cases::kSmallFrame;

using Pair = std::array<int, 2>;

Pair makePair() {
    Pair pair{};
    check(::socketpair(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0, pair.data()), "socketpair");
    return pair;
}

[[noreturn]] void relay(int setter, const std::vector<Pair>& watchers, bool batched) {
    const int epoll = check(::epoll_create1(EPOLL_CLOEXEC), "epoll_create1");
    epoll_event event{};
    event.events = EPOLLIN;
    check(::epoll_ctl(epoll, EPOLL_CTL_ADD, setter, &event), "epoll_ctl");
    std::vector<char> buffer(kFrame * 1'024);
    std::size_t held = 0;  // bytes in the buffer
    for (;;) {
        if (::epoll_wait(epoll, &event, 1, -1) != 1)
            continue;
        const ssize_t got = ::recv(setter, buffer.data() + held, buffer.size() - held, 0);
        if (got <= 0)
            bench::fail("the setter is gone");
        held += static_cast<std::size_t>(got);
        const std::size_t whole = held - held % kFrame;
        const std::size_t step = batched ? std::max(whole, kFrame) : kFrame;
        for (std::size_t at = 0; at < whole; at += step)
            for (const Pair& watcher : watchers)
                bench::fanout_sockets::sendAll(watcher[0], buffer.data() + at, step);
        std::copy(buffer.begin() + static_cast<std::ptrdiff_t>(whole),
                  buffer.begin() + static_cast<std::ptrdiff_t>(held), buffer.begin());
        held -= whole;
    }
}

[[noreturn]] void watch(const std::vector<Pair>& pairs, bench::fanout_cases::Board& board) {
    std::vector<int> sockets;
    for (const Pair& pair : pairs) {
        sockets.push_back(pair[1]);
        board.attach(pairs.size());
    }
    bench::fanout_sockets::watch(sockets, kFrame, board);
}

}  // namespace

int main(int argc, char** argv) {
    const auto measured = bench::fanout_cases::parse(argc, argv);
    auto& board = bench::makeShared<bench::fanout_cases::Board>();
    const Pair setter = makePair();
    std::vector<Pair> watchers(measured.watchers);
    for (Pair& pair : watchers)
        pair = makePair();
    const bench::Child service([&] { relay(setter[1], watchers, measured.variant == "batched"); });
    const bench::Child watching([&] { watch(watchers, board); });
    board.waitForWatchers();
    const std::vector<char> frame(kFrame);
    bench::fanout_cases::measure(measured, board, [&] {
        bench::fanout_sockets::sendAll(setter[0], frame.data(), frame.size());
    });
}

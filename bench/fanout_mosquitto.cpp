// The mosquitto broker: one topic whose value is retained, as our properties keep
// theirs, and N subscribers to it, each a connection of its own.

#include <string>
#include <vector>

#include "bench/fanout_sockets.h"
#include "bench/mqtt.h"

namespace {

using bench::fanout_cases::Board;
using bench::fanout_cases::kPath;

std::string publishPacket() {
    return bench::mqtt::publishPacket(kPath, bench::fanout_cases::kValue);
}

[[noreturn]] void watch(const bench::mqtt::Broker& broker, std::size_t count, Board& board) {
    std::vector<int> sockets;
    for (std::size_t i = 0; i < count; ++i) {
        sockets.push_back(broker.connectClient("watcher" + std::to_string(i)));
        bench::mqtt::subscribe(sockets.back(), kPath);
        board.attach(count);
    }
    bench::fanout_sockets::watch(sockets, publishPacket().size(), board);
}

}  // namespace

int main(int argc, char** argv) {
    const auto measured = bench::fanout_cases::parse(argc, argv);
    auto& board = bench::makeShared<Board>();
    const bench::mqtt::Broker broker;
    const bench::Child watching([&] { watch(broker, measured.watchers, board); });
    const int setter = broker.connectClient("setter");
    board.waitForWatchers();
    const std::string publish = publishPacket();
    bench::fanout_cases::measure(measured, board, [&] {
        bench::fanout_sockets::sendAll(setter, publish.data(), publish.size());
    });
}

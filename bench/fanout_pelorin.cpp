// Our REST layer: a service with a property resource, a client that sets
// /radio/signal, and N clients, each with a connection of its own, that observe
// it. The kept value that a new observer gets at once tells that it is registered.

#include <cstdlib>
#include <deque>
#include <memory>
#include <string>

#include "bench/fanout_cases.h"
#include "dispatch/dispatch.h"
#include "plr/ipc.h"
#include "plr/rest.h"

namespace {

using bench::fanout_cases::Board;

constexpr const char* kService = "net.example.bench";
const std::string kPath(bench::fanout_cases::kPath);

[[noreturn]] void sleepForEver() {
    bench::Event never;
    for (;;)
        never.wait();
}

void serve(bench::Event& listening) {
    const auto queue = dispatch::queue::create("bench.service");
    const auto server = plr::rest::RestServerExample::create(queue, kService);
    server->registerResource("/connections", std::make_shared<plr::rest::ConnectionRestResource>());
    server->registerResource("/radio", std::make_shared<plr::rest::PropertyRestResource>(true));
    server->connect(vox::listener::create(kService));
    listening.signal();
    sleepForEver();
}

void watch(std::uint64_t count, Board& board) {
    const auto queue = dispatch::queue::create("bench.watchers");
    std::deque<plr::RestModule> modules;
    queue.sync([&] {
        for (std::uint64_t i = 0; i < count; ++i) {
            const plr::RestModule& module =
                modules.emplace_back(queue, "watcher" + std::to_string(i));
            module.connect(vox::connection::create(kService));
            module.observeProperty(kPath, [&board, count, first = true](vox::object) mutable {
                if (std::exchange(first, false))
                    board.attach(count);
                else
                    board.deliver();
            });
        }
    });
    sleepForEver();
}

}  // namespace

int main(int argc, char** argv) {
    const auto measured = bench::fanout_cases::parse(argc, argv);
    auto& board = bench::makeShared<Board>();
    auto& listening = bench::makeShared<bench::Event>();
    const bench::TemporaryFolder folder;
    ::setenv("VOX_RUNTIME_DIR", folder.path().c_str(), 1);
    const bench::Child service([&] { serve(listening); });
    const bench::Child watching([&] {
        listening.wait();
        watch(measured.watchers, board);
    });
    board.waitForWatchers();
    const auto queue = dispatch::queue::create("bench.setter");
    const plr::RestModule setter(queue, "setter");
    const auto value =
        vox::object::adopt(vox_string_create(std::string(bench::fanout_cases::kValue).c_str()));
    queue.sync([&] { setter.connect(vox::connection::create(kService)); });
    bench::fanout_cases::measure(measured, board,
                                 [&] { queue.sync([&] { setter.setProperty(kPath, value); }); });
    queue.sync([&] { setter.disconnect(); });
}

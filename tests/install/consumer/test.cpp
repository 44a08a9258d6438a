// A test of somebody else's, without a framework.
#include "plr/test.h"

#include <iostream>

#include "plr/concurrency.h"

int main() {
    using namespace std::chrono_literals;
    plr::test::VirtualTime time;
    plr::test::VoxPeer peer;
    peer.tested().resume();
    const auto service = plr::DispatchTimerService::create(nullptr);
    const auto timer = service->startPeriodicTimer(1h, time.createQueue("timer"), [&peer] {
        peer.tested().send_message(vox::dict::create());
    });
    time.advance(24h);
    const bool works = peer.takeMessages().size() == 24;
    std::cout << (works ? "works\n" : "does not work\n");
    return works ? 0 : 1;
}

#include "plr/test/virtual_time.h"

#include <gtest/gtest.h>

#include <memory>
#include <string>
#include <thread>
#include <vector>

#include "dispatch/dispatch.h"
#include "plr/concurrency/clock.h"
#include "plr/concurrency/dispatch_timer_service.h"
#include "plr/concurrency/shared_synchronizable.h"
#include "plr/concurrency/while_alive.h"
#include "plr/test/vox_peer.h"

namespace {

using namespace std::chrono_literals;
using plr::test::VirtualTime;
using Strings = std::vector<std::string>;

// Owns its queue, asks every minute, and gives up 10 s later.
class Poller : public plr::SharedSynchronizable<Poller> {
  public:
    static std::shared_ptr<Poller> create(std::shared_ptr<plr::TimerService> timers,
                                          const dispatch::queue& queue) {
        auto made = make_shared_ptr(new Poller(std::move(timers), queue));
        made->execute_wrapped([self = made.get()] {
            self->ownQueue_.assertCurrent();
            self->timer_ = self->timers_->startPeriodicTimer(
                1min, self->ownQueue_.queue(),
                plr::whileAlive(self->weak_from_this(), [](Poller& poller) { poller.ask(); }));
        });
        return made;
    }
    Strings log() const {
        return perform([this] {
            ownQueue_.assertCurrent();
            return log_;
        });
    }

  private:
    Poller(std::shared_ptr<plr::TimerService> timers, const dispatch::queue& queue)
        : SharedSynchronizable(queue), timers_(std::move(timers)) {}
    void ask() {
        ownQueue_.assertCurrent();
        log_.emplace_back("ask");
        timers_->runAfter(10s, ownQueue_.queue(),
                          plr::whileAlive(weak_from_this(), [](Poller& self) {
                              self.ownQueue_.assertCurrent();
                              self.log_.emplace_back("give up");
                          }));
    }

    const std::shared_ptr<plr::TimerService> timers_;
    std::unique_ptr<plr::Timer> timer_ PLR_CONFINED_TO(ownQueue_);
    Strings log_ PLR_CONFINED_TO(ownQueue_);
};

TEST(VirtualTime, RunsTimersOfObjectsByTheirDeadlines) {
    for (const bool byHand : {true, false}) {
        VirtualTime time;
        const auto queue = byHand ? time.createQueue("poller") : dispatch::queue::create("poller");
        const auto poller = Poller::create(plr::DispatchTimerService::create(nullptr), queue);
        time.advance(1min - 1us);
        EXPECT_EQ(poller->log(), Strings());
        time.advance(1us);
        EXPECT_EQ(poller->log(), (Strings{"ask"}));
        time.advance(1min);
        EXPECT_EQ(poller->log(), (Strings{"ask", "give up", "ask"}));
        time.advance(24h);
        EXPECT_EQ(poller->log().size(), 2 * (2 + 24 * 60) - 1u);
        EXPECT_EQ(time.elapsed(), 24h + 2min);
    }
}

TEST(VirtualTime, KeepsQueuesOfItsOwnStill) {
    VirtualTime time;
    const auto queue = time.createQueue("still");
    const auto here = std::this_thread::get_id();
    Strings order;
    queue.async([&] {
        EXPECT_EQ(std::this_thread::get_id(), here);
        order.emplace_back("first");
        queue.async([&] { order.emplace_back("second"); });
    });
    EXPECT_EQ(order, Strings());
    time.settle();
    EXPECT_EQ(order, (Strings{"first", "second"}));
}

// Work that goes from queue to queue, blocks a worker on the way, and ends in a message.
TEST(VirtualTime, WaitsForAllThatFollowsFromATimer) {
    VirtualTime time;
    plr::test::VoxPeer peer;
    const auto still = time.createQueue("still");
    const auto first = dispatch::queue::create("first");
    const auto second = dispatch::queue::create("second");
    std::size_t messages = 0;  // touched by `second` only
    peer.tested().set_event_handler(
        [&](const vox::object& event) { messages += event.type() == VOX_TYPE_DICTIONARY; });
    peer.tested().set_target_queue(second);
    peer.tested().resume();
    constexpr std::size_t kRounds = 200;
    for (std::size_t round = 1; round <= kRounds; ++round) {
        first.after(dispatch::time::after(1h), dispatch::block<void()>([&] {
                        still.sync([&] { second.sync([] {}); });
                        second.async([&] { peer.send(vox::dict::create()); });
                    }));
        time.advance(1h);
        ASSERT_EQ(second.sync([&] { return messages; }), round);
    }
    peer.hangUp();
    time.settle();  // the handler above hears of it
}

TEST(VirtualTime, MovesAllClocks) {
    VirtualTime time;
    const auto queue = time.createQueue("clocks");
    Strings fired;
    const auto set = [&](const char* name, std::chrono::nanoseconds delay, dispatch::clock on) {
        queue.after(dispatch::time::after(delay, on),
                    dispatch::block<void()>([&fired, name] { fired.emplace_back(name); }));
    };
    set("boot", 3s, dispatch::clock::boot);
    set("wall", 2s, dispatch::clock::wall);
    set("monotonic", 1s, dispatch::clock::monotonic);
    set("noon", 12h, dispatch::clock::wall);
    const std::uint64_t date = plr::Clock::now_in_nanoseconds();
    time.advance(3s);
    EXPECT_EQ(fired, (Strings{"monotonic", "wall", "boot"}));
    EXPECT_EQ(plr::Clock::now_in_nanoseconds(), date + 3'000'000'000);
    time.stepWallClock(12h);
    EXPECT_EQ(fired.back(), "noon");
    EXPECT_EQ(time.elapsed(), 3s);
}

TEST(VirtualTime, GivesTheClocksBack) {
    { VirtualTime().advance(24h); }
    const dispatch::group fired;
    fired.enter();
    dispatch::queue::global().after(dispatch::time::after(1ms),
                                    dispatch::block<void()>([&] { fired.leave(); }));
    EXPECT_EQ(fired.wait(), 0);
}

}  // namespace

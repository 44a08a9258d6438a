#include <random>
#include <type_traits>

#include "plr/concurrency/monitor.h"
#include "support/waiting.h"

namespace {

using dispatch::group;
using plr::concurrency::Monitor;
using plr::concurrency::PriorityQueue;
using plr::test::Event;
using enum PriorityQueue::Priority;
using Block = dispatch::block<void()>;

static_assert(std::has_virtual_destructor_v<Monitor> &&
              sizeof(Monitor) == sizeof(void*) + sizeof(PriorityQueue) + sizeof(group));

// Keeps a queue busy with a block until it is opened.
class Gate {
  public:
    explicit Gate(const PriorityQueue& queue) {
        queue.addBlock(pass(), Normal);
        EXPECT_TRUE(entered_.wait());
    }
    // The queue's owner waits for the end of the block before the gate goes.
    [[nodiscard]] Block pass() {
        return Block([this] {
            entered_.signal();
            EXPECT_TRUE(opened_.wait());
        });
    }
    void open() { opened_.signal(); }

  private:
    Event entered_;
    Event opened_;
};

Block append(std::string& log, char what) {
    return Block([&log, what] { log += what; });
}

TEST(PriorityQueue, HighestBlocksGoBeforeNormalOnesThatWait) {
    const struct {
        const char* name;
        void (*submit)(const PriorityQueue&, Block);
    } rows[] = {
        {"addBlock", [](const auto& on, Block b) { on.addBlock(std::move(b), Highest); }},
        {"addHighest", [](const auto& on, Block b) { on.addHighestPriorityBlock(std::move(b)); }},
        {"group", [](const auto& on, Block b) { on.addBlock(group(), std::move(b), Highest); }},
        {"copy",
         [](const auto& on, Block b) { PriorityQueue(on).addBlock(std::move(b), Highest); }},
    };
    for (const auto& row : rows) {
        SCOPED_TRACE(row.name);
        const PriorityQueue queue("lanes");
        std::string order;
        Gate gate(queue);
        queue.addBlock(append(order, 'a'), Normal);
        row.submit(queue, append(order, 'X'));
        // Any value but 1 is a normal priority.
        queue.addBlock(append(order, 'b'), static_cast<PriorityQueue::Priority>(7));
        row.submit(queue, append(order, 'Y'));
        gate.open();
        queue.addBlockSync(append(order, 'c'), Normal);
        EXPECT_EQ(order, "XYabc");
    }
}

TEST(PriorityQueue, NestedHighestBlocksStack) {
    const PriorityQueue queue("lanes");
    std::string order;
    Gate gate(queue);
    queue.addBlock(append(order, 'a'), Normal);
    queue.addHighestPriorityBlock(Block([&] {
        queue.addHighestPriorityBlock(Block([&] {
            queue.addBlock(append(order, 'b'), Normal);
            queue.addHighestPriorityBlock(append(order, 'Z'));
            order += 'Y';
        }));
        order += 'X';
    }));
    gate.open();
    queue.addBlockSync(Block([] {}), Normal);  // perhaps before 'b'
    queue.addBlockSync(append(order, 'c'), Normal);
    EXPECT_EQ(order, "XYZabc");
}

// Several threads submit at random, blocks too. At the start of each normal block
// no highest one may wait that was submitted before the previous normal block
// started, nor any that a block of the queue submitted.
class Submissions {
  public:
    static constexpr int kThreads = 3;
    static constexpr int kEach = 3'000;

    void run() {
        std::vector<std::thread> threads;
        for (std::size_t t = 0; t < kThreads; ++t)
            threads.emplace_back([this, t] { submitFrom(t, queue_); });
        for (std::thread& each : threads)
            each.join();
        EXPECT_EQ(all_.wait(dispatch::time::after(plr::test::kBound)), 0);
        queue_.addBlockSync(Block([] {}), Normal);
        for (const Lane& lane : lanes_) {
            EXPECT_EQ(lane.ranHighest, lane.submittedHighest);
            EXPECT_EQ(lane.ranNormal, lane.submittedNormal);
        }
    }

  private:
    struct Lane {
        std::atomic<int> submittedHighest{0};  // counted when the submission returned
        int submittedNormal = 0;
        int ranHighest = 0;
        int ranNormal = 0;
        int mayNotWait = 0;  // highest blocks below this one
    };

    void submitFrom(std::size_t t, PriorityQueue queue) {
        std::minstd_rand random(static_cast<unsigned>(t) + 1);
        for (int i = 0; i < kEach; ++i) {
            const auto priority = random() % 3 == 0 ? Highest : Normal;
            Lane& lane = lanes_[t];
            const int number =
                priority == Highest ? lane.submittedHighest.load() : lane.submittedNormal++;
            Block work = makeWork(t, priority, number, random() % 4 == 0);
            if (random() % 8 == 0)
                queue.addBlockSync(work, priority);
            else
                queue.addBlock(all_, std::move(work), priority);
            if (priority == Highest)
                ++lane.submittedHighest;
            if (random() % 64 == 0) {
                queue.suspend();
                queue.resume();
            }
        }
    }

    Block makeWork(std::size_t t, PriorityQueue::Priority priority, int number, bool nested) {
        return Block([this, t, priority, number, nested] {
            queue_.assertSynchronized();
            EXPECT_FALSE(std::exchange(running_, true));
            Lane& lane = lanes_[t];
            EXPECT_EQ((priority == Highest ? lane.ranHighest : lane.ranNormal)++, number);
            if (priority == Normal)
                checkHighest();
            if (nested)
                queue_.addBlock(all_, makeWork(kThreads, Highest, own_.submittedHighest++, false),
                                Highest);
            running_ = false;
        });
    }
    void checkHighest() {
        EXPECT_EQ(own_.ranHighest, own_.submittedHighest);
        for (Lane& lane : lanes_) {
            EXPECT_GE(lane.ranHighest, lane.mayNotWait);
            lane.mayNotWait = lane.submittedHighest;
        }
    }

    const PriorityQueue queue_{"lanes"};
    const group all_;
    bool running_ = false;
    std::array<Lane, kThreads + 1> lanes_;
    Lane& own_ = lanes_[kThreads];  // what blocks submit
};

TEST(PriorityQueue, KeepsItsRuleWhenThreadsAndBlocksSubmitAtRandom) {
    Submissions().run();
}

TEST(PriorityQueue, NotificationsHoldNormalBlocksBackOnlyOnceTheGroupCompleted) {
    for (const auto priority : {Normal, Highest}) {
        const PriorityQueue queue("lanes");
        const group never;
        never.enter();
        bool normalRan = false;
        Event notified;
        queue.notifyOn(never, Block([&] {
                           queue.assertSynchronized();
                           EXPECT_TRUE(normalRan);
                           notified.signal();
                       }),
                       priority);
        queue.addBlockSync(Block([&] { normalRan = true; }), Normal);
        EXPECT_TRUE(normalRan);
        never.leave();
        EXPECT_TRUE(notified.wait());
    }
}

TEST(PriorityQueue, MisuseStopsTheProcess) {
    const PriorityQueue queue("lanes");
    EXPECT_DEATH(queue.assertSynchronized(), "lanes.work");
    for (const auto outer : {Normal, Highest})
        for (const auto inner : {Normal, Highest})
            EXPECT_DEATH(
                queue.addBlockSync(Block([&] { queue.addBlockSync(Block([] {}), inner); }), outer),
                "sync.. from its own work");
}

TEST(Monitor, WaitsForItsOwnWorkAndItsChildrens) {
    Monitor parent("parent");
    EXPECT_EQ(parent.waitForCompletion(dispatch::forever), 0);
    const Monitor child(&parent, "unused");
    std::string order;
    Event entered;
    Event opened;
    child.executeBlock(Block([&] {
                           entered.signal();
                           EXPECT_TRUE(opened.wait());
                       }),
                       Normal);
    EXPECT_TRUE(entered.wait());
    parent.executeBlock(append(order, 'a'), Normal);
    child.executeBlock(append(order, 'X'), Highest);
    const group other;
    parent.executeBlock(other, append(order, 'Y'), Highest);
    parent.notifyOnCompletion(other, append(order, 'n'), Normal);
    EXPECT_NE(parent.waitForCompletion(dispatch::immediately), 0);
    EXPECT_NE(other.wait(dispatch::immediately), 0);
    opened.signal();
    EXPECT_EQ(parent.waitForCompletion(dispatch::forever), 0);
    parent.executeBlockAndWait(append(order, 'z'), Normal, dispatch::forever);
    EXPECT_EQ(order, "XYanz");
}

TEST(Monitor, ABlockThatWasWaitedForTooShortlyStillRunsOutsideOfTheGroup) {
    const Monitor monitor("monitor");
    Event opened;
    Event ran;
    const group other;
    monitor.executeBlock(other, Block([&] { EXPECT_TRUE(opened.wait()); }), Normal);
    for (const auto priority : {Normal, Highest}) {
        auto captured = std::make_shared<int>(7);
        monitor.executeBlockAndWait(Block([&ran, kept = std::move(captured)] {
                                        EXPECT_EQ(*kept, 7);
                                        ran.signal();
                                    }),
                                    priority, dispatch::time::after(std::chrono::milliseconds(1)));
    }
    EXPECT_EQ(monitor.waitForCompletion(dispatch::immediately), 0);
    opened.signal();
    EXPECT_TRUE(ran.wait() && ran.wait());
}

TEST(Monitor, SuspendsItsQueueForABlockOnTheCallersThread) {
    Monitor monitor("monitor");
    std::string order;
    monitor.suspendAndExecute(Block([&, caller = std::this_thread::get_id()] {
        EXPECT_EQ(std::this_thread::get_id(), caller);
        monitor.executeBlock(append(order, 'a'), Normal);
        monitor.executeBlock(append(order, 'X'), Highest);
        EXPECT_NE(monitor.waitForCompletion(dispatch::time::after(std::chrono::milliseconds(1))),
                  0);
        EXPECT_EQ(order, "");
    }));
    EXPECT_EQ(monitor.waitForCompletion(dispatch::forever), 0);
    EXPECT_EQ(order, "Xa");
}

}  // namespace

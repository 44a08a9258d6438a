#include "plr/concurrency/shared_synchronizable.h"

#include <gtest/gtest.h>

#include <atomic>
#include <memory>
#include <string>
#include <vector>

#include "plr/concurrency/while_alive.h"
#include "support/waiting.h"

namespace {

using plr::test::drain;
using plr::test::Event;

// What an object's end looked like. Waits for it at the latest when the test
// ends, since it comes later than the last owner's.
class End {
  public:
    ~End() { EXPECT_TRUE(wait()); }
    [[nodiscard]] bool wait() { return waited_ || (waited_ = happened_.wait()); }
    void signal() { happened_.signal(); }

    std::atomic<bool> onItsQueue{false};

  private:
    Event happened_;
    bool waited_ = false;
};

class Thing : public plr::SharedSynchronizable<Thing> {
  public:
    explicit Thing(End& end) : SharedSynchronizable("thing"), end_(end) {}
    virtual ~Thing() {
        end_.onItsQueue = ownQueue_.queue().is_current();
        end_.signal();
    }
    static std::shared_ptr<Thing> create(End& end) { return make_shared_ptr(new Thing(end)); }

    [[nodiscard]] const dispatch::queue& queue() const { return ownQueue_.queue(); }
    template <class Callable>
    auto performed(Callable&& work) const {
        return perform(std::forward<Callable>(work));
    }

  private:
    End& end_;
};

TEST(SharedSynchronizable, WrappedWorkKeepsTheObjectAlive) {
    End end;
    auto thing = Thing::create(end);
    const Thing* raw = thing.get();
    const dispatch::queue queue = thing->queue();
    Event go;
    Event checked;
    std::weak_ptr<Thing> weak = thing->weak_from_this();
    queue.async([&go] { EXPECT_TRUE(go.wait()); });
    thing->execute_wrapped([weak, raw, &checked] {
        EXPECT_EQ(weak.lock().get(), raw);
        checked.signal();
    });
    thing.reset();
    go.signal();
    EXPECT_TRUE(checked.wait());
    EXPECT_TRUE(end.wait());
    drain(queue);
    EXPECT_TRUE(weak.expired());
    EXPECT_TRUE(end.onItsQueue);
}

TEST(SharedSynchronizable, DroppingTheLastOwnerOnTheQueueDestroysBehindTheQueuedWork) {
    End end;
    auto thing = Thing::create(end);
    const dispatch::queue queue = thing->queue();
    std::vector<std::string> log;  // touched on the queue only
    const auto destroyed = [&end] { return end.onItsQueue.load(); };
    Event go;
    queue.async([&] {
        EXPECT_TRUE(go.wait());
        thing.reset();
        log.push_back(destroyed() ? "destroyed in the block" : "alive after the drop");
    });
    queue.async([&] { log.push_back(destroyed() ? "destroyed too early" : "queued before"); });
    go.signal();
    EXPECT_TRUE(end.wait());
    queue.sync([&] {
        EXPECT_EQ(log, (std::vector<std::string>{"alive after the drop", "queued before"}));
    });
    EXPECT_TRUE(end.onItsQueue);
}

TEST(SharedSynchronizable, RefusesWorkWhileNobodyOwnsIt) {
    End end;
    Event dropped;
    class Derived : public Thing {
      public:
        using Thing::Thing;
    };
    auto* thing = new Derived(end);
    const auto expectRefused = [thing] {
        EXPECT_THROW(thing->execute_wrapped([] { FAIL(); }), std::bad_weak_ptr);
        EXPECT_THROW(static_cast<void>(thing->weak_from_this()), std::bad_weak_ptr);
    };
    expectRefused();
    std::shared_ptr<Derived> owner = Thing::make_shared_ptr(thing);
    EXPECT_EQ(static_cast<const Thing*>(thing)->weak_from_this().lock(), owner);
    EXPECT_STREQ(thing->queue().label(), "thing");
    // Queued before the drop, so that it runs before the destruction.
    thing->queue().async([&] {
        EXPECT_TRUE(dropped.wait());
        expectRefused();
    });
    owner.reset();
    dropped.signal();
    EXPECT_TRUE(end.wait());
    EXPECT_EQ(Thing::make_shared_ptr(static_cast<Thing*>(nullptr)).get(), nullptr);
}

TEST(SharedSynchronizable, RunsWorkInOrderAndReturnsResults) {
    End end;
    const auto thing = Thing::create(end);
    std::vector<int> order;  // touched on the queue only
    for (int i = 0; i < 3; ++i)
        thing->execute_wrapped([&order, i] { order.push_back(i); });
    thing->execute_wrapped(dispatch::block<void()>([&order] { order.push_back(3); }));
    EXPECT_EQ(thing->execute_wrapped_sync([&order] { return order; }),
              (std::vector<int>{0, 1, 2, 3}));
    EXPECT_EQ(*thing->execute_wrapped_sync([] { return std::make_unique<int>(7); }), 7);
    // perform() also from the queue itself.
    const auto onQueue = [&] { return thing->queue().is_current(); };
    EXPECT_TRUE(thing->execute_wrapped_sync([&] { return thing->performed(onQueue); }));
    EXPECT_TRUE(thing->performed(onQueue));
}

TEST(WhileAlive, DoesNothingOnceTheObjectIsGone) {
    auto object = std::make_shared<int>(0);
    auto add =
        plr::whileAlive(std::weak_ptr<int>(object), [](int& sum, int number) { sum += number; });
    dispatch::block<void(int)> asBlock(add);
    add(1);
    asBlock(2);
    EXPECT_EQ(*object, 3);
    std::weak_ptr<int> weak = object;
    object.reset();
    EXPECT_TRUE(weak.expired());
    add(4);
    asBlock(8);
}

}  // namespace

#include "plr/concurrency/shared_synchronizable.h"

#include "plr/concurrency/while_alive.h"
#include "support/waiting.h"

namespace {

using namespace plr::test;

// Calls `atEnd` when it is destroyed.
class Thing : public plr::SharedSynchronizable<Thing> {
  public:
    explicit Thing(std::function<void()> atEnd)
        : SharedSynchronizable("thing"), atEnd_(std::move(atEnd)) {}
    virtual ~Thing() {
        EXPECT_TRUE(queue().is_current());
        atEnd_();
    }
    static std::shared_ptr<Thing> create(std::function<void()> atEnd) {
        return make_shared_ptr(new Thing(std::move(atEnd)));
    }

    [[nodiscard]] const dispatch::queue& queue() const { return ownQueue_.queue(); }
    template <class Callable>
    auto performed(Callable&& work) const {
        return perform(std::forward<Callable>(work));
    }

  private:
    const std::function<void()> atEnd_;
};

class SharedThing : public testing::Test {
  protected:
    const std::function<void()> atEnd_ = [this] { ended_.signal(); };
    Event ended_, go_;
};

TEST_F(SharedThing, IsKeptAliveByWrappedWork) {
    auto thing = Thing::create(atEnd_);
    const Thing* raw = thing.get();
    const std::weak_ptr<Thing> weak = thing->weak_from_this();
    thing->queue().async([this] { EXPECT_TRUE(go_.wait()); });
    thing->execute_wrapped([weak, raw] { EXPECT_EQ(weak.lock().get(), raw); });
    thing.reset();
    go_.signal();
    EXPECT_TRUE(ended_.wait());
    EXPECT_TRUE(weak.expired());
}

TEST_F(SharedThing, IsDestroyedBehindTheQueuedWorkWhenItsLastOwnerGoesOnItsQueue) {
    std::vector<std::string> log;  // touched on the queue only
    auto thing = Thing::create([&] {
        log.push_back("destroyed");
        ended_.signal();
    });
    const dispatch::queue queue = thing->queue();
    queue.async([&] {
        EXPECT_TRUE(go_.wait());
        thing.reset();
        log.push_back("dropped");
    });
    queue.async([&] { log.push_back("queued before"); });
    go_.signal();
    EXPECT_TRUE(ended_.wait());
    queue.sync([&] {
        EXPECT_EQ(log, (std::vector<std::string>{"dropped", "queued before", "destroyed"}));
    });
}

TEST_F(SharedThing, RefusesWorkWhileNobodyOwnsIt) {
    class Derived : public Thing {
      public:
        using Thing::Thing;
    };
    auto* thing = new Derived(atEnd_);
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
        EXPECT_TRUE(go_.wait());
        expectRefused();
    });
    owner.reset();
    go_.signal();
    EXPECT_TRUE(ended_.wait());
    EXPECT_EQ(Thing::make_shared_ptr(static_cast<Thing*>(nullptr)).get(), nullptr);
}

TEST_F(SharedThing, RunsWorkInOrderAndReturnsResults) {
    auto thing = Thing::create(atEnd_);
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
    thing.reset();
    EXPECT_TRUE(ended_.wait());
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
